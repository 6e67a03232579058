// The walk over the tiles that a rectangle touches, for whoever reads, writes or looks at them.
#ifndef ZMC_FORMAT_TILEWALK_H
#define ZMC_FORMAT_TILEWALK_H

#include <cstdint>
#include <type_traits>

#include "format/LevelGeometry.h"
#include "format/Rectangle.h"

namespace zelm {

// What one tile holds of a rectangle. Both rectangles are in pixels of the level.
struct TilePart {
    std::uint32_t column;  // of the tile in the grid of its level
    std::uint32_t row;
    Rectangle tile;  // in its true size: those at the right and bottom edge are smaller
    Rectangle part;  // what lies in the rectangle; never empty

    // Where the part begins in its tile.
    std::uint32_t FirstColumn() const { return part.x - tile.x; }
    std::uint32_t FirstLine() const { return part.y - tile.y; }
};

// Calls visit(const TilePart&) for every tile that the rectangle touches: tile rows from the top,
// tiles from the left. A visitor may answer true to go on, and false to end the walk; the answer is
// whether none did. What lies outside of the level has no tiles, and neither has a level whose tile
// size is 0.
template <class Visit>
bool VisitTiles(const LevelGeometry& level, const Rectangle& rectangle, Visit&& visit) {
    const Rectangle inside = Intersection(rectangle, level.Whole());
    if (inside.IsEmpty() || level.tileSize == 0) return true;
    const auto lastColumn = static_cast<std::uint32_t>((inside.Right() - 1u) / level.tileSize);
    const auto lastRow = static_cast<std::uint32_t>((inside.Bottom() - 1u) / level.tileSize);
    for (std::uint32_t row = inside.y / level.tileSize; row <= lastRow; ++row)
        for (std::uint32_t column = inside.x / level.tileSize; column <= lastColumn; ++column) {
            const Rectangle tile = level.Tile(column, row);
            const TilePart part{column, row, tile, Intersection(tile, inside)};
            if constexpr (std::is_void_v<std::invoke_result_t<Visit&, const TilePart&>>)
                visit(part);
            else if (!visit(part))
                return false;
        }
    return true;
}

}  // namespace zelm

#endif
