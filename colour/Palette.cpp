#include "colour/Palette.h"

#include <iterator>
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

// The place is told, because as a rule the new entry is the last one, or the last but one where
// somebody has looked up the colour behind all. An empty pointer to fill would be an allocation.
void Palette::AddColor(const Color& color) {
    auto place = colors.end();
    if (!colors.empty() && std::prev(place)->first > nextIndex) --place;
    colors.insert_or_assign(place, nextIndex, ColorPtr(new (std::nothrow) Color(color)));
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
