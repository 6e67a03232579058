// Averages of whole runs of cells without invalid samples: the hot path of building a pyramid.
#ifndef ZMC_HOST_REDUCE_AVERAGEROW_H
#define ZMC_HOST_REDUCE_AVERAGEROW_H

#include <algorithm>
#include <cstddef>
#include <cstring>

#include "host/reduce/ReductionCells.h"

namespace zmchost {

// A quarter of the sum, half away from zero, in the sum's own type where it is small: one shift,
// without a division and without a branch.
template <class P>
P QuarterOf(SumOf<P> sum) {
    using Sum = SumOf<P>;
    if constexpr (std::is_floating_point_v<P>) {
        return static_cast<P>(sum * Sum{0.25});
    } else {
        const Sum awayFromZero = std::is_signed_v<P> ? Sum{2} + (sum >> (8 * sizeof(Sum) - 1)) : 2;
        return static_cast<P>((sum + awayFromZero) >> 2);
    }
}

template <class P>
P QuarterOf(P a, P b, P c, P d) {
    using Sum = SumOf<P>;
    return QuarterOf<P>(SumOfFour<Sum>(a, b, c, d));
}

// Small integers: the average of every pixel with its right neighbour is computed in one loop of
// vector code, wanted or not, and every second pixel copied out of it. Copies take a power of two
// of samples; what they write too much is overwritten by the next.
template <class T, std::size_t bands>
void AverageSmall(const T* upper, const T* lower, std::size_t pixels, T* out) {
    constexpr std::size_t kPixels = 256;
    constexpr std::size_t kCopied = bands == 3 ? 4 : bands;
    T averages[2 * kPixels * bands + kCopied];
    for (std::size_t done = 0; done < pixels;) {
        const std::size_t n = std::min(kPixels, pixels - done);
        const std::size_t wanted = 2 * n * bands - bands;
        const T* const a = upper + 2 * done * bands;
        const T* const b = lower + 2 * done * bands;
        for (std::size_t i = 0; i < wanted; ++i)
            averages[i] = QuarterOf<T>(a[i], a[i + bands], b[i], b[i + bands]);
        T* const target = out + done * bands;
        if constexpr (bands == 1) {
            for (std::size_t i = 0; i < n; ++i) target[i] = averages[2 * i];
        } else {
            for (std::size_t i = 0; i + 1 < n; ++i)
                std::memcpy(target + i * bands, averages + 2 * i * bands, kCopied * sizeof(T));
            std::memcpy(target + (n - 1) * bands, averages + 2 * (n - 1) * bands,
                        bands * sizeof(T));
        }
        done += n;
    }
}

// `parts` numbers per pixel: bands, or twice as many of complex samples.
template <class P>
void AverageParts(const P* upper, const P* lower, std::size_t parts, std::size_t pixels, P* out) {
    for (std::size_t x = 0; x < pixels; ++x) {
        const P* const a = upper + 2 * x * parts;
        const P* const b = lower + 2 * x * parts;
        for (std::size_t i = 0; i < parts; ++i)
            out[x * parts + i] = QuarterOf<P>(a[i], a[i + parts], b[i], b[i + parts]);
    }
}

template <class P, std::size_t parts>
void AverageFixedParts(const P* upper, const P* lower, std::size_t pixels, P* out) {
    if constexpr (sizeof(P) <= 2)
        AverageSmall<P, parts>(upper, lower, pixels, out);
    else
        AverageParts<P>(upper, lower, parts, pixels, out);
}

// upper, lower: 2 * pixels pixels each of a pair of rows; out: `pixels` pixels.
template <class P>
void AverageRow(const P* upper, const P* lower, std::size_t parts, std::size_t pixels, P* out) {
    switch (parts) {
        case 1:
            return AverageFixedParts<P, 1>(upper, lower, pixels, out);
        case 2:
            return AverageFixedParts<P, 2>(upper, lower, pixels, out);
        case 3:
            return AverageFixedParts<P, 3>(upper, lower, pixels, out);
        case 4:
            return AverageFixedParts<P, 4>(upper, lower, pixels, out);
        default:
            return AverageParts<P>(upper, lower, parts, pixels, out);
    }
}

}  // namespace zmchost

#endif
