// MaskBand: which pixels of a band are valid: 255 where they are, 0 where they are not.
//
// The rule is the one by which the module marks its tiles: equal to the no-data value, or not
// finite. It is applied here, to the pixels, and not taken from the module's mask buffers, because
// those go by a band's place in the request and by the interleave word of the file, which for tiles
// of several bands is not the layout that they are delivered in, and because they know no-data
// values as doubles only, which cannot tell neighbours among large 64-bit integers.
//
// Any number of threads where the band's dataset is shared.
#ifndef ZMC_GDAL_MASKBAND_H
#define ZMC_GDAL_MASKBAND_H

#include <gdal_priv.h>

#include <vector>

#include "gdal/Band.h"

namespace zmcgdal {

class MaskBand final : public SharedBlocks<GDALRasterBand> {
public:
    explicit MaskBand(Band& maskedBand);

    bool IsMaskBand() const override { return true; }
    GDALMaskValueRange GetMaskValueRange() const override { return GMVR_0_AND_255_ONLY; }
    GDALRasterBand* GetMaskBand() override { return this; }
    int GetMaskFlags() override { return GMF_ALL_VALID; }
    int GetOverviewCount() override { return band.GetOverviewCount(); }
    GDALRasterBand* GetOverview(int index) override;

protected:
    CPLErr IReadBlock(int blockX, int blockY, void* data) override;
    CPLErr IRasterIO(GDALRWFlag mode, int x, int y, int width, int height, void* data,
                     int bufferWidth, int bufferHeight, GDALDataType bufferType,
                     GSpacing pixelSpace, GSpacing lineSpace, GDALRasterIOExtraArg* extra) override;

private:
    Band& band;
    const int number;  // of the band, from 1

    // Reads a window of the band and judges it; `stride` bytes lie between the lines of `out`.
    CPLErr ReadMask(int x, int y, int width, int height, unsigned char* out, std::size_t stride);
};

// LevelMask: the mask of a level where a file beside the pyramid has one of the whole dataset: of
// the pixels that a pixel of the level stands for, that of the first.
class LevelMask final : public GDALRasterBand {
public:
    // The main band, which has the level's as an overview, outlives this object.
    LevelMask(Band& levelBand, GDALRasterBand& mainBand, std::uint32_t reduction);

    bool IsMaskBand() const override { return true; }
    GDALMaskValueRange GetMaskValueRange() const override { return GMVR_0_AND_255_ONLY; }
    GDALRasterBand* GetMaskBand() override { return this; }
    int GetMaskFlags() override { return GMF_ALL_VALID; }

protected:
    CPLErr IReadBlock(int blockX, int blockY, void* data) override;

private:
    GDALRasterBand& main;
    int step;  // pixels of the main band
};

}  // namespace zmcgdal

#endif
