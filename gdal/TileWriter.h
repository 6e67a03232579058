// TileWriter: whole tiles of a raster under creation, from a caller's buffer straight into the
// file.
//
// Who writes a new raster mostly writes windows that cover whole tiles, with all bands. These need
// not wait in GDAL's block cache: their samples are brought into the order of the file in a scratch
// tile that stays in the processor's cache, so each is copied twice on its way to the system
// instead of three times, and the disk gets work from the beginning on. One thread at a time, as
// GDAL writes.
#ifndef ZMC_GDAL_TILEWRITER_H
#define ZMC_GDAL_TILEWRITER_H

#include <array>
#include <vector>

#include "gdal/Dataset.h"

namespace zmcgdal {

// The largest part of a window of the level that is made of whole tiles; its width or height is 0
// if there is none.
zelm::Rectangle WholeTiles(const zelm::LevelGeometry& level, const zelm::Rectangle& window);

// What is left of the window around that part: above, below, left and right of it, some with a
// width or height of 0.
std::array<zelm::Rectangle, 4> Around(const zelm::Rectangle& window, const zelm::Rectangle& part);

class TileWriter {
public:
    // The dataset is under creation and outlives this object.
    explicit TileWriter(Dataset& underCreation);

    // Writes `tiles`, a window of whole tiles, of all bands. `from` is where the samples of the
    // window's first pixel lie. What waits of these tiles in GDAL's cache is dropped. False,
    // reported to GDAL, where a tile was not written; all others were.
    bool Write(const zelm::Rectangle& tiles, const Target& from);

private:
    bool WriteTile(const zelm::Rectangle& tile, const void* samples, const Target& from);
    void Gather(const zelm::Rectangle& tile, const unsigned char* samples, const Target& from);
    void GatherLine(std::uint32_t width, const unsigned char* samples, const Target& from,
                    unsigned char* line) const;
    void DropBlocks(int blockX, int blockY);

    Dataset& dataset;
    int bands;
    GDALDataType type;
    GSpacing sampleSize;
    std::vector<unsigned char> scratch;
};

}  // namespace zmcgdal

#endif
