// GdalRasterSource: a GDAL dataset as the source of a pyramid.
//
// Pixels are asked for in the pyramid's own type, so nothing passes through another one. A read
// that GDAL fails is thrown as zmchost::Error with GDAL's text, whatever thread it happened on. The
// first band whose color interpretation is alpha weighs the others; masks are those that GDAL tells
// of beside alpha and no-data values: of the dataset, of a band, or where all bands are no data.
#ifndef ZMC_GDAL_GDALRASTERSOURCE_H
#define ZMC_GDAL_GDALRASTERSOURCE_H

#include <gdal_priv.h>

#include <optional>
#include <string>
#include <vector>

#include "host/raster/RasterSource.h"

namespace zmcgdal {

class GdalRasterSource final : public zmchost::RasterSource {
public:
    // The dataset outlives this object. `signedByte`: samples of type Byte are signed. Throws
    // zmchost::Error if the dataset's bands cannot stand in one pyramid.
    explicit GdalRasterSource(GDALDataset& source, bool signedByte = false);

    std::string Name() const override;
    zelm::RasterProps Props() const override;
    zelm::PalettePtr BandPalette(std::uint32_t band) const override;
    void Read(const zmchost::Window& window, std::span<const std::uint32_t> bands,
              void* pixels) override;

    std::optional<std::uint32_t> AlphaBand(std::uint32_t band) const override;
    bool HasMask(std::uint32_t band) const override;
    void ReadMask(const zmchost::Window& window, std::span<const std::uint32_t> bands,
                  unsigned char* shown) override;

    // What of the source a pyramid cannot keep, in a few words each; empty as a rule.
    std::vector<std::string> Losses() const;

private:
    GDALDataset& dataset;
    std::uint32_t pixelType = 0;
    GDALDataType bufferType = GDT_Unknown;
    std::optional<std::uint32_t> alphaBand;

    GDALRasterBand& BandOf(std::uint32_t band) const;
    void FindAlpha();
    void ReadShown(GDALRasterBand& from, bool isMask, const zmchost::Window& window,
                   std::vector<unsigned char>& shown);
    void ChooseType(bool signedByte);
};

// True if the band's samples are declared as signed bytes by its IMAGE_STRUCTURE.
bool IsSignedByte(GDALRasterBand& band);

}  // namespace zmcgdal

#endif
