// BasicRasterReader: what readers of every pixel type have in common.
//
// The order of the operations is fixed: hosts call them through the virtual table. Levels are
// signed, 0 is full resolution, level n is reduced by 2 to the power n; bands count from 0. No
// operation throws or takes a lock: a reader is used by one thread at a time, and failure is false
// or the default value of the result.
//
// The two kinds differ in what they can do: a memory raster has one level, the whole, keeps neither
// statistics nor palettes, and moves its samples in the interleave of its buffer; a pyramid has the
// levels of its file and keeps records of all kinds in it.
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
    // A copy of what the raster is; one that is not valid where it cannot be had.
    virtual RasterProps GetRasterProps() const = 0;
    // Size at a level; a memory raster has its one size at every level.
    virtual std::uint32_t GetSamples(std::int32_t level) const = 0;
    virtual std::uint32_t GetLines(std::int32_t level) const = 0;
    virtual std::uint32_t GetBands() const = 0;  // the same at every level
    // Scale of level 0, and factor between levels (0 where there are none).
    virtual std::uint32_t GetBaseReduction() const = 0;
    virtual std::uint32_t GetLevelReduction() const = 0;
    // The first and the last level that the file announces, both inclusive.
    virtual std::int32_t GetMinLevel() const = 0;
    virtual std::int32_t GetMaxLevel() const = 0;
    // True when all levels of a pyramid are in the file.
    virtual bool HasPyramid() const = 0;
    // Lays out a pyramid with the levels from minLevel to maxLevel, both inclusive. `third` is used
    // by no reader; `pair` points to two values that have to be equal.
    virtual bool BuildPyramid(std::int32_t minLevel, std::int32_t maxLevel, std::int32_t third,
                              const std::int32_t* pair) = 0;
    // Whether BuildPyramid does anything: it does for a pyramid.
    virtual bool CanBuildPyramid() const = 0;
    // Removes the file of a pyramid, true whether that worked or not; false of a memory raster.
    virtual bool DeletePyramid() = 0;
    // Looks again whether the pyramid is complete; see HasPyramid for the answer.
    virtual bool RefreshPyramidState() = 0;
    // Statistics that can be stored, a union of StatsFlag values.
    virtual std::uint32_t GetStatsMask() const = 0;
    // Whether a record of this band is stored.
    virtual bool HasBandStats(std::uint32_t band) const = 0;
    // Whether SetBandStats and SetHistograms store anything: they do for a pyramid.
    virtual bool CanStoreBandStats() const = 0;
    virtual bool CanStoreHistograms() const = 0;
    // Whether the band has a no-data value; the value itself is RasterReader<T>::GetNoDataValue.
    virtual bool HasNoDataValue(std::uint32_t band) const = 0;
    // Whether SetNoDataValues has an effect.
    virtual bool SupportsNoData() const = 0;
    // Takes the no-data values of `source` for this reader's bands; they live in this reader alone.
    virtual void SetNoDataValues(const RasterProps& source) = 0;
    // The palette of a band: whether there is one with colours; the one that was stored last, which
    // the reader holds too until it is asked for another (for a band without one a pyramid gives a
    // palette of no colours, a memory raster an empty pointer); and the store of another, which is
    // true of every pyramid, whatever the disk did.
    virtual bool HasPalette(std::uint32_t band) const = 0;
    virtual PalettePtr GetPalette(std::uint32_t band) const = 0;
    virtual bool SetPalette(std::uint32_t band, const Palette& palette) = 0;
    // A place of the interface that no reader fills: always false.
    virtual bool ReservedReaderQuery() const = 0;
    // Whether the reader takes tiles of this level, as far as it knows: a memory raster those of
    // level 0 and below, a valid pyramid any. GetMinLevel and GetMaxLevel tell what a file has.
    virtual bool IsValidLevel(std::int32_t level) const = 0;
    virtual ~BasicRasterReader() = default;
};

}  // namespace zelm

#endif
