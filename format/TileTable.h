// TileTable: where the tiles of the ordering Morton lie.
//
// Pure arithmetic on a table in memory: no file. The table has a row for each level up to
// `levelMax` and each band, of as many entries as level 0 has tiles; a level uses the start of its
// rows, row by row of its own grid, and what it does not use is 0. Offsets are absolute.
#ifndef ZMC_FORMAT_TILETABLE_H
#define ZMC_FORMAT_TILETABLE_H

#include <cstdint>

#include "core/Array.h"
#include "format/LevelGeometry.h"

namespace zelm {

struct TileTable {
    LevelGeometry levelZero;
    std::uint32_t levelMin;
    std::uint32_t levelMax;
    std::uint32_t bands;
    std::uint32_t sampleBytes;

    std::uint64_t Tiles() const {
        return std::uint64_t{levelZero.tilesAcross} * levelZero.tilesDown;
    }

    // Fills `offsets` along the Morton curve from `cursor` on, and advances that behind the last
    // tile. A table beyond PyramidLimits, or one that finds no memory, leaves `offsets` empty and
    // `cursor` as it was.
    void Place(Array<std::uint64_t>& offsets, std::uint64_t& cursor) const;
};

}  // namespace zelm

#endif
