#include "gdal/WindowTiles.h"

#include <algorithm>
#include <utility>

#include "core/PixelVocabulary.h"
#include "format/TileWalk.h"

namespace zmcgdal {

using zelm::Rectangle;
using zelm::TilePart;

WindowTiles::WindowTiles(const zmchost::PyramidHeader& fileHeader, std::uint32_t fileLevel,
                         const Rectangle& shown, std::vector<std::uint32_t> bandNumbers)
    : header(fileHeader),
      level(fileLevel),
      grid(header.Geometry(level)),
      window(Intersection(shown, grid.Whole())),
      bands(std::move(bandNumbers)),
      pixelBytes(zelm::PixelSize(header.pixelType)) {
    if (header.IsPlanar()) {
        const auto sampleBytes = static_cast<std::uint32_t>(pixelBytes);
        places.emplace(zelm::TileTable{header.Geometry(0), header.levelMin, header.levelMax,
                                       header.bandCount, sampleBytes},
                       header.tileDataStart);
    } else {
        bands.assign(1, 0);
        pixelBytes *= header.bandCount;
    }
    reached = window.y / grid.tileSize;
}

std::uint32_t WindowTiles::EndRow() const {
    if (window.IsEmpty()) return 0;
    return static_cast<std::uint32_t>((window.Bottom() - 1u) / grid.tileSize) + 1u;
}

std::uint64_t WindowTiles::PlaceOf(std::uint32_t band, std::uint32_t column,
                                   std::uint32_t row) const {
    if (places) return places->At(band, level, column, row);
    return header.LevelOffset(level) + grid.TileOffset(column, row, pixelBytes);
}

template <class Visit>
void WindowTiles::Walk(std::uint32_t row, Visit&& visit) const {
    for (; row < EndRow(); ++row) {
        const Rectangle line{window.x, row * grid.tileSize, window.width, 1};
        const bool goesOn = zelm::VisitTiles(grid, line, [&](const TilePart& part) {
            return std::all_of(bands.begin(), bands.end(), [&](std::uint32_t band) {
                const std::uint64_t place = PlaceOf(band, part.column, part.row);
                const ByteRange range{place, part.tile.Pixels() * pixelBytes};
                return place == 0 || visit(range, part.row);
            });
        });
        if (!goesOn) return;
    }
}

std::vector<ByteRange> WindowTiles::Collect(std::uint32_t row, std::optional<std::uint64_t> offset,
                                            std::uint64_t most) {
    std::vector<ByteRange> found;
    std::uint64_t bytes = 0;
    Walk(row, [&](const ByteRange& range, std::uint32_t tileRow) {
        const bool matches = !offset || (range.offset <= *offset && *offset < range.End());
        if (found.empty() && !matches) return true;
        if (found.empty()) reached = tileRow;
        bytes += range.size;
        if (!found.empty() && bytes > most) return false;
        found.push_back(range);
        return found.size() < kMostTiles;
    });
    return found;
}

std::vector<ByteRange> WindowTiles::First(std::uint64_t most) {
    return Collect(window.y / grid.tileSize, std::nullopt, most);
}

// Without a look at each tile.
bool WindowTiles::MayHave(std::uint64_t offset) const {
    if (places) return offset >= header.tileDataStart && offset < header.tileDataEnd;
    const std::uint64_t begin = header.LevelOffset(level);
    return offset >= begin && offset - begin < header.LevelBytes(level);
}

// Reading goes on downwards as a rule.
std::vector<ByteRange> WindowTiles::From(std::uint64_t offset, std::uint64_t most) {
    if (!MayHave(offset)) return {};
    const std::uint32_t first = window.y / grid.tileSize;
    std::vector<ByteRange> found = Collect(reached, offset, most);
    if (found.empty() && reached != first) found = Collect(first, offset, most);
    return found;
}

}  // namespace zmcgdal
