// BasicRasterReader: what readers of every pixel type have in common.
//
// The order of the operations is fixed: hosts call them through the virtual table. Levels are
// signed, 0 is full resolution, level n is reduced by 2 to the power n; bands count from 0. No
// operation throws or takes a lock: a reader is used by one thread at a time, and failure is false
// or the default value of the result.
#ifndef ZMC_RASTER_BASICRASTERREADER_H
#define ZMC_RASTER_BASICRASTERREADER_H

#include <cstdint>

#include "colour/Palette.h"
#include "raster/RasterProps.h"

namespace zelm {

class BasicRasterReader {
public:
    // True when the reader is bound to its pixels.
    virtual bool IsValid() const = 0;
    // Tells the kinds of readers apart: 1 for a memory raster, 7 for a pyramid.
    virtual std::uint32_t GetCapabilities() const = 0;
    virtual RasterProps GetRasterProps() const = 0;
    // Size at a level; a memory raster has its one size at every level.
    virtual std::uint32_t GetSamples(std::int32_t level) const = 0;
    virtual std::uint32_t GetLines(std::int32_t level) const = 0;
    virtual std::uint32_t GetBands() const = 0;
    // Scale of level 0, and factor between levels (0 where there are none).
    virtual std::uint32_t GetBaseReduction() const = 0;
    virtual std::uint32_t GetLevelReduction() const = 0;
    virtual std::int32_t GetMinLevel() const = 0;
    virtual std::int32_t GetMaxLevel() const = 0;
    // True when all levels of a pyramid are in the file.
    virtual bool HasPyramid() const = 0;
    // Lays out a pyramid with the levels from minLevel to maxLevel, both inclusive. `third` is used
    // by no reader; `pair` points to two values that have to be equal.
    virtual bool BuildPyramid(std::int32_t minLevel, std::int32_t maxLevel, std::int32_t third,
                              const std::int32_t* pair) = 0;
    virtual bool CanBuildPyramid() const = 0;
    virtual bool DeletePyramid() = 0;
    // Looks again whether the pyramid is complete; see HasPyramid for the answer.
    virtual bool RefreshPyramidState() = 0;
    // Statistics that can be stored, a union of StatsFlag values.
    virtual std::uint32_t GetStatsMask() const = 0;
    virtual bool HasBandStats(std::uint32_t band) const = 0;
    virtual bool CanStoreBandStats() const = 0;
    virtual bool CanStoreHistograms() const = 0;
    virtual bool HasNoDataValue(std::uint32_t band) const = 0;
    virtual bool SupportsNoData() const = 0;
    // Takes the no-data values of `source` for this reader's bands; they live in this reader alone.
    virtual void SetNoDataValues(const RasterProps& source) = 0;
    virtual bool HasPalette(std::uint32_t band) const = 0;
    virtual PalettePtr GetPalette(std::uint32_t band) const = 0;
    virtual bool SetPalette(std::uint32_t band, const Palette& palette) = 0;
    // A place of the interface that no reader fills: always false.
    virtual bool ReservedReaderQuery() const = 0;
    virtual bool IsValidLevel(std::int32_t level) const = 0;
    virtual ~BasicRasterReader() = default;
};

}  // namespace zelm

#endif
