// PartGrid: a raster cut into parts, each of which makes the levels from 0 to `level` of its area
// and touches no tile of another.
//
// Parts are rectangles of whole tiles of that level, the last ones less, and count from the upper
// left one, row by row. A plain value; no file is touched.
#ifndef ZMC_HOST_BUILD_PARTGRID_H
#define ZMC_HOST_BUILD_PARTGRID_H

#include <cstdint>

#include "format/PyramidHeaderRecord.h"
#include "format/Rectangle.h"

namespace zmchost {

// Side of the tiles of every file that the module creates.
inline constexpr std::uint32_t kTileSide = zelm::kWrittenTileSize;
// The most parts that a raster is cut into.
inline constexpr std::uint64_t kMostParts = 100000;

struct PartGrid {
    std::uint32_t width = 0;  // of level 0
    std::uint32_t height = 0;
    std::uint32_t level = 0;
    std::uint32_t columns = 1;  // tiles of `level` that a part has side by side
    std::uint32_t rows = 1;     // and one below the other

    bool operator==(const PartGrid&) const = default;

    std::uint64_t PartWidth() const { return std::uint64_t{columns} * kTileSide << level; }
    std::uint64_t PartHeight() const { return std::uint64_t{rows} * kTileSide << level; }
    std::uint64_t Across() const { return (width + PartWidth() - 1) / PartWidth(); }
    std::uint64_t Down() const { return (height + PartHeight() - 1) / PartHeight(); }
    std::uint64_t Count() const { return Across() * Down(); }
    // Of level 0; `part` is below Count().
    zelm::Rectangle Area(std::uint64_t part) const;
};

}  // namespace zmchost

#endif
