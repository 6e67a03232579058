#include "format/NumberText.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <clocale>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <locale>

namespace zelm {
namespace {

// The sign of a zero counts as well.
bool SameReal(double a, double b) {
    return (a == b && std::signbit(a) == std::signbit(b)) || (std::isnan(a) && std::isnan(b));
}
double LibraryReal(const std::string& text) { return std::strtod(text.c_str(), nullptr); }
// strtol has 64 bits here, as the integers of documents do before they are cut.
std::uint32_t LibraryInteger(const std::string& text) {
    return static_cast<std::uint32_t>(std::strtol(text.c_str(), nullptr, 10));
}

RC_GTEST_PROP(NumberText, RealsAreWrittenAsPrintfDoes, (double value)) {
    char text[64];
    std::snprintf(text, sizeof text, "%.15g", value);
    RC_ASSERT(FormatReal(value, 15) == text);
    std::snprintf(text, sizeof text, "%.6g", value);
    RC_ASSERT(FormatReal(value, 6) == text);
}

RC_GTEST_PROP(NumberText, RealsAreReadAsTheLibraryDoes, ()) {
    const auto text = *rc::gen::container<std::string>(
        rc::gen::elementOf(std::string(" \t+-..0011223789eExXinfaNp,")));
    RC_ASSERT(SameReal(ReadReal(text), LibraryReal(text)));
}

RC_GTEST_PROP(NumberText, HexadecimalRealsAreReadAsTheLibraryDoes,
              (bool negative, int exponent, bool bare)) {
    const auto digits = *rc::gen::container<std::string>(
        rc::gen::elementOf(std::string("0000123456789abcdefABCDEF..")));
    const auto tail =
        *rc::gen::container<std::string>(rc::gen::elementOf(std::string("pP+-.x 0123")));
    const std::string text = std::string(negative ? "-" : "") + (exponent % 2 ? "0x" : "0X") +
                             digits + (bare ? tail : "p" + std::to_string(exponent % 1200));
    RC_ASSERT(SameReal(ReadReal(text), LibraryReal(text)));
}

RC_GTEST_PROP(NumberText, WhatWasWrittenIsReadBack, (double value, std::int64_t integer)) {
    RC_ASSERT(SameReal(ReadReal(FormatReal(value, 17)), value));
    RC_ASSERT(ReadInteger(FormatDecimal(integer)) == static_cast<std::uint32_t>(integer));
}

RC_GTEST_PROP(NumberText, IntegersAreReadAsTheLibraryDoes, ()) {
    const auto text =
        *rc::gen::container<std::string>(rc::gen::elementOf(std::string(" \t+--0123456789ax.")));
    RC_ASSERT(ReadInteger(text) == LibraryInteger(text));
}

RC_GTEST_PROP(NumberText, LongIntegersAreReadAsTheLibraryDoes, (bool negative, std::uint64_t a)) {
    const auto more = *rc::gen::container<std::string>(rc::gen::elementOf(std::string("059")));
    const std::string text = (negative ? "-" : "") + std::to_string(a) + more.substr(0, 3);
    RC_ASSERT(ReadInteger(text) == LibraryInteger(text));
}

TEST(NumberText, EdgesOfReals) {
    EXPECT_EQ(ReadReal(""), 0);
    EXPECT_EQ(ReadReal("none"), 0);
    EXPECT_EQ(ReadReal("--1"), 0);
    EXPECT_EQ(ReadReal("+-1"), 0);
    EXPECT_EQ(ReadReal("\n\t 12.5 7"), 12.5);
    EXPECT_EQ(ReadReal("1,5"), 1);
    EXPECT_EQ(ReadReal("1e999"), std::numeric_limits<double>::infinity());
    EXPECT_EQ(ReadReal("-1e999"), -std::numeric_limits<double>::infinity());
    EXPECT_EQ(ReadReal("1e-999"), 0);
    EXPECT_EQ(ReadReal("0x10"), 16);
    EXPECT_EQ(ReadReal("255|7"), 255);
    EXPECT_EQ(ReadReal("12x"), 12);
    EXPECT_EQ(ReadReal("12e1"), 120);
    EXPECT_EQ(ReadReal("12E1"), 120);
    EXPECT_EQ(ReadReal("12.5"), 12.5);
    EXPECT_EQ(ReadReal("999999999"), 999999999);
    EXPECT_EQ(ReadReal("4294967296"), 4294967296);
    EXPECT_EQ(ReadReal("-000000000000000012"), -12);
    EXPECT_TRUE(std::signbit(ReadReal("-0")));
    EXPECT_TRUE(std::isnan(ReadReal("-nan")));
    EXPECT_EQ(ReadReal("inf"), std::numeric_limits<double>::infinity());
}

// Hexadecimal reals: a fraction alone, a binary exponent, and values that no double holds.
TEST(NumberText, EdgesOfHexadecimalReals) {
    for (const char* text : {"0x.8",
                             "0X.8p1",
                             "0x1.8",
                             "0x1.",
                             "0x.",
                             "0x",
                             "0xg",
                             "0x.g",
                             "0x-1",
                             "0x+1",
                             "0x 1",
                             "0xp1",
                             "0x1p",
                             "0x1p+",
                             "0x1p-",
                             "0x1px",
                             "0x1p4",
                             "0x1P-4",
                             "0x1p0x1",
                             "-0x1",
                             "-0x0",
                             "0x0p99999",
                             "0x1p-2000",
                             "-0x1p-2000",
                             "0x1p2000",
                             "-0x1p2000",
                             "0x1p-1074",
                             "0x1p-1075",
                             "0x1.8p-1075",
                             "0x1.8p-1074",
                             "0x1.00000000000008p0",
                             "0x1.000000000000080000001p0",
                             "0x1.fffffffffffff8p1023",
                             "0x1.fffffffffffff7p1023",
                             "0x1.fffffffffffff7p-1023",
                             "0x123456789abcdef0123456789",
                             "0x0000000000000000000000000001",
                             "0x.00000000000000000000000000001p+200",
                             "0x1p99999999999999999999",
                             "0x1p-99999999999999999999",
                             "0x0.0000000000000000000000000000000p-99999999999999999999"})
        EXPECT_TRUE(SameReal(ReadReal(text), LibraryReal(text)))
            << text << ": " << ReadReal(text) << " for " << LibraryReal(text);
}

// A sign makes a number negative, and where there is none it means nothing.
TEST(NumberText, TextsWithoutANumberAreZeroWithoutASign) {
    for (const char* text : {"-x", "-", "-.", "-e5", "--1", "-+1", " -abc"}) {
        EXPECT_EQ(ReadReal(text), 0) << text;
        EXPECT_FALSE(std::signbit(ReadReal(text))) << text;
    }
    EXPECT_TRUE(std::signbit(ReadReal("-0")));
}

TEST(NumberText, IntegersEndAtThoseOfSixtyFourBits) {
    EXPECT_EQ(ReadInteger("9223372036854775807"), 0xFFFFFFFFu);
    EXPECT_EQ(ReadInteger("9223372036854775808"), 0xFFFFFFFFu);
    EXPECT_EQ(ReadInteger("18446744073709551615"), 0xFFFFFFFFu);
    EXPECT_EQ(ReadInteger("12345678901234567890"), 0xFFFFFFFFu);
    EXPECT_EQ(ReadInteger("-9223372036854775808"), 0u);
    EXPECT_EQ(ReadInteger("-9223372036854775809"), 0u);
    EXPECT_EQ(ReadInteger("-99999999999999999999999999"), 0u);
    EXPECT_EQ(ReadInteger("-4294967297"), 0xFFFFFFFFu);
}

TEST(NumberText, EdgesOfIntegers) {
    EXPECT_EQ(ReadInteger(""), 0u);
    EXPECT_EQ(ReadInteger("abc"), 0u);
    EXPECT_EQ(ReadInteger("12abc"), 12u);
    EXPECT_EQ(ReadInteger("-1"), 4294967295u);
    EXPECT_EQ(ReadInteger("4294967295"), 4294967295u);
    EXPECT_EQ(ReadInteger("99999999999999999999999999"), 4294967295u);
}

TEST(NumberText, CharactersAreNumbers) {
    EXPECT_EQ(FormatPixel(char{-3}), "-3");
    EXPECT_EQ(FormatPixel(static_cast<unsigned char>(200)), "200");
}

TEST(NumberText, PixelsHaveTheDigitsOfTheirType) {
    EXPECT_EQ(FormatPixel(1.0f / 3), "0.333333");
    EXPECT_EQ(FormatPixel(1.0 / 3), "0.333333333333333");
    EXPECT_EQ(FormatPixel(1e20), "1e+20");
    EXPECT_EQ(FormatPixel(Complex<float>(1.5f, 2.5f)), "1.5 2.5");
    EXPECT_EQ(FormatPixel(Complex<double>(1.0 / 3, -2e10)), "0.333333 -2e+10");
    EXPECT_EQ(FormatPixel(std::numeric_limits<std::int64_t>::min()), "-9223372036854775808");
    EXPECT_EQ(FormatPixel(std::numeric_limits<std::uint64_t>::max()), "18446744073709551615");
}

// A locale with a comma for the point and groups of thousands, for C and C++ alike.
struct CommaPunctuation : std::numpunct<char> {
    char do_decimal_point() const override { return ','; }
    char do_thousands_sep() const override { return '.'; }
    std::string do_grouping() const override { return "\3"; }
};

TEST(NumberText, DoesNotDependOnTheLocale) {
    const std::string before = std::setlocale(LC_ALL, nullptr);
    const std::locale old =
        std::locale::global(std::locale(std::locale::classic(), new CommaPunctuation));
    for (const char* name : {"de_DE.UTF-8", "fr_FR.UTF-8"}) std::setlocale(LC_ALL, name);
    EXPECT_EQ(FormatReal(1234567.5, 15), "1234567.5");
    EXPECT_EQ(FormatDecimal(1234567), "1234567");
    EXPECT_EQ(ReadReal("1234.5"), 1234.5);
    EXPECT_EQ(ReadReal("1.5e999"), std::numeric_limits<double>::infinity());
    std::locale::global(old);
    std::setlocale(LC_ALL, before.c_str());
}

}  // namespace
}  // namespace zelm
