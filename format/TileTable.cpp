#include "format/TileTable.h"

#include <algorithm>
#include <array>
#include <bit>

#include "format/PyramidLimits.h"

namespace zelm {
namespace {

// Above the logarithm of the tile size every tile shrinks to nothing: no blocks.
std::uint32_t EndOfBlocks(std::uint32_t tileSize, std::uint32_t levelMax) {
    return std::min(static_cast<std::uint32_t>(std::bit_width(tileSize)), levelMax + 1u);
}

// Extent at a level of some tiles of a row of the grid, of which the last has its own extent. Each
// tile is shifted by itself, and the bits lost with it: that differs from the level's own geometry
// where 2^L does not divide the tile size.
std::uint32_t ReducedExtent(std::uint32_t first, std::uint32_t covered, std::uint32_t tiles,
                            std::uint32_t tileSize, std::uint32_t last, std::uint32_t level) {
    const std::uint32_t whole = first + covered == tiles ? covered - 1u : covered;
    return whole * (tileSize >> level) + (whole != covered ? last >> level : 0u);
}

// Lays one band of tiles of all levels along the Morton curve over the tile grid of level 0.
//
// A block is the square of 2^L x 2^L tiles that one tile of level L covers, and on the curve it is
// one run. Its reduced tile is placed when the curve has left it, and that is noticed one tile
// late: the first tile of the next block comes before it. The quadtree is descended in curve
// order and quadrants outside the grid are skipped, so each tile is visited once.
class MortonWalk {
public:
    MortonWalk(const LevelGeometry& levelZero, std::uint32_t levelMin, std::uint32_t levelMax,
               std::uint32_t sampleBytes, std::uint64_t* offsets, std::uint64_t rowStride,
               std::uint64_t start)
        : grid(levelZero),
          firstLevel(levelMin),
          endLevel(EndOfBlocks(levelZero.tileSize, levelMax)),
          bytes(sampleBytes),
          table(offsets),
          stride(rowStride),
          cursor(start) {
        for (std::uint32_t level = 1; level < endLevel; ++level)
            acrossAt[level] = TilesAcross(level);
    }

    // Places all tiles; the answer is the offset behind the last.
    std::uint64_t Run() {
        const std::uint32_t side = std::max(grid.tilesAcross, grid.tilesDown);
        Descend(0, 0, static_cast<std::uint32_t>(std::bit_width(side - 1u)));
        return cursor;
    }

private:
    static constexpr std::uint32_t kNoBlock = 0xFFFFFFFFu;
    struct Block {
        std::uint32_t x = kNoBlock;
        std::uint32_t y = kNoBlock;
    };

    std::uint32_t TilesAcross(std::uint32_t level) const {
        return LevelGeometry(grid.samples, 0, grid.tileSize, level).tilesAcross;
    }

    void Descend(std::uint32_t x, std::uint32_t y, std::uint32_t level) {
        if (level == 0) return Visit(x, y);
        const std::uint32_t half = 1u << (level - 1u);
        const bool right = x + half < grid.tilesAcross;
        const bool below = y + half < grid.tilesDown;
        Descend(x, y, level - 1u);
        if (right) Descend(x + half, y, level - 1u);
        if (below) Descend(x, y + half, level - 1u);
        if (right && below) Descend(x + half, y + half, level - 1u);
        if (level < endLevel && level >= firstLevel) {
            leftBlocks[level] = {x, y};
            leftLevels |= 1u << level;
        }
    }

    void Visit(std::uint32_t x, std::uint32_t y) {
        if (firstLevel == 0) {
            table[std::uint64_t{grid.tilesAcross} * y + x] = cursor;
            Advance(grid.TileWidth(x), grid.TileHeight(y));
        }
        if (x == grid.tilesAcross - 1u && y == grid.tilesDown - 1u) return Finish(x, y);
        while (leftLevels != 0) EmitLeft(static_cast<std::uint32_t>(std::countr_zero(leftLevels)));
    }

    // The last tile of the grid ends its own blocks at once, level by level.
    void Finish(std::uint32_t x, std::uint32_t y) {
        for (std::uint32_t level = std::max(firstLevel, 1u); level < endLevel; ++level) {
            if (leftLevels >> level & 1u) EmitLeft(level);
            Emit({x >> level << level, y >> level << level}, level);
        }
    }

    void EmitLeft(std::uint32_t level) {
        leftLevels &= ~(1u << level);
        Emit(leftBlocks[level], level);
    }

    // A block whose tiles all shrink to nothing in one direction takes no place.
    void Emit(const Block& block, std::uint32_t level) {
        const std::uint32_t width = Reduced(block.x, grid.tilesAcross, grid.lastWidth, level);
        const std::uint32_t height = Reduced(block.y, grid.tilesDown, grid.lastHeight, level);
        if (width == 0 || height == 0) return;
        const std::uint64_t tile =
            std::uint64_t{acrossAt[level]} * (block.y >> level) + (block.x >> level);
        table[level * stride + tile] = cursor;
        Advance(width, height);
    }

    // Extent of a block at its level.
    std::uint32_t Reduced(std::uint32_t first, std::uint32_t tiles, std::uint32_t last,
                          std::uint32_t level) const {
        return ReducedExtent(first, std::min(tiles - first, 1u << level), tiles, grid.tileSize,
                             last, level);
    }

    void Advance(std::uint32_t width, std::uint32_t height) {
        cursor += std::uint64_t{width} * height * bytes;
    }

    const LevelGeometry grid;  // of level 0
    const std::uint32_t firstLevel;
    const std::uint32_t endLevel;
    const std::uint32_t bytes;
    std::uint64_t* const table;
    const std::uint64_t stride;  // entries from level to level
    std::uint64_t cursor;
    std::array<std::uint32_t, 32> acrossAt{};
    std::array<Block, 32> leftBlocks{};  // blocks that the curve has left, until they are placed
    std::uint32_t leftLevels = 0;        // bit L: leftBlocks[L] waits
};

// Tiles of a level that the walk has placed: all of its grid, or none where tiles shrink to
// nothing.
std::uint64_t PlacedTiles(const LevelGeometry& levelZero, std::uint32_t level) {
    if (level >= LevelGeometry::kLevelsWithPixels || levelZero.tileSize >> level == 0) return 0;
    const LevelGeometry grid(levelZero.samples, levelZero.lines, levelZero.tileSize, level);
    return std::uint64_t{grid.tilesAcross} * grid.tilesDown;
}

}  // namespace

void TileTable::Place(Array<std::uint64_t>& offsets, std::uint64_t& cursor) const {
    const std::uint64_t tiles = Tiles();
    if (levelZero.tileSize == 0 ||
        std::max(levelZero.tilesAcross, levelZero.tilesDown) > PyramidLimits::kMaxMortonTiles ||
        levelMax > PyramidLimits::kMaxLevel ||
        PyramidLimits::TileTableBytes(tiles, bands, levelMax) > PyramidLimits::kMaxTableBytes ||
        !offsets.SetShape(ArrayShape(levelMax + 1u, bands, static_cast<std::uint32_t>(tiles)))) {
        offsets.Clear();
        return;
    }
    std::uint64_t* const table = offsets.data;
    std::fill_n(table, offsets.shape.elements, 0);
    if (tiles == 0 || bands == 0 || levelMin > levelMax) return;

    const std::uint64_t start = cursor;
    const std::uint64_t stride = tiles * bands;
    const std::uint64_t end =
        MortonWalk(levelZero, levelMin, levelMax, sampleBytes, table, stride, start).Run();
    cursor = start + (end - start) * bands;
    // A later band lies as the first one does, by a constant further on.
    for (std::uint32_t level = levelMin; level <= levelMax; ++level) {
        const std::uint64_t* const row = table + level * stride;
        const std::uint64_t placed = PlacedTiles(levelZero, level);
        for (std::uint64_t band = 1; band < bands; ++band)
            std::transform(row, row + placed, table + level * stride + band * tiles,
                           [&](std::uint64_t offset) { return offset + (end - start) * band; });
    }
}

// The walk (MortonWalk) as sums: what lies before a tile on the curve is whole quadrants of the
// quadtree, and the tiles of a quadrant at a level have the product of their summed widths and
// heights. Reduced tiles come one tile late: before a tile stand those of the blocks that end
// before the tile before it.
TilePlaces::TilePlaces(const TileTable& described, std::uint64_t startOffset)
    : table(described),
      endLevel(EndOfBlocks(table.levelZero.tileSize, table.levelMax)),
      depth(static_cast<std::uint32_t>(std::bit_width(
          std::max({table.levelZero.tilesAcross, table.levelZero.tilesDown, 1u}) - 1u))),
      start(startOffset) {
    for (std::uint32_t level = table.levelMin; level < endLevel; ++level)
        bandBytes += Bytes({}, 1u << depth, level);
}

std::uint64_t TilePlaces::At(std::uint32_t band, std::uint32_t level, std::uint32_t tileX,
                             std::uint32_t tileY) const {
    if (level < table.levelMin || level >= endLevel) return 0;
    const Tile block{tileX << level, tileY << level};
    // Where 2^level is at most the side of a tile, a block in the grid of its level has pixels.
    const std::uint64_t first = level == 0 ? PlaceOfTile(block) : PlaceOfBlock(block, level);
    return first + band * bandBytes;
}

// The last tile, on the curve too, of a square or of what the grid has of it.
TilePlaces::Tile TilePlaces::LastOf(Tile corner, std::uint32_t side) const {
    return {std::min(corner.x + side, table.levelZero.tilesAcross) - 1u,
            std::min(corner.y + side, table.levelZero.tilesDown) - 1u};
}

bool TilePlaces::Has(Tile tile) const {
    return tile.x < table.levelZero.tilesAcross && tile.y < table.levelZero.tilesDown;
}

std::optional<TilePlaces::Tile> TilePlaces::Previous(Tile tile) const {
    for (std::uint32_t level = 1; level <= depth; ++level) {
        const std::uint32_t half = 1u << (level - 1u);
        const Tile corner{tile.x >> level << level, tile.y >> level << level};
        const bool right = (tile.x & half) != 0;
        const bool below = (tile.y & half) != 0;
        const Tile rightOf{corner.x + half, corner.y};
        if (right && below) return LastOf({corner.x, corner.y + half}, half);
        if (below && Has(rightOf)) return LastOf(rightOf, half);
        if (right || below) return LastOf(corner, half);
    }
    return std::nullopt;
}

// The first tile behind a block.
std::optional<TilePlaces::Tile> TilePlaces::Following(Tile block, std::uint32_t level) const {
    while (++level <= depth) {
        const std::uint32_t half = 1u << (level - 1u);
        const Tile corner{block.x >> level << level, block.y >> level << level};
        const bool right = (block.x & half) != 0;
        const bool below = (block.y & half) != 0;
        const Tile beside{corner.x + half, block.y & ~(half - 1u)};
        if (!right && Has(beside)) return beside;
        const Tile under{corner.x, corner.y + half};
        if (!below && Has(under)) return under;
    }
    return std::nullopt;
}

// What the level has of a square of tiles.
std::uint64_t TilePlaces::Bytes(Tile corner, std::uint32_t side, std::uint32_t level) const {
    const LevelGeometry& grid = table.levelZero;
    if (!Has(corner)) return 0;
    const auto width = ReducedExtent(corner.x, std::min(grid.tilesAcross - corner.x, side),
                                     grid.tilesAcross, grid.tileSize, grid.lastWidth, level);
    const auto height = ReducedExtent(corner.y, std::min(grid.tilesDown - corner.y, side),
                                      grid.tilesDown, grid.tileSize, grid.lastHeight, level);
    return std::uint64_t{width} * height * table.sampleBytes;
}

// Of the block with that tile.
std::uint64_t TilePlaces::BlockBytes(Tile tile, std::uint32_t level) const {
    return Bytes({tile.x >> level << level, tile.y >> level << level}, 1u << level, level);
}

// What the level has of the blocks before the one with that tile.
std::uint64_t TilePlaces::BytesBefore(Tile tile, std::uint32_t level) const {
    std::uint64_t bytes = 0;
    for (std::uint32_t above = depth; above > level; --above) {
        const std::uint32_t half = 1u << (above - 1u);
        const Tile corner{tile.x >> above << above, tile.y >> above << above};
        const bool right = (tile.x & half) != 0;
        const bool below = (tile.y & half) != 0;
        if (right || below) bytes += Bytes(corner, half, level);
        if (below) bytes += Bytes({corner.x + half, corner.y}, half, level);
        if (right && below) bytes += Bytes({corner.x, corner.y + half}, half, level);
    }
    return bytes;
}

std::uint64_t TilePlaces::PlaceOfTile(Tile tile) const {
    std::uint64_t place = start;
    if (table.levelMin == 0) place += BytesBefore(tile, 0);
    if (const auto previous = Previous(tile))
        for (std::uint32_t level = FirstReduced(); level < endLevel; ++level)
            place += BytesBefore(*previous, level);
    return place;
}

// Behind the tile that the curve comes to next stand the blocks that it has left, the smallest
// first; behind the last of the grid, its own ones in between.
std::uint64_t TilePlaces::PlaceOfBlock(Tile block, std::uint32_t level) const {
    const Tile last = LastOf({}, 1u << depth);
    const Tile next = Following(block, level).value_or(last);
    const auto previous = Previous(next);
    const auto blockOf = [](Tile tile, std::uint32_t at) {
        return Tile{tile.x >> at << at, tile.y >> at << at};
    };
    std::uint64_t place = PlaceOfTile(next);
    if (table.levelMin == 0) place += BlockBytes(next, 0);
    for (std::uint32_t at = FirstReduced(); at <= level; ++at) {
        if (previous && blockOf(*previous, at) != blockOf(next, at)) {
            if (at == level && blockOf(*previous, at) == block) break;
            place += BlockBytes(*previous, at);
        }
        if (next == last && at != level) place += BlockBytes(next, at);
    }
    return place;
}

}  // namespace zelm
