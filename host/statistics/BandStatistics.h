// BandAccumulator<T>: statistics of one band, gathered row by row in one pass.
//
// All sums are exact, of floating types too: mantissas are summed per exponent as integers, and
// rounded once, at the end. A large offset therefore costs no digit of the standard deviation, and
// the result is the same, bit for bit, however the rows were divided among accumulators and in
// whatever order these were merged. An accumulator is used by one thread at a time.
#ifndef ZMC_HOST_STATISTICS_BANDSTATISTICS_H
#define ZMC_HOST_STATISTICS_BANDSTATISTICS_H

#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "core/ElementTypes.h"
#include "dispatch/NoDataRule.h"
#include "host/statistics/ExactSums.h"
#include "raster/RasterBandStats.h"

namespace zmchost {

template <class T>
class BandAccumulator {
public:
    // Takes band `band` of a pixel-interleaved row of `width` pixels with `bands` samples. mask: of
    // the same shape, bit 0 set = not valid; null when every sample is valid. A sample that is not
    // finite never counts.
    void AddRow(const T* row, const unsigned char* mask, std::uint32_t band, std::uint32_t bands,
                std::uint32_t width);

    // Takes one value `times` times, as from a table of counts.
    void AddRepeated(const T& value, std::uint64_t times);

    // Takes all that `other` has seen.
    void Merge(const BandAccumulator& other);

    // All of it as numbers that are exact, and back; what is loaded replaces what was there.
    // Complex types have nothing to keep but their count.
    void Save(NumberPacker& packer) const;
    void Load(NumberUnpacker& numbers);

    std::uint64_t Count() const { return count; }

    // The record: count, and the seven values with their flags. The standard deviation is that of
    // the population. Without a valid sample, and for complex types, whose values have no order
    // and no single sum, no flag is set; nor for a value that a double cannot hold.
    zelm::RasterBandStats<T> Stats(std::uint32_t band) const;

    // What one takes at the most, about: sums of reals have a place for every exponent.
    static constexpr std::size_t kBytes = std::is_floating_point_v<T> ? 25000 * sizeof(T) : 100;

private:
    std::uint64_t count = 0;
    T minimum{};
    T maximum{};
    ExactSums<T> sums;
};

}  // namespace zmchost

#endif
