#include "host/file/PresentTiles.h"

#include "core/PixelVocabulary.h"
#include "format/PyramidLayout.h"
#include "format/TileWalk.h"

namespace zmchost {

PresentTiles::PresentTiles(const PyramidHeader& described) : header(described) {
    if (header.IsPlanar())
        places.emplace(zelm::TileTable{header.Geometry(0), header.levelMin, header.levelMax,
                                       header.bandCount, zelm::PixelSize(header.pixelType)},
                       header.tileDataStart);
}

std::uint64_t PresentTiles::EndOf(std::uint32_t level, std::uint32_t tileX, std::uint32_t tileY,
                                  std::uint32_t band) const {
    const zelm::LevelGeometry grid = header.Geometry(level);
    const std::uint64_t pixels = grid.Tile(tileX, tileY).Pixels();
    const std::uint64_t sample = zelm::PixelSize(header.pixelType);
    if (places) return places->At(band, level, tileX, tileY) + pixels * sample;
    const std::uint64_t pixel = sample * header.bandCount;
    return header.LevelOffset(level) + grid.TileOffset(tileX, tileY, pixel) + pixels * pixel;
}

bool PresentTiles::Have(std::uint32_t level, const zelm::Rectangle& window,
                        std::span<const std::uint32_t> bands, std::uint64_t fileSize) const {
    if (level != header.levelMin &&
        !zelm::PyramidLayout::MayHaveLevels(header.versionMajor, header.versionMinor))
        return false;
    bool have = true;
    zelm::VisitTiles(header.Geometry(level), window, [&](const zelm::TilePart& part) {
        const std::uint32_t tileX = part.tile.x / header.tileSize;
        const std::uint32_t tileY = part.tile.y / header.tileSize;
        for (const std::uint32_t band : bands) {
            have = EndOf(level, tileX, tileY, band) <= fileSize;
            if (!have || !places) break;
        }
        return have;
    });
    return have;
}

bool PresentTiles::HaveLevel(std::uint32_t level, std::uint64_t fileSize) const {
    if (fileSize >= header.tileDataEnd) return true;
    const std::uint64_t bytes =
        zelm::LevelGeometry::LevelPixels(header.width, header.height, level) *
        zelm::PixelSize(header.pixelType) * header.bandCount;
    return !places && header.LevelOffset(level) + bytes <= fileSize;
}

}  // namespace zmchost
