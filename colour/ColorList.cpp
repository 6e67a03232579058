#include "colour/ColorList.h"

#include <new>

namespace zelm {
namespace {

// Colours for which there is no memory are left out, or left without a name, in silence.
void Demand(const Color* made) {
    if (!made || !made->name.wide) throw std::bad_alloc();
}

}  // namespace

void ColorList::Add(Rgba color) {
    Whole().colors.push_back(color);
    ++colorCount;
}

void ColorList::LookUp(std::uint32_t index) {
    if (index < colorCount) return;
    Whole().lookedUp.push_back(index);
    ++lookedUpCount;
}

std::span<const ColorList::Rgba> ColorList::Colors() const {
    if (!content) return {};
    return {content->colors.data(), colorCount};
}

std::span<const std::uint32_t> ColorList::LookedUp() const {
    if (!content) return {};
    return {content->lookedUp.data(), lookedUpCount};
}

ColorList::Content& ColorList::Whole() {
    if (!content) {
        content = std::make_shared<Content>();
    } else if (content->colors.size() != colorCount || content->lookedUp.size() != lookedUpCount) {
        const auto known = Colors();
        const auto indexes = LookedUp();
        content = std::make_shared<Content>(Content{{known.begin(), known.end()},  //
                                                    {indexes.begin(), indexes.end()}});
    }
    return *content;
}

void ColorList::CopyTo(Palette& target) const {
    RGBAColor color{Array<unsigned char>()};  // one for all: its name is made once
    for (const Rgba rgba : Colors()) {
        color.red = Channel(rgba, 0);
        color.green = Channel(rgba, 1);
        color.blue = Channel(rgba, 2);
        color.alpha = Channel(rgba, 3);
        target.AddColor(color);
        Demand(target.colors.rbegin()->second.Get());
    }
    for (const std::uint32_t index : LookedUp())
        if (index >= colorCount) Demand(target.GetColor(index));
}

}  // namespace zelm
