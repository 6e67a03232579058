// Masks of every shape, one after another, against the rule in words: all element types,
// interleaves and shares of bands with a value, widths around those of vectors, and more bands than
// any loop takes at once.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <vector>

#include "core/NumericConversion.h"
#include "dispatch/NoDataMask.h"
#include "tests/dispatch/MarkedSample.h"
#include "tests/dispatch/PropsReader.h"
#include "tests/support/ElementTypeList.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;
using zmctest::IsMarked;
namespace {

// Which bands have a no-data value, and which.
enum class Values { None, Same, Different, SomeSame, SomeDifferent };
constexpr Values kValues[] = {Values::None, Values::Same, Values::Different, Values::SomeSame,
                              Values::SomeDifferent};

bool HasValue(Values values, std::size_t band) {
    switch (values) {
        case Values::None:
            return false;
        case Values::SomeSame:
        case Values::SomeDifferent:
            return band % 3 != 1;
        default:
            return true;
    }
}

double Value(Values values, std::size_t band) {
    const bool same = values == Values::Same || values == Values::SomeSame;
    return same ? 2.0 : static_cast<double>(1 + band % 5);
}

template <class Real>
Real RealSample(std::size_t number) {
    constexpr Real kSpecial[] = {std::numeric_limits<Real>::quiet_NaN(),
                                 std::numeric_limits<Real>::infinity(),
                                 -std::numeric_limits<Real>::infinity()};
    return number % 11 == 0 ? kSpecial[number / 11 % 3] : static_cast<Real>(number * 7 % 6);
}

// Values from 0 to 5, and for the types that have them the ones that are not finite.
template <class T>
T SampleAt(std::size_t number) {
    if constexpr (kIsComplex<T>) {
        using Part = decltype(T::re);
        return T(RealSample<Part>(number),
                 number % 5 != 0 ? Part{0} : RealSample<Part>(number / 5));
    } else if constexpr (std::is_floating_point_v<T>) {
        return RealSample<T>(number);
    } else {
        return static_cast<T>(number * 7 % 6);
    }
}

template <class T>
class Tile {
public:
    Tile(std::int32_t layout, const Box& shape, Values noData)
        : interleave(layout),
          box(shape),
          values(noData),
          reader(PropsReader<T>(layout, static_cast<std::uint32_t>(shape.bands))),
          pixels(shape.Elements(layout) + 2 * kGuard),
          mask(pixels.size()) {
        for (std::uint32_t b = 0; b < box.bands; ++b)
            if (HasValue(values, b)) reader.props.SetNoDataValue(b, Value(values, b));
        for (std::size_t i = 0; i < pixels.size(); ++i) pixels[i] = SampleAt<T>(i);
        for (std::size_t i = 0; i < mask.size(); ++i)
            mask[i] = static_cast<unsigned char>(i * 37 + i / 7);
    }

    void ExpectMarks() {
        auto expected = mask;
        ForEach([&](std::size_t b, std::size_t at) {
            const bool marked = IsMarked<T>(pixels[at], HasValue(values, b), ValueOf(b));
            expected[at] = static_cast<unsigned char>((expected[at] & 0xFE) | (marked ? 1 : 0));
        });
        const auto kept = pixels;
        ComputeNoDataMask<T>(reader, Size(box.width), Size(box.height), Size(box.bands),
                             pixels.data() + kGuard, mask.data() + kGuard);
        EXPECT_EQ(mask, expected);
        EXPECT_TRUE(SameBits(pixels, kept));
    }

    void ExpectStamps() {
        auto expected = pixels;
        ForEach([&](std::size_t b, std::size_t at) {
            if (HasValue(values, b) && (mask[at] & 1) != 0) expected[at] = ValueOf(b);
        });
        const auto kept = mask;
        ApplyNoDataMask<T>(reader, Size(box.width), Size(box.height), Size(box.bands),
                           pixels.data() + kGuard, mask.data() + kGuard);
        EXPECT_TRUE(SameBits(pixels, expected));
        EXPECT_EQ(mask, kept);
    }

private:
    static constexpr std::size_t kGuard = 16;
    std::int32_t interleave;
    Box box;
    Values values;
    ReaderRasterMemory<T> reader;
    std::vector<T> pixels;
    std::vector<unsigned char> mask;

    static std::uint32_t Size(std::size_t size) { return static_cast<std::uint32_t>(size); }
    T ValueOf(std::size_t band) const { return FromDouble<T>(Value(values, band)); }

    template <class Visit>
    void ForEach(Visit&& visit) const {
        const std::size_t bands = interleave == Interleave::None ? 1 : box.bands;
        for (std::size_t b = 0; b < bands; ++b)
            for (std::size_t l = 0; l < box.height; ++l)
                for (std::size_t s = 0; s < box.width; ++s)
                    visit(b, kGuard + box.Index(interleave, b, l, s));
    }
};

template <class T>
class NoDataMaskShapes : public ::testing::Test {
protected:
    static void ExpectAll(const Box& box) {
        for (const std::int32_t interleave : kInterleaves) {
            for (const Values values : kValues) {
                SCOPED_TRACE(::testing::Message() << box.width << " x " << box.height << " x "
                                                  << box.bands << ", interleave " << interleave
                                                  << ", values " << static_cast<int>(values));
                Tile<T>(interleave, box, values).ExpectMarks();
                Tile<T>(interleave, box, values).ExpectStamps();
            }
        }
    }
};

TYPED_TEST_SUITE(NoDataMaskShapes, AllElementTypes, ElementTypeNames);

TYPED_TEST(NoDataMaskShapes, WidthsAroundThoseOfVectors) {
    for (const std::size_t width : {1u, 2u, 3u, 7u, 8u, 9u, 15u, 16u, 17u, 31u, 33u, 63u, 65u})
        for (const std::size_t bands : {1u, 2u, 3u, 4u, 7u}) this->ExpectAll({width, 3, bands});
}

// Rules repeat over as many pixels as fit: tiles of less than one repetition and of several.
TYPED_TEST(NoDataMaskShapes, TilesAroundTheRepetitionOfRules) {
    for (const std::size_t pixels : {15u, 17u, 256u, 257u, 1366u, 4099u})
        for (const std::size_t bands : {3u, 16u, 17u}) this->ExpectAll({pixels, 1, bands});
}

// Bands that do not fit together are taken in several goes, with as few as one in the last.
TYPED_TEST(NoDataMaskShapes, MoreBandsThanAreTakenAtOnce) {
    for (const std::size_t bands : {256u, 257u, 513u, 1025u, 2049u, 4097u})
        this->ExpectAll({2, 2, bands});
}

TYPED_TEST(NoDataMaskShapes, BandsLeftOverThatAreAsManyAsABlock) {
    for (const std::size_t bands : {259u, 560u, 1072u, 2096u, 4144u})
        this->ExpectAll({2, 2, bands});
}

TYPED_TEST(NoDataMaskShapes, NoBandsLeaveBothBuffersAlone) {
    using T = TypeParam;
    for (const std::int32_t interleave : {Interleave::BIP, Interleave::BIL, Interleave::BSQ}) {
        const auto reader = PropsReader<T>(interleave);
        std::vector<T> pixels(4, SampleAt<T>(0));
        const auto kept = pixels;
        std::vector<unsigned char> mask{0, 1, 2, 3};
        ComputeNoDataMask<T>(reader, 2, 2, 0, pixels.data(), mask.data());
        ApplyNoDataMask<T>(reader, 2, 2, 0, pixels.data(), mask.data());
        EXPECT_EQ(mask, (std::vector<unsigned char>{0, 1, 2, 3}));
        EXPECT_TRUE(SameBits(pixels, kept));
    }
}

TYPED_TEST(NoDataMaskShapes, NullBuffersAreIgnored) {
    using T = TypeParam;
    for (const std::int32_t interleave : kInterleaves) {
        const auto reader = PropsReader<T>(interleave, 2);
        std::vector<T> pixels(4);
        std::vector<unsigned char> mask(4, 1);
        ComputeNoDataMask<T>(reader, 2, 1, 2, nullptr, mask.data());
        ComputeNoDataMask<T>(reader, 2, 1, 2, pixels.data(), nullptr);
        ApplyNoDataMask<T>(reader, 2, 1, 2, nullptr, mask.data());
        ApplyNoDataMask<T>(reader, 2, 1, 2, pixels.data(), nullptr);
        EXPECT_EQ(mask, std::vector<unsigned char>(4, 1));
        EXPECT_TRUE(SameBits(pixels, std::vector<T>(4)));
    }
}

}  // namespace
}  // namespace zmctest
