// ValueCounter<T>: how often every value of one band occurs, for types of 8 and 16 bits.
//
// One pass gives statistics and histogram, and costs less than sums and bins would. The tables have
// 8 bytes per value of the type: 4 KiB for bytes, which have two, or 512 KiB for each object. Used
// by one thread at a time; the counters of several threads are merged, in any order.
#ifndef ZMC_HOST_STATISTICS_VALUECOUNTER_H
#define ZMC_HOST_STATISTICS_VALUECOUNTER_H

#include <cstddef>
#include <cstdint>
#include <type_traits>
#include <vector>

#include "core/ElementTypes.h"
#include "host/statistics/BandStatistics.h"
#include "host/statistics/Histogram.h"

namespace zmchost {

// Types that have a ValueCounter.
template <class T>
inline constexpr bool kCountsEveryValue = !zelm::kIsComplex<T> && sizeof(T) <= 2;

template <class T>
class ValueCounter {
    static_assert(kCountsEveryValue<T>);
    using Index = std::make_unsigned_t<T>;

public:
    static constexpr std::size_t kValues = std::size_t{1} << (8 * sizeof(T));
    // Neighbours of one value wait for each other's count: those of bytes, which have small tables,
    // go to two in turn.
    static constexpr std::size_t kTables = sizeof(T) == 1 ? 2 : 1;
    static constexpr std::size_t kBytes = kTables * kValues * sizeof(std::uint64_t);

    ValueCounter() : counts(kTables * kValues) {}

    // As HistogramAccumulator::AddRow.
    void AddRow(const T* row, const unsigned char* mask, std::uint32_t band, std::uint32_t bands,
                std::uint32_t width) {
        std::uint64_t* const table = counts.data();
        std::uint64_t* const other = table + (kTables - 1) * kValues;
        const T* sample = row + band;
        if (!mask) {
            for (std::uint32_t i = 1; i < width; i += 2, sample += 2 * std::size_t{bands}) {
                ++table[static_cast<Index>(sample[0])];
                ++other[static_cast<Index>(sample[bands])];
            }
            if (width % 2 != 0) ++table[static_cast<Index>(*sample)];
            return;
        }
        const unsigned char* marked = mask + band;
        for (std::uint32_t i = 0; i < width; ++i, sample += bands, marked += bands)
            table[static_cast<Index>(*sample)] += (*marked & 1) ^ 1;
    }

    void Merge(const ValueCounter& other) {
        for (std::size_t i = 0; i < counts.size(); ++i) counts[i] += other.counts[i];
    }

    // The counts of the values that occur as numbers. Load adds them.
    void Save(NumberPacker& packer) const {
        std::uint64_t occurring = 0;
        for (std::size_t i = 0; i < kValues; ++i) occurring += CountAt(i) != 0 ? 1u : 0u;
        packer.Put(occurring);
        for (std::size_t i = 0, before = 0; i < kValues; ++i) {
            if (CountAt(i) == 0) continue;
            packer.Put(std::uint64_t{i - before});
            packer.Put(CountAt(i));
            before = i;
        }
    }
    void Load(NumberUnpacker& numbers) {
        std::uint64_t place = 0;
        for (std::uint64_t left = numbers.Take(); left > 0 && numbers.Good(); --left) {
            place += numbers.Take();
            if (place >= kValues) return numbers.Refuse();
            counts[place] += numbers.Take();
        }
    }

    std::uint64_t Count(T value) const { return CountAt(static_cast<Index>(value)); }

    // Statistics and histogram of all that was seen, as the accumulators would have found them.
    // Without a valid sample the histogram is that of a constant band of 0, with no counts.
    BandAccumulator<T> Statistics() const {
        BandAccumulator<T> statistics;
        AddTo(statistics);
        return statistics;
    }
    HistogramAccumulator<T> Histogram(std::uint32_t binCount = kDefaultHistogramBins) const {
        const zelm::RasterBandStats<T> stats = Statistics().Stats(0);
        HistogramAccumulator<T> histogram(
            HistogramBins<T>::ForBand(stats.minimum, stats.maximum, binCount));
        AddTo(histogram);
        return histogram;
    }

    // Lets an accumulator of T take all that was seen.
    template <class Accumulator>
    void AddTo(Accumulator& accumulator) const {
        for (std::size_t i = 0; i < kValues; ++i)
            accumulator.AddRepeated(static_cast<T>(static_cast<Index>(i)), CountAt(i));
    }

private:
    std::uint64_t CountAt(std::size_t place) const {
        return kTables == 1 ? counts[place] : counts[place] + counts[place + kValues];
    }

    std::vector<std::uint64_t> counts;  // by the value's bits, table after table
};

}  // namespace zmchost

#endif
