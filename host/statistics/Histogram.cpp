#include "host/statistics/Histogram.h"

#include <algorithm>

namespace zmchost {

template <class T>
HistogramAccumulator<T>::HistogramAccumulator(const HistogramBins<T>& bins)
    : bins_(bins), counts_(bins.Count()) {}

template <class T>
void HistogramAccumulator<T>::AddRow(const T* row, const unsigned char* mask, std::uint32_t band,
                                     std::uint32_t bands, std::uint32_t width) {
    for (std::size_t i = 0, at = band; i < width; ++i, at += bands) {
        if (!mask || (mask[at] & 1) == 0) AddRepeated(row[at], 1);
    }
}

template <class T>
void HistogramAccumulator<T>::AddRepeated(T value, std::uint64_t times) {
    const std::uint32_t bin = bins_.Index(value);
    if (bin != HistogramBins<T>::kOutside) counts_[bin] += times;
}

template <class T>
void HistogramAccumulator<T>::Merge(const HistogramAccumulator& other) {
    const std::size_t n = std::min(counts_.size(), other.counts_.size());
    for (std::size_t i = 0; i < n; ++i) counts_[i] += other.counts_[i];
}

template <class T>
zelm::RasterBandHistogram<T> HistogramAccumulator<T>::Histogram(std::uint32_t band) const {
    zelm::RasterBandHistogram<T> record;
    record.band = band;
    record.binSize = bins_.Size();
    record.binCount = bins_.Count();
    record.minimum = bins_.Minimum();
    record.maximum = bins_.Maximum();
    record.source = zelm::HistogramSource::ORVA;
    if (record.counts.SetShape(zelm::ArrayShape(bins_.Count())))
        std::copy(counts_.begin(), counts_.end(), record.counts.data);
    return record;
}

#define ZMC_X(type, name, code) template class HistogramAccumulator<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
