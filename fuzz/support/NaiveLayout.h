// The layout of a pyramid file by the letter of its format, in integers of 128 bits that cannot
// overflow: tiles are counted one after the other, and nothing is shared with the module.
#ifndef ZMC_FUZZ_SUPPORT_NAIVELAYOUT_H
#define ZMC_FUZZ_SUPPORT_NAIVELAYOUT_H

#include <algorithm>
#include <cstdint>
#include <map>
#include <vector>

namespace zmcfuzz {

__extension__ typedef unsigned __int128 Wide;

struct HeaderFields {
    std::uint32_t samples = 0;
    std::uint32_t lines = 0;
    std::uint32_t bands = 0;
    std::uint32_t tile = 0;
    std::uint32_t levelMin = 0;
    std::uint32_t levelMax = 0;
    std::uint32_t pixelType = 0;
    std::uint32_t ordering = 0;
};

inline Wide SampleBytes(std::uint32_t pixelType) {
    static const std::map<std::uint32_t, std::uint32_t> sizes{{1, 1},  {99, 1}, {12, 2}, {2, 2},
                                                              {13, 4}, {3, 4},  {4, 4},  {15, 8},
                                                              {14, 8}, {5, 8},  {6, 8},  {9, 16}};
    const auto found = sizes.find(pixelType);
    return found == sizes.end() ? 1 : found->second;
}

// One direction of one level.
struct NaiveAxis {
    Wide extent = 0;
    Wide tile = 0;
    Wide tiles = 0;

    // The count of tiles is a 32-bit sum by the format: an extent so large that it wraps has none.
    NaiveAxis(Wide pixels, Wide side) : extent(pixels), tile(side) {
        if (side != 0 && pixels + side - 1 < Wide{1} << 32) tiles = (pixels + side - 1) / side;
    }
    Wide TileExtent(Wide index) const { return std::min(tile, extent - index * tile); }
};

class NaiveLayout {
public:
    const HeaderFields fields;
    const Wide sampleBytes;

    explicit NaiveLayout(const HeaderFields& header)
        : fields(header), sampleBytes(SampleBytes(header.pixelType)) {}

    bool IsPlanar() const { return fields.ordering >= 2; }
    Wide TilePixelBytes() const { return IsPlanar() ? sampleBytes : sampleBytes * fields.bands; }

    // Levels from 32 on have no pixels, since 32 halvings leave nothing of 32 bits.
    static Wide Halved(std::uint32_t extent, std::uint32_t times) {
        for (std::uint32_t i = 0; i < times && extent != 0; ++i) extent /= 2;
        return extent;
    }
    NaiveAxis Across(std::uint32_t level) const {
        return NaiveAxis(Halved(fields.samples, level), fields.tile);
    }
    NaiveAxis Down(std::uint32_t level) const {
        return NaiveAxis(Halved(fields.lines, level), fields.tile);
    }
    Wide Tiles(std::uint32_t level) const { return Across(level).tiles * Down(level).tiles; }
    Wide LevelBytes(std::uint32_t level) const {
        return Halved(fields.samples, level) * Halved(fields.lines, level) * sampleBytes *
               fields.bands;
    }

    // Of all levels from `above` + 1 on.
    Wide BytesAbove(std::uint32_t above) const {
        Wide total = 0;
        const std::uint64_t first = std::uint64_t{above} + 1;
        for (std::uint64_t level = first; level <= fields.levelMax; ++level)
            total += LevelBytes(static_cast<std::uint32_t>(level));
        return total;
    }
    Wide TileDataBytes() const {
        Wide total = 0;
        for (std::uint32_t level = fields.levelMin; level <= fields.levelMax; ++level)
            total += LevelBytes(level);
        return total;
    }

    Wide TableBytes() const {
        return std::max<Wide>(Tiles(0), 1) * std::max<Wide>(fields.bands, 1) *
               (Wide{fields.levelMax} + 1) * 8;
    }

    // Whether the documented limits let such a file be laid out.
    bool IsAllowed() const {
        if (fields.tile == 0 || fields.tile > 2048 || fields.levelMax > 1023) return false;
        if (IsPlanar() && (Across(0).tiles > 65536 || Down(0).tiles > 65536 ||
                           TableBytes() + 8 * (Wide{fields.levelMax} + 1) > Wide{4} << 30))
            return false;
        return TileDataBytes() <= Wide{1} << 62;
    }

    // From the start of its level, in the orderings whose tiles hold all bands: what lies before
    // it, tile rows first.
    Wide TileOffset(std::uint32_t level, Wide tileX, Wide tileY) const {
        const NaiveAxis across = Across(level);
        const NaiveAxis down = Down(level);
        const Wide pixels =
            across.extent * (tileY * down.tile) + down.TileExtent(tileY) * (tileX * across.tile);
        return pixels * sampleBytes * fields.bands;
    }
};

// Places tiles along the Morton curve, one tile after the other.
class NaiveMorton {
public:
    static constexpr Wide kNoPlace = ~Wide{0};

    // By level, band and index of the tile in its level.
    std::vector<Wide> offsets;
    Wide cursor;

    NaiveMorton(const NaiveLayout& naive, Wide start) : cursor(start), layout(naive) {
        offsets.resize(static_cast<std::size_t>(layout.TableBytes() / 8), kNoPlace);
        const std::vector<Tile> tiles = Curve();
        for (std::uint32_t band = 0; band < layout.fields.bands; ++band)
            for (std::size_t i = 0; i < tiles.size(); ++i)
                for (std::uint32_t level = layout.fields.levelMin;
                     level <= layout.fields.levelMax && level < 32; ++level)
                    Visit(band, tiles, i, level);
    }

    Wide Offset(std::uint32_t level, std::uint32_t band, Wide tileX, Wide tileY) const {
        return offsets.at(Index(level, band, tileX, tileY));
    }

private:
    struct Tile {
        std::uint64_t code;
        std::uint32_t x;
        std::uint32_t y;
    };

    std::vector<Tile> Curve() const {
        std::vector<Tile> tiles;
        for (std::uint32_t y = 0; y < layout.Down(0).tiles; ++y)
            for (std::uint32_t x = 0; x < layout.Across(0).tiles; ++x) {
                std::uint64_t code = 0;
                for (int bit = 0; bit < 32; ++bit)
                    code |= std::uint64_t{x >> bit & 1} << (2 * bit) | std::uint64_t{y >> bit & 1}
                                                                           << (2 * bit + 1);
                tiles.push_back({code, x, y});
            }
        std::sort(tiles.begin(), tiles.end(),
                  [](const Tile& a, const Tile& b) { return a.code < b.code; });
        return tiles;
    }

    // A tile of a level above 0 has its place behind the first tile that lies outside of what it
    // covers, and the last ones at the end.
    void Visit(std::uint32_t band, const std::vector<Tile>& tiles, std::size_t i,
               std::uint32_t level) {
        const Tile& tile = tiles[i];
        if (level == 0) {
            Place(0, band, tile.x, tile.y, layout.Across(0).TileExtent(tile.x),
                  layout.Down(0).TileExtent(tile.y));
            return;
        }
        if (i != 0 && (tiles[i - 1].x >> level != tile.x >> level ||
                       tiles[i - 1].y >> level != tile.y >> level))
            PlaceBlock(level, band, tiles[i - 1]);
        if (i + 1 == tiles.size()) PlaceBlock(level, band, tile);
    }

    // The extents of the tiles that a block covers, each cut down by itself.
    static Wide Covered(const NaiveAxis& axis, std::uint32_t block, std::uint32_t level) {
        Wide sum = 0;
        for (Wide tile = Wide{block} << level;
             tile < axis.tiles && tile < (Wide{block} + 1) << level; ++tile)
            sum += axis.TileExtent(tile) >> level;
        return sum;
    }

    void PlaceBlock(std::uint32_t level, std::uint32_t band, const Tile& inside) {
        const std::uint32_t x = inside.x >> level;
        const std::uint32_t y = inside.y >> level;
        const Wide width = Covered(layout.Across(0), x, level);
        const Wide height = Covered(layout.Down(0), y, level);
        if (width != 0 && height != 0) Place(level, band, x, y, width, height);
    }

    void Place(std::uint32_t level, std::uint32_t band, std::uint32_t x, std::uint32_t y,
               Wide width, Wide height) {
        offsets.at(Index(level, band, x, y)) = cursor;
        cursor += width * height * layout.sampleBytes;
    }

    std::size_t Index(std::uint32_t level, std::uint32_t band, Wide tileX, Wide tileY) const {
        const Wide row = Wide{level} * layout.fields.bands + band;
        return static_cast<std::size_t>(row * layout.Tiles(0) + layout.Across(level).tiles * tileY +
                                        tileX);
    }

    const NaiveLayout& layout;
};

}  // namespace zmcfuzz

#endif
