// A model of weighed reduction: one cell at a time, from the definition, integers in numbers of any
// size. It takes what is computed without weights as given.
#ifndef ZMC_TESTS_HOST_NAIVEWEIGHING_H
#define ZMC_TESTS_HOST_NAIVEWEIGHING_H

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <optional>
#include <vector>

#include "host/base/BigInteger.h"
#include "host/raster/NoData.h"
#include "tests/host/NaiveReduction.h"

namespace naive {

using Color = std::array<std::uint8_t, 4>;

struct BandWeights {
    int alpha = -1;
    const std::vector<Color>* colors = nullptr;
};

inline zmchost::BigInteger Big(Int128 value) { return zmchost::BigInteger::Signed(value); }

inline long double Real(const zmchost::BigInteger& value) {
    std::int64_t exponent = 0;
    const long double significand = value.Split(exponent);
    const long double magnitude = std::ldexp(significand, static_cast<int>(exponent));
    return value.Negative() != (magnitude < 0) ? -magnitude : magnitude;
}

inline bool Less(const zmchost::BigInteger& a, const zmchost::BigInteger& b) {
    return (a - b).Negative();
}

// Sums of weights times values: exact for integers, long double for others.
template <class P>
struct Sum;
template <class P>
requires std::is_integral_v<P>
struct Sum<P> {
    zmchost::BigInteger value;
    void Add(std::int64_t kernel, Int128 weight, Int128 sample) {
        value += Big(kernel) * Big(weight) * Big(sample);
    }
    bool Positive() const { return !value.Negative() && !value.Zero(); }
};
template <class P>
requires std::is_floating_point_v<P>
struct Sum<P> {
    long double value = 0;
    void Add(std::int64_t kernel, long double weight, long double sample) {
        value += static_cast<long double>(kernel) * weight * sample;
    }
    bool Positive() const { return value > 0; }
};

template <class P>
using Alpha = std::conditional_t<std::is_floating_point_v<P>, long double, Int128>;

template <class P>
struct Quotient {
    Sum<P> dividend, divisor;
};

// One tap that is valid.
template <class T, class P>
struct WeighedTap {
    T value;
    std::int64_t kernel;
    Alpha<P> alpha;  // 0 where it is hidden or transparent
};

// alpha < 0: that no sample has.
template <class T, class P>
Alpha<P> AlphaValue(const T& sample) {
    if constexpr (zelm::kIsComplex<T>) {
        return 1;
    } else if constexpr (std::is_floating_point_v<T>) {
        return sample > 0 && std::isfinite(sample) ? static_cast<long double>(sample) : 0;
    } else {
        const Int128 most = 0xFFFFFFFF;
        const Int128 value = static_cast<Int128>(sample);
        return value < 0 ? 0 : value > most ? most : value;
    }
}

template <class T, class P>
std::vector<WeighedTap<T, P>> WeighedTaps(Resampling method, const Picture<T>& picture,
                                          std::uint32_t x, std::uint32_t band, int alpha) {
    std::vector<WeighedTap<T, P>> taps;
    const int halo = static_cast<int>(picture.halo);
    const bool wide = method >= Resampling::Bilinear;
    for (int j = -halo; j < halo + 2; ++j)
        for (int i = -halo; i < halo + 2; ++i) {
            const std::int64_t column = 2 * std::int64_t{x} + i;
            const std::int64_t kernel =
                wide ? TapWeight(method, i - 1) * TapWeight(method, j - 1) : 1;
            if (kernel == 0 || !picture.Valid(j + halo, column, band)) continue;
            Alpha<P> weight = 1;
            if (alpha >= 0) {
                const auto other = static_cast<std::uint32_t>(alpha);
                weight = picture.Valid(j + halo, column, other)
                             ? AlphaValue<T, P>(picture.At(j + halo, column, other))
                             : 0;
            }
            if (picture.Hidden(j + halo, column, band)) weight = 0;
            taps.push_back({picture.At(j + halo, column, band), kernel, weight});
        }
    return taps;
}

// Of entries (kernel, weight, value): their mean, without taps of negative weight where those that
// remain are less than a quarter of the kernel with the largest weight.
template <class P>
struct Term {
    std::int64_t kernel;
    Alpha<P> weight;
    Alpha<P> value;
};

template <class P>
bool Thin(Resampling method, const std::vector<Term<P>>& terms) {
    const std::int64_t whole = method >= Resampling::Bilinear ? Whole(method) * Whole(method) : 4;
    Sum<P> four, limit;
    Alpha<P> largest = 0;
    for (const Term<P>& term : terms) {
        four.Add(term.kernel, term.weight, 4);
        largest = std::max(largest, term.weight);
    }
    limit.Add(whole, largest, 1);
    if constexpr (std::is_integral_v<P>)
        return Less(four.value, limit.value);
    else
        return four.value < limit.value;
}

template <class P>
Quotient<P> Mean(const std::vector<Term<P>>& terms, bool thin) {
    Quotient<P> mean;
    for (const Term<P>& term : terms) {
        if (thin && term.kernel <= 0) continue;
        mean.dividend.Add(term.kernel, term.weight, term.value);
        mean.divisor.Add(term.kernel, term.weight, 1);
    }
    return mean;
}

// The integer nearest to a quotient, half away from zero, by trying those around it; and on which
// side of it the quotient lies.
struct Nearest {
    Int128 value;
    int direction;
};
inline Nearest RoundBig(const zmchost::BigInteger& dividend, const zmchost::BigInteger& divisor) {
    const auto middle = static_cast<Int128>(std::floor(Real(dividend) / Real(divisor)));
    const auto distance = [&](Int128 k) {
        const zmchost::BigInteger difference = dividend - Big(k) * divisor;
        return difference.Negative() ? Big(0) - difference : difference;
    };
    Int128 best = middle - 3;
    for (Int128 k = middle - 2; k <= middle + 3; ++k) {
        const bool farther = (k < 0 ? -k : k) > (best < 0 ? -best : best);
        if (Less(distance(k), distance(best)) || (!Less(distance(best), distance(k)) && farther))
            best = k;
    }
    const zmchost::BigInteger rest = dividend - Big(best) * divisor;
    return {best, rest.Zero() ? 0 : rest.Negative() ? -1 : 1};
}

inline std::uint8_t RoundComponent(const Quotient<int>& part, bool root) {
    if (!part.dividend.Positive()) return 0;
    if (!root)
        return static_cast<std::uint8_t>(
            std::min<Int128>(255, RoundBig(part.dividend.value, part.divisor.value).value));
    // k - 1/2 <= root, which is (2k - 1)^2 / 4 <= quotient.
    int k = 0;
    while (k < 255 && !Less(Big(4) * part.dividend.value,
                            Big(Int128{2 * k + 1} * (2 * k + 1)) * part.divisor.value))
        ++k;
    return static_cast<std::uint8_t>(k);
}

// The entry that a mix of colours is nearest to; nothing where none is seen.
template <class T, class P>
std::optional<std::uint32_t> MixedIndex(Resampling method,
                                        const std::vector<WeighedTap<T, P>>& taps,
                                        const std::vector<Color>& colors,
                                        const std::vector<bool>& mayName) {
    const bool root = method == Resampling::Rms;
    std::array<std::vector<Term<int>>, 4> terms;
    const auto power = [&](int part) { return Int128{root ? part * part : part}; };
    for (const auto& tap : taps) {
        const auto index = static_cast<Int128>(tap.value);
        if (index < 0 || index >= static_cast<Int128>(colors.size())) continue;
        const Color& color = colors[static_cast<std::size_t>(index)];
        for (std::size_t k = 0; k < 3; ++k)
            terms[k].push_back(
                {tap.kernel, static_cast<Int128>(tap.alpha) * color[3], power(color[k])});
        terms[3].push_back({tap.kernel, static_cast<Int128>(tap.alpha), power(color[3])});
    }
    const bool thin = Thin<int>(method, terms[0]) || Thin<int>(method, terms[3]);
    Color mixed{};
    for (std::size_t k = 0; k < 4; ++k) {
        const Quotient<int> part = Mean<int>(terms[k], thin);
        if (!part.divisor.Positive()) return std::nullopt;
        mixed[k] = RoundComponent(part, root);
    }
    std::optional<std::uint32_t> best;
    int least = 1 << 30;
    for (std::uint32_t i = 0; i < colors.size(); ++i) {
        int distance = 0;
        for (std::size_t k = 0; k < 4; ++k)
            distance += (colors[i][k] - mixed[k]) * (colors[i][k] - mixed[k]);
        if (!mayName[i] || distance >= least) continue;
        least = distance;
        best = i;
    }
    return best;
}

}  // namespace naive

#endif
