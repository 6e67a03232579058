// RasterBandHistogram<T>: histogram of one band at one level, as readers hand it out and pyramid
// files keep it. The module computes none of the values. T is the pixel type of the raster.
//
// Bin i counts the samples from minimum + i * binSize up to, and without, the start of the next;
// the last one counts `maximum` too. How wide a bin of a built file is, docs/format.md tells.
#ifndef ZMC_RASTER_RASTERBANDHISTOGRAM_H
#define ZMC_RASTER_RASTERBANDHISTOGRAM_H

#include <cstdint>

#include "core/Array.h"

namespace zelm {

// Values of RasterBandHistogram::source, where the counts come from; 0 is anything else.
namespace HistogramSource {
inline constexpr std::uint32_t Native = 1;
inline constexpr std::uint32_t Dynamic = 2;
inline constexpr std::uint32_t ORVA = 3;
}  // namespace HistogramSource

template <class T>
struct RasterBandHistogram {
    std::uint32_t band = 0;       // from 0
    double binSize = 0;           // width of one bin in pixel units
    std::uint32_t binCount = 0;   // bins that the range is cut into
    Array<std::uint64_t> counts;  // one per bin
    T minimum{};                  // lower end of the range
    T maximum{};                  // upper end of the range
    std::uint32_t source = 0;     // every stored histogram comes back as ORVA
    std::uint32_t type = 0;       // carried along, and lost on storing
    std::uint32_t level = 0;      // level that the histogram describes
};

}  // namespace zelm

#endif
