// HistogramAccumulator<T>: exact counts of one band over bins whose range is known.
//
// The bins depend on minimum and maximum. For types of 8 and 16 bits a ValueCounter finds both and
// the histogram in one pass. Wider types need two passes over the same samples, the first with a
// BandAccumulator; a builder reads the second back from level 0 of the file that it has written.
// Counts are exact either way. An accumulator is used by one thread at a time; those of several
// threads are merged, in any order.
#ifndef ZMC_HOST_STATISTICS_HISTOGRAM_H
#define ZMC_HOST_STATISTICS_HISTOGRAM_H

#include <cstdint>
#include <vector>

#include "core/ElementTypes.h"
#include "host/base/PackedNumbers.h"
#include "host/statistics/HistogramBins.h"
#include "raster/RasterBandHistogram.h"

namespace zmchost {

template <class T>
class HistogramAccumulator {
public:
    explicit HistogramAccumulator(const HistogramBins<T>& division);

    // Takes band `band` of a pixel-interleaved row of `width` pixels with `bands` samples. mask: of
    // the same shape, bit 0 set = not valid; null when every sample is valid. Samples outside the
    // bins are not counted.
    void AddRow(const T* row, const unsigned char* mask, std::uint32_t band, std::uint32_t bands,
                std::uint32_t width);
    void AddRepeated(T value, std::uint64_t times);

    // Takes the counts of `other`, which has the same bins.
    void Merge(const HistogramAccumulator& other);

    // Its bins and counts as numbers. Load adds those of the same bins; false, and nothing is
    // added, where the numbers are of other bins or are none.
    void Save(NumberPacker& packer) const;
    bool Load(NumberUnpacker& numbers);

    const std::vector<std::uint64_t>& Counts() const { return counts; }

    // The record, for level 0 and of source ORVA, the one that a file keeps. If the memory for the
    // counts is not there, the record's array carries the error.
    zelm::RasterBandHistogram<T> Histogram(std::uint32_t band) const;

private:
    std::uint64_t DivisionSum() const;

    HistogramBins<T> bins;
    std::vector<std::uint64_t> counts;
};

}  // namespace zmchost

#endif
