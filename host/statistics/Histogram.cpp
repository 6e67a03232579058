#include "host/statistics/Histogram.h"

#include <algorithm>
#include <span>

#include "host/base/Checksum.h"

namespace zmchost {

template <class T>
HistogramAccumulator<T>::HistogramAccumulator(const HistogramBins<T>& division)
    : bins(division), counts(division.Count()) {}

template <class T>
void HistogramAccumulator<T>::AddRow(const T* row, const unsigned char* mask, std::uint32_t band,
                                     std::uint32_t bands, std::uint32_t width) {
    for (std::size_t i = 0, at = band; i < width; ++i, at += bands) {
        if (!mask || (mask[at] & 1) == 0) AddRepeated(row[at], 1);
    }
}

template <class T>
void HistogramAccumulator<T>::AddRepeated(T value, std::uint64_t times) {
    const std::uint32_t bin = bins.Index(value);
    if (bin != HistogramBins<T>::kOutside) counts[bin] += times;
}

template <class T>
void HistogramAccumulator<T>::Merge(const HistogramAccumulator& other) {
    const std::size_t n = std::min(counts.size(), other.counts.size());
    for (std::size_t i = 0; i < n; ++i) counts[i] += other.counts[i];
}

template <class T>
void HistogramAccumulator<T>::Save(NumberPacker& packer) const {
    packer.Put(DivisionSum());
    packer.Put(std::uint64_t{counts.size()});
    for (const std::uint64_t one : counts) packer.Put(one);
}

template <class T>
bool HistogramAccumulator<T>::Load(NumberUnpacker& numbers) {
    if (numbers.Take() != DivisionSum() || numbers.Take() != counts.size()) numbers.Refuse();
    std::vector<std::uint64_t> further(numbers.Good() ? counts.size() : 0);
    for (std::uint64_t& one : further) one = numbers.Take();
    if (!numbers.Good()) return false;
    for (std::size_t i = 0; i < further.size(); ++i) counts[i] += further[i];
    return true;
}

// By which bins of another range are told from these.
template <class T>
std::uint64_t HistogramAccumulator<T>::DivisionSum() const {
    const T ends[2] = {bins.Minimum(), bins.Maximum()};
    return PixelChecksum(counts.size(), std::as_bytes(std::span(ends)));
}

template <class T>
zelm::RasterBandHistogram<T> HistogramAccumulator<T>::Histogram(std::uint32_t band) const {
    zelm::RasterBandHistogram<T> record;
    record.band = band;
    record.binSize = bins.Size();
    record.binCount = bins.Count();
    record.minimum = bins.Minimum();
    record.maximum = bins.Maximum();
    record.source = zelm::HistogramSource::ORVA;
    if (record.counts.SetShape(zelm::ArrayShape(bins.Count())))
        std::copy(counts.begin(), counts.end(), record.counts.data);
    return record;
}

#define ZMC_X(type, name, code) template class HistogramAccumulator<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
