#include "host/build/TileStore.h"

#include <cstring>

#include "format/TileWalk.h"
#include "host/base/Checksum.h"
#include "host/base/Error.h"
#include "host/build/BuildPlan.h"

namespace zmchost {
namespace {

constexpr std::size_t kTilePixels = std::size_t{kTileSide} * kTileSide;

void CopyLines(std::byte* to, std::size_t toStride, const std::byte* from, std::size_t fromStride,
               std::size_t bytes, std::uint32_t lines) {
    for (std::uint32_t line = 0; line < lines; ++line, to += toStride, from += fromStride)
        std::memcpy(to, from, bytes);
}

}  // namespace

TileStore::TileStore(TileStoreSetup storeSetup, PixelWork& pixelWork, MemoryMeter& meter)
    : setup(std::move(storeSetup)),
      work(pixelWork),
      buffer(meter, kTilePixels * setup.pixelBytes),
      cleanMask(kTilePixels * setup.bands) {
    meter.Add(cleanMask.size());
}

std::uint64_t TileStore::WorkMemory(const TileStoreSetup& setup) {
    return kTilePixels * (std::uint64_t{setup.pixelBytes} + setup.bands);
}

zelm::LevelGeometry TileStore::Geometry(std::uint32_t level) const {
    return {setup.width, setup.height, kTileSide, level};
}

std::uint32_t TileStore::TilesAcross(std::uint32_t level) const {
    return Geometry(level).tilesAcross;
}

std::uint32_t TileStore::TilesDown(std::uint32_t level) const { return Geometry(level).tilesDown; }

Window TileStore::Tile(std::uint32_t level, std::uint32_t column, std::uint32_t row) const {
    return Geometry(level).Tile(column, row);
}

void TileStore::Write(const Strip& strip, std::uint32_t stripBegin, std::uint32_t begin,
                      std::uint32_t end) {
    const std::lock_guard<std::mutex> lock(mutex);
    const std::uint32_t row = strip.firstLine / kTileSide;
    for (std::uint32_t column = begin / kTileSide; column < TilesAlong(end); ++column)
        WriteTile(strip, stripBegin, column, row);
}

void TileStore::WriteTile(const Strip& strip, std::uint32_t stripBegin, std::uint32_t column,
                          std::uint32_t row) {
    const Window tile = Tile(strip.level, column, row);
    const std::size_t lineBytes = std::size_t{tile.width} * setup.pixelBytes;
    const std::byte* from =
        strip.Row(strip.firstLine) + std::size_t{tile.x - stripBegin} * setup.pixelBytes;
    CopyLines(buffer.Data(), lineBytes, from, strip.RowBytes(), lineBytes, tile.height);
    if (summedLevel == strip.level) sum += SumOfTile(tile);
    Check("write a tile", work.WriteTile(strip.level, tile, buffer.Data(), cleanMask.data()));
}

// Of the tile in the buffer.
std::uint64_t TileStore::SumOfTile(const Window& tile) const {
    const std::uint64_t place = std::uint64_t{tile.y} << 32 | tile.x;
    const std::size_t bytes = std::size_t{tile.width} * tile.height * setup.pixelBytes;
    return PixelChecksum(place, {buffer.Data(), bytes});
}

std::uint64_t TileStore::SumOf(std::uint32_t level, const Window& tiles) {
    const std::lock_guard<std::mutex> lock(mutex);
    std::uint64_t total = 0;
    zelm::VisitTiles(Geometry(level), tiles, [&](const zelm::TilePart& tile) {
        Check("read a tile back", work.ReadTile(level, tile.tile, buffer.Data()));
        total += SumOfTile(tile.tile);
    });
    return total;
}

void TileStore::Check(const char* operation, bool done) {
    if (const std::string failure = work.Failure(); !failure.empty())
        throw Error(setup.name, operation, failure);
    if (!done) throw Error(setup.name, operation, "the module refuses");
}

void TileStore::ReadTile(std::uint32_t level, const Window& tile, std::byte* pixels) {
    const std::lock_guard<std::mutex> lock(mutex);
    Check("read a tile back", work.ReadTile(level, tile, pixels));
}

void TileStore::Read(std::uint32_t level, const Window& window, std::byte* pixels) {
    const std::lock_guard<std::mutex> lock(mutex);
    const std::size_t windowStride = std::size_t{window.width} * setup.pixelBytes;
    zelm::VisitTiles(Geometry(level), window, [&](const zelm::TilePart& tile) {
        Check("read a tile back", work.ReadTile(level, tile.tile, buffer.Data()));
        const std::size_t tileStride = std::size_t{tile.tile.width} * setup.pixelBytes;
        CopyLines(pixels + (tile.part.y - window.y) * windowStride +
                      std::size_t{tile.part.x - window.x} * setup.pixelBytes,
                  windowStride,
                  buffer.Data() + tile.FirstLine() * tileStride +
                      std::size_t{tile.FirstColumn()} * setup.pixelBytes,
                  tileStride, std::size_t{tile.part.width} * setup.pixelBytes, tile.part.height);
    });
}

}  // namespace zmchost
