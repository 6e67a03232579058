// DatasetFacts: what GDAL tells of a raster that its archived records do not: no-data values,
// meanings of bands, colour tables, and a mask of the dataset.
#ifndef ZMC_RENDER_DATASETFACTS_H
#define ZMC_RENDER_DATASETFACTS_H

#include <gdal_priv.h>

#include "render/PixelSource.h"
#include "render/RasterFacts.h"

namespace zmcrender {

// Adds what there is to the facts of the same raster; palettes only to bands without one.
void AddDatasetFacts(GDALDataset& dataset, RasterFacts& facts);

// The mask of a whole dataset, level by level: those that a file beside the raster, or the raster
// itself, has; none that only follows from alpha or no-data values. The dataset is borrowed and
// outlives it. Used by one thread at a time.
class DatasetMask {
public:
    explicit DatasetMask(GDALDataset& masked) : dataset(masked) {}
    // Whether there is one that all levels from the finest, `minLevel`, to `maxLevel` have.
    bool Exists(std::uint32_t minLevel, std::uint32_t maxLevel) const;
    // As PixelSource::ReadMask. Throws zmchost::Error with GDAL's words.
    void Read(std::uint32_t levelAboveFinest, const zmchost::Window& window,
              unsigned char* shown) const;

private:
    GDALDataset& dataset;

    GDALRasterBand* MaskOf(std::uint32_t levelAboveFinest) const;
};

}  // namespace zmcrender

#endif
