// Masks against a naive model that decides sample by sample, for every element type and interleave.
#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

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

// Few values, so that samples equal no-data values often, and all the special ones.
template <class Real>
Real RealSample(Random& random) {
    constexpr auto inf = std::numeric_limits<Real>::infinity();
    constexpr Real values[] = {0,
                               -Real{0},
                               1,
                               2,
                               -1,
                               std::numeric_limits<Real>::quiet_NaN(),
                               inf,
                               -inf,
                               std::numeric_limits<Real>::max(),
                               std::numeric_limits<Real>::denorm_min()};
    return values[random.Between(0, std::size(values) - 1)];
}

template <class T>
T SpecialSample(Random& random) {
    if constexpr (kIsComplex<T>) {
        using Part = decltype(T::re);
        return T(RealSample<Part>(random), random.OneIn(2) ? Part{0} : RealSample<Part>(random));
    } else if constexpr (std::is_floating_point_v<T>) {
        return RealSample<T>(random);
    } else {
        constexpr T values[] = {0, 1, 2, std::numeric_limits<T>::min(),
                                std::numeric_limits<T>::max()};
        return values[random.Between(0, std::size(values) - 1)];
    }
}

template <class T>
struct MaskCase {
    std::int32_t interleave;
    Box box;
    ReaderRasterMemory<T> reader;
    std::vector<T> pixels;
    std::vector<unsigned char> mask;

    explicit MaskCase(Random random)
        : interleave(kInterleaves[random.Between(0, 3)]),
          box{random.Between(0, 40), random.Between(0, 9),
              random.OneIn(10) ? random.Between(500, 1100) : random.Between(0, 40)},
          reader(PropsReader<T>(interleave, static_cast<std::uint32_t>(box.bands))) {
        SetValues(random);
        pixels.resize(box.width * box.height * box.bands + 16);
        mask.resize(pixels.size());
        for (T& pixel : pixels) pixel = SpecialSample<T>(random);
        for (unsigned char& byte : mask) byte = static_cast<unsigned char>(random.Between(0, 255));
    }

    // All bands, no bands or some of them have a value, and often the same.
    void SetValues(Random& random) {
        const std::size_t share = random.Between(0, 3);
        const bool same = random.OneIn(2);
        const double values[] = {0, 1, 2, -0.0, std::numeric_limits<double>::quiet_NaN()};
        for (std::uint32_t b = 0; b < box.bands; ++b)
            if (share == 3 || (share != 0 && random.OneIn(share + 1)))
                reader.props.SetNoDataValue(b, values[same ? 1 : random.Between(0, 4)]);
    }

    bool HasValue(std::size_t b) const {
        return reader.props.HasNoDataValue(static_cast<std::uint32_t>(b));
    }
    T Value(std::size_t b) const {
        return FromDouble<T>(reader.props.GetNoDataValue(static_cast<std::uint32_t>(b)));
    }

    template <class Visit>
    void ForEach(Visit&& visit) const {
        const std::size_t bands = interleave == Interleave::None ? 1 : box.bands;
        for (std::size_t b = 0; b < bands; ++b)
            for (std::size_t l = 0; l < box.height; ++l)
                for (std::size_t s = 0; s < box.width; ++s)
                    if (const std::size_t at = box.Index(interleave, b, l, s); at < pixels.size())
                        visit(b, at);
    }

    std::uint32_t Width() const { return static_cast<std::uint32_t>(box.width); }
    std::uint32_t Height() const { return static_cast<std::uint32_t>(box.height); }
    std::uint32_t Bands() const { return static_cast<std::uint32_t>(box.bands); }
};

template <class T>
class NoDataMasks : public ::testing::Test {};

TYPED_TEST_SUITE(NoDataMasks, AllElementTypes, ElementTypeNames);

TYPED_TEST(NoDataMasks, AreComputedAsTheModelSays) {
    using T = TypeParam;
    EXPECT_TRUE(rc::check([](std::uint32_t seed) {
        MaskCase<T> c{Random(seed)};
        RC_PRE(c.interleave != Interleave::None || c.box.bands != 0);
        auto expected = c.mask;
        c.ForEach([&](std::size_t b, std::size_t at) {
            const bool marked = IsMarked<T>(c.pixels[at], c.HasValue(b), c.Value(b));
            expected[at] = static_cast<unsigned char>((expected[at] & 0xFE) | (marked ? 1 : 0));
        });
        ComputeNoDataMask<T>(c.reader, c.Width(), c.Height(), c.Bands(), c.pixels.data(),
                             c.mask.data());
        RC_ASSERT(c.mask == expected);
    }));
}

TYPED_TEST(NoDataMasks, AreAppliedAsTheModelSays) {
    using T = TypeParam;
    EXPECT_TRUE(rc::check([](std::uint32_t seed) {
        MaskCase<T> c{Random(seed)};
        RC_PRE(c.interleave != Interleave::None || c.box.bands != 0);
        auto expected = c.pixels;
        c.ForEach([&](std::size_t b, std::size_t at) {
            if (c.HasValue(b) && (c.mask[at] & 1) != 0) expected[at] = c.Value(b);
        });
        const auto keptMask = c.mask;
        ApplyNoDataMask<T>(c.reader, c.Width(), c.Height(), c.Bands(), c.pixels.data(),
                           c.mask.data());
        RC_ASSERT(SameBits(c.pixels, expected));
        RC_ASSERT(c.mask == keptMask);
    }));
}

}  // namespace
}  // namespace zmctest
