// TileTable: where the tiles of the ordering Morton lie.
//
// Pure arithmetic on a table in memory: no file. The table has a row for each level up to
// `levelMax` and each band, of as many entries as level 0 has tiles; a level uses the start of its
// rows, row by row of its own grid, and what it does not use is 0. Offsets are absolute.
#ifndef ZMC_FORMAT_TILETABLE_H
#define ZMC_FORMAT_TILETABLE_H

#include <cstdint>
#include <optional>

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

// TilePlaces: the entries of such a table one by one, without the table: a header of a few hundred
// bytes can announce one of gigabytes. Each takes a descent of the curve, which bench/pyramid_bench
// times (PlaceInLargestGrid).
//
// A grid of up to 65536 x 65536 tiles, with a tile size above 0. Nothing here changes; any number
// of threads may look.
class TilePlaces {
public:
    // The tiles begin at `startOffset`.
    TilePlaces(const TileTable& described, std::uint64_t startOffset);

    // The entry of a tile of the level's own grid. 0 for levels that the table has no place for.
    // Those of the bands lie BandBytes apart.
    std::uint64_t At(std::uint32_t band, std::uint32_t level, std::uint32_t tileX,
                     std::uint32_t tileY) const;
    std::uint64_t BandBytes() const { return bandBytes; }

private:
    struct Tile {  // of level 0
        std::uint32_t x = 0;
        std::uint32_t y = 0;
        bool operator==(const Tile&) const = default;
    };

    std::uint32_t FirstReduced() const { return table.levelMin > 1 ? table.levelMin : 1; }
    Tile LastOf(Tile corner, std::uint32_t side) const;
    bool Has(Tile tile) const;
    std::optional<Tile> Previous(Tile tile) const;
    std::optional<Tile> Following(Tile block, std::uint32_t level) const;
    std::uint64_t Bytes(Tile corner, std::uint32_t side, std::uint32_t level) const;
    std::uint64_t BlockBytes(Tile tile, std::uint32_t level) const;
    std::uint64_t BytesBefore(Tile tile, std::uint32_t level) const;
    std::uint64_t PlaceOfTile(Tile tile) const;
    std::uint64_t PlaceOfBlock(Tile block, std::uint32_t level) const;

    TileTable table;
    std::uint32_t endLevel;
    std::uint32_t depth;  // of the quadtree over the grid
    std::uint64_t start;
    std::uint64_t bandBytes = 0;  // from band to band
};

}  // namespace zelm

#endif
