// PyramidRasterReader<T>: the reader over a pyramid file.
//
// A thin rim: it forwards to the dataset, of which it holds a counted reference, and adds its own
// copy of the properties, the sizes of the levels, and the no-data values with their masks. These
// values live in this reader alone; the file has no place for them.
//
// Tiles are pixel-interleaved whatever the interleave says, while masks go by the interleave. What
// the dataset refuses, a rectangle, level or band that it does not hold or has no memory for, is
// false with buffer and mask as they were; all else is true, whatever the file did. The setters of
// records are true even where nothing could be stored. A reader is for one thread at a time, and
// shares that thread with all readers of its dataset.
#ifndef ZMC_PYRAMID_PYRAMIDRASTERREADER_H
#define ZMC_PYRAMID_PYRAMIDRASTERREADER_H

#include "pyramid/PyramidDataset.h"
#include "raster/RasterProps.h"
#include "raster/RasterReader.h"

namespace zelm {

class PyramidDataConnection;

template <class T>
class PyramidRasterReader final : public RasterReader<T> {
public:
    PyramidDatasetPtr dataset;  // keeps the dataset alive after the connection has closed
    RasterProps props;          // filled at construction; SetNoDataValues alone changes it

    // A null connection, or one without a dataset, gives a reader that is not valid. May throw what
    // the georeference does, or std::bad_alloc.
    PyramidRasterReader(PyramidDataConnection* connection, GeoRefPtr geoRef, MetadataPtr metadata);

    bool IsValid() const override { return static_cast<bool>(dataset); }
    std::uint32_t GetCapabilities() const override { return 7; }
    // A record of nothing known, not even an interleave, if memory ran out.
    RasterProps GetRasterProps() const override;
    // The size at a level, rounded down; that of level 0 while the pyramid is not complete.
    std::uint32_t GetSamples(std::int32_t level) const override;
    std::uint32_t GetLines(std::int32_t level) const override;
    std::uint32_t GetBands() const override { return props.bands; }
    std::uint32_t GetBaseReduction() const override { return 1; }
    std::uint32_t GetLevelReduction() const override { return HasPyramid() ? 2 : 0; }
    std::int32_t GetMinLevel() const override;
    std::int32_t GetMaxLevel() const override;
    bool HasPyramid() const override { return dataset && dataset->HasPyramid; }
    // Makes the file, or empties it, and lays out the levels; the client fills them. True even if
    // the file could not be made, or was not touched because the levels are beyond the limits (no
    // level above 1023; see PyramidLimits.h); false for a null `pair`, or one of two values.
    bool BuildPyramid(std::int32_t minLevel, std::int32_t maxLevel, std::int32_t third,
                      const std::int32_t* pair) override;
    bool CanBuildPyramid() const override { return true; }
    // True whether the file could be removed or not.
    bool DeletePyramid() override;
    bool RefreshPyramidState() override;
    std::uint32_t GetStatsMask() const override { return StatsFlag::All; }
    bool HasBandStats(std::uint32_t band) const override;
    bool CanStoreBandStats() const override { return true; }
    bool CanStoreHistograms() const override { return true; }
    bool HasNoDataValue(std::uint32_t band) const override { return props.HasNoDataValue(band); }
    bool SupportsNoData() const override { return true; }
    // Leaves all values as they are if memory ran out.
    void SetNoDataValues(const RasterProps& source) override;
    bool HasPalette(std::uint32_t band) const override;
    // Not null unless memory ran out: a palette of no colours for a band without one.
    PalettePtr GetPalette(std::uint32_t band) const override;
    bool SetPalette(std::uint32_t band, const Palette& palette) override;
    bool ReservedReaderQuery() const override { return false; }
    bool IsValidLevel(std::int32_t) const override { return static_cast<bool>(dataset); }

    RasterDataConnection* GetConnection() const override { return this->connection; }
    // The record at POSITION `band` of those stored: see PyramidDataset::GetBandStats.
    RasterBandStats<T> GetBandStats(std::uint32_t band) const override;
    bool SetBandStats(const Array<RasterBandStats<T>>& stats) override;
    Array<RasterBandHistogram<T>> GetHistograms() const override;
    bool SetHistograms(const Array<RasterBandHistogram<T>>& histograms) override;
    T GetNoDataValue(std::uint32_t band) const override;

    // A null buffer is refused; with a null mask no mask is computed.
    bool ReadTile(std::int32_t x, std::int32_t y, std::uint32_t width, std::uint32_t height,
                  const Array<int>& bandList, std::int32_t level, T* buffer,
                  unsigned char* mask) override;
    bool WriteTile(std::int32_t x, std::int32_t y, std::uint32_t width, std::uint32_t height,
                   const Array<int>& bandList, std::int32_t level, T* buffer,
                   unsigned char* mask) override;
};

}  // namespace zelm

#endif
