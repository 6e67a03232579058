// ColorList: the colours of a stored palette as numbers, for those who have no use for an object of
// each, of which there may be 65,536.
//
// Colours count from 0 without a gap. Behind them stand the null colours that lookups have left: a
// palette of that content has an entry for each, and counts none of them.
//
// A copy shares what it holds with its original until one of them gets more than the other, so that
// to keep a list costs nothing, however many colours it has: those of a palette within another
// belong to both. Lists that share are used by one thread at a time while one of them changes.
#ifndef ZMC_COLOUR_COLORLIST_H
#define ZMC_COLOUR_COLORLIST_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "colour/Palette.h"

namespace zelm {

class ColorList {
public:
    // From the low byte on: red, green, blue, alpha.
    using Rgba = std::uint32_t;
    static constexpr Rgba Pack(std::uint8_t red, std::uint8_t green, std::uint8_t blue,
                               std::uint8_t alpha) {
        return red | Rgba{green} << 8 | Rgba{blue} << 16 | Rgba{alpha} << 24;
    }
    static constexpr std::uint8_t Channel(Rgba color, int index) {
        return static_cast<std::uint8_t>(color >> (8 * index));
    }

    ColorList() = default;
    ColorList(const ColorList&) = default;  // moving is copying: the counts go with the content
    ColorList& operator=(const ColorList&) = default;
    ~ColorList() = default;

    // Each may throw std::bad_alloc, and then changes nothing.
    void Add(Rgba color);
    void LookUp(std::uint32_t index);

    void Clear() { *this = ColorList(); }
    // Good until this list, or one that shares with it, changes.
    std::span<const Rgba> Colors() const;

    // Fills an empty palette with what Palette's AddColor and GetColor would have made of the same.
    // Throws std::bad_alloc; the palette is then of no use.
    void CopyTo(Palette& target) const;

private:
    // Grows at its ends alone: each list that shares it has the front parts that it knows of.
    struct Content {
        std::vector<Rgba> colors;
        std::vector<std::uint32_t> lookedUp;  // indexes that had no colour then
    };

    std::span<const std::uint32_t> LookedUp() const;
    // The content, of which this list knows all: a copy where another list has gone on.
    Content& Whole();

    std::shared_ptr<Content> content;  // null: nothing
    std::size_t colorCount = 0;
    std::size_t lookedUpCount = 0;
};

}  // namespace zelm

#endif
