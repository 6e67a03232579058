// Histograms of one band: exact counts over a range that is known, and a table of all values for
// the types that are small enough to need no range.
//
// One pass over a raster suffices for types of 8 and 16 bits: a ValueCounter sees every value, and
// gives statistics and histogram at the end. Wider types need two passes, since the bins depend on
// minimum and maximum: a BandAccumulator first, then a HistogramAccumulator over the same samples,
// which a builder reads back from level 0 of the file that it has written. Counts are exact either
// way. Each object is used by one thread at a time; those of several threads are merged.
#ifndef ZMC_HOST_HISTOGRAM_H
#define ZMC_HOST_HISTOGRAM_H

#include <cstddef>
#include <cstdint>
#include <vector>

#include "core/ElementTypes.h"
#include "host/BandStatistics.h"
#include "raster/RasterBandHistogram.h"

namespace zmchost {

inline constexpr std::uint32_t kDefaultHistogramBins = 256;

// Types of which a ValueCounter keeps a count per value.
template <class T>
inline constexpr bool kCountsEveryValue = !zelm::kIsComplex<T> && sizeof(T) <= 2;

// Division of [minimum, maximum] into bins of equal width.
//
// An integer v fills the interval from v to v + 1, so the bins of an integer type divide
// [minimum, maximum + 1), and 256 bins over 0 to 255 are one per value. In floating types the
// maximum itself belongs to the last bin. A constant band has a width of 1, not 0, and all its
// samples are in bin 0.
template <class T>
class HistogramBins {
public:
    static constexpr std::uint32_t kOutside = 0xFFFFFFFF;

    // binCount is at least 1; 0 is taken as 1.
    HistogramBins(T minimum, T maximum, std::uint32_t binCount = kDefaultHistogramBins);

    // The usual division for a band of this extent: one bin per value for 8-bit types, else
    // binCount bins between its minimum and its maximum.
    static HistogramBins ForBand(T minimum, T maximum,
                                 std::uint32_t binCount = kDefaultHistogramBins);

    T Minimum() const { return minimum_; }
    T Maximum() const { return maximum_; }
    std::uint32_t Count() const { return count_; }
    double Size() const { return size_; }

    // The bin of a value; kOutside for one out of the range, and for a NaN.
    std::uint32_t Index(T value) const;

private:
    T minimum_;
    T maximum_;
    std::uint32_t count_;
    double size_;       // width of a bin
    double scale_ = 0;  // bins per unit, and
    double half_ = 1;   // the factor that keeps maximum - minimum finite; floating types only
};

// Counts of one band over given bins.
template <class T>
class HistogramAccumulator {
public:
    explicit HistogramAccumulator(const HistogramBins<T>& bins);

    // As BandAccumulator::AddRow. Samples outside the bins are not counted.
    void AddRow(const T* row, const unsigned char* mask, std::uint32_t band, std::uint32_t bands,
                std::uint32_t width);
    void AddRepeated(T value, std::uint64_t times);

    // Takes the counts of `other`, which has the same bins.
    void Merge(const HistogramAccumulator& other);

    const std::vector<std::uint64_t>& Counts() const { return counts_; }

    // The record, for level 0 and of source ORVA, the one that a file keeps. If the memory for the
    // counts is not there, the record's array carries the error.
    zelm::RasterBandHistogram<T> Histogram(std::uint32_t band) const;

private:
    HistogramBins<T> bins_;
    std::vector<std::uint64_t> counts_;
};

// Counts of every value of one band, for types of 8 and 16 bits: 8 bytes per value of the type,
// 2 KiB or 512 KiB.
template <class T>
class ValueCounter {
    static_assert(kCountsEveryValue<T>);

public:
    static constexpr std::size_t kValues = std::size_t{1} << (8 * sizeof(T));

    ValueCounter() : counts_(kValues) {}

    void AddRow(const T* row, const unsigned char* mask, std::uint32_t band, std::uint32_t bands,
                std::uint32_t width);
    void Merge(const ValueCounter& other);

    std::uint64_t Count(T value) const;

    // Statistics and histogram of all that was seen, as the accumulators would have found them.
    // Without a valid sample the histogram is that of a constant band of 0, with no counts.
    BandAccumulator<T> Statistics() const;
    HistogramAccumulator<T> Histogram(std::uint32_t binCount = kDefaultHistogramBins) const;

private:
    std::vector<std::uint64_t> counts_;  // by the value's bits
};

}  // namespace zmchost

#endif
