#include "gdal/WindowParts.h"

#include <algorithm>

namespace zmcgdal {
namespace {

using zelm::Rectangle;

std::uint64_t Touched(std::uint64_t begin, std::uint64_t end, std::uint32_t side) {
    return (end - 1) / side - begin / side + 1;
}

// The part of a row of `extent` from `begin` on that lies in [from, to).
struct Span {
    std::uint32_t begin, extent;
};
Span Within(std::uint64_t from, std::uint64_t to, std::uint32_t begin, std::uint32_t extent) {
    const std::uint64_t first = std::max<std::uint64_t>(from, begin);
    const std::uint64_t last = std::min<std::uint64_t>(to, std::uint64_t{begin} + extent);
    return {static_cast<std::uint32_t>(first), static_cast<std::uint32_t>(last - first)};
}

}  // namespace

WindowParts::WindowParts(const Rectangle& whole, std::uint32_t tileSide, std::uint32_t apart,
                         std::uint64_t wanted)
    : window(whole),
      side(tileSide),
      firstColumn(whole.x / tileSide),
      columns(Touched(whole.x, whole.Right(), tileSide)),
      firstRow(whole.y / tileSide),
      rows(Touched(whole.y, whole.Bottom(), tileSide)) {
    run =
        std::clamp<std::uint64_t>(columns * rows / std::max<std::uint64_t>(wanted, 1), 1, columns);
    if (Runs() < wanted) bands = std::max<std::uint32_t>(apart, 1);
}

std::uint64_t WindowParts::Tiles(const Rectangle& whole, std::uint32_t tileSide,
                                 std::uint32_t apart) {
    return Touched(whole.x, whole.Right(), tileSide) * Touched(whole.y, whole.Bottom(), tileSide) *
           apart;
}

WindowParts::Part WindowParts::At(std::uint64_t number) const {
    const std::uint64_t place = number / bands;
    const std::uint64_t row = firstRow + place / RunsAcross();
    const std::uint64_t column = firstColumn + place % RunsAcross() * run;
    const Span across = Within(column * side, (column + run) * side, window.x, window.width);
    const Span down = Within(row * side, (row + 1) * side, window.y, window.height);
    Part part{{across.begin, down.begin, across.extent, down.extent}, 0, 0};
    if (bands > 1) part.firstBand = static_cast<std::uint32_t>(number % bands);
    if (bands > 1) part.bandCount = 1;
    return part;
}

}  // namespace zmcgdal
