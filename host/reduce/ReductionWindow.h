// The methods on a window around a cell: kernels widened by 2, separable, with integer weights.
#ifndef ZMC_HOST_REDUCE_REDUCTIONWINDOW_H
#define ZMC_HOST_REDUCE_REDUCTIONWINDOW_H

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "host/base/Int128.h"
#include "host/reduce/Reduction.h"
#include "host/reduce/Rounded.h"

namespace zmchost {

// Weights of one side, from the cell outwards, at distances 1/4, 3/4, 5/4 ... of the kernel; both
// sides together weigh at most 2 to the kShift, and just that in all but the spline.
struct BilinearKernel {
    static constexpr int kReach = 2;
    static constexpr int kShift = 3;
    static constexpr std::int64_t kWeights[kReach] = {3, 1};
};
struct CubicKernel {
    static constexpr int kReach = 4;
    static constexpr int kShift = 8;
    static constexpr std::int64_t kWeights[kReach] = {111, 29, -9, -3};
};
// sinc(d) * sinc(d / 3), scaled and rounded so that all arithmetic is exact.
struct LanczosKernel {
    static constexpr int kReach = 6;
    static constexpr int kShift = 30;
    static constexpr std::int64_t kWeights[kReach] = {479302660, 145497691, -71551275,
                                                      -36505753, 16166410,  3961179};
};

// The cubic B-spline, 2/3 - d^2 + d^3 / 2 up to 1 and (2 - d)^3 / 6 up to 2, times 384.
struct CubicSplineKernel {
    static constexpr int kReach = 4;
    static constexpr int kShift = 10;
    static constexpr std::int64_t kWeights[kReach] = {235, 121, 27, 1};
};
// 1 2 1 around the second sample of the cell: all taps from left to right, of which the first is
// none.
struct GaussKernel {
    static constexpr int kReach = 2;
    static constexpr int kShift = 2;
    static constexpr std::int64_t kTaps[2 * kReach] = {0, 1, 2, 1};
};
// The cell itself, as a window.
struct BoxKernel {
    static constexpr int kReach = 1;
    static constexpr int kShift = 1;
    static constexpr std::int64_t kWeights[kReach] = {1};
};

// Weight of tap 0 to 2 * kReach - 1, from left to right or top to bottom.
template <class Kernel>
constexpr std::int64_t Weight(int tap) {
    if constexpr (requires { Kernel::kTaps; })
        return Kernel::kTaps[tap];
    else
        return Kernel::kWeights[tap < Kernel::kReach ? Kernel::kReach - 1 - tap
                                                     : tap - Kernel::kReach];
}

// The weights of all taps of a row together.
template <class Kernel>
constexpr std::int64_t RowWeight() {
    std::int64_t sum = 0;
    for (int tap = 0; tap < 2 * Kernel::kReach; ++tap) sum += Weight<Kernel>(tap);
    return sum;
}
template <class Kernel>
inline constexpr std::int64_t kWholeWeight = RowWeight<Kernel>() * RowWeight<Kernel>();

// The narrowest type that holds any sum of samples P times weights of `bits` bits; no kernel has
// weights whose magnitudes sum up to twice the whole.
template <class P, int bits>
using WeightedSum = std::conditional_t<
    std::is_same_v<P, float>, double,
    std::conditional_t<
        std::is_same_v<P, double>, long double,
        std::conditional_t<(8 * static_cast<int>(sizeof(P)) + bits <= 30), std::int32_t,
                           std::conditional_t<(8 * static_cast<int>(sizeof(P)) + bits <= 62),
                                              std::int64_t, Int128>>>>;

// The numbers of a raster's rows: samples, or the parts of complex samples. Column c of part p of a
// row is row[c * stride + p].
template <class P>
struct PartRows {
    const P* const* rows;
    const unsigned char* const* masks;
    std::size_t stride;      // numbers per pixel
    std::size_t maskStride;  // mask bytes per pixel
    std::uint32_t width;
};

// One result from all valid taps inside the level, masks and borders regarded. The cell's own 2 x 2
// samples have a valid one among them, whose value is `reference`: floating sums are taken of
// differences to it, so that equal samples give just themselves.
template <class Kernel, class P>
Rounded<P> WindowPart(const PartRows<P>& source, std::size_t part, std::size_t band,
                      std::uint32_t x, P reference) {
    using Sum = WeightedSum<P, 2 * Kernel::kShift + 1>;
    constexpr int taps = 2 * Kernel::kReach;
    const std::int64_t left = std::int64_t{2} * x + 1 - Kernel::kReach;
    const int first = left < 0 ? static_cast<int>(-left) : 0;
    const int last = static_cast<int>(std::min<std::int64_t>(taps, source.width - left));
    const Sum origin = std::is_floating_point_v<P> ? static_cast<Sum>(reference) : Sum{0};
    Sum sum = 0;
    Sum positiveSum = 0;
    std::int64_t weights = 0;
    std::int64_t positiveWeights = 0;
    for (int j = 0; j < taps; ++j) {
        const P* const row = source.rows[j];
        if (!row) continue;
        const unsigned char* const mask = source.masks ? source.masks[j] : nullptr;
        for (int i = first; i < last; ++i) {
            const auto column = static_cast<std::size_t>(left + i);
            if (mask && (mask[column * source.maskStride + band] & 1) != 0) continue;
            const std::int64_t weight = Weight<Kernel>(j) * Weight<Kernel>(i);
            const Sum value = static_cast<Sum>(row[column * source.stride + part]) - origin;
            const Sum term = static_cast<Sum>(weight) * value;
            sum += term;
            weights += weight;
            if (weight <= 0) continue;
            positiveSum += term;
            positiveWeights += weight;
        }
    }
    if (weights < kWholeWeight<Kernel> / 4) {
        sum = positiveSum;
        weights = positiveWeights;
    }
    if constexpr (std::is_floating_point_v<P>)
        return RoundedFloat<P>(origin + sum / static_cast<Sum>(weights));
    else
        return RoundedQuotient<P, Sum>(sum, static_cast<Sum>(weights));
}

// A sum of the whole weight in the raster's type.
template <class P, class Kernel, class Sum>
P OfWholeWeight(Sum sum) {
    constexpr std::int64_t whole = kWholeWeight<Kernel>;
    constexpr int shift = std::countr_zero(static_cast<std::uint64_t>(whole));
    if constexpr (std::is_floating_point_v<P>) {
        // Of a power of two the compiler makes a product.
        return RoundedFloat<P>(sum / static_cast<Sum>(whole)).value;
    } else if constexpr (whole != std::int64_t{1} << shift) {
        return RoundedQuotient<P, Sum>(sum, static_cast<Sum>(whole)).value;
    } else {
        constexpr Sum half = Sum{1} << (shift - 1);
        const Sum rounded = sum < 0 ? -((half - sum) >> shift) : (sum + half) >> shift;
        constexpr Sum low = std::numeric_limits<P>::min();
        constexpr Sum high = std::numeric_limits<P>::max();
        return static_cast<P>(std::clamp(rounded, low, high));
    }
}

// Results x to x + pixels - 1 of one part, where all taps lie inside the level and are valid:
// columns are summed first, and their sums then along the row.
template <class Kernel, class P>
void WindowRun(const PartRows<P>& source, std::size_t part, std::uint32_t x, std::size_t pixels,
               P* out) {
    using ColumnSum = WeightedSum<P, Kernel::kShift>;
    using Sum = WeightedSum<P, 2 * Kernel::kShift + 1>;
    constexpr std::size_t kPixels = 64;
    constexpr int taps = 2 * Kernel::kReach;
    ColumnSum columns[2 * kPixels + taps - 2];
    for (std::size_t done = 0; done < pixels;) {
        const std::size_t n = std::min(kPixels, pixels - done);
        const std::size_t left = 2 * (x + done) + 1 - Kernel::kReach;
        const std::size_t count = 2 * n + taps - 2;
        std::fill_n(columns, count, ColumnSum{0});
        for (int j = 0; j < taps; ++j) {
            const P* const row = source.rows[j] + left * source.stride + part;
            const auto weight = static_cast<ColumnSum>(Weight<Kernel>(j));
            for (std::size_t i = 0; i < count; ++i)
                columns[i] += weight * static_cast<ColumnSum>(row[i * source.stride]);
        }
        for (std::size_t i = 0; i < n; ++i) {
            Sum sum = 0;
            for (int k = 0; k < taps; ++k)
                sum += static_cast<Sum>(Weight<Kernel>(k)) *
                       static_cast<Sum>(columns[2 * i + static_cast<std::size_t>(k)]);
            out[(done + i) * source.stride + part] = OfWholeWeight<P, Kernel>(sum);
        }
        done += n;
    }
}

}  // namespace zmchost

#endif
