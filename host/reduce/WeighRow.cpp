#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <limits>
#include <optional>

#include "core/ElementTypes.h"
#include "host/base/Int128.h"
#include "host/reduce/ReductionCells.h"
#include "host/reduce/ReductionWindow.h"
#include "host/reduce/RootMeanSquare.h"
#include "host/reduce/Weighing.h"

namespace zmchost {
namespace {

constexpr int kMostTapsOfARow = 2 * LanczosKernel::kReach;
constexpr int kMostTaps = kMostTapsOfARow * kMostTapsOfARow;
constexpr std::uint64_t kMostAlpha = ~std::uint32_t{0};  // that counts, so that all sums fit

template <class T>
using AlphaType =
    std::conditional_t<std::is_same_v<T, float>, double,
                       std::conditional_t<std::is_same_v<T, double>, long double, std::int64_t>>;

template <class T>
AlphaType<T> AlphaOf(const T& sample) {
    if constexpr (zelm::kIsComplex<T>)
        return 1;
    else if constexpr (std::is_floating_point_v<T>)
        return sample > 0 && !zelm::NoDataRule<T>::NotFinite(sample) ? AlphaType<T>{sample} : 0;
    else
        return sample > 0 ? static_cast<std::int64_t>(
                                std::min(kMostAlpha, static_cast<std::uint64_t>(sample)))
                          : 0;
}

// A sample that counts, the weight of the kernel there, and what weighs it beside.
template <class T>
struct Tap {
    T value;
    std::int64_t kernel;
    AlphaType<T> alpha;
};

template <class T>
struct Taps {
    std::array<Tap<T>, kMostTaps> all;
    std::size_t count = 0;
    bool alike = true;  // none is hidden or without weight, and they weigh the same

    const Tap<T>* begin() const { return all.data(); }
    const Tap<T>* end() const { return all.data() + count; }
};

// Where sums of samples are held whose magnitudes have `bits` bits: integers exactly.
template <class P, int bits>
using SumType =
    std::conditional_t<std::is_same_v<P, float>, double,
                       std::conditional_t<std::is_same_v<P, double>, long double,
                                          std::conditional_t<(bits <= 62), std::int64_t, Int128>>>;

template <class T>
inline constexpr int kAlphaBits = std::min(8 * static_cast<int>(sizeof(T)), 32);

// Whether so little weight is left that what negative taps subtract would show.
template <class Kernel, class Sum>
bool IsThin(Sum weights, Sum largest) {
    constexpr std::int64_t quarter = kWholeWeight<Kernel> / 4;
    return weights < static_cast<Sum>(quarter) * largest;
}

// Sums over all taps, and over those of positive weight.
template <class Kernel, class Sum>
class TapSums {
public:
    void Add(std::int64_t kernel, Sum alpha, Sum value) {
        const Sum weight = static_cast<Sum>(kernel) * alpha;
        sums[0] += weight * value;
        weights[0] += weight;
        largest = std::max(largest, alpha);
        if (kernel <= 0) return;
        sums[1] += weight * value;
        weights[1] += weight;
    }
    bool Thin() const { return IsThin<Kernel>(weights[0], largest); }
    // Of the taps to go by.
    Sum Of(bool thin) const { return sums[thin ? 1 : 0]; }
    Sum Weight(bool thin) const { return weights[thin ? 1 : 0]; }

private:
    Sum sums[2] = {};
    Sum weights[2] = {};
    Sum largest = 0;
};

struct Floor {
    Int128 quotient;
    Int128 rest;  // from 0 to below the divisor
};
Floor FloorOf(Int128 dividend, Int128 divisor) {
    const Int128 quotient = dividend / divisor;
    const Int128 rest = dividend % divisor;
    return rest < 0 ? Floor{quotient - 1, rest + divisor} : Floor{quotient, rest};
}

// (high * 2^32 + low) / weights, half away from zero, where the dividend itself may take more than
// 128 bits: of 64-bit samples, whose halves are summed alone.
template <class P>
Rounded<P> QuotientOfHalves(Int128 high, Int128 low, Int128 weights) {
    constexpr Int128 unit = Int128{1} << 32;
    const Floor upper = FloorOf(high, weights);
    const Floor lower = FloorOf(upper.rest * unit + low, weights);
    const Int128 floor = upper.quotient * unit + lower.quotient;
    const Int128 missing = weights - lower.rest;
    const bool up = floor < 0 ? lower.rest > missing : lower.rest >= missing;
    constexpr Int128 least = std::numeric_limits<P>::min();
    constexpr Int128 most = std::numeric_limits<P>::max();
    const Int128 held = std::clamp<Int128>(up ? floor + 1 : floor, least, most);
    return {static_cast<P>(held), held > floor ? -1 : held < floor || lower.rest != 0 ? 1 : 0};
}

template <class Kernel, class P, class T, class Part>
std::optional<Rounded<P>> MeanOfHalves(const Taps<T>& taps, Part part) {
    TapSums<Kernel, Int128> high, low;
    for (const Tap<T>& tap : taps) {
        const P value = part(tap.value);
        high.Add(tap.kernel, tap.alpha, value >> 32);
        low.Add(tap.kernel, tap.alpha, static_cast<std::uint32_t>(value));
    }
    const bool thin = high.Thin();
    if (high.Weight(thin) <= 0) return std::nullopt;
    return QuotientOfHalves<P>(high.Of(thin), low.Of(thin), high.Weight(thin));
}

// The mean of one part of the samples; nothing where nothing weighs. Floating sums are taken of
// differences to a sample, so that equal samples give just themselves.
template <class Kernel, class P, class T, class Part>
std::optional<Rounded<P>> MeanOfTaps(const Taps<T>& taps, Part part) {
    if constexpr (std::is_integral_v<P> && sizeof(P) == 8) {
        return MeanOfHalves<Kernel, P>(taps, part);
    } else {
        using Sum =
            SumType<P, 8 * static_cast<int>(sizeof(P)) + kAlphaBits<P> + 2 * Kernel::kShift + 1>;
        const Sum origin =
            std::is_floating_point_v<P> ? static_cast<Sum>(part(taps.all[0].value)) : Sum{0};
        TapSums<Kernel, Sum> sum;
        for (const Tap<T>& tap : taps)
            sum.Add(tap.kernel, static_cast<Sum>(tap.alpha),
                    static_cast<Sum>(part(tap.value)) - origin);
        const bool thin = sum.Thin();
        if (!(sum.Weight(thin) > 0)) return std::nullopt;
        if constexpr (std::is_floating_point_v<P>)
            return RoundedFloat<P>(origin + sum.Of(thin) / sum.Weight(thin));
        else
            return RoundedQuotient<P, Sum>(sum.Of(thin), sum.Weight(thin));
    }
}

template <class Kernel, class T>
std::optional<Rounded<T>> WeighedMean(const Taps<T>& taps) {
    if constexpr (zelm::kIsComplex<T>) {
        using P = decltype(T::re);
        const auto re = MeanOfTaps<Kernel, P>(taps, [](const T& x) { return x.re; });
        const auto im = MeanOfTaps<Kernel, P>(taps, [](const T& x) { return x.im; });
        if (!re || !im) return std::nullopt;
        return Joined(*re, *im);
    } else {
        return MeanOfTaps<Kernel, T>(taps, [](T x) { return x; });
    }
}

template <class T>
Rounded<T> WeighedRoot(const Taps<T>& taps) {
    if constexpr (zelm::kIsComplex<T>) {
        return {taps.all[0].value};
    } else if constexpr (std::is_floating_point_v<T>) {
        long double squares = 0;
        long double weights = 0;
        for (const Tap<T>& tap : taps) {
            const auto value = static_cast<long double>(tap.value);
            squares += static_cast<long double>(tap.alpha) * (value * value);
            weights += static_cast<long double>(tap.alpha);
        }
        return RoundedFloat<T>(std::sqrt(squares / weights));
    } else {
        T values[4];
        std::uint64_t weights[4];
        for (std::size_t i = 0; i < taps.count; ++i) {
            values[i] = taps.all[i].value;
            weights[i] = static_cast<std::uint64_t>(taps.all[i].alpha);
        }
        return RootMeanSquare(values, weights, static_cast<int>(taps.count));
    }
}

template <class T>
Rounded<T> WeighedMode(const Taps<T>& taps) {
    const Tap<T>* best = taps.begin();
    AlphaType<T> most = 0;
    for (const Tap<T>& tap : taps) {
        AlphaType<T> weight = 0;
        for (const Tap<T>& other : taps) weight += other.value == tap.value ? other.alpha : 0;
        if (!(weight > most)) continue;
        best = &tap;
        most = weight;
    }
    return {best->value};
}

template <Resampling method, class T>
Rounded<T> Picked(const Taps<T>& taps) {
    Cell<T> cell;
    for (const Tap<T>& tap : taps) cell.values[cell.count++] = tap.value;
    return ReduceCell<method>(cell);
}

// What a method makes of taps of which each weighs something; nothing where that cancels out.
template <Resampling method, class Kernel, class T>
std::optional<Rounded<T>> WeighedResult(const Taps<T>& taps) {
    if constexpr (method == Resampling::Rms)
        return WeighedRoot(taps);
    else if constexpr (method == Resampling::Mode)
        return WeighedMode(taps);
    else if constexpr (method == Resampling::Minimum || method == Resampling::Maximum ||
                       method == Resampling::Median)
        return Picked<method>(taps);
    else
        return WeighedMean<Kernel>(taps);
}

template <class T>
const Rgba* ColorOf(const ColorIndex& colors, const T& sample) {
    if constexpr (zelm::kIsComplex<T>) {
        return nullptr;
    } else {
        constexpr double most = 4294967296.0;
        if (!(sample >= 0) || static_cast<double>(sample) >= most) return nullptr;
        const auto index = static_cast<std::uint64_t>(sample);
        return static_cast<T>(index) == sample ? colors.Find(index) : nullptr;
    }
}

// sum / weights, or its root, as a component of a colour.
template <bool root, class Sum>
std::uint8_t Component(Sum sum, Sum weights) {
    constexpr int most = 255;
    if (!(sum > 0)) return 0;
    if constexpr (root) {
        auto value = static_cast<int>(std::min<long double>(
            most, std::sqrt(static_cast<long double>(sum) / static_cast<long double>(weights))));
        const auto above = [&](int k) {
            return Sum{4} * (sum - weights * static_cast<Sum>(k * (k + 1))) >= weights;
        };
        while (value > 0 && !above(value - 1)) --value;
        while (value < most && above(value)) ++value;
        return static_cast<std::uint8_t>(value);
    } else if constexpr (std::is_floating_point_v<Sum>) {
        return static_cast<std::uint8_t>(std::min<Sum>(most, std::floor(sum / weights + Sum{0.5})));
    } else {
        return static_cast<std::uint8_t>(std::min<Sum>(most, (2 * sum + weights) / (2 * weights)));
    }
}

// The colour that the taps mix to; nothing where none of them is seen.
template <class Kernel, bool root, class T>
std::optional<Rgba> MixedColor(const Taps<T>& taps, const ColorIndex& colors) {
    using P = std::conditional_t<zelm::kIsComplex<T>, double, T>;
    using Sum = SumType<P, 8 * 3 + kAlphaBits<P> + 2 * Kernel::kShift + 4>;
    TapSums<Kernel, Sum> components[3], opacity;
    const auto powered = [](int value) { return static_cast<Sum>(root ? value * value : value); };
    for (const Tap<T>& tap : taps) {
        const Rgba* const color = ColorOf(colors, tap.value);
        if (!color) continue;
        const auto alpha = static_cast<Sum>(tap.alpha);
        for (std::size_t i = 0; i < 3; ++i)
            components[i].Add(tap.kernel, alpha * static_cast<Sum>((*color)[3]),
                              powered((*color)[i]));
        opacity.Add(tap.kernel, alpha, powered((*color)[3]));
    }
    const bool thin = components[0].Thin() || opacity.Thin();
    if (!(components[0].Weight(thin) > 0)) return std::nullopt;
    Rgba mixed;
    for (std::size_t i = 0; i < 3; ++i)
        mixed[i] = Component<root>(components[i].Of(thin), components[i].Weight(thin));
    mixed[3] = Component<root>(opacity.Of(thin), opacity.Weight(thin));
    return mixed;
}

// A method as values: what walks over a row is compiled once for all of them.
template <class T>
struct WeighingMethod {
    int reach;
    std::array<std::int64_t, kMostTapsOfARow> kernel;
    bool computes;
    std::optional<Rounded<T>> (*result)(const Taps<T>& taps);
    std::optional<Rgba> (*mixed)(const Taps<T>& taps, const ColorIndex& colors);
};

template <class T, Resampling method, class Kernel>
constexpr WeighingMethod<T> MakeMethod() {
    WeighingMethod<T> values{Kernel::kReach,
                             {},
                             Computes(method),
                             &WeighedResult<method, Kernel, T>,
                             &MixedColor<Kernel, method == Resampling::Rms, T>};
    for (int tap = 0; tap < 2 * Kernel::kReach; ++tap)
        values.kernel[static_cast<std::size_t>(tap)] = Weight<Kernel>(tap);
    return values;
}

template <class T, Resampling method, class Kernel>
constexpr WeighingMethod<T> kMethod = MakeMethod<T, method, Kernel>();

// Null where samples are taken as they are, whatever they weigh.
template <class T>
const WeighingMethod<T>* MethodOf(Resampling method) {
    switch (method) {
#define ZMC_METHOD(name, Kernel) \
    case Resampling::name:       \
        return &kMethod<T, Resampling::name, Kernel>;
        ZMC_METHOD(Average, BoxKernel)
        ZMC_METHOD(Bilinear, BilinearKernel)
        ZMC_METHOD(Cubic, CubicKernel)
        ZMC_METHOD(Lanczos, LanczosKernel)
        ZMC_METHOD(Gauss, GaussKernel)
        ZMC_METHOD(CubicSpline, CubicSplineKernel)
        default:
            break;
    }
    if constexpr (!zelm::kIsComplex<T>) {
        switch (method) {
            ZMC_METHOD(Rms, BoxKernel)
            ZMC_METHOD(Mode, BoxKernel)
            ZMC_METHOD(Minimum, BoxKernel)
            ZMC_METHOD(Maximum, BoxKernel)
            ZMC_METHOD(Median, BoxKernel)
            default:
                break;
        }
    }
#undef ZMC_METHOD
    return nullptr;
}

// One call of WeighRow. Runs of cells whose taps weigh alike are left as they are.
template <class T>
class RowWeigher {
    static constexpr std::size_t kBlock = 32;  // cells that are judged together

public:
    RowWeigher(const WeighingMethod<T>& chosen, std::uint32_t bandCount, std::uint32_t pixels,
               const ReductionRows<T>& rows, const zelm::NoDataRule<T>* rules,
               const Weighing& weights, T* row, unsigned char* rowMask)
        : method(chosen),
          taps(2 * chosen.reach),
          halo(chosen.reach - 1),
          bands(bandCount),
          width(pixels),
          source(rows),
          noData(rules),
          weighing(weights),
          out(row),
          outMask(rowMask) {}

    void Run() {
        const std::size_t cells = width / 2;
        for (std::size_t x = 0; x < cells; x += kBlock) {
            const std::size_t n = std::min(kBlock, cells - x);
            for (std::size_t band = 0; band < bands; ++band)
                if (Colors(band) || !Alike(x, n, band))
                    for (std::size_t i = x; i < x + n; ++i) Mend(i, band);
        }
    }

private:
    const ColorIndex* Colors(std::size_t band) const {
        return method.computes && !zelm::kIsComplex<T> ? weighing.bands[band].colors.get()
                                                       : nullptr;
    }
    std::uint32_t AlphaBand(std::size_t band) const {
        if constexpr (zelm::kIsComplex<T>) return BandWeighing::kNoBand;
        return weighing.bands[band].alpha;
    }
    zelm::NoDataRule<T> Rule(std::size_t band) const {
        return noData ? noData[band] : zelm::NoDataRule<T>{};
    }
    std::int64_t Weight(int tap) const { return method.kernel[static_cast<std::size_t>(tap)]; }
    unsigned char MaskAt(int row, std::size_t at) const {
        const unsigned char* const mask = source.masks ? source.masks[row] : nullptr;
        return mask ? mask[at] : 0;
    }

    // Masks of others may have any bits behind the first.
    bool Hides(unsigned char mask) const { return weighing.hidden && (mask & kHiddenBit) != 0; }

    // Whether all samples of a band that the cells tap weigh the same, and something.
    bool Alike(std::size_t x, std::size_t n, std::size_t band) const {
        const std::uint32_t alpha = AlphaBand(band);
        const std::size_t first = 2 * x - std::min(2 * x, static_cast<std::size_t>(halo));
        const std::size_t last =
            std::min<std::size_t>(2 * (x + n) + static_cast<std::size_t>(halo), width);
        bool alike = true;
        const T* reference = nullptr;
        for (int r = 0; r < taps && alike; ++r) {
            if (!source.rows[r]) continue;
            if (weighing.hidden && source.masks && source.masks[r])
                alike = NoneOf(source.masks[r], kHiddenBit, first, last, band);
            if (alpha == BandWeighing::kNoBand) continue;
            const T* const row = source.rows[r] + alpha;
            if (!reference) reference = row + first * bands;
            for (std::size_t c = first; c < last; ++c) alike &= row[c * bands] == *reference;
            if (source.masks && source.masks[r])
                alike = alike && NoneOf(source.masks[r], kInvalidBit, first, last, alpha);
        }
        return alike && (!reference || AlphaOf(*reference) > 0);
    }

    bool NoneOf(const unsigned char* mask, unsigned char bit, std::size_t first, std::size_t last,
                std::size_t band) const {
        unsigned char any = 0;
        for (std::size_t c = first; c < last; ++c) any |= mask[c * bands + band];
        return (any & bit) == 0;
    }

    // Calls visit(sample, mask byte) for the cell's own samples, in reading order.
    template <class Visitor>
    void VisitOwn(std::size_t x, std::size_t band, Visitor visit) const {
        for (int r = halo; r < halo + 2; ++r) {
            if (!source.rows[r]) continue;
            for (std::size_t c = 2 * x; c < 2 * x + 2; ++c)
                visit(source.rows[r][c * bands + band], MaskAt(r, c * bands + band));
        }
    }

    Taps<T> Gather(std::size_t x, std::size_t band) const {
        Taps<T> gathered;
        const auto left = static_cast<std::int64_t>(2 * x) - halo;
        for (int r = 0; r < taps; ++r) {
            if (!source.rows[r]) continue;
            for (int c = 0; c < taps; ++c) {
                const std::int64_t kernel = Weight(r) * Weight(c);
                if (kernel != 0 && left + c >= 0 && left + c < static_cast<std::int64_t>(width))
                    Take(gathered, r, static_cast<std::size_t>(left + c), band, kernel);
            }
        }
        return gathered;
    }

    void Take(Taps<T>& gathered, int row, std::size_t column, std::size_t band,
              std::int64_t kernel) const {
        const std::size_t at = column * bands + band;
        const unsigned char mask = MaskAt(row, at);
        if ((mask & kInvalidBit) != 0) return;
        const AlphaType<T> alpha = Hides(mask) ? 0 : AlphaAt(row, column, band);
        gathered.alike =
            gathered.alike && alpha > 0 && (gathered.count == 0 || alpha == gathered.all[0].alpha);
        if (alpha > 0) gathered.all[gathered.count++] = {source.rows[row][at], kernel, alpha};
    }

    AlphaType<T> AlphaAt(int row, std::size_t column, std::size_t band) const {
        const std::uint32_t alpha = AlphaBand(band);
        if (alpha == BandWeighing::kNoBand) return 1;
        const std::size_t at = column * bands + alpha;
        return (MaskAt(row, at) & kInvalidBit) != 0 ? 0 : AlphaOf(source.rows[row][at]);
    }

    void Mend(std::size_t x, std::size_t band) {
        const std::size_t at = x * bands + band;
        if (weighing.hidden && outMask) {
            unsigned shown = 0;
            unsigned valid = 0;
            VisitOwn(x, band, [&](const T&, unsigned char mask) {
                shown += (mask & kHiddenBit) == 0 ? 1 : 0;
                valid += (mask & (kHiddenBit | kInvalidBit)) == 0 ? 1 : 0;
            });
            if (shown == 0) {
                outMask[at] |= kHiddenBit;
                return LeaveUnweighed(x, band);
            }
            if (valid == 0) {
                out[at] = InvalidValue(Rule(band));
                outMask[at] |= kInvalidBit;
            }
        }
        if (outMask && (outMask[at] & kInvalidBit) != 0) return;
        const Taps<T> gathered = Gather(x, band);
        if (const ColorIndex* const colors = Colors(band))
            MendIndex(x, band, gathered, *colors);
        else if (!gathered.alike)
            MendQuantity(x, band, gathered);
    }

    void MendQuantity(std::size_t x, std::size_t band, const Taps<T>& gathered) {
        std::optional<Rounded<T>> result;
        if (gathered.count > 0) result = method.result(gathered);
        if (!result) return LeaveUnweighed(x, band);
        out[x * bands + band] = KeptValid(*result, Rule(band));
    }

    void MendIndex(std::size_t x, std::size_t band, const Taps<T>& gathered,
                   const ColorIndex& colors) {
        if (gathered.count == 0) return LeaveUnweighed(x, band);
        T& result = out[x * bands + band];
        const T& first = gathered.all[0].value;
        if (std::all_of(gathered.begin(), gathered.end(),
                        [&](const Tap<T>& tap) { return tap.value == first; })) {
            result = first;
            return;
        }
        const auto color = method.mixed(gathered, colors);
        const auto nearest = color ? colors.Nearest(*color) : std::nullopt;
        if (!nearest)
            return TakeFirst(x, band, weighing.hidden ? kInvalidBit | kHiddenBit : kInvalidBit);
        if constexpr (!zelm::kIsComplex<T>) result = static_cast<T>(*nearest);
    }

    // A cell whose taps weigh nothing keeps what it has, unless its band has a value for that.
    void LeaveUnweighed(std::size_t x, std::size_t band) {
        const std::size_t at = x * bands + band;
        const zelm::NoDataRule<T> rule = Rule(band);
        if (rule.hasValue) {
            out[at] = rule.value;
            if (outMask) outMask[at] |= kInvalidBit;
        } else if (Colors(band)) {
            TakeFirst(x, band, kInvalidBit);
        }
    }

    // The first of the cell's own samples without one of these bits; a mean of indices is none.
    void TakeFirst(std::size_t x, std::size_t band, int bits) {
        bool found = false;
        VisitOwn(x, band, [&](const T& sample, unsigned char mask) {
            if (found || (mask & bits) != 0) return;
            out[x * bands + band] = sample;
            found = true;
        });
    }

    const WeighingMethod<T>& method;
    const int taps;  // of a row
    const int halo;
    const std::size_t bands;
    const std::uint32_t width;
    const ReductionRows<T>& source;
    const zelm::NoDataRule<T>* const noData;
    const Weighing& weighing;
    T* const out;
    unsigned char* const outMask;
};

}  // namespace

bool Weighing::Any() const {
    return hidden || std::any_of(bands.begin(), bands.end(), [](const BandWeighing& band) {
               return band.alpha != BandWeighing::kNoBand || band.colors;
           });
}

template <class T>
void WeighRow(Resampling method, std::uint32_t bands, std::uint32_t sourceWidth,
              const ReductionRows<T>& source, const zelm::NoDataRule<T>* noData,
              const Weighing& weighing, T* out, unsigned char* outMask) {
    if (const WeighingMethod<T>* const chosen = MethodOf<T>(method))
        RowWeigher<T>(*chosen, bands, sourceWidth, source, noData, weighing, out, outMask).Run();
}

#define ZMC_X(type, name, code)                                                                  \
    template void WeighRow(Resampling, std::uint32_t, std::uint32_t, const ReductionRows<type>&, \
                           const zelm::NoDataRule<type>*, const Weighing&, type*, unsigned char*);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
