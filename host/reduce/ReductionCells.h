// The methods on a cell of 2 x 2 samples, as one function per method on its valid samples.
#ifndef ZMC_HOST_REDUCE_REDUCTIONCELLS_H
#define ZMC_HOST_REDUCE_REDUCTIONCELLS_H

#include <algorithm>
#include <cstdint>
#include <type_traits>
#include <utility>

#include "host/base/Int128.h"
#include "host/reduce/Reduction.h"
#include "host/reduce/RootMeanSquare.h"
#include "host/reduce/Rounded.h"

namespace zmchost {

// The valid samples of a cell in reading order; count is at least 1 where a method sees it.
template <class T>
struct Cell {
    T values[4] = {};
    int count = 0;
};

// What holds the sum of four samples: exactly, of integers, and with room for the last digits and
// for any sum, of floating types.
template <class T>
using SumOf = std::conditional_t<
    std::is_same_v<T, float>, double,
    std::conditional_t<
        std::is_same_v<T, double>, long double,
        std::conditional_t<sizeof(T) <= 2, std::int32_t,
                           std::conditional_t<sizeof(T) == 4, std::int64_t, Int128>>>>;

// In this order in all places, so that floating results do not depend on the path taken.
template <class Sum>
Sum SumOfFour(Sum a, Sum b, Sum c, Sum d) {
    return (a + b) + (c + d);
}

template <class P>
Rounded<P> MeanOf(SumOf<P> sum, int count) {
    if constexpr (std::is_floating_point_v<P>) {
        return RoundedFloat<P>(sum / static_cast<SumOf<P>>(count));
    } else if constexpr (sizeof(P) <= 2) {
        // A division by multiplication: exact, since the sum has no more than 19 bits.
        constexpr std::uint64_t kReciprocals[5] = {0, 0x80000000, 0x40000000, 0x2AAAAAAB,
                                                   0x20000000};
        // NOLINTNEXTLINE(bugprone-misplaced-widening-cast): likewise, 20 bits fit.
        const auto doubled = static_cast<std::uint64_t>(2 * (sum < 0 ? -sum : sum) + count);
        const auto magnitude = static_cast<std::int32_t>(doubled * kReciprocals[count] >> 32);
        const std::int32_t mean = sum < 0 ? -magnitude : magnitude;
        return {static_cast<P>(mean), SignOf(sum - mean * count)};
    } else {
        return RoundedQuotient<P, SumOf<P>>(sum, count);
    }
}

// The mean of one part of the samples: of themselves, or of the real or imaginary parts.
template <class P, class T, class Part>
Rounded<P> MeanOfPart(const Cell<T>& cell, Part part) {
    SumOf<P> sums[4];
    for (int i = 0; i < 4; ++i) sums[i] = i < cell.count ? part(cell.values[i]) : P{0};
    return MeanOf<P>(SumOfFour<SumOf<P>>(sums[0], sums[1], sums[2], sums[3]), cell.count);
}

template <class T>
Rounded<T> CellAverage(const Cell<T>& cell) {
    if constexpr (zelm::kIsComplex<T>) {
        using P = decltype(T::re);
        return Joined(MeanOfPart<P>(cell, [](const T& x) { return x.re; }),
                      MeanOfPart<P>(cell, [](const T& x) { return x.im; }));
    } else {
        return MeanOfPart<T>(cell, [](T x) { return x; });
    }
}

template <class T>
Rounded<T> CellMode(const Cell<T>& cell) {
    int best = 0;
    int bestCount = 0;
    for (int i = 0; i < cell.count; ++i) {
        int count = 0;
        for (int j = 0; j < cell.count; ++j) count += cell.values[j] == cell.values[i] ? 1 : 0;
        if (count > bestCount) {
            best = i;
            bestCount = count;
        }
    }
    return {cell.values[best]};
}

template <class T>
Rounded<T> CellMinimum(const Cell<T>& cell) {
    T least = cell.values[0];
    for (int i = 1; i < cell.count; ++i) least = cell.values[i] < least ? cell.values[i] : least;
    return {least};
}

template <class T>
Rounded<T> CellMaximum(const Cell<T>& cell) {
    T most = cell.values[0];
    for (int i = 1; i < cell.count; ++i) most = most < cell.values[i] ? cell.values[i] : most;
    return {most};
}

template <class T>
Rounded<T> CellMedian(Cell<T> cell) {
    if (cell.count == 4) {
        const auto [a, b, c, d] = cell.values;
        const T low = std::max(std::min(a, b), std::min(c, d));
        const T high = std::min(std::max(a, b), std::max(c, d));
        return {std::min(low, high)};
    }
    for (int i = 1; i < cell.count; ++i) {
        for (int j = i; j > 0 && cell.values[j] < cell.values[j - 1]; --j)
            std::swap(cell.values[j], cell.values[j - 1]);
    }
    return {cell.values[(cell.count - 1) / 2]};
}

template <Resampling method, class T>
Rounded<T> ReduceCell(const Cell<T>& cell) {
    if constexpr (method == Resampling::Average)
        return CellAverage(cell);
    else if constexpr (method == Resampling::Rms)
        return RootMeanSquare(cell.values, cell.count);
    else if constexpr (method == Resampling::Mode)
        return CellMode(cell);
    else if constexpr (method == Resampling::Minimum)
        return CellMinimum(cell);
    else if constexpr (method == Resampling::Maximum)
        return CellMaximum(cell);
    else if constexpr (method == Resampling::Median)
        return CellMedian(cell);
    else
        return {cell.values[0]};
}

}  // namespace zmchost

#endif
