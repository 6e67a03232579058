#include "host/TileStore.h"

#include <algorithm>
#include <cstring>

#include "host/BuildPlan.h"
#include "host/Error.h"

namespace zmchost {
namespace {

constexpr std::size_t kTilePixels = std::size_t{kTileSide} * kTileSide;

// Never smaller for what was lost, and equal only if that was zeros: 32-bit words cannot overflow
// the sum of a tile.
std::uint64_t SumOfWords(const std::byte* bytes, std::size_t size) {
    std::uint64_t sum = 0;
    std::size_t i = 0;
    for (; i + 4 <= size; i += 4) {
        std::uint32_t word;
        std::memcpy(&word, bytes + i, 4);
        sum += word;
    }
    for (; i < size; ++i) sum += std::to_integer<std::uint64_t>(bytes[i]);
    return sum;
}

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
      cleanMask(kTilePixels * setup.bands),
      sums(setup.maxLevel + 1) {
    meter.Add(cleanMask.size());
    for (std::uint32_t level = 0; level <= setup.maxLevel; ++level)
        sums[level].resize(std::size_t{TilesAcross(level)} * TilesDown(level));
}

std::uint64_t TileStore::WorkMemory(const TileStoreSetup& setup) {
    return kTilePixels * (std::uint64_t{setup.pixelBytes} + setup.bands);
}

std::uint32_t TileStore::TilesAcross(std::uint32_t level) const {
    return TilesAlong(setup.width >> level);
}

std::uint32_t TileStore::TilesDown(std::uint32_t level) const {
    return TilesAlong(setup.height >> level);
}

Window TileStore::Tile(std::uint32_t level, std::uint32_t column, std::uint32_t row) const {
    const std::uint32_t x = column * kTileSide;
    const std::uint32_t y = row * kTileSide;
    return {x, y, std::min(kTileSide, (setup.width >> level) - x),
            std::min(kTileSide, (setup.height >> level) - y)};
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
    Sum(strip.level, column, row) = SumOfWords(buffer.Data(), TileBytes(tile));
    if (!work.WriteTile(strip.level, tile, buffer.Data(), cleanMask.data()))
        throw Error(setup.name, "write a tile", "the module refuses");
}

void TileStore::ReadTile(std::uint32_t level, const Window& tile, std::byte* pixels) {
    const std::lock_guard<std::mutex> lock(mutex);
    if (!work.ReadTile(level, tile, pixels))
        throw Error(setup.name, "read a tile back", "the module refuses");
}

void TileStore::Read(std::uint32_t level, const Window& window, std::byte* pixels) {
    const std::lock_guard<std::mutex> lock(mutex);
    const std::size_t windowStride = std::size_t{window.width} * setup.pixelBytes;
    const std::uint32_t right = window.x + window.width;
    for (std::uint32_t column = window.x / kTileSide; column < TilesAlong(right); ++column) {
        const Window tile = Tile(level, column, window.y / kTileSide);
        if (!work.ReadTile(level, tile, buffer.Data()))
            throw Error(setup.name, "read a tile back", "the module refuses");
        const std::uint32_t begin = std::max(tile.x, window.x);
        const std::uint32_t end = std::min(tile.x + tile.width, right);
        CopyLines(pixels + std::size_t{begin - window.x} * setup.pixelBytes, windowStride,
                  buffer.Data() + std::size_t{begin - tile.x} * setup.pixelBytes,
                  std::size_t{tile.width} * setup.pixelBytes,
                  std::size_t{end - begin} * setup.pixelBytes, window.height);
    }
}

void TileStore::CompareAll() {
    for (std::uint32_t level = 0; level <= setup.maxLevel; ++level)
        for (std::uint32_t row = 0; row < TilesDown(level); ++row)
            for (std::uint32_t column = 0; column < TilesAcross(level); ++column) {
                const Window tile = Tile(level, column, row);
                std::memset(buffer.Data(), 0, TileBytes(tile));
                ReadTile(level, tile, buffer.Data());
                if (SumOfWords(buffer.Data(), TileBytes(tile)) != Sum(level, column, row))
                    throw Error(setup.name, "write all tiles",
                                "the disk did not take one of level " + std::to_string(level));
            }
}

}  // namespace zmchost
