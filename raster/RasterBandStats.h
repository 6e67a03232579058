// RasterBandStats<T>: statistics of one band, as readers hand them out and pyramid files keep
// them. The module computes none of the values: a host that stores them says what they are, and the
// pixels that count are those which no rule marks as no-data (NoDataRule.h). Built files hold them
// of level 0. T is the pixel type of the raster, complex types included, whose extremes have no
// meaning.
#ifndef ZMC_RASTER_RASTERBANDSTATS_H
#define ZMC_RASTER_RASTERBANDSTATS_H

#include <cstdint>

#include "core/Array.h"

namespace zelm {

// Values of RasterBandStats::flags: which fields hold something.
namespace StatsFlag {
inline constexpr std::uint32_t Minimum = 1;
inline constexpr std::uint32_t Maximum = 2;
inline constexpr std::uint32_t Mean = 4;
inline constexpr std::uint32_t StandardDeviation = 8;
inline constexpr std::uint32_t Sum = 16;
inline constexpr std::uint32_t SumOfSquares = 32;
inline constexpr std::uint32_t RootMeanSquare = 64;
inline constexpr std::uint32_t All = 127;
}  // namespace StatsFlag

template <class T>
struct RasterBandStats {
    std::uint32_t band = 0;   // from 0
    std::uint64_t count = 0;  // carried along, and lost on storing
    std::uint32_t flags = 0;  // a value whose flag is clear is absent, whatever its field says
    T minimum{};              // of the samples that count
    T maximum{};
    double mean = 0;               // sum / number of samples
    double standardDeviation = 0;  // of the population: sqrt(sumOfSquares / number - mean^2)
    double sum = 0;
    double sumOfSquares = 0;
    double rootMeanSquare = 0;  // sqrt(sumOfSquares / number)
    Array<double> sumXY;        // carried along, and lost on storing
    Array<double> covariance;   // likewise
};

}  // namespace zelm

#endif
