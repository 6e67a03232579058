#include "colour/Palette.h"

#include <new>

namespace zelm {
namespace {

ColorPtr WholeCopy(const Color& color) {
    const ColorPtr copy(new Color(color));
    if (!copy || (color.name.wide && !copy->name.wide)) throw std::bad_alloc();
    return copy;
}

}  // namespace

void Palette::Clear() {
    colors.clear();
    nextIndex = 0;
}

Color* Palette::GetColor(std::uint32_t index) {
    ColorPtr& entry = colors[index];
    if (!entry) entry.Reset(new (std::nothrow) Color);
    return entry.Get();
}

// As a rule the new entry is the last one, and an empty pointer to fill would be an allocation.
void Palette::AddColor(const Color& color) {
    colors.insert_or_assign(colors.end(), nextIndex, ColorPtr(new (std::nothrow) Color(color)));
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
    std::map<std::uint32_t, ColorPtr> copies;
    for (const auto& [index, color] : colors)
        if (color) copies.emplace_hint(copies.end(), index, WholeCopy(*color));
    target.colors.swap(copies);
    target.nextIndex = nextIndex;
}

}  // namespace zelm
