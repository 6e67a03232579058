#include "colour/Palette.h"

#include <iterator>
#include <new>

namespace zelm {
namespace {

// Stands for a copy that is yet to be made, in the place of the one who owns it: a pointer that is
// copied into its entry counts its object three times over.
struct CopyToCome {
    const Color& color;
    operator Color*() const { return new (std::nothrow) Color(color); }
};

bool IsCopyOf(const ColorPtr& copy, const Color& color) {
    return copy && (!color.name.wide || copy->name.wide);
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
    const std::size_t before = colors.size();
    place = colors.try_emplace(place, nextIndex, CopyToCome{color});
    if (colors.size() == before) place->second = ColorPtr(CopyToCome{color});
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
    for (const auto& [index, color] : colors) {
        if (!color) continue;
        const auto copy = copies.try_emplace(copies.end(), index, CopyToCome{*color});
        if (!IsCopyOf(copy->second, *color)) throw std::bad_alloc();
    }
    target.colors.swap(copies);
    target.nextIndex = nextIndex;
}

}  // namespace zelm
