#include "format/PyramidLimits.h"

#include <algorithm>
#include <limits>

#include "core/CheckedArithmetic.h"
#include "core/PixelVocabulary.h"
#include "format/LevelGeometry.h"

namespace zelm::PyramidLimits {
namespace {

std::uint64_t LevelTableBytes(std::uint32_t levelMax) {
    return (levelMax + std::uint64_t{1}) * sizeof(std::uint64_t);
}

bool AllowTileTable(const PyramidHeaderRecord& header) {
    if (!header.IsPlanar()) return true;
    const LevelGeometry grid = header.Geometry(0);
    if (grid.tilesAcross > kMaxMortonTiles || grid.tilesDown > kMaxMortonTiles) return false;
    const std::uint64_t tiles = std::uint64_t{grid.tilesAcross} * grid.tilesDown;
    const std::uint64_t bytes = TileTableBytes(tiles, header.bandCount, header.levelMax);
    return bytes <= kMaxTableBytes - LevelTableBytes(header.levelMax);
}

bool AllowTileData(const PyramidHeaderRecord& header) {
    const std::uint64_t sampleBytes = PixelSize(header.pixelType);
    std::optional<std::uint64_t> total = 0;
    for (std::uint32_t level = header.levelMin; level <= header.levelMax; ++level) {
        const auto pixels = LevelGeometry::LevelPixels(header.width, header.height, level);
        total = CheckedSum(total, CheckedProduct({pixels, sampleBytes, header.bandCount}));
    }
    return FitsWithin(total, kMaxTileDataBytes);
}

}  // namespace

std::uint64_t TileTableBytes(std::uint64_t tiles, std::uint32_t bands, std::uint32_t levelMax) {
    // An extent of 0 counts as 1, as in the shape of the table.
    return CheckedProduct({std::max<std::uint64_t>(tiles, 1), std::max(bands, 1u),
                           levelMax + std::uint64_t{1}, sizeof(std::uint64_t)})
        .value_or(std::numeric_limits<std::uint64_t>::max());
}

bool Allow(const PyramidHeaderRecord& header) {
    return header.tileSize != 0 && header.tileSize <= kMaxTileSize &&
           header.levelMax <= kMaxLevel && AllowTileTable(header) && AllowTileData(header);
}

}  // namespace zelm::PyramidLimits
