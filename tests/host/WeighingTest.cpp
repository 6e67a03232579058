#include "host/reduce/Weighing.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>

#include "tests/host/AnyPicture.h"
#include "tests/host/NaiveWeighing.h"
#include "tests/host/Palettes.h"

namespace {

using naive::AnyPicture;
using naive::AnySample;
using naive::MaskKind;
using naive::Picture;
using naive::Random;
using naive::SameBits;
using zelm::NoDataRule;
using zmchost::BandWeighing;
using zmchost::ColorIndex;
using zmchost::Resampling;
using zmchost::Weighing;
using Colors = std::vector<naive::Color>;

template <class T>
struct Reduced {
    std::vector<T> plain, out;
    std::vector<unsigned char> plainMask, mask;
};

template <class T>
Reduced<T> Reduce(Resampling method, const Picture<T>& picture,
                  const std::vector<NoDataRule<T>>& rules, const Weighing& weighing) {
    std::vector<const T*> rows;
    std::vector<const unsigned char*> masks;
    for (const auto& row : picture.rows) rows.push_back(row.empty() ? nullptr : row.data());
    for (const auto& mask : picture.masks) masks.push_back(mask.empty() ? nullptr : mask.data());
    const zmchost::ReductionRows<T> source{rows.data(), masks.empty() ? nullptr : masks.data()};
    const NoDataRule<T>* const noData = rules.empty() ? nullptr : rules.data();
    Reduced<T> result;
    result.plain.resize(std::size_t{picture.width / 2} * picture.bands);
    result.plainMask.resize(result.plain.size());
    zmchost::ReduceRow<T>(method, picture.bands, picture.width, source, noData, result.plain.data(),
                          result.plainMask.data());
    result.out = result.plain;
    result.mask = result.plainMask;
    zmchost::WeighRow<T>(method, picture.bands, picture.width, source, noData, weighing,
                         result.out.data(), result.mask.data());
    return result;
}

// What is asked of one row, and what came out of it.
template <class T>
struct Case {
    Resampling method;
    const Picture<T>& picture;
    const std::vector<NoDataRule<T>>& rules;
    const Weighing& weighing;
    const Colors* colors;  // of all bands
    const Reduced<T>& reduced;
};

template <class T>
T InvalidSample(const NoDataRule<T>& rule) {
    if (rule.hasValue) return rule.value;
    if constexpr (zelm::kIsComplex<T>)
        return {std::numeric_limits<decltype(T::re)>::quiet_NaN(),
                std::numeric_limits<decltype(T::re)>::quiet_NaN()};
    else if constexpr (std::is_floating_point_v<T>)
        return std::numeric_limits<T>::quiet_NaN();
    else
        return 0;
}

template <class T>
class CellCheck {
public:
    using P = std::conditional_t<zelm::kIsComplex<T>, double, T>;
    using Tap = naive::WeighedTap<T, P>;

    CellCheck(const Case<T>& checked, std::uint32_t column, std::uint32_t bandNumber)
        : c(checked),
          x(column),
          band(bandNumber),
          at(checked.picture.Index(column, bandNumber)),
          rule(checked.rules[bandNumber]),
          result(checked.reduced.out[at]),
          plain(checked.reduced.plain[at]) {}

    void Run() {
        const bool invalid = c.reduced.plainMask[at] != 0;
        CountOwn();
        if (c.weighing.hidden && shown == 0) return ExpectUnweighed(2);
        if (invalid) return ExpectKept(1);
        if (c.weighing.hidden && seen == 0) {
            EXPECT_TRUE(SameBits(result, InvalidSample(rule)));
            EXPECT_EQ(c.reduced.mask[at], 1);
            return;
        }
        const int alpha =
            zelm::kIsComplex<T> || c.weighing.bands[band].alpha == BandWeighing::kNoBand
                ? -1
                : static_cast<int>(c.weighing.bands[band].alpha);
        for (const Tap& tap : naive::WeighedTaps<T, P>(c.method, c.picture, x, band, alpha)) {
            alike = alike && tap.alpha > 0 && (taps.empty() || tap.alpha == taps[0].alpha);
            if (tap.alpha > 0) taps.push_back(tap);
        }
        if (taps.empty()) return ExpectUnweighed(0);
        if (c.colors)
            ExpectIndex();
        else if (alike)
            ExpectKept(0);
        else
            ExpectWeighed();
    }

private:
    void CountOwn() {
        const int halo = static_cast<int>(c.picture.halo);
        for (int r = halo; r < halo + 2; ++r)
            for (std::uint32_t i = 2 * x; i < 2 * x + 2; ++i) {
                const bool hidden = c.picture.Hidden(r, i, band);
                const bool valid = c.picture.Valid(r, i, band);
                shown += hidden ? 0 : 1;
                seen += !hidden && valid ? 1 : 0;
                if (valid && !firstValid) firstValid = c.picture.At(r, i, band);
                if (valid && !hidden && !firstSeen) firstSeen = c.picture.At(r, i, band);
            }
    }

    void ExpectKept(int mask) {
        EXPECT_TRUE(SameBits(result, plain));
        EXPECT_EQ(c.reduced.mask[at], mask);
    }

    void ExpectUnweighed(int mask) {
        if (rule.hasValue) {
            EXPECT_TRUE(SameBits(result, rule.value));
            EXPECT_EQ(c.reduced.mask[at], mask | 1);
        } else {
            EXPECT_TRUE(SameBits(result, c.colors ? firstValid.value_or(plain) : plain));
            EXPECT_EQ(c.reduced.mask[at], mask | c.reduced.plainMask[at]);
        }
    }

    void ExpectIndex() {
        EXPECT_EQ(c.reduced.mask[at], 0);
        if constexpr (std::is_integral_v<T>) {
            T expected = taps[0].value;
            const bool one = std::all_of(taps.begin(), taps.end(), [&](const Tap& tap) {
                return tap.value == taps[0].value;
            });
            std::vector<bool> mayName;
            for (std::size_t i = 0; i < c.colors->size(); ++i)
                mayName.push_back(i <= std::uint64_t(std::numeric_limits<T>::max()) &&
                                  !(rule.hasValue && static_cast<T>(i) == rule.value));
            if (!one) {
                const auto index = naive::MixedIndex<T, P>(c.method, taps, *c.colors, mayName);
                expected = index ? static_cast<T>(*index) : *firstSeen;
            }
            EXPECT_EQ(result, expected);
        }
    }

    void ExpectWeighed() {
        using enum Resampling;
        if (c.method == Mode || c.method == Minimum || c.method == Maximum || c.method == Median)
            ExpectPicked();
        else if constexpr (zelm::kIsComplex<T>)
            ExpectComplexMean();
        else if (c.method == Rms)
            ExpectRoot();
        else
            ExpectMean();
    }

    void ExpectPicked() {
        EXPECT_EQ(c.reduced.mask[at], 0);
        if constexpr (!zelm::kIsComplex<T>) {
            std::vector<T> values;
            for (const Tap& tap : taps) values.push_back(tap.value);
            if (c.method != Resampling::Mode) {
                EXPECT_EQ(result, naive::Picked(c.method, values));
                return;
            }
            naive::Alpha<P> most = 0;
            T expected{};
            for (const Tap& tap : taps) {
                naive::Alpha<P> weight = 0;
                for (const Tap& other : taps)
                    if (other.value == tap.value) weight += other.alpha;
                if (weight > most) expected = tap.value;
                most = std::max(most, weight);
            }
            EXPECT_EQ(result, expected);
        }
    }

    template <class Number, class Value>
    naive::Quotient<Number> MeanOf(Value value) const {
        std::vector<naive::Term<Number>> terms;
        for (const Tap& tap : taps) terms.push_back({tap.kernel, tap.alpha, value(tap.value)});
        return naive::Mean<Number>(terms, naive::Thin<Number>(c.method, terms));
    }

    void ExpectMean() {
        const auto mean =
            MeanOf<P>([](const T& value) { return static_cast<naive::Alpha<P>>(value); });
        if (!mean.divisor.Positive()) return ExpectUnweighed(0);
        EXPECT_EQ(c.reduced.mask[at], 0);
        if constexpr (std::is_integral_v<T>) {
            const naive::Nearest nearest = naive::RoundBig(mean.dividend.value, mean.divisor.value);
            const zmchost::Int128 least = std::numeric_limits<T>::min();
            const zmchost::Int128 most = std::numeric_limits<T>::max();
            const zmchost::Int128 held = std::clamp(nearest.value, least, most);
            auto expected = static_cast<T>(held);
            const bool below =
                held > nearest.value || (held == nearest.value && nearest.direction < 0);
            if (rule.hasValue && expected == rule.value) {
                const bool up = held == least || (!below && held != most);
                expected = static_cast<T>(up ? expected + 1 : expected - 1);
            }
            EXPECT_EQ(result, expected);
        } else {
            ExpectNear(mean.dividend.value / mean.divisor.value);
        }
    }

    void ExpectNear(long double expected) {
        long double largest = std::abs(expected);
        for (const Tap& tap : taps)
            largest = std::max(largest, std::abs(static_cast<long double>(tap.value)));
        const long double unit = std::numeric_limits<T>::epsilon();
        EXPECT_LE(std::abs(static_cast<long double>(result) - expected),
                  std::abs(expected) * unit + largest * unit * 0x1p-8L +
                      std::numeric_limits<T>::denorm_min());
        EXPECT_FALSE(rule.hasValue && result == rule.value);
    }

    void ExpectRoot() {
        EXPECT_EQ(c.reduced.mask[at], 0);
        if constexpr (std::is_integral_v<T>) {
            zmchost::BigInteger squares, weights;
            for (const Tap& tap : taps) {
                const auto value = naive::Big(static_cast<zmchost::Int128>(tap.value));
                squares += naive::Big(tap.alpha) * value * value;
                weights += naive::Big(tap.alpha);
            }
            const auto four = naive::Big(4) * squares;
            const auto isRoot = [&](T root) {
                if (root < 0) return false;
                const auto wide = static_cast<zmchost::Int128>(root);
                const auto bound = [&](zmchost::Int128 twice) {
                    return naive::Big(twice) * naive::Big(twice) * weights;
                };
                const bool tall = root == std::numeric_limits<T>::max();
                return (root == 0 || !naive::Less(four, bound(2 * wide - 1))) &&
                       (tall || naive::Less(four, bound(2 * wide + 1)));
            };
            const bool moved = rule.hasValue && isRoot(rule.value) &&
                               (result == static_cast<T>(rule.value + 1) ||
                                result == static_cast<T>(rule.value - 1));
            EXPECT_TRUE(moved || isRoot(result));
            EXPECT_FALSE(rule.hasValue && result == rule.value);
        } else {
            long double squares = 0;
            long double weights = 0;
            for (const Tap& tap : taps) {
                squares += tap.alpha * tap.value * tap.value;
                weights += tap.alpha;
            }
            ExpectNear(std::sqrt(squares / weights));
        }
    }

    void ExpectComplexMean() {
        if constexpr (zelm::kIsComplex<T>) {
            const auto re = MeanOf<P>([](const T& v) { return static_cast<long double>(v.re); });
            const auto im = MeanOf<P>([](const T& v) { return static_cast<long double>(v.im); });
            const double unit = std::numeric_limits<decltype(T::re)>::epsilon();
            EXPECT_EQ(c.reduced.mask[at], 0);
            EXPECT_NEAR(result.re, static_cast<double>(re.dividend.value / re.divisor.value),
                        16 * unit);
            EXPECT_NEAR(result.im, static_cast<double>(im.dividend.value / im.divisor.value),
                        16 * unit);
        }
    }

    const Case<T>& c;
    std::uint32_t x, band;
    std::size_t at;
    NoDataRule<T> rule;
    T result, plain;
    int shown = 0, seen = 0;
    std::optional<T> firstValid, firstSeen;
    std::vector<Tap> taps;
    bool alike = true;
};

template <class T>
void CheckRow(const Case<T>& checked) {
    for (std::uint32_t x = 0; x < checked.picture.width / 2; ++x)
        for (std::uint32_t band = 0; band < checked.picture.bands; ++band) {
            CellCheck<T>(checked, x, band).Run();
            if (!::testing::Test::HasFailure()) continue;
            ADD_FAILURE() << zmchost::ResamplingName(checked.method) << ", "
                          << zelm::ElementTraits<T>::word << ", cell " << x << ", band " << band;
            return;
        }
}

// Stretches of one alpha, as pictures have them, between any others.
template <class T>
void SmoothAlpha(Random& random, Picture<T>& picture, std::uint32_t alpha) {
    const std::uint32_t from = static_cast<std::uint32_t>(random()) % (picture.width + 1);
    const T value = random() % 2 == 0 ? T{} : AnySample<T>(random, false);
    for (auto& row : picture.rows)
        for (std::uint32_t x = from; !row.empty() && x < picture.width; ++x)
            row[picture.Index(x, alpha)] = value;
}

template <class T>
struct Scene {
    Picture<T> picture;
    std::vector<NoDataRule<T>> rules;
    Weighing weighing;

    Scene(Random& random, Resampling method, int round) {
        const std::uint32_t bands = 1 + static_cast<std::uint32_t>(random() % 4);
        const std::uint32_t halo = zmchost::ReductionHalo(method);
        const auto width = static_cast<std::uint32_t>(random() % (halo > 1 ? 60 : 150));
        const bool extreme = round % 3 == 1 && !zelm::kIsComplex<T>;
        const auto kind = static_cast<MaskKind>(random() % 4);
        rules.resize(bands);
        for (NoDataRule<T>& rule : rules) {
            rule.hasValue = random() % 3 == 0;
            rule.value = AnySample<T>(random, extreme);
        }
        picture = AnyPicture<T>(random, halo, bands, width, kind, rules, extreme);
        weighing.bands.resize(bands);
        weighing.hidden = random() % 2 == 0;
        picture.hides = weighing.hidden;
        const unsigned char kept = random() % 2 == 0 ? 0xFF : 0xFD;
        for (auto& mask : picture.masks)
            for (std::size_t i = 0; i < mask.size(); ++i)
                if (i % 40 < 25) mask[i] &= kept;
        const auto alpha = static_cast<std::uint32_t>(random() % bands);
        if (random() % 2 == 0) SmoothAlpha(random, picture, alpha);
        for (std::uint32_t band = 0; band < bands; ++band)
            if (band != alpha && random() % 4 != 0) weighing.bands[band].alpha = alpha;
    }
};

class WeighingModel : public ::testing::TestWithParam<std::uint32_t> {};

TEST_P(WeighingModel, EveryMethodAgreesWithThePlainDefinition) {
    zelm::VisitElementType(GetParam(), []<class T>(std::type_identity<T>) {
        for (std::uint32_t code = 1; code < zmchost::kResamplings; ++code) {
            const auto method = static_cast<Resampling>(code);
            if (!zmchost::SupportsElementType(method, zelm::ElementTraits<T>::code)) continue;
            Random random(code);
            for (int round = 0; round < 16 && !::testing::Test::HasFailure(); ++round) {
                const Scene<T> scene(random, method, round);
                const auto reduced = Reduce(method, scene.picture, scene.rules, scene.weighing);
                CheckRow<T>({method, scene.picture, scene.rules, scene.weighing, nullptr, reduced});
            }
        }
    });
}

// Palettes of few and of many colours, of equal ones, with transparent ones, and shorter than the
// indices of the picture.
Colors AnyColors(Random& random, int round) {
    const std::size_t counts[] = {1, 3, 5, 200, 300};
    Colors colors(counts[round % 5]);
    const unsigned range = round % 2 == 0 ? 256 : 3;
    for (naive::Color& color : colors) {
        for (auto& part : color) part = static_cast<std::uint8_t>(random() % range);
        if (random() % 2 == 0) color[3] = random() % 2 == 0 ? 255 : 0;
    }
    return colors;
}

TEST_P(WeighingModel, PalettesAgreeWithThePlainDefinition) {
    zelm::VisitElementType(GetParam(), []<class T>(std::type_identity<T>) {
        if constexpr (std::is_integral_v<T>) {
            for (std::uint32_t code = 1; code < zmchost::kResamplings; ++code) {
                const auto method = static_cast<Resampling>(code);
                if (!zmchost::Computes(method)) continue;
                Random random(code);
                for (int round = 0; round < 15 && !::testing::Test::HasFailure(); ++round) {
                    Scene<T> scene(random, method, round);
                    const Colors colors = AnyColors(random, round);
                    const auto palette = zmctest::PaletteOf(colors);
                    for (std::uint32_t band = 0; band < scene.picture.bands; ++band) {
                        const NoDataRule<T> rule = scene.rules[band];
                        scene.weighing.bands[band].colors =
                            std::make_shared<ColorIndex>(*palette, [rule](std::uint32_t i) {
                                return i <= std::uint64_t(std::numeric_limits<T>::max()) &&
                                       !(rule.hasValue && static_cast<T>(i) == rule.value);
                            });
                    }
                    const auto reduced = Reduce(method, scene.picture, scene.rules, scene.weighing);
                    CheckRow<T>(
                        {method, scene.picture, scene.rules, scene.weighing, &colors, reduced});
                }
            }
        }
    });
}

#define ZMC_X(type, name, code) +1
constexpr std::size_t kTypes = 0 ZMC_ELEMENT_TYPES(ZMC_X);
#undef ZMC_X
#define ZMC_X(type, name, code) code,
constexpr std::array<std::uint32_t, kTypes> kCodes = {ZMC_ELEMENT_TYPES(ZMC_X)};
#undef ZMC_X
INSTANTIATE_TEST_SUITE_P(Types, WeighingModel, ::testing::ValuesIn(kCodes),
                         [](const auto& code) { return "Code" + std::to_string(code.param); });

template <class T>
Weighing OneAlpha(std::uint32_t bands) {
    Weighing weighing;
    weighing.bands.resize(bands);
    for (std::uint32_t band = 0; band + 1 < bands; ++band) weighing.bands[band].alpha = bands - 1;
    return weighing;
}

// Columns of 200 beside transparent columns of 10.
TEST(Weighing, TransparentColoursLeaveNoRim) {
    for (const Resampling method :
         {Resampling::Average, Resampling::Rms, Resampling::Mode, Resampling::Minimum,
          Resampling::Median, Resampling::Bilinear, Resampling::Cubic, Resampling::Lanczos,
          Resampling::Gauss, Resampling::CubicSpline}) {
        const std::uint32_t halo = zmchost::ReductionHalo(method);
        Picture<unsigned char> picture{2, 80, halo, {}, {}};
        std::vector<unsigned char> row;
        for (int x = 0; x < 80; ++x) {
            row.push_back(x % 2 == 0 ? 200 : 10);
            row.push_back(x % 2 == 0 ? 255 : 0);
        }
        picture.rows.assign(2 + 2 * halo, row);
        const auto reduced = Reduce<unsigned char>(method, picture, {}, OneAlpha<unsigned char>(2));
        for (std::size_t i = 0; i < reduced.out.size(); i += 2)
            EXPECT_EQ(reduced.out[i], 200) << zmchost::ResamplingName(method);
    }
}

TEST(Weighing, NearestTakesTheSampleAsItIs) {
    Picture<unsigned char> picture{2, 2, 0, {{10, 0, 200, 255}, {200, 255, 200, 255}}, {}};
    picture.masks = {{2, 0, 0, 0}, {0, 0, 0, 0}};
    Weighing weighing = OneAlpha<unsigned char>(2);
    weighing.hidden = true;
    EXPECT_EQ(Reduce<unsigned char>(Resampling::Nearest, picture, {{}, {}}, weighing).out[0], 10);
}

TEST(Weighing, SixtyFourBitSamplesWithLargeWeightsAreExact) {
    constexpr auto top = std::numeric_limits<std::uint64_t>::max();
    const auto mean = [](std::uint64_t a, std::uint64_t wa, std::uint64_t b, std::uint64_t wb) {
        const Picture<std::uint64_t> picture{2, 2, 0, {{a, wa, b, wb}, {a, wa, b, wb}}, {}};
        return Reduce<std::uint64_t>(Resampling::Average, picture, {}, OneAlpha<std::uint64_t>(2))
            .out[0];
    };
    EXPECT_EQ(mean(top, 0xFFFFFFFE, top - 1, 1), top);
    EXPECT_EQ(mean(top, 1, top - 2, 2), top - 1);
    EXPECT_EQ(mean(0, 0xFFFFFFFF, top, 0xFFFFFFFE), 9223372035781033983u);
    // More than 2^32 - 1 weighs no more.
    EXPECT_EQ(mean(0, top, 100, 0xFFFFFFFF), 50u);
}

TEST(Weighing, NothingIsDoneWhereNothingWeighs) {
    Weighing weighing;
    weighing.bands.resize(3);
    EXPECT_FALSE(weighing.Any());
    weighing.bands[1].alpha = 2;
    EXPECT_TRUE(weighing.Any());
}

}  // namespace
