#include "host/build/PartExtents.h"

#include <algorithm>
#include <optional>

#include "core/PixelVocabulary.h"
#include "format/TileTable.h"
#include "format/TileWalk.h"

namespace zmchost {
namespace {

// Puts one behind the last; those of a row of tiles are one.
void Append(std::vector<Extent>& extents, const Extent& extent) {
    if (!extents.empty() && extents.back().end == extent.begin)
        extents.back().end = extent.end;
    else
        extents.push_back(extent);
}

class Tiles {
public:
    explicit Tiles(const PyramidHeader& described)
        : header(described), sample(zelm::PixelSize(header.pixelType)) {
        if (header.IsPlanar())
            places.emplace(zelm::TileTable{header.Geometry(0), header.levelMin, header.levelMax,
                                           header.bandCount, zelm::PixelSize(header.pixelType)},
                           header.tileDataStart);
    }

    void Add(std::uint32_t level, const zelm::Rectangle& area, std::vector<Extent>& extents) const {
        const zelm::LevelGeometry grid = header.Geometry(level);
        zelm::VisitTiles(grid, area,
                         [&](const zelm::TilePart& part) { AddTile(level, grid, part, extents); });
    }

private:
    const PyramidHeader& header;
    const std::uint64_t sample;
    std::optional<zelm::TilePlaces> places;

    void AddTile(std::uint32_t level, const zelm::LevelGeometry& grid, const zelm::TilePart& part,
                 std::vector<Extent>& extents) const {
        if (!places) {
            const std::uint64_t pixel = sample * header.bandCount;
            const std::uint64_t begin =
                header.LevelOffset(level) + grid.TileOffset(part.column, part.row, pixel);
            return Append(extents, {begin, begin + part.tile.Pixels() * pixel});
        }
        const std::uint64_t first = places->At(0, level, part.column, part.row);
        for (std::uint32_t band = 0; band < header.bandCount; ++band) {
            const std::uint64_t begin = first + band * places->BandBytes();
            Append(extents, {begin, begin + part.tile.Pixels() * sample});
        }
    }
};

// What an area of level 0 is at a level.
zelm::Rectangle AtLevel(const zelm::Rectangle& area, std::uint32_t level) {
    return {area.x >> level, area.y >> level,
            static_cast<std::uint32_t>((area.Right() >> level) - (area.x >> level)),
            static_cast<std::uint32_t>((area.Bottom() >> level) - (area.y >> level))};
}

}  // namespace

std::vector<Extent> Merged(std::vector<Extent> extents) {
    std::ranges::sort(extents, {}, &Extent::begin);
    std::vector<Extent> merged;
    for (const Extent& extent : extents) {
        if (extent.begin == extent.end) continue;
        if (!merged.empty() && extent.begin <= merged.back().end)
            merged.back().end = std::max(merged.back().end, extent.end);
        else
            merged.push_back(extent);
    }
    return merged;
}

std::vector<Extent> PartExtents(const PyramidHeader& header, const PartGrid& grid,
                                std::uint64_t part, std::uint32_t finest) {
    const Tiles tiles(header);
    std::vector<Extent> extents;
    for (std::uint32_t level = finest; level <= grid.level; ++level)
        tiles.Add(level, AtLevel(grid.Area(part), level), extents);
    return Merged(std::move(extents));
}

}  // namespace zmchost
