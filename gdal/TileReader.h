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
#include <span>
#include <vector>

#include "format/Rectangle.h"
#include "gdal/LazyRaster.h"
#include "host/file/PresentTiles.h"
#include "host/file/PyramidFileInfo.h"

namespace zmcgdal {

// GDAL counts with a sign, and has looked at its numbers when it asks.
inline zelm::Rectangle RectangleOf(int x, int y, int width, int height) {
    const auto positive = [](int number) { return static_cast<std::uint32_t>(number); };
    return {positive(x), positive(y), positive(width), positive(height)};
}

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
    // Both outlive this object. `type` is what the samples are shown as. Tiles that the file does
    // not have cannot be read, or are zeros. Without `keepsTiles`, of tiles whose bands are all
    // asked for nothing is read that is not asked for, and nothing remembered.
    TileReader(LazyRaster& pyramid, const zmchost::PyramidFileInfo& info, GDALDataType type,
               bool missingAsZeros, bool keepsTiles = true);

    GDALDataType Type() const { return sampleType; }
    // The samples of all bands of a pixel lie together in the file.
    bool IsPixelInterleaved() const;

    // Reads the bands (from 0) of a window inside a level; false, reported to GDAL, if the module
    // refused it, the disk failed, or the file is incomplete and lacks some of it.
    bool Read(std::uint32_t level, const zelm::Rectangle& window, const int* bands, int bandCount,
              const Target& target);

    // The same row of tiles by row of tiles, with a word to the caller after each, if he wants one,
    // who may end it: that is reported as his doing, and the answer is false.
    bool Read(std::uint32_t level, const zelm::Rectangle& window, const int* bands, int bandCount,
              const Target& target, const GDALRasterIOExtraArg* extra);

    // Must be called when the file has changed.
    void Forget() { held = heldApart = TileKey(); }

    // Whether a tile that was read is kept for whoever reads its next part. Of one that is not,
    // what is asked for alone is read.
    bool IsHeld(const zelm::Rectangle& tile) const;
    // The tile of the grid of `level`, clipped to the level.
    zelm::Rectangle TileAt(std::uint32_t level, int tileX, int tileY) const;

private:
    LazyRaster& raster;
    const zmchost::PyramidFileInfo& layout;
    GDALDataType sampleType;
    std::size_t rawSampleSize;
    std::size_t sampleSize;
    std::uint32_t tileSize;
    int fileBands;
    std::vector<int> allBands;
    bool readsMissing;  // as zeros
    bool keeps;
    zmchost::PresentTiles present;
    std::vector<unsigned char> scratch;  // one tile as GDAL sees its samples
    std::vector<unsigned char> planes;   // the same, band after band
    std::vector<unsigned char> raw;      // one tile as the file holds it, where that differs

    struct TileKey {
        std::uint32_t level = UINT32_MAX;
        std::uint32_t x = 0;
        std::uint32_t y = 0;
        int band = 0;  // 0 where all bands lie together
        friend bool operator==(const TileKey&, const TileKey&) = default;
    };
    // Bands that GDAL has vector code for, to put them apart.
    static constexpr int kMostPlanes = 4;
    // Bytes of a tile that is kept for whoever reads its next part; larger ones are read in pieces.
    static constexpr std::uint64_t kMostHeld = std::uint64_t{16} << 20;
    static constexpr std::uint64_t kPieceBytes = std::uint64_t{4} << 20;

    TileKey held;        // tile in `scratch`
    TileKey heldApart;   // tile in `planes`, and the
    int planeAway = -1;  // band whose plane went straight to a caller

    // The one place where the module fills a buffer: it has to hold what the module's reader
    // writes, whatever the header has said of the samples.
    bool ReadRaw(std::uint32_t level, const zelm::Rectangle& tile, const int* bands, int bandCount,
                 std::span<unsigned char> buffer);
    bool IsThere(std::uint32_t level, const zelm::Rectangle& tile, const int* bands,
                 int bandCount) const;
    bool FitsTarget(const zelm::Rectangle& window, const int* bands, int bandCount,
                    const Target& target) const;
    bool LoadSamples(std::uint32_t level, const zelm::Rectangle& area, const int* bands,
                     int bandCount);
    bool CopyPieces(std::uint32_t level, const zelm::Rectangle& part, const zelm::Rectangle& window,
                    const int* bands, int bandCount, const Target& target);
    const unsigned char* LoadTile(std::uint32_t level, const zelm::Rectangle& tile, int band);
    const unsigned char* LoadPlane(std::uint32_t level, const zelm::Rectangle& tile, int band);
    bool SplitTile(std::uint32_t level, const zelm::Rectangle& tile, int band, void* out);
    bool IsWholeTile(const zelm::Rectangle& window) const;
    bool CopyPart(std::uint32_t level, const zelm::Rectangle& tile, const zelm::Rectangle& window,
                  const int* bands, int bandCount, const Target& target);
    bool IsPlainPlane(const zelm::Rectangle& window, int bandCount, const Target& target) const;
    bool SplitsIntoPlanes(int bandCount) const;
    void CopyTile(const zelm::Rectangle& tile, const unsigned char* samples, int samplesPerPixel,
                  const zelm::Rectangle& window, const int* bands, int bandCount,
                  const Target& target) const;
    bool CopyAllBandsApart(const zelm::Rectangle& tile, const unsigned char* samples,
                           const zelm::Rectangle& part, const zelm::Rectangle& window,
                           const int* bands, int bandCount, const Target& target) const;
};

}  // namespace zmcgdal

#endif
