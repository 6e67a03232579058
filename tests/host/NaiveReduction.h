// A model of the reduction that takes one cell at a time from plain definitions: wide arithmetic,
// sorted lists, kernels by their formulas. Slow, and sharing no code with what it judges.
#ifndef ZMC_TESTS_HOST_NAIVEREDUCTION_H
#define ZMC_TESTS_HOST_NAIVEREDUCTION_H

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <map>
#include <numbers>
#include <type_traits>
#include <utility>
#include <vector>

#include "host/base/Int128.h"
#include "host/reduce/Reduction.h"

namespace naive {

using zmchost::Int128;
using zmchost::Resampling;

// A window of rows around one coarse row, as ReduceRow gets it.
template <class T>
struct Picture {
    std::uint32_t bands = 1;
    std::uint32_t width = 0;
    std::uint32_t halo = 0;
    std::vector<std::vector<T>> rows;  // an empty one is outside the level
    std::vector<std::vector<unsigned char>> masks;
    bool hides = false;  // bit 1 of a mask hides a sample

    bool Valid(int row, std::int64_t column, std::uint32_t band) const {
        if (row < 0 || row >= static_cast<int>(rows.size()) || column < 0 || column >= width)
            return false;
        const auto r = static_cast<std::size_t>(row);
        if (rows[r].empty()) return false;
        return masks.empty() || masks[r].empty() || (masks[r][Index(column, band)] & 1) == 0;
    }
    bool Hidden(int row, std::int64_t column, std::uint32_t band) const {
        const auto r = static_cast<std::size_t>(row);
        return hides && !masks.empty() && !masks[r].empty() &&
               (masks[r][Index(column, band)] & 2) != 0;
    }
    T At(int row, std::int64_t column, std::uint32_t band) const {
        return rows[static_cast<std::size_t>(row)][Index(column, band)];
    }
    std::size_t Index(std::int64_t column, std::uint32_t band) const {
        return static_cast<std::size_t>(column) * bands + band;
    }
};

// An exact quotient for integers; the value itself for floating types.
template <class P>
using Wide = std::conditional_t<std::is_floating_point_v<P>, long double, Int128>;

template <class P>
struct Fraction {
    Wide<P> dividend = 0;
    Wide<P> divisor = 1;
};

inline long double KernelValue(Resampling method, long double d) {
    d = std::abs(d);
    constexpr long double pi = std::numbers::pi_v<long double>;
    switch (method) {
        case Resampling::Bilinear:
            return d < 1 ? 1 - d : 0;
        case Resampling::Cubic:
            if (d < 1) return (1.5L * d - 2.5L) * d * d + 1;
            return d < 2 ? ((-0.5L * d + 2.5L) * d - 4) * d + 2 : 0;
        case Resampling::CubicSpline:
            if (d < 1) return 2.0L / 3 - d * d + d * d * d / 2;
            return d < 2 ? (2 - d) * (2 - d) * (2 - d) / 6 : 0;
        default:
            return d < 3 ? 3 * std::sin(pi * d) * std::sin(pi * d / 3) / (pi * pi * d * d) : 0;
    }
}

// What all taps of a row weigh together.
inline std::int64_t Whole(Resampling method) {
    switch (method) {
        case Resampling::Bilinear:
            return 8;
        case Resampling::Cubic:
            return 256;
        case Resampling::Gauss:
            return 4;
        case Resampling::CubicSpline:
            return 768;
        default:
            return std::int64_t{1} << 30;
    }
}

// Weight of the tap at distance (2 * i + 1) / 4. The Gaussian has 1 2 1 around the sample behind
// the middle of the cell.
inline std::int64_t TapWeight(Resampling method, int i) {
    if (method == Resampling::Gauss) return std::abs(i) > 1 ? 0 : 2 - std::abs(i);
    static std::map<std::pair<Resampling, int>, std::int64_t> known;
    const auto [entry, isNew] = known.try_emplace({method, i}, 0);
    if (isNew) {
        long double total = 0;
        for (int k = -6; k < 6; ++k) total += KernelValue(method, (k + 0.5L) / 2);
        const long double unit = static_cast<long double>(Whole(method)) / total;
        entry->second = std::llround(KernelValue(method, (i + 0.5L) / 2) * unit);
    }
    return entry->second;
}

template <class P, class T, class Part>
Fraction<P> WindowFraction(Resampling method, const Picture<T>& picture, std::uint32_t x,
                           std::uint32_t band, Part part) {
    Fraction<P> all{0, 0};
    Fraction<P> positive{0, 0};
    const int halo = static_cast<int>(picture.halo);
    for (int j = -halo; j < halo + 2; ++j) {
        for (int i = -halo; i < halo + 2; ++i) {
            const std::int64_t column = 2 * std::int64_t{x} + i;
            if (!picture.Valid(j + halo, column, band)) continue;
            const std::int64_t weight = TapWeight(method, i - 1) * TapWeight(method, j - 1);
            const auto value = static_cast<Wide<P>>(part(picture.At(j + halo, column, band)));
            all.dividend += static_cast<Wide<P>>(weight) * value;
            all.divisor += static_cast<Wide<P>>(weight);
            if (weight <= 0) continue;
            positive.dividend += static_cast<Wide<P>>(weight) * value;
            positive.divisor += static_cast<Wide<P>>(weight);
        }
    }
    const auto whole = static_cast<Wide<P>>(Whole(method) * Whole(method));
    return all.divisor * 4 < whole ? positive : all;
}

template <class T>
std::vector<T> CellValues(const Picture<T>& picture, std::uint32_t x, std::uint32_t band) {
    std::vector<T> values;
    const int halo = static_cast<int>(picture.halo);
    for (int j = halo; j < halo + 2; ++j)
        for (std::int64_t i = 2 * std::int64_t{x}; i < 2 * std::int64_t{x} + 2; ++i)
            if (picture.Valid(j, i, band)) values.push_back(picture.At(j, i, band));
    return values;
}

template <class T>
T Mode(const std::vector<T>& values) {
    return *std::max_element(values.begin(), values.end(), [&](T a, T b) {
        return std::count(values.begin(), values.end(), a) <
               std::count(values.begin(), values.end(), b);
    });
}

template <class T>
T Picked(Resampling method, std::vector<T> values) {
    if (method == Resampling::Nearest) return values.front();
    if constexpr (!zelm::kIsComplex<T>) {
        if (method == Resampling::Mode) return Mode(values);
        std::sort(values.begin(), values.end());
        if (method == Resampling::Minimum) return values.front();
        if (method == Resampling::Maximum) return values.back();
        return values[(values.size() - 1) / 2];
    } else {
        return values.front();
    }
}

// The exact result of the methods that compute one, of one part of the samples.
template <class P, class T, class Part>
Fraction<P> ExactPart(Resampling method, const Picture<T>& picture, std::uint32_t x,
                      std::uint32_t band, Part part) {
    if (method != Resampling::Average) return WindowFraction<P>(method, picture, x, band, part);
    Fraction<P> mean{0, 0};
    for (const T& value : CellValues(picture, x, band)) {
        mean.dividend += static_cast<Wide<P>>(part(value));
        mean.divisor += 1;
    }
    return mean;
}

// Half away from zero, by trying the whole numbers around the quotient.
template <class T>
T RoundInteger(const Fraction<T>& exact) {
    const Int128 floor = exact.dividend / exact.divisor - (exact.dividend < 0 ? 1 : 0);
    Int128 best = floor;
    for (Int128 candidate = floor; candidate <= floor + 2; ++candidate) {
        const auto distance = [&](Int128 k) {
            const Int128 difference = exact.dividend - k * exact.divisor;
            return difference < 0 ? -difference : difference;
        };
        const bool nearer = distance(candidate) < distance(best);
        const bool farther = (candidate < 0 ? -candidate : candidate) > (best < 0 ? -best : best);
        if (nearer || (distance(candidate) == distance(best) && farther)) best = candidate;
    }
    const Int128 low = std::numeric_limits<T>::min();
    const Int128 high = std::numeric_limits<T>::max();
    return static_cast<T>(best < low ? low : best > high ? high : best);
}

inline bool Computed(Resampling method) {
    return method == Resampling::Average || method >= Resampling::Bilinear;
}

}  // namespace naive

#endif
