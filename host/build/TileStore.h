// TileStore: the tiles of the file that is being built.
//
// Writes rows of tiles from strips and reads windows of finished levels back. The module says true
// for a write that the disk refused; what the disk said is asked for behind every tile. Reads and
// writes may come from several threads; one at a time goes on, as the module wants it.
#ifndef ZMC_HOST_BUILD_TILESTORE_H
#define ZMC_HOST_BUILD_TILESTORE_H

#include <cstdint>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "format/LevelGeometry.h"
#include "host/build/PixelWork.h"
#include "host/build/Strip.h"

namespace zmchost {

struct TileStoreSetup {
    std::string name;         // of the target, for messages
    std::uint32_t width = 0;  // of level 0
    std::uint32_t height = 0;
    std::uint32_t maxLevel = 0;
    std::uint32_t pixelBytes = 0;
    std::uint32_t bands = 0;
};

class TileStore {
public:
    TileStore(TileStoreSetup storeSetup, PixelWork& pixelWork, MemoryMeter& meter);

    // Bytes that an object holds.
    static std::uint64_t WorkMemory(const TileStoreSetup& setup);

    // Writes the tiles of columns [begin, end) of the strip's level, which the strip holds from
    // column `stripBegin` on. Its lines are whole rows of tiles, and so are the columns. Throws
    // Error for a tile that the disk did not take.
    void Write(const Strip& strip, std::uint32_t stripBegin, std::uint32_t begin,
               std::uint32_t end);

    // From now on the tiles of a level that are written are summed up; Sum is the same whatever
    // their order. Of two tiles with the same pixels in other places it tells too.
    void SumLevel(std::uint32_t level) { summedLevel = level; }
    std::uint64_t Sum() const { return sum; }
    // The same of tiles as they stand in the file. Throws Error.
    std::uint64_t SumOf(std::uint32_t level, const Window& tiles);

    // Reads a window of a level whose tiles were all written. Throws Error, as the next does.
    void Read(std::uint32_t level, const Window& window, std::byte* pixels);

    // Reads one whole tile; the buffer has room for a full one.
    void ReadTile(std::uint32_t level, const Window& tile, std::byte* pixels);

    Window Tile(std::uint32_t level, std::uint32_t column, std::uint32_t row) const;
    std::uint32_t TilesAcross(std::uint32_t level) const;
    std::uint32_t TilesDown(std::uint32_t level) const;

private:
    zelm::LevelGeometry Geometry(std::uint32_t level) const;
    void WriteTile(const Strip& strip, std::uint32_t stripBegin, std::uint32_t column,
                   std::uint32_t row);
    std::uint64_t SumOfTile(const Window& tile) const;
    void Check(const char* operation, bool done);

    TileStoreSetup setup;
    PixelWork& work;
    std::mutex mutex;
    std::optional<std::uint32_t> summedLevel;
    std::uint64_t sum = 0;
    MeteredBytes buffer;
    std::vector<unsigned char> cleanMask;
};

}  // namespace zmchost

#endif
