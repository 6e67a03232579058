#include "host/statistics/BandStatistics.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>

namespace zmchost {
namespace {

// significand * 2 to the exponent; what a long double cannot hold becomes 0 or infinite.
long double Scaled(long double significand, std::int64_t exponent) {
    const std::int64_t bounded = std::clamp<std::int64_t>(exponent, -40000, 40000);
    return std::ldexp(significand, static_cast<int>(bounded));
}

long double ToLongDouble(const BigInteger& value, std::int64_t unitExponent) {
    std::int64_t exponent = 0;
    const long double significand = value.Split(exponent);
    return Scaled(significand, exponent + unitExponent);
}

void SetIfHeld(double& field, std::uint32_t& flags, std::uint32_t flag, long double value) {
    const auto rounded = static_cast<double>(value);
    if (!std::isfinite(rounded)) return;
    field = rounded;
    flags |= flag;
}

// A sample as a number that keeps all of it, and back.
template <class T>
std::uint64_t BitsOf(T value) {
    std::uint64_t bits = 0;
    std::memcpy(&bits, &value, sizeof value);
    return bits;
}

template <class T>
T FromBits(std::uint64_t bits) {
    T value{};
    std::memcpy(&value, &bits, sizeof value);
    return value;
}

// The sums of up to 65536 samples of at most 32 bits fit in 64, and so do the squares of 16 bits.
constexpr std::uint32_t kChunk = 65536;

template <class T>
struct ChunkSums {
    using Squares = std::conditional_t<sizeof(T) <= 2, std::uint64_t, UInt128>;

    std::uint64_t count = 0;
    std::int64_t sum = 0;
    Squares squares = 0;
    T minimum = std::numeric_limits<T>::max();
    T maximum = std::numeric_limits<T>::lowest();

    void Add(T value) {
        const auto wide = static_cast<std::int64_t>(value);
        ++count;
        sum += wide;
        const auto bits = static_cast<std::uint64_t>(wide);
        squares += bits * bits;  // right modulo 2 to the 64, of negative values too
        minimum = std::min(minimum, value);
        maximum = std::max(maximum, value);
    }
    void Add(const T* row, const unsigned char* mask, std::size_t stride, std::uint32_t width) {
        if (!mask) {
            for (std::size_t i = 0; i < width; ++i) Add(row[i * stride]);
        } else {
            for (std::size_t i = 0; i < width; ++i) {
                if ((mask[i * stride] & 1) == 0) Add(row[i * stride]);
            }
        }
    }
};

}  // namespace

template <class T>
void BandAccumulator<T>::AddRow(const T* row, const unsigned char* mask, std::uint32_t band,
                                std::uint32_t bands, std::uint32_t width) {
    row += band;
    if (mask) mask += band;
    if constexpr (zelm::kIsComplex<T>) {
        for (std::size_t i = 0; i < width; ++i) {
            const std::size_t at = i * bands;
            const bool marked = mask && (mask[at] & 1) != 0;
            if (!marked && !zelm::NoDataRule<T>::NotFinite(row[at])) ++count;
        }
    } else if constexpr (std::is_floating_point_v<T>) {
        sums.Reserve();
        T lowest = count != 0 ? minimum : std::numeric_limits<T>::max();
        T highest = count != 0 ? maximum : std::numeric_limits<T>::lowest();
        for (std::size_t i = 0; i < width; ++i) {
            const std::size_t at = i * bands;
            using Bits = std::conditional_t<sizeof(T) == 4, std::uint32_t, std::uint64_t>;
            const auto bits = std::bit_cast<Bits>(row[at]);
            if ((mask && (mask[at] & 1) != 0) || !ExactSums<T>::Finite(bits)) continue;
            sums.AddOne(bits);
            ++count;
            lowest = std::min(lowest, row[at]);
            highest = std::max(highest, row[at]);
        }
        minimum = lowest;
        maximum = highest;
    } else if constexpr (sizeof(T) == 8) {
        for (std::size_t i = 0; i < width; ++i) {
            const std::size_t at = i * bands;
            if (!mask || (mask[at] & 1) == 0) AddRepeated(row[at], 1);
        }
    } else {
        for (std::uint32_t from = 0; from < width; from += std::min(kChunk, width - from)) {
            const std::size_t offset = std::size_t{from} * bands;
            ChunkSums<T> chunk;
            chunk.Add(row + offset, mask ? mask + offset : nullptr, bands,
                      std::min(kChunk, width - from));
            if (chunk.count == 0) continue;
            minimum = count != 0 ? std::min(minimum, chunk.minimum) : chunk.minimum;
            maximum = count != 0 ? std::max(maximum, chunk.maximum) : chunk.maximum;
            count += chunk.count;
            sums.AddSums(chunk.sum, chunk.squares);
        }
    }
}

template <class T>
void BandAccumulator<T>::AddRepeated(const T& value, std::uint64_t times) {
    if (times == 0 || zelm::NoDataRule<T>::NotFinite(value)) return;
    if constexpr (!zelm::kIsComplex<T>) {
        sums.Add(value, times);
        minimum = count != 0 ? std::min(minimum, value) : value;
        maximum = count != 0 ? std::max(maximum, value) : value;
    }
    count += times;
}

template <class T>
void BandAccumulator<T>::Merge(const BandAccumulator& other) {
    if (other.count == 0) return;
    if constexpr (!zelm::kIsComplex<T>) {
        sums.Merge(other.sums);
        minimum = count != 0 ? std::min(minimum, other.minimum) : other.minimum;
        maximum = count != 0 ? std::max(maximum, other.maximum) : other.maximum;
    }
    count += other.count;
}

template <class T>
void BandAccumulator<T>::Save(NumberPacker& packer) const {
    packer.Put(count);
    if constexpr (!zelm::kIsComplex<T>) {
        if (count == 0) return;
        packer.Put(BitsOf(minimum));
        packer.Put(BitsOf(maximum));
        sums.Save(packer);
    }
}

template <class T>
void BandAccumulator<T>::Load(NumberUnpacker& numbers) {
    *this = BandAccumulator();
    count = numbers.Take();
    if constexpr (!zelm::kIsComplex<T>) {
        if (count == 0) return;
        minimum = FromBits<T>(numbers.Take());
        maximum = FromBits<T>(numbers.Take());
        sums.Load(numbers);
    }
}

template <class T>
zelm::RasterBandStats<T> BandAccumulator<T>::Stats(std::uint32_t band) const {
    zelm::RasterBandStats<T> stats;
    stats.band = band;
    stats.count = count;
    if (count == 0) return stats;
    if constexpr (!zelm::kIsComplex<T>) {
        using Sums = ExactSums<T>;
        const BigInteger whole = sums.Sum();
        const BigInteger wholeOfSquares = sums.SumOfSquares();
        const auto n = static_cast<long double>(count);
        const long double total = ToLongDouble(whole, Sums::kSumExponent);
        const long double totalOfSquares = ToLongDouble(wholeOfSquares, Sums::kSquaresExponent);
        // n * sum of squares - square of the sum is n * n times the variance; subtracting before
        // anything is rounded keeps all its digits.
        const BigInteger spread = BigInteger(count) * wholeOfSquares - whole * whole;
        const long double deviation = std::sqrt(ToLongDouble(spread, Sums::kSquaresExponent)) / n;

        stats.minimum = minimum;
        stats.maximum = maximum;
        stats.flags = zelm::StatsFlag::Minimum | zelm::StatsFlag::Maximum;
        SetIfHeld(stats.mean, stats.flags, zelm::StatsFlag::Mean, total / n);
        SetIfHeld(stats.standardDeviation, stats.flags, zelm::StatsFlag::StandardDeviation,
                  deviation);
        SetIfHeld(stats.sum, stats.flags, zelm::StatsFlag::Sum, total);
        SetIfHeld(stats.sumOfSquares, stats.flags, zelm::StatsFlag::SumOfSquares, totalOfSquares);
        SetIfHeld(stats.rootMeanSquare, stats.flags, zelm::StatsFlag::RootMeanSquare,
                  std::sqrt(totalOfSquares / n));
    }
    return stats;
}

#define ZMC_X(type, name, code) template class BandAccumulator<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
