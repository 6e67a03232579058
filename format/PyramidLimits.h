// What a pyramid file may claim before anything is allocated for it.
//
// A header is a few hundred bytes and can announce anything. It is judged as a whole by one
// function; a file that fails the judgement does not open, and one that fails it is not made: a
// reader's BuildPyramid up to level 1024 leaves a file of that name as it is.
#ifndef ZMC_FORMAT_PYRAMIDLIMITS_H
#define ZMC_FORMAT_PYRAMIDLIMITS_H

#include <cstdint>

#include "format/PyramidHeaderRecord.h"

namespace zelm::PyramidLimits {

inline constexpr std::uint32_t kMaxTileSize = 2048;
inline constexpr std::uint32_t kMaxLevel = 1023;
// The level table and the tile table together. Only the ordering Morton has a tile table.
inline constexpr std::uint64_t kMaxTableBytes = std::uint64_t{4} << 30;
// Tile tables up to this size are built when a file is opened. Larger ones wait for the first tile:
// touching their fresh memory would take longer than all the rest of an open.
inline constexpr std::uint64_t kMaxEagerTableBytes = std::uint64_t{64} << 10;
// Beyond this no table is made at all, and the place of each tile is computed when it is asked for
// (TilePlaces): that takes longer, and no memory.
inline constexpr std::uint64_t kMaxHeldTableBytes = std::uint64_t{4} << 20;
// The tile data, so that no sum of offsets leaves 64 bits.
inline constexpr std::uint64_t kMaxTileDataBytes = std::uint64_t{1} << 62;
// The Morton curve has 16 bits for each direction.
inline constexpr std::uint32_t kMaxMortonTiles = 65536;
// The buffer of 2 x 2 tiles; where it would be larger there is none.
inline constexpr std::uint64_t kMaxScratchBytes = std::uint64_t{256} << 20;

// Bytes of a table of `tiles` offsets for each band and each of the levels up to `levelMax`;
// anything above kMaxTableBytes stands for "too many".
std::uint64_t TileTableBytes(std::uint64_t tiles, std::uint32_t bands, std::uint32_t levelMax);

// True if all tables of such a file can be laid out. A tile size of 0 or above kMaxTileSize fails.
bool Allow(const PyramidHeaderRecord& header);

}  // namespace zelm::PyramidLimits

#endif
