// RasterReader<T>: the reader through which pixels of element type T move.
//
// A tile is a bare buffer of `width` x `height` pixels with the bands of `bandList`, in that order,
// in the raster's interleave (slowest first):
//   None  height, width           BIL   height, bands, width
//   BIP   height, width, bands    BSQ   bands, height, width
// A pyramid moves its tiles pixel-interleaved whatever its interleave says, while its masks still
// go by the interleave.
//
// `mask` has the tile's shape with one byte per sample. Bit 0 marks a sample that holds no valid
// data; bits 1 to 7 are the caller's and never change, so the caller initialises the mask.
//
// A band list names bands from 0, each as often as wanted, in the order in which the tile holds
// them. All buffers are the caller's and are used during the call alone.
//
// What a disk fails to read or write does not show in these answers, which say whether the call was
// one that the reader takes. A host that has to know lends the file to the module and looks at the
// record of the source that it lent (files/RecordingSource.h), as zmchost::Raster does.
#ifndef ZMC_RASTER_RASTERREADER_H
#define ZMC_RASTER_RASTERREADER_H

#include <cstdint>

#include "core/Array.h"
#include "core/ElementTypes.h"
#include "raster/BasicRasterReader.h"
#include "raster/RasterBandHistogram.h"
#include "raster/RasterBandStats.h"

namespace zelm {

class RasterDataConnection;

template <class T>
class RasterReader : public BasicRasterReader {
public:
    // The connection that built the reader: borrowed, not counted, and dangling once that has gone.
    RasterDataConnection* connection = nullptr;

    // Borrowed as well; null for a reader without a connection.
    virtual RasterDataConnection* GetConnection() const = 0;
    // The record at position `band` of those that are stored, whatever band it names: whoever
    // stores all bands once, in one call and in their order, gets each by its number. A
    // record with no flag set where there is none.
    virtual RasterBandStats<T> GetBandStats(std::uint32_t band) const = 0;
    // Stores records of any bands, in order. True of every pyramid, whatever the disk did; false of
    // a memory raster, which keeps none.
    virtual bool SetBandStats(const Array<RasterBandStats<T>>& stats) = 0;
    // All stored histograms, in the order of their storing; empty where there are none.
    virtual Array<RasterBandHistogram<T>> GetHistograms() const = 0;
    // Stores histograms of any bands and levels, in order, with the answer of SetBandStats.
    virtual bool SetHistograms(const Array<RasterBandHistogram<T>>& histograms) = 0;
    // The band's no-data value as a pixel, truncated and cut to T; zero for a band without one.
    virtual T GetNoDataValue(std::uint32_t band) const = 0;

    // Fills `buffer` with the tile whose first pixel is (x, y), measured at `level`, and then sets
    // or clears bit 0 of each byte of `mask`, which may be null. The tile lies within the raster:
    // nothing is clipped or padded.
    virtual bool ReadTile(std::int32_t x, std::int32_t y, std::uint32_t width, std::uint32_t height,
                          const Array<int>& bandList, std::int32_t level, T* buffer,
                          unsigned char* mask) = 0;

    // Stores the tile. Samples of `buffer` whose mask bit 0 is set are first overwritten with the
    // band's no-data value, and stay so after the call. False for a null buffer or mask.
    virtual bool WriteTile(std::int32_t x, std::int32_t y, std::uint32_t width,
                           std::uint32_t height, const Array<int>& bandList, std::int32_t level,
                           T* buffer, unsigned char* mask) = 0;
};

// Shares one reader among its copies.
template <class T>
class RasterReaderPtr : public Pointer<RasterReader<T>> {
public:
    using Pointer<RasterReader<T>>::Pointer;
};

}  // namespace zelm

#endif
