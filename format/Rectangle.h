// Rectangle: columns [x, x + width) and lines [y, y + height) of a level, in pixels of that level.
//
// One without width or height is empty. Its far edges may lie behind the last 32-bit number: all
// questions are answered in 64 bits. Windows, tiles and parts of them are all told by it; host and
// driver know it by the name Window. A plain value: nothing throws, and any number of threads may
// use one.
#ifndef ZMC_FORMAT_RECTANGLE_H
#define ZMC_FORMAT_RECTANGLE_H

#include <algorithm>
#include <cstdint>

namespace zelm {

struct Rectangle {
    std::uint32_t x = 0;       // first column
    std::uint32_t y = 0;       // first line
    std::uint32_t width = 0;   // columns
    std::uint32_t height = 0;  // lines

    // The column behind the last, the line behind the last, and the number of pixels.
    constexpr std::uint64_t Right() const { return std::uint64_t{x} + width; }
    constexpr std::uint64_t Bottom() const { return std::uint64_t{y} + height; }
    constexpr std::uint64_t Pixels() const { return std::uint64_t{width} * height; }
    constexpr bool IsEmpty() const { return width == 0 || height == 0; }

    // Whether no edge of `other` lies outside, be it empty or not.
    constexpr bool Contains(const Rectangle& other) const {
        return other.x >= x && other.y >= y && other.Right() <= Right() &&
               other.Bottom() <= Bottom();
    }

    // Member by member: empty ones may differ.
    friend constexpr bool operator==(const Rectangle&, const Rectangle&) = default;
};

// The pixels that lie in both; an empty rectangle if there are none.
constexpr Rectangle Intersection(const Rectangle& a, const Rectangle& b) {
    const std::uint32_t x = std::max(a.x, b.x);
    const std::uint32_t y = std::max(a.y, b.y);
    const std::uint64_t right = std::min(a.Right(), b.Right());
    const std::uint64_t bottom = std::min(a.Bottom(), b.Bottom());
    if (right <= x || bottom <= y) return {x, y, 0, 0};
    return {x, y, static_cast<std::uint32_t>(right - x), static_cast<std::uint32_t>(bottom - y)};
}

}  // namespace zelm

#endif
