// What follows from a header, in integers that do not overflow: whether a file opens, and where its
// tile data ends.
#ifndef ZMC_FUZZ_SUPPORT_NAIVEFILE_H
#define ZMC_FUZZ_SUPPORT_NAIVEFILE_H

#include <algorithm>
#include <cstdint>
#include <tuple>

#include "format/PyramidHeaderRecord.h"
#include "pyramid/PyramidDataset.h"

namespace zmcfuzz {

__extension__ using Wide = unsigned __int128;

// Tables beyond this are not looked at entry by entry, and no tile is asked for that would make
// one: the module's own limit is above the memory of a fuzzing run.
inline constexpr std::uint64_t kComparedTableBytes = 1u << 20;

inline zelm::PyramidHeaderRecord HeaderOf(const zelm::PyramidDataset& dataset) {
    return {dataset.VersionMajor, dataset.VersionMinor, dataset.BandCount,   dataset.Samples,
            dataset.Lines,        dataset.TileSize,     dataset.LevelMin,    dataset.LevelMax,
            dataset.PixelType,    dataset.Interleave,   dataset.TileOrdering};
}

inline std::uint32_t SampleBytes(std::uint32_t pixelType) {
    switch (pixelType) {
        case 2:
        case 12:
            return 2;
        case 3:
        case 4:
        case 13:
            return 4;
        case 5:
        case 6:
        case 14:
        case 15:
            return 8;
        case 9:
            return 16;
        default:
            return 1;
    }
}

inline Wide TilesOver(std::uint32_t extent, std::uint32_t side) {
    return (Wide{extent} + side - 1) / side;
}

// Tile counts are counted in 32 bits, and wrap for sizes this close to their end.
inline bool TileCountWraps(std::uint32_t extent, std::uint32_t side) {
    return Wide{extent} + side - 1 > 0xFFFFFFFFu;
}
inline bool TileCountWraps(const zelm::PyramidDataset& dataset) {
    return TileCountWraps(dataset.Samples, dataset.TileSize) ||
           TileCountWraps(dataset.Lines, dataset.TileSize);
}

inline Wide TileTableBytes(const zelm::PyramidHeaderRecord& header) {
    const auto over = [&](std::uint32_t extent) {
        return TileCountWraps(extent, header.tileSize) ? Wide{0}
                                                       : TilesOver(extent, header.tileSize);
    };
    const Wide tiles = over(header.width) * over(header.height);
    const Wide levels = Wide{header.levelMax} + 1;
    return std::max<Wide>(tiles, 1) * std::max(header.bandCount, 1u) * levels * 8;
}
inline Wide TileTableBytes(const zelm::PyramidDataset& dataset) {
    return TileTableBytes(HeaderOf(dataset));
}

inline Wide TileDataEnd(const zelm::PyramidHeaderRecord& header, std::uint64_t start) {
    Wide end = start;
    const std::uint32_t last = std::min(header.levelMax, 31u);
    for (std::uint32_t level = header.levelMin; level <= last; ++level)
        end += Wide{header.width >> level} * (header.height >> level) *
               SampleBytes(header.pixelType) * header.bandCount;
    return end;
}

// By the limits of the module, for a tile size up to the largest.
inline bool MayOpen(const zelm::PyramidHeaderRecord& header) {
    if (header.tileSize == 0 || header.levelMax > 1023) return false;
    if (TileDataEnd(header, 0) > Wide{1} << 62) return false;
    if (header.tileOrdering != 2) return true;
    const auto tooMany = [&](std::uint32_t extent) {
        return !TileCountWraps(extent, header.tileSize) &&
               TilesOver(extent, header.tileSize) > 65536;
    };
    if (tooMany(header.width) || tooMany(header.height)) return false;
    return TileTableBytes(header) + (Wide{header.levelMax} + 1) * 8 <= Wide{4} << 30;
}

}  // namespace zmcfuzz

namespace zelm {

inline bool operator==(const PyramidHeaderRecord& a, const PyramidHeaderRecord& b) {
    const auto values = [](const PyramidHeaderRecord& r) {
        return std::tuple(r.versionMajor, r.versionMinor, r.bandCount, r.width, r.height,
                          r.tileSize, r.levelMin, r.levelMax, r.pixelType, r.interleave,
                          r.tileOrdering);
    };
    return values(a) == values(b);
}

}  // namespace zelm

#endif
