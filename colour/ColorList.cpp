#include "colour/ColorList.h"

#include <new>

namespace zelm {
namespace {

// Colours for which there is no memory are left out, or left without a name, in silence.
void Demand(const Color* made) {
    if (!made || !made->name.wide) throw std::bad_alloc();
}

}  // namespace

void ColorList::LookUp(std::uint32_t index) {
    if (index >= colors.size()) lookedUp.push_back(index);
}

void ColorList::Clear() {
    colors.clear();
    lookedUp.clear();
}

void ColorList::CopyTo(Palette& target) const {
    RGBAColor color{Array<unsigned char>()};  // one for all: its name is made once
    for (const Rgba rgba : colors) {
        color.red = Channel(rgba, 0);
        color.green = Channel(rgba, 1);
        color.blue = Channel(rgba, 2);
        color.alpha = Channel(rgba, 3);
        target.AddColor(color);
        Demand(target.colors.rbegin()->second.Get());
    }
    for (const std::uint32_t index : lookedUp)
        if (index >= colors.size()) Demand(target.GetColor(index));
}

}  // namespace zelm
