// ColorIndex: the colours of a palette by index, and the entry nearest to any colour.
//
// Nearest is exact: the least squared distance over red, green, blue and alpha, and of several
// entries the lowest index. Equal colours are kept once, in a tree of boxes, so that a search looks
// at a few of tens of thousands of entries; answers are remembered. Any number of threads may ask.
#ifndef ZMC_HOST_REDUCE_COLORINDEX_H
#define ZMC_HOST_REDUCE_COLORINDEX_H

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <vector>

#include "colour/Palette.h"

namespace zmchost {

// Red, green, blue and alpha.
using Rgba = std::array<std::uint8_t, 4>;

class ColorIndex {
public:
    // The colours below `palette.nextIndex`; an entry without a colour, or with the null colour,
    // has none. `mayName` tells which entries may be answers: samples have to be able to hold the
    // index, and must not read as no data.
    ColorIndex(const zelm::Palette& palette,
               const std::function<bool(std::uint32_t index)>& mayName);

    // The colour of an entry; null where there is none.
    const Rgba* Find(std::uint64_t index) const {
        return index < colors.size() && present[index] ? &colors[index] : nullptr;
    }
    // Nothing only where no entry may be an answer.
    std::optional<std::uint32_t> Nearest(const Rgba& color) const;

private:
    struct Entry {
        Rgba color;
        std::uint32_t index;
    };
    // Entries [begin, end) and the box around them. A leaf has no children.
    struct Node {
        Rgba low{}, high{};
        std::uint32_t begin = 0, end = 0;
        std::uint32_t leastIndex = 0;
        std::uint32_t left = 0, right = 0;
    };
    struct Best {
        std::uint32_t distance;
        std::uint32_t index;
    };

    std::uint32_t Grow(std::uint32_t begin, std::uint32_t end);
    Node BoxAround(std::uint32_t begin, std::uint32_t end) const;
    void Search(std::uint32_t node, const Rgba& color, Best& best) const;

    std::vector<Rgba> colors;
    std::vector<bool> present;
    std::vector<Entry> entries;  // possible answers, in the order of the tree
    std::vector<Node> nodes;     // the root first
    // A colour in the upper half and its answer in the lower one, in one word, so that threads see
    // both or neither.
    std::unique_ptr<std::atomic<std::uint64_t>[]> known;
};

}  // namespace zmchost

#endif
