// WindowTiles: where the tiles lie that a window touches, told by the header alone.
//
// The order is that in which a window is read: tile rows from the top, tiles from the left, and of
// a tile that holds one band the bands one after the other.
//
// It remembers how far the reading has come, so that the next question is answered from there. One
// thread at a time.
#ifndef ZMC_GDAL_WINDOWTILES_H
#define ZMC_GDAL_WINDOWTILES_H

#include <cstdint>
#include <optional>
#include <vector>

#include "format/Rectangle.h"
#include "format/TileTable.h"
#include "gdal/RangeStore.h"
#include "host/file/PyramidHeader.h"

namespace zmcgdal {

class WindowTiles {
public:
    // A window of a level that the file has, and bands of it, from 0.
    WindowTiles(const zmchost::PyramidHeader& fileHeader, std::uint32_t fileLevel,
                const zelm::Rectangle& shown, std::vector<std::uint32_t> bandNumbers);

    // A file may have tiles of one byte: the most of them that are told at once.
    static constexpr std::size_t kMostTiles = 65536;

    // The tiles from the first one on, as many as have `most` bytes together, kMostTiles at most;
    // the first one, whatever it has.
    std::vector<ByteRange> First(std::uint64_t most);
    // The same from the tile on that has the byte at `offset`; none where no tile has it.
    std::vector<ByteRange> From(std::uint64_t offset, std::uint64_t most);

private:
    // Calls visit(ByteRange, row) for each tile from the row `row` of tiles on, as long as it
    // answers true.
    template <class Visit>
    void Walk(std::uint32_t row, Visit&& visit) const;
    std::vector<ByteRange> Collect(std::uint32_t row, std::optional<std::uint64_t> offset,
                                   std::uint64_t most);
    std::uint32_t EndRow() const;
    bool MayHave(std::uint64_t offset) const;
    std::uint64_t PlaceOf(std::uint32_t band, std::uint32_t column, std::uint32_t row) const;

    zmchost::PyramidHeader header;
    std::uint32_t level;
    zelm::LevelGeometry grid;
    zelm::Rectangle window;
    std::vector<std::uint32_t> bands;  // one in place of all where they lie together
    std::uint64_t pixelBytes;          // of one pixel in a tile
    std::optional<zelm::TilePlaces> places;
    std::uint32_t reached = 0;  // the row of tiles of the last answer
};

}  // namespace zmcgdal

#endif
