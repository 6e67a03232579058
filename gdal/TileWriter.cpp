#include "gdal/TileWriter.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "format/TileWalk.h"
#include "gdal/Band.h"
#include "gdal/Create.h"
#include "gdal/Reporting.h"

namespace zmcgdal {

using zelm::Rectangle;

namespace {

// The whole tiles of [start, start + extent) along one side, as first and end.
std::pair<std::uint32_t, std::uint32_t> WholeAlong(std::uint32_t start, std::uint32_t extent,
                                                   std::uint32_t limit, std::uint32_t side) {
    const std::uint64_t first = (std::uint64_t{start} + side - 1) / side * side;
    const std::uint32_t end = start + extent;
    const std::uint64_t last = end == limit ? end : end / side * side;
    if (first >= last) return {start, start};
    return {static_cast<std::uint32_t>(first), static_cast<std::uint32_t>(last)};
}

// A line of a picture whose bands lie apart: one walk over the line for all bands takes half the
// time of one for each.
template <std::size_t... bands>
void Interleave(const unsigned char* from, GSpacing bandSpace, unsigned char* to,
                std::uint32_t width, std::index_sequence<bands...>) {
    const unsigned char* const planes[] = {(from + static_cast<GSpacing>(bands) * bandSpace)...};
    for (std::uint32_t x = 0; x < width; ++x, to += sizeof...(bands))
        ((to[bands] = planes[bands][x]), ...);
}

// False for what it is not made for.
bool InterleaveBytes(const unsigned char* from, GSpacing bandSpace, int bands, unsigned char* to,
                     std::uint32_t width) {
    if (bands == 3)
        Interleave(from, bandSpace, to, width, std::make_index_sequence<3>());
    else if (bands == 4)
        Interleave(from, bandSpace, to, width, std::make_index_sequence<4>());
    return bands == 3 || bands == 4;
}

}  // namespace

Rectangle WholeTiles(const zelm::LevelGeometry& level, const Rectangle& window) {
    const auto [left, right] = WholeAlong(window.x, window.width, level.samples, level.tileSize);
    const auto [top, bottom] = WholeAlong(window.y, window.height, level.lines, level.tileSize);
    return {left, top, right - left, bottom - top};
}

std::array<Rectangle, 4> Around(const Rectangle& window, const Rectangle& part) {
    const std::uint32_t right = part.x + part.width, bottom = part.y + part.height;
    return {{{window.x, window.y, window.width, part.y - window.y},
             {window.x, bottom, window.width, window.y + window.height - bottom},
             {window.x, part.y, part.x - window.x, part.height},
             {right, part.y, window.x + window.width - right, part.height}}};
}

TileWriter::TileWriter(Dataset& underCreation)
    : dataset(underCreation),
      bands(underCreation.GetRasterCount()),
      type(underCreation.File().tiles.Type()),
      sampleSize(GDALGetDataTypeSizeBytes(type)) {}

bool TileWriter::Write(const Rectangle& tiles, const Target& from) {
    const zelm::LevelGeometry grid = dataset.File().info.header.Geometry(dataset.Level());
    bool written = true;
    zelm::VisitTiles(grid, tiles, [&](const zelm::TilePart& part) {
        const auto* const samples = static_cast<const unsigned char*>(from.data) +
                                    (part.tile.y - tiles.y) * from.lineSpace +
                                    (part.tile.x - tiles.x) * from.pixelSpace;
        written = WriteTile(part.tile, samples, from) && written;
    });
    return written;
}

bool TileWriter::WriteTile(const Rectangle& tile, const void* samples, const Target& from) {
    OpenFile& file = dataset.File();
    Creation& creation = *dataset.UnderCreation();
    const auto side = file.info.header.tileSize;
    const auto blockX = static_cast<int>(tile.x / side), blockY = static_cast<int>(tile.y / side);
    const std::size_t block =
        static_cast<std::size_t>(blockY) * file.info.header.Geometry(dataset.Level()).tilesAcross +
        static_cast<std::size_t>(blockX);
    const bool done = Reported(
        [&] {
            Gather(tile, static_cast<const unsigned char*>(samples), from);
            DropBlocks(blockX, blockY);
            file.tiles.Forget();
            zmchost::Raster& raster = file.raster.Get();
            raster.Write(dataset.Level(), tile, raster.AllBands(), scratch.data());
            creation.NoteBytes(scratch.size());
        },
        CPLE_FileIO);
    for (std::size_t band = 0; band < static_cast<std::size_t>(bands); ++band)
        done ? creation.MarkWritten(block, band) : creation.MarkLost(block, band);
    return done;
}

void TileWriter::Gather(const Rectangle& tile, const unsigned char* samples, const Target& from) {
    const auto lineBytes =
        static_cast<std::size_t>(tile.width * sampleSize * static_cast<GSpacing>(bands));
    scratch.resize(tile.height * lineBytes);
    unsigned char* line = scratch.data();
    for (std::uint32_t y = 0; y < tile.height; ++y, samples += from.lineSpace, line += lineBytes)
        GatherLine(tile.width, samples, from, line);
}

// Lines of all bands as they lie are copied at once, others sample by sample.
void TileWriter::GatherLine(std::uint32_t width, const unsigned char* samples, const Target& from,
                            unsigned char* line) const {
    const GSpacing pixel = sampleSize * bands;
    const bool alike = from.type == type && from.pixelSpace == pixel &&
                       (bands == 1 || from.bandSpace == sampleSize);
    if (alike) {
        std::memcpy(line, samples, width * static_cast<std::size_t>(pixel));
        return;
    }
    const bool areBytes = type == GDT_Byte && from.type == GDT_Byte && from.pixelSpace == 1;
    if (areBytes && InterleaveBytes(samples, from.bandSpace, bands, line, width)) return;
    for (int band = 0; band < bands; ++band)
        GDALCopyWords64(samples + band * from.bandSpace, from.type,
                        static_cast<int>(from.pixelSpace), line + band * sampleSize, type,
                        static_cast<int>(pixel), width);
}

void TileWriter::DropBlocks(int blockX, int blockY) {
    for (int number = 1; number <= bands; ++number)
        dataset.GetRasterBand(number)->FlushBlock(blockX, blockY, FALSE);
}

}  // namespace zmcgdal
