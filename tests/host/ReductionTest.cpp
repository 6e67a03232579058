#include "host/reduce/Reduction.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <bit>
#include <cstring>
#include <vector>

#include "core/ElementTypes.h"
#include "host/reduce/ReductionWindow.h"
#include "tests/host/AnyPicture.h"
#include "tests/host/NaiveReduction.h"
#include "tests/support/Sanitizers.h"

namespace {

using naive::AnyPicture;
using naive::AnySample;
using naive::MaskKind;
using naive::Picture;
using naive::Random;
using naive::SameBits;
using zelm::NoDataRule;
using zmchost::Resampling;

constexpr Resampling kAll[] = {Resampling::Nearest, Resampling::Average,  Resampling::Rms,
                               Resampling::Mode,    Resampling::Minimum,  Resampling::Maximum,
                               Resampling::Median,  Resampling::Bilinear, Resampling::Cubic,
                               Resampling::Lanczos, Resampling::Gauss,    Resampling::CubicSpline};

template <class T>
constexpr T kUntouched = T(77);
template <class P>
constexpr zelm::Complex<P> kUntouched<zelm::Complex<P>> = {77, 77};

template <class T>
struct Reduced {
    std::vector<T> out;
    std::vector<unsigned char> mask;
};

template <class T>
Reduced<T> Reduce(Resampling method, const Picture<T>& picture,
                  const std::vector<NoDataRule<T>>& rules) {
    std::vector<const T*> rows;
    std::vector<const unsigned char*> masks;
    for (const auto& row : picture.rows) rows.push_back(row.empty() ? nullptr : row.data());
    for (const auto& mask : picture.masks) masks.push_back(mask.empty() ? nullptr : mask.data());
    Reduced<T> result;
    const std::size_t samples = std::size_t{picture.width / 2} * picture.bands;
    result.out.resize(samples + 1, kUntouched<T>);
    result.mask.resize(samples + 1, 0xAA);
    zmchost::ReduceRow<T>(
        method, picture.bands, picture.width, {rows.data(), masks.empty() ? nullptr : masks.data()},
        rules.empty() ? nullptr : rules.data(), result.out.data(), result.mask.data());
    EXPECT_TRUE(result.out.back() == kUntouched<T>) << "written behind the row";
    EXPECT_EQ(result.mask.back(), 0xAA) << "written behind the mask";
    result.out.pop_back();
    result.mask.pop_back();
    return result;
}

// A picture of one cell, the usual way to ask for one result.
template <class T>
Picture<T> OneCell(std::vector<T> upper, std::vector<T> lower) {
    return {1, 2, 0, {std::move(upper), std::move(lower)}, {}};
}

template <class T>
T ReduceOne(Resampling method, T a, T b, T c, T d) {
    return Reduce<T>(method, OneCell<T>({a, b}, {c, d}), {}).out[0];
}

// Integers: the result must be the one exact rounding, moved aside where the rule says.
template <class T>
void ExpectComputed(Resampling method, const Picture<T>& picture, std::uint32_t x,
                    std::uint32_t band, const NoDataRule<T>& rule, T result) {
    if constexpr (std::is_integral_v<T>) {
        const auto exact =
            naive::ExactPart<T>(method, picture, x, band, [](T value) { return value; });
        T expected = naive::RoundInteger<T>(exact);
        if (rule.hasValue && expected == rule.value) {
            const bool below = exact.dividend < zmchost::Int128{expected} * exact.divisor;
            const bool up = expected == std::numeric_limits<T>::min() ||
                            (!below && expected != std::numeric_limits<T>::max());
            expected = static_cast<T>(up ? expected + 1 : expected - 1);
        }
        ASSERT_EQ(result, expected) << "cell " << x << " band " << band;
    } else if constexpr (std::is_floating_point_v<T>) {
        const auto exact =
            naive::ExactPart<T>(method, picture, x, band, [](T value) { return value; });
        const long double quotient = exact.dividend / exact.divisor;
        // Two values away at most: one for rounding, one for moving aside; and what cancels out.
        long double largest = std::abs(quotient);
        for (const auto& row : picture.rows)
            for (const T value : row)
                if (std::isfinite(value)) largest = std::max<long double>(largest, std::abs(value));
        const long double unit = std::numeric_limits<T>::epsilon();
        ASSERT_NEAR(static_cast<double>(result - quotient), 0.0,
                    static_cast<double>(std::abs(quotient) * unit + largest * unit * 0x1p-8L +
                                        std::numeric_limits<T>::denorm_min()))
            << "cell " << x << " band " << band;
        ASSERT_FALSE(rule.hasValue && result == rule.value);
    } else {
        using P = decltype(T::re);
        const auto close = [&](P found, naive::Fraction<P> exact) {
            // The parts of samples are whole numbers from -4 to 4.
            ASSERT_NEAR(static_cast<double>(found - exact.dividend / exact.divisor), 0.0,
                        8 * static_cast<double>(std::numeric_limits<P>::epsilon()));
        };
        close(result.re, naive::ExactPart<P>(method, picture, x, band, [](T v) { return v.re; }));
        close(result.im, naive::ExactPart<P>(method, picture, x, band, [](T v) { return v.im; }));
        ASSERT_FALSE(rule.hasValue && result == rule.value);
    }
}

template <class T>
void ExpectInvalid(const NoDataRule<T>& rule, T result) {
    if (rule.hasValue) {
        ASSERT_TRUE(SameBits(result, rule.value));
    } else if constexpr (zelm::kIsComplex<T>) {
        ASSERT_TRUE(std::isnan(result.re) && std::isnan(result.im));
    } else if constexpr (std::is_floating_point_v<T>) {
        ASSERT_TRUE(std::isnan(result));
    } else {
        ASSERT_EQ(result, 0);
    }
}

template <class T>
void CheckPicture(Resampling method, const Picture<T>& picture,
                  const std::vector<NoDataRule<T>>& rules) {
    const Reduced<T> reduced = Reduce(method, picture, rules);
    for (std::uint32_t x = 0; x < picture.width / 2; ++x) {
        for (std::uint32_t band = 0; band < picture.bands; ++band) {
            const std::size_t at = picture.Index(x, band);
            const std::vector<T> values = naive::CellValues(picture, x, band);
            ASSERT_EQ(reduced.mask[at], values.empty() ? 1 : 0);
            if (values.empty()) {
                ExpectInvalid(rules[band], reduced.out[at]);
            } else if (naive::Computed(method)) {
                ExpectComputed(method, picture, x, band, rules[band], reduced.out[at]);
            } else if (method != Resampling::Rms) {  // which has tests of its own
                ASSERT_TRUE(reduced.out[at] == naive::Picked(method, values)) << "cell " << x;
            }
            if (::testing::Test::HasFatalFailure()) return;
        }
    }
}

template <class T>
void CheckMethod(Resampling method) {
    Random random(42);
    const std::uint32_t halo = zmchost::ReductionHalo(method);
    for (const MaskKind kind :
         {MaskKind::None, MaskKind::Clear, MaskKind::Noise, MaskKind::Runs, MaskKind::Full}) {
        for (int round = 0; round < zmctest::WithSanitizers(4, 12); ++round) {
            const std::uint32_t bands = 1 + static_cast<std::uint32_t>(random() % 5);
            const bool wide = round == 0 && halo <= 1;
            const std::uint32_t width =
                wide ? 2500 : static_cast<std::uint32_t>(random() % (halo > 1 ? 50 : 200));
            const bool extreme = round % 2 == 1 && !zelm::kIsComplex<T>;
            std::vector<NoDataRule<T>> rules(bands);
            for (NoDataRule<T>& rule : rules) {
                rule.hasValue = random() % 4 != 0;
                rule.value = AnySample<T>(random, extreme);
            }
            CheckPicture(method, AnyPicture<T>(random, halo, bands, width, kind, rules, extreme),
                         rules);
            if (::testing::Test::HasFatalFailure()) {
                ADD_FAILURE() << zmchost::ResamplingName(method) << ", "
                              << zelm::ElementTraits<T>::word << ", masks "
                              << static_cast<int>(kind) << ", round " << round;
                return;
            }
        }
    }
}

class ReductionModel : public ::testing::TestWithParam<std::uint32_t> {};

TEST_P(ReductionModel, EveryMethodAgreesWithThePlainDefinition) {
    zelm::VisitElementType(GetParam(), []<class T>(std::type_identity<T>) {
        for (const Resampling method : kAll) {
            if (zmchost::SupportsElementType(method, zelm::ElementTraits<T>::code))
                CheckMethod<T>(method);
        }
    });
}

// Constant pictures, among them values with all digits, at borders and with holes.
template <class T>
void CheckConstants() {
    Random random(7);
    for (const Resampling method : kAll) {
        if (!zmchost::SupportsElementType(method, zelm::ElementTraits<T>::code)) continue;
        for (int round = 0; round < 20; ++round) {
            const std::uint32_t halo = zmchost::ReductionHalo(method);
            const auto kind = round % 2 == 0 ? MaskKind::None : MaskKind::Noise;
            auto picture =
                AnyPicture<T>(random, halo, 2, 61, kind, std::vector<NoDataRule<T>>(2), true);
            T constant = AnySample<T>(random, true);
            if constexpr (std::is_signed_v<T> && std::is_integral_v<T>) {
                // Its root of squares is one more than the type holds.
                if (method == Resampling::Rms && constant < 0) constant = static_cast<T>(~constant);
            }
            if constexpr (std::is_floating_point_v<T>) {
                if (method == Resampling::Rms) constant = std::abs(constant);
            }
            for (auto& row : picture.rows) std::fill(row.begin(), row.end(), constant);
            const Reduced<T> reduced = Reduce<T>(method, picture, {});
            for (std::size_t i = 0; i < reduced.out.size(); ++i) {
                if (reduced.mask[i] == 0) {
                    ASSERT_TRUE(reduced.out[i] == constant)
                        << zmchost::ResamplingName(method) << " " << zelm::ElementTraits<T>::word;
                }
            }
        }
    }
}

TEST_P(ReductionModel, ConstantStaysConstant) {
    zelm::VisitElementType(GetParam(), []<class T>(std::type_identity<T>) { CheckConstants<T>(); });
}

#define ZMC_X(type, name, code) +1
constexpr std::size_t kTypes = 0 ZMC_ELEMENT_TYPES(ZMC_X);
#undef ZMC_X
#define ZMC_X(type, name, code) code,
constexpr std::array<std::uint32_t, kTypes> kCodes = {ZMC_ELEMENT_TYPES(ZMC_X)};
#undef ZMC_X
INSTANTIATE_TEST_SUITE_P(Types, ReductionModel, ::testing::ValuesIn(kCodes),
                         [](const auto& code) { return "Code" + std::to_string(code.param); });

TEST(Reduction, WordsAndNamesAgree) {
    for (const Resampling method : kAll)
        EXPECT_EQ(zmchost::ParseResampling(zmchost::ResamplingName(method)), method);
    EXPECT_FALSE(zmchost::ParseResampling("Average"));
    EXPECT_FALSE(zmchost::ParseResampling(""));
    EXPECT_FALSE(zmchost::ParseResampling("bicubic"));
}

TEST(Reduction, ComplexTypesKnowTheLinearMethodsAndNearest) {
    int supported = 0;
    for (const Resampling method : kAll) {
        supported += zmchost::SupportsElementType(method, zelm::PixelTypeCode::ComplexDouble);
        EXPECT_TRUE(zmchost::SupportsElementType(method, zelm::PixelTypeCode::UInt64));
        EXPECT_FALSE(zmchost::SupportsElementType(method, 7));
    }
    EXPECT_EQ(supported, 7);
}

TEST(Reduction, UnsupportedMethodWritesNothing) {
    using C = zelm::Complex<float>;
    const auto reduced =
        Reduce<C>(Resampling::Median, OneCell<C>({{1, 1}, {2, 2}}, {{3, 3}, {4, 4}}), {});
    EXPECT_TRUE(reduced.out[0] == kUntouched<C>);
    EXPECT_EQ(reduced.mask[0], 0xAA);
}

TEST(Reduction, WeightsAreThoseOfTheKernels) {
    const auto check = []<class Kernel>(Kernel, Resampling method) {
        std::int64_t total = 0;
        for (int i = 0; i < Kernel::kReach; ++i) {
            EXPECT_EQ(Kernel::kWeights[i], naive::TapWeight(method, i)) << i;
            total += 2 * Kernel::kWeights[i];
        }
        EXPECT_EQ(total, naive::Whole(method));
        EXPECT_EQ(zmchost::kWholeWeight<Kernel>, total * total);
        EXPECT_LE(total, std::int64_t{1} << Kernel::kShift);
        EXPECT_EQ(zmchost::ReductionHalo(method), Kernel::kReach - 1);
    };
    check(zmchost::BilinearKernel{}, Resampling::Bilinear);
    check(zmchost::CubicKernel{}, Resampling::Cubic);
    check(zmchost::LanczosKernel{}, Resampling::Lanczos);
    check(zmchost::CubicSplineKernel{}, Resampling::CubicSpline);
}

// As GDAL places it: the taps of cell x are the columns 2x, 2x + 1 and 2x + 2.
TEST(Reduction, GaussStandsAroundTheSecondSampleOfTheCell) {
    Picture<short> picture{1, 6, 1, {}, {}};
    picture.rows = {
        {9, 9, 9, 9, 9, 9}, {160, 0, 0, 16, 0, 0}, {0, 0, 0, 0, 0, 0}, {0, 0, 0, 0, 0, 64}};
    // Rows weigh 0 1 2 1, and the last cell has two columns of 1 2.
    EXPECT_THAT(Reduce<short>(Resampling::Gauss, picture, {}).out,
                ::testing::ElementsAre(10, 2, 11));
    picture.rows[3].clear();
    EXPECT_THAT(Reduce<short>(Resampling::Gauss, picture, {}).out,
                ::testing::ElementsAre(13, 3, 0));
}

TEST(Reduction, SplineOfAnImpulseIsItsWeights) {
    Picture<int> picture{1, 16, 3, {}, {}};
    picture.rows.assign(8, std::vector<int>(16, 0));
    picture.rows[3][7] = 768 * 768;
    EXPECT_THAT(Reduce<int>(Resampling::CubicSpline, picture, {}).out,
                ::testing::ElementsAre(0, 0, 235 * 27, 235 * 235, 235 * 121, 235, 0, 0));
}

TEST(Reduction, AverageRoundsHalfAwayFromZero) {
    EXPECT_EQ(ReduceOne<unsigned char>(Resampling::Average, 0, 0, 1, 1), 1);
    EXPECT_EQ(ReduceOne<unsigned char>(Resampling::Average, 0, 0, 0, 1), 0);
    EXPECT_EQ(ReduceOne<char>(Resampling::Average, 0, 0, -1, -1), -1);
    EXPECT_EQ(ReduceOne<char>(Resampling::Average, 0, 0, 0, -1), 0);
    EXPECT_EQ(ReduceOne<short>(Resampling::Average, -32768, -32768, -32768, -32767), -32768);
    EXPECT_EQ(ReduceOne<std::int64_t>(Resampling::Average, 0, 0, -3, -3), -2);
}

TEST(Reduction, SixtyFourBitAveragesDoNotOverflow) {
    constexpr auto top = std::numeric_limits<std::uint64_t>::max();
    constexpr auto low = std::numeric_limits<std::int64_t>::min();
    EXPECT_EQ(ReduceOne<std::uint64_t>(Resampling::Average, top, top, top, top - 1), top);
    EXPECT_EQ(ReduceOne<std::uint64_t>(Resampling::Average, top, top, top - 2, top - 4), top - 1);
    EXPECT_EQ(ReduceOne<std::int64_t>(Resampling::Average, low, low, low, low), low);
    EXPECT_EQ(ReduceOne<std::int64_t>(Resampling::Average, low, low, low + 3, low), low + 1);
    EXPECT_EQ(ReduceOne<std::int64_t>(Resampling::Average, low, std::int64_t{-1} - low, low,
                                      std::int64_t{-1} - low),
              -1);
}

TEST(Reduction, LargestFloatsAverageWithoutOverflow) {
    constexpr double d = std::numeric_limits<double>::max();
    constexpr float f = std::numeric_limits<float>::max();
    EXPECT_EQ(ReduceOne<double>(Resampling::Average, d, d, d, d), d);
    EXPECT_EQ(ReduceOne<float>(Resampling::Average, -f, -f, -f, -f), -f);
    EXPECT_EQ(ReduceOne<double>(Resampling::Rms, d, -d, d, d), d);
    constexpr double tiny = std::numeric_limits<double>::denorm_min();
    EXPECT_EQ(ReduceOne<double>(Resampling::Average, tiny, tiny, tiny, tiny), tiny);
    EXPECT_EQ(ReduceOne<double>(Resampling::Rms, tiny, tiny, tiny, tiny), tiny);
}

// Kernels with negative weights overshoot beside an edge; the results stay in the type.
TEST(Reduction, OvershootIsClamped) {
    for (const Resampling method : {Resampling::Cubic, Resampling::Lanczos}) {
        const std::uint32_t halo = zmchost::ReductionHalo(method);
        Picture<std::int64_t> picture{1, 64, halo, {}, {}};
        std::vector<std::int64_t> row(64, std::numeric_limits<std::int64_t>::min());
        std::fill(row.begin() + 31, row.end(), std::numeric_limits<std::int64_t>::max());
        picture.rows.assign(2 + 2 * halo, row);
        const auto reduced = Reduce<std::int64_t>(method, picture, {});
        EXPECT_THAT(reduced.out, ::testing::Contains(std::numeric_limits<std::int64_t>::max()));
        EXPECT_THAT(reduced.out, ::testing::Contains(std::numeric_limits<std::int64_t>::min()));
        Picture<float> floats{1, 64, halo, {}, {}};
        std::vector<float> line(64, std::numeric_limits<float>::lowest());
        std::fill(line.begin() + 31, line.end(), std::numeric_limits<float>::max());
        floats.rows.assign(2 + 2 * halo, line);
        for (const float value : Reduce<float>(method, floats, {}).out)
            EXPECT_TRUE(std::isfinite(value));
    }
}

TEST(Reduction, ValidAreaDoesNotGrow) {
    for (const Resampling method : {Resampling::Bilinear, Resampling::Cubic, Resampling::Lanczos}) {
        const std::uint32_t halo = zmchost::ReductionHalo(method);
        Picture<short> picture{1, 40, halo, {}, {}};
        picture.rows.assign(2 + 2 * halo, std::vector<short>(40, 5));
        std::vector<unsigned char> mask(40, 0);
        std::fill(mask.begin() + 10, mask.begin() + 20, 1);
        picture.masks.assign(2 + 2 * halo, mask);
        const auto reduced = Reduce<short>(method, picture, {{true, -9}});
        for (std::size_t x = 0; x < 20; ++x) {
            EXPECT_EQ(reduced.mask[x], x >= 5 && x < 10 ? 1 : 0);
            EXPECT_EQ(reduced.out[x], x >= 5 && x < 10 ? -9 : 5);
        }
    }
}

TEST(Reduction, MarkedSamplesOfAnyValueDoNotCount) {
    Picture<float> picture = OneCell<float>({NAN, 4}, {INFINITY, 8});
    picture.masks = {{1, 0}, {1, 0}};
    EXPECT_EQ(Reduce<float>(Resampling::Average, picture, {}).out[0], 6);
    EXPECT_EQ(Reduce<float>(Resampling::Median, picture, {}).out[0], 4);
    EXPECT_EQ(Reduce<float>(Resampling::Nearest, picture, {}).out[0], 4);
    EXPECT_EQ(Reduce<float>(Resampling::Maximum, picture, {}).out[0], 8);
}

TEST(Reduction, NoDataValueIsKeptBitForBit) {
    const auto payload = std::bit_cast<double>(std::uint64_t{0xFFF8000000001234});
    Picture<double> picture = OneCell<double>({1, 2}, {3, 4});
    picture.masks = {{1, 1}, {1, 1}};
    const auto reduced = Reduce<double>(Resampling::Average, picture, {{true, payload}});
    EXPECT_EQ(std::bit_cast<std::uint64_t>(reduced.out[0]), 0xFFF8000000001234u);
    EXPECT_EQ(reduced.mask[0], 1);
    const auto zero = Reduce<double>(Resampling::Average, picture, {{true, -0.0}});
    EXPECT_TRUE(std::signbit(zero.out[0]));
}

template <class T>
T MovedAverage(T a, T b, T c, T d, T noData) {
    return Reduce<T>(Resampling::Average, OneCell<T>({a, b}, {c, d}), {{true, noData}}).out[0];
}

TEST(Reduction, ResultThatReadsAsNoDataMovesTowardsTheUnroundedOne) {
    EXPECT_EQ(MovedAverage<unsigned char>(1, 3, 1, 3, 2), 3);  // exact: upwards
    EXPECT_EQ(MovedAverage<unsigned char>(1, 1, 3, 4, 2), 3);  // 2.25
    EXPECT_EQ(MovedAverage<unsigned char>(1, 1, 1, 4, 2), 1);  // 1.75
    EXPECT_EQ(MovedAverage<unsigned char>(255, 255, 255, 254, 255), 254);
    EXPECT_EQ(MovedAverage<char>(-128, -128, -128, -127, -128), -127);
    EXPECT_EQ(MovedAverage<unsigned char>(0, 0, 0, 1, 0), 1);
    EXPECT_EQ(MovedAverage<float>(-1, 1, -2, 2, 0), std::numeric_limits<float>::denorm_min());
    EXPECT_EQ(MovedAverage<double>(1, 3, 1, 3, 2), std::nextafter(2.0, 3.0));
    constexpr float top = std::numeric_limits<float>::max();
    EXPECT_EQ(MovedAverage<float>(top, top, top, top, top), std::nextafter(top, 0.0F));
    using C = zelm::Complex<double>;
    const C moved = MovedAverage<C>({1, 1}, {3, 3}, {1, 1}, {3, 3}, {2, 2});
    EXPECT_TRUE(moved == C(std::nextafter(2.0, 3.0), 2));
}

TEST(Reduction, OddLastColumnBelongsToNoCellButIsTapped) {
    Picture<unsigned char> narrow{1, 3, 0, {{1, 1, 200}, {1, 1, 200}}, {}};
    EXPECT_THAT(Reduce<unsigned char>(Resampling::Maximum, narrow, {}).out,
                ::testing::ElementsAre(1));
    Picture<unsigned char> tapped{1, 3, 1, {{}, {0, 0, 70}, {0, 0, 70}, {}}, {}};
    // Weights 3 3 1 along the row.
    EXPECT_THAT(Reduce<unsigned char>(Resampling::Bilinear, tapped, {}).out,
                ::testing::ElementsAre(10));
    // 1 2 1.
    EXPECT_THAT(Reduce<unsigned char>(Resampling::Gauss, tapped, {}).out,
                ::testing::ElementsAre(18));
}

TEST(Reduction, NarrowLevelsGiveNothing) {
    for (const Resampling method : kAll) {
        const std::uint32_t halo = zmchost::ReductionHalo(method);
        for (const std::uint32_t width : {0u, 1u}) {
            Picture<int> picture{3, width, halo, {}, {}};
            picture.rows.assign(2 + 2 * halo, std::vector<int>(3 * width, 1));
            EXPECT_TRUE(Reduce<int>(method, picture, {}).out.empty());
        }
    }
}

TEST(Reduction, OutMaskMayBeAbsent) {
    const short row[] = {1, 2, 3, 4};
    const short* rows[] = {row, row};
    short out[2] = {};
    zmchost::ReduceRow<short>(Resampling::Average, 1, 4, {rows, nullptr}, nullptr, out, nullptr);
    EXPECT_EQ(out[0], 2);
    EXPECT_EQ(out[1], 4);
}

}  // namespace
