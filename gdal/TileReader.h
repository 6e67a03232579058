// TileReader: pixels of one open pyramid for GDAL's buffers.
//
// Windows are gathered tile by tile through one scratch tile that stays in the processor's cache;
// it also remembers the last tile, so that the bands of a block, asked for one after the other,
// cost one read. A window that is one whole tile in the caller's own layout bypasses the scratch.
// One thread at a time, like the reader beneath.
#ifndef ZMC_GDAL_TILEREADER_H
#define ZMC_GDAL_TILEREADER_H

#include <gdal_priv.h>

#include <cstdint>
#include <vector>

#include "gdal/LazyRaster.h"
#include "host/file/PyramidFileInfo.h"

namespace zmcgdal {

// A rectangle of one level, in pixels; it lies within the level.
struct Window {
    std::uint32_t level = 0;
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;
};

// A caller's buffer in GDAL's terms: steps in bytes between pixels, lines and bands.
struct Target {
    void* data = nullptr;
    GDALDataType type = GDT_Unknown;
    GSpacing pixelSpace = 0;
    GSpacing lineSpace = 0;
    GSpacing bandSpace = 0;
};

class TileReader {
public:
    // Both outlive this object. `type` is what the samples are shown as.
    TileReader(LazyRaster& pyramid, const zmchost::PyramidFileInfo& info, GDALDataType type);

    GDALDataType Type() const { return sampleType; }
    // The samples of all bands of a pixel lie together in the file.
    bool IsPixelInterleaved() const;

    // Reads the bands (from 0) of a window; false, reported to GDAL, if the module refused it or
    // the disk failed. What an incomplete file does not hold reads as zeros.
    bool Read(const Window& window, const int* bands, int bandCount, const Target& target);

    // Must be called when the file has changed.
    void Forget() { held = heldApart = TileKey(); }

    // The tile of the grid of `level`, clipped to the level.
    Window TileAt(std::uint32_t level, int tileX, int tileY) const;

private:
    LazyRaster& raster;
    const zmchost::PyramidFileInfo& layout;
    GDALDataType sampleType;
    std::size_t rawSampleSize;
    std::size_t sampleSize;
    int tileSize;
    int fileBands;
    std::vector<int> allBands;
    std::vector<unsigned char> scratch;  // one tile as GDAL sees its samples
    std::vector<unsigned char> planes;   // the same, band after band
    std::vector<unsigned char> raw;      // one tile as the file holds it, where that differs

    struct TileKey {
        std::uint32_t level = UINT32_MAX;
        int x = 0;
        int y = 0;
        int band = 0;  // 0 where all bands lie together
        friend bool operator==(const TileKey&, const TileKey&) = default;
    };
    TileKey held;        // tile in `scratch`
    TileKey heldApart;   // tile in `planes`, and the
    int planeAway = -1;  // band whose plane went straight to a caller

    bool ReadRaw(const Window& tile, const int* bands, int bandCount, void* buffer);
    bool FitsTarget(const Window& window, const int* bands, int bandCount,
                    const Target& target) const;
    const unsigned char* LoadTile(const Window& tile, int band);
    const unsigned char* LoadPlane(const Window& tile, int band);
    bool SplitTile(const Window& tile, int band, void* out);
    bool IsPlainPlane(const Window& window, int bandCount, const Target& target) const;
    bool SplitsIntoPlanes(int bandCount) const;
    void CopyTile(const Window& tile, const unsigned char* samples, int samplesPerPixel,
                  const Window& window, const int* bands, int bandCount,
                  const Target& target) const;
    bool CopyAllBandsApart(const Window& tile, const unsigned char* samples, const Window& part,
                           const Window& window, const int* bands, int bandCount,
                           const Target& target) const;
};

}  // namespace zmcgdal

#endif
