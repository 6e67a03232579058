// HistogramBins<T>: division of [minimum, maximum] into bins of equal width.
//
// An integer v fills the interval from v to v + 1, so the bins of an integer type divide
// [minimum, maximum + 1), and 256 bins over 0 to 255 are one per value. In floating types the
// maximum itself belongs to the last bin. A constant band has a width of 1, not 0, and all its
// samples are in bin 0. Complex values have no order: they are outside of any bins.
#ifndef ZMC_HOST_STATISTICS_HISTOGRAMBINS_H
#define ZMC_HOST_STATISTICS_HISTOGRAMBINS_H

#include <cstdint>

#include "core/ElementTypes.h"

namespace zmchost {

inline constexpr std::uint32_t kDefaultHistogramBins = 256;

template <class T>
class HistogramBins {
public:
    static constexpr std::uint32_t kOutside = 0xFFFFFFFF;

    // binCount is at least 1; 0 is taken as 1. The ends are finite.
    HistogramBins(T lowest, T highest, std::uint32_t binCount = kDefaultHistogramBins);

    // The usual division for a band of this extent: one bin per value for 8-bit types, else
    // binCount bins between its minimum and its maximum.
    static HistogramBins ForBand(T lowest, T highest,
                                 std::uint32_t binCount = kDefaultHistogramBins);

    T Minimum() const { return minimum; }
    T Maximum() const { return maximum; }
    std::uint32_t Count() const { return count; }
    double Size() const { return size; }

    // The bin of a value; kOutside for one out of the range, and for a NaN.
    std::uint32_t Index(T value) const;

private:
    T minimum;
    T maximum;
    std::uint32_t count;
    double size = 1;    // width of a bin
    double factor = 1;  // floating types: a power of two that keeps maximum - minimum in range,
    double scale = 0;   // and bins per unit of what it multiplied
};

}  // namespace zmchost

#endif
