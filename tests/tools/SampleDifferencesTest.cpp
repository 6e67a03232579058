#include "tools/SampleDifferences.h"

#include <gtest/gtest.h>

#include <limits>
#include <vector>

#include "core/ElementTypes.h"

namespace zmctools {
namespace {

namespace Code = zelm::PixelTypeCode;

TEST(SampleDifferences, PlaceNumberAndGreatestByBand) {
    const unsigned char a[] = {1, 2, 3, 4, 5, 6, 7, 8};
    const unsigned char b[] = {1, 2, 3, 9, 5, 6, 7, 6};
    SampleDifferences found(Code::Byte, Code::Byte, 2, 0);
    found.Take({10, 20, 2, 2}, a, b);
    EXPECT_EQ(found.Samples(), 2u);
    EXPECT_EQ(found.Bands()[0].samples, 0u);
    EXPECT_EQ(found.Bands()[1].samples, 2u);
    EXPECT_EQ(found.Bands()[1].greatest, 5);
    EXPECT_EQ(found.Bands()[1].x, 11u);
    EXPECT_EQ(found.Bands()[1].y, 20u);
}

TEST(SampleDifferences, ToleranceIncludesItself) {
    const short a[] = {0, 0, 0};
    const short b[] = {2, -2, 3};
    SampleDifferences found(Code::Int16, Code::Int16, 1, 2);
    found.Take({0, 0, 3, 1}, a, b);
    EXPECT_EQ(found.Samples(), 1u);
    EXPECT_EQ(found.Bands()[0].x, 2u);
    EXPECT_EQ(found.Bands()[0].greatest, 3);
}

TEST(SampleDifferences, TypesAreComparedAsNumbers) {
    const char a[] = {-1, 5};
    const std::int64_t b[] = {-1, 5};
    SampleDifferences found(Code::Char, Code::Int64, 1, 0);
    found.Take({0, 0, 2, 1}, a, b);
    EXPECT_EQ(found.Samples(), 0u);
}

TEST(SampleDifferences, TheLastBitOf64Counts) {
    const std::uint64_t a[] = {UINT64_MAX};
    const std::uint64_t b[] = {UINT64_MAX - 1};
    SampleDifferences found(Code::UInt64, Code::UInt64, 1, 0);
    found.Take({0, 0, 1, 1}, a, b);
    EXPECT_EQ(found.Bands()[0].greatest, 1);
}

TEST(SampleDifferences, LongLinesAreTakenToTheirEnd) {
    constexpr std::uint32_t kWidth = 100000;
    const std::vector<unsigned char> a(std::size_t{kWidth} * 3);
    std::vector<unsigned char> b = a;
    for (const std::size_t sample : {65535u, 65536u, 200003u, 299998u, 299999u}) b[sample] = 9;
    SampleDifferences found(Code::Byte, Code::Byte, 3, 0);
    found.Take({7, 5, kWidth, 1}, a.data(), b.data());
    EXPECT_EQ(found.Bands()[0].samples, 1u);
    EXPECT_EQ(found.Bands()[0].x, 7u + 65535 / 3);
    EXPECT_EQ(found.Bands()[1].samples, 2u);
    EXPECT_EQ(found.Bands()[1].x, 7u + 65536 / 3);
    EXPECT_EQ(found.Bands()[2].samples, 2u);
    EXPECT_EQ(found.Bands()[2].x, 7u + 200003 / 3);
}

TEST(SampleDifferences, NotANumberAndInfinity) {
    constexpr double kNan = std::numeric_limits<double>::quiet_NaN();
    constexpr double kInfinity = std::numeric_limits<double>::infinity();
    const double a[] = {kNan, kNan, kInfinity, kInfinity, 0.0};
    const double b[] = {-kNan, 0, kInfinity, -kInfinity, -0.0};
    SampleDifferences found(Code::Double, Code::Double, 1, 1e300);
    found.Take({0, 0, 5, 1}, a, b);
    EXPECT_EQ(found.Samples(), 2u);
    EXPECT_EQ(found.Bands()[0].x, 1u);
}

TEST(SampleDifferences, OfComplexNumbersTheMagnitude) {
    const float a[] = {0, 0};
    const float b[] = {3, 4};
    SampleDifferences found(Code::ComplexSingle, Code::ComplexSingle, 1, 4.9);
    found.Take({0, 0, 1, 1}, a, b);
    EXPECT_EQ(found.Bands()[0].greatest, 5);
    EXPECT_EQ(found.Samples(), 1u);
}

}  // namespace
}  // namespace zmctools
