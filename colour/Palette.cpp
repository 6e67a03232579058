#include "colour/Palette.h"

#include <new>

namespace zelm {

void Palette::Clear() {
    colors.clear();
    nextIndex = 0;
}

Color* Palette::GetColor(std::uint32_t index) {
    ColorPtr& entry = colors[index];
    if (!entry) entry.Reset(new (std::nothrow) Color);
    return entry.Get();
}

void Palette::AddColor(const Color& color) {
    colors[nextIndex].Reset(new (std::nothrow) Color(color));
    ++nextIndex;
}

void Palette::SetColor(std::uint32_t index, const Color& color) {
    ColorPtr& entry = colors[index];
    if (entry)
        entry->Assign(color);
    else
        entry.Reset(new (std::nothrow) Color(color));
}

void Palette::CopyTo(Palette& target) const {
    if (this == &target) return;
    target.Clear();
    target.nextIndex = nextIndex;
    for (const auto& [index, color] : colors)
        if (color) target.SetColor(index, *color);
}

}  // namespace zelm
