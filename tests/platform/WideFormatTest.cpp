#include "platform/WideFormat.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <limits>
#include <string>

namespace platform {
namespace {

template <class... Values>
std::wstring Wide(const wchar_t* format, Values... values) {
    wchar_t buffer[256];
    const std::size_t units = FormatWide(buffer, 256, format, values...);
    EXPECT_EQ(units, std::wcslen(buffer));
    return buffer;
}

template <class... Values>
std::u16string Units(const char16_t* format, Values... values) {
    char16_t buffer[256];
    FormatWide(buffer, 256, format, values...);
    return buffer;
}

TEST(WideFormat, TextsAreWide) {
    EXPECT_EQ(Wide(L"<%s>", L"wide \u00e4"), L"<wide \u00e4>");
    EXPECT_EQ(Wide(L"<%ls>", L"wide"), L"<wide>");
    EXPECT_EQ(Units(u"<%s>", u"wide \u00e4"), u"<wide \u00e4>");
}

TEST(WideFormat, NarrowTextsOnRequest) {
    EXPECT_EQ(Wide(L"%hs %S", "one", "two"), L"one two");
    EXPECT_EQ(Units(u"%hs|%S|%hc", "one", "two", 'c'), u"one|two|c");
}

TEST(WideFormat, WidthsAndPrecisionsOfTexts) {
    EXPECT_EQ(Wide(L"<%5s><%-5s><%.2s>", L"abc", L"abc", L"abc"), L"<  abc><abc  ><ab>");
    EXPECT_EQ(Wide(L"<%*s><%*s><%.*s>", 5, L"abc", -5, L"abc", 1, L"abc"), L"<  abc><abc  ><a>");
    EXPECT_EQ(Wide(L"<%3c><%-3c>", L'x', L'y'), L"<  x><y  >");
}

TEST(WideFormat, NullTextPrints) {
    EXPECT_EQ(Wide(L"%s", static_cast<const wchar_t*>(nullptr)), L"(null)");
    EXPECT_EQ(Units(u"%hs", static_cast<const char*>(nullptr)), u"(null)");
}

TEST(WideFormat, NumbersOfEveryLength) {
    EXPECT_EQ(Wide(L"%hhd %hd %d %ld %lld %jd %td", 257, 65537, -3, -4l, -5ll,
                   static_cast<std::intmax_t>(6), static_cast<std::ptrdiff_t>(-7)),
              L"1 1 -3 -4 -5 6 -7");
    EXPECT_EQ(Wide(L"%hhu %hx %u %lu %llX %zu", 257u, 0x12345u, 3u, 4ul, 0xABCDEFull,
                   static_cast<std::size_t>(9)),
              L"1 2345 3 4 ABCDEF 9");
    EXPECT_EQ(Wide(L"%5d|%-5d|%05d|%+d|% d|%.3d|%#x|%o", 42, 42, 42, 42, 42, 7, 255u, 8u),
              L"   42|42   |00042|+42| 42|007|0xff|10");
    EXPECT_EQ(Wide(L"%.2f %e %g %.1Lf", 1.005, 12345.678, 0.5, 2.25L),
              L"1.00 1.234568e+04 0.5 2.2");
}

TEST(WideFormat, LengthsThatFewNumbersHave) {
    const std::ptrdiff_t small = -7;
    EXPECT_EQ(Wide(L"%zd %wd %i %zi", small, -8l, -9, small), L"-7 -8 -9 -7");
    EXPECT_EQ(
        Wide(L"%ju %tu %wx %hu %hhX", std::uintmax_t{6}, std::size_t{7}, 0xABul, 65537u, 0x1FFu),
        L"6 7 ab 1 FF");
    EXPECT_EQ(Units(u"%zd %ju %i", small, std::uintmax_t{6}, -9), u"-7 6 -9");
}

TEST(WideFormat, EveryConversionOfReals) {
    for (const double value : {0.1, -1e300, 12345.678, std::numeric_limits<double>::infinity()}) {
        char text[512];
        const auto expect = [&](int length, const wchar_t* wide, const char16_t* units) {
            const int shown = std::min(length, 255);
            EXPECT_EQ(Wide(wide, value), std::wstring(text, text + shown));
            EXPECT_EQ(Units(units, value), std::u16string(text, text + shown));
        };
        expect(std::snprintf(text, sizeof text, "%.4a", value), L"%.4a", u"%.4a");
        expect(std::snprintf(text, sizeof text, "%.4A", value), L"%.4A", u"%.4A");
        expect(std::snprintf(text, sizeof text, "%.4e", value), L"%.4e", u"%.4e");
        expect(std::snprintf(text, sizeof text, "%.4E", value), L"%.4E", u"%.4E");
        expect(std::snprintf(text, sizeof text, "%.4f", value), L"%.4f", u"%.4f");
        expect(std::snprintf(text, sizeof text, "%.4F", value), L"%.4F", u"%.4F");
        expect(std::snprintf(text, sizeof text, "%.4g", value), L"%.4g", u"%.4g");
        expect(std::snprintf(text, sizeof text, "%.4G", value), L"%.4G", u"%.4G");
    }
}

TEST(WideFormat, CharactersOfBothKinds) {
    EXPECT_EQ(Wide(L"%c%C%lC%hc", L'\u00e4', 'b', L'\u00e5', 'd'), L"\u00e4b\u00e5d");
    EXPECT_EQ(Units(u"%c%C%lC|%-3c|%3C|", u'\u00e4', 'b', u'\u00e5', u'e', 'f'),
              u"\u00e4b\u00e5|e  |  f|");
    EXPECT_EQ(Wide(L"%lS|%hS", L"wide", "narrow"), L"wide|narrow");
}

// More flags than the longest sensible format has, and a letter that no conversion is.
TEST(WideFormat, FlagsWithoutEnd) {
    EXPECT_EQ(Wide(L"%++++++++++++++++++++5d|", 42), L"  +42|");
    EXPECT_EQ(Wide(L"%--------------------5d|", 42), L"42   |");
    EXPECT_EQ(Wide(L"%\u00e4%d", 5), L"%\u00e45");
    EXPECT_EQ(Units(u"%5\u00e4%d", 5), u"%5\u00e45");
}

TEST(WideFormat, OddFormats) {
    EXPECT_EQ(Wide(L"100%%"), L"100%");
    EXPECT_EQ(Wide(L"end %"), L"end %");
    EXPECT_EQ(Wide(L"%y%d", 5), L"%y5");
    int target = 3;
    EXPECT_EQ(Wide(L"a%nb", &target), L"ab");
    EXPECT_EQ(target, 3);
    EXPECT_EQ(Wide(L"%p", static_cast<void*>(nullptr)).empty(), false);
}

TEST(WideFormat, CutsAtTheBuffer) {
    wchar_t buffer[8];
    EXPECT_EQ(FormatWide(buffer, 8, L"%s", L"0123456789"), 7u);
    EXPECT_STREQ(buffer, L"0123456");
    for (const wchar_t* const format : {L"%20d", L"%20c"}) {
        EXPECT_EQ(FormatWide(buffer, 8, format, 5), 7u);
        EXPECT_STREQ(buffer, L"       ");
    }
    EXPECT_EQ(FormatWide(buffer, 8, L"012345%10y"), 7u);
    EXPECT_STREQ(buffer, L"012345%");
    EXPECT_EQ(FormatWide(buffer, 8, L"0123456789%s", static_cast<const wchar_t*>(nullptr)), 7u);
    EXPECT_EQ(FormatWide(buffer, 1, L"x"), 0u);
    EXPECT_STREQ(buffer, L"");
}

TEST(WideFormat, HugeWidthsAreBounded) {
    std::wstring buffer(10000, L'?');
    EXPECT_EQ(FormatWide(buffer.data(), buffer.size(), L"%999999999d", 5), 4095u);
    EXPECT_EQ(FormatWide(buffer.data(), buffer.size(), L"%.999999999f", 1e300), 4095u);
    EXPECT_EQ(FormatWide(buffer.data(), buffer.size(), L"%*d", -2147483647 - 1, 5), 4095u);
}

RC_GTEST_PROP(WideFormatProperty, AgreesWithPrintf, (int number, double real)) {
    const int width = *rc::gen::inRange(-40, 40);
    const int precision = *rc::gen::inRange(-1, 20);
    char narrow[512];
    std::snprintf(narrow, sizeof narrow, "%*.*d|%*x|%+.*e", width, precision, number, width,
                  static_cast<unsigned>(number), precision, real);
    const std::wstring wide = Wide(L"%*.*d|%*x|%+.*e", width, precision, number, width,
                                   static_cast<unsigned>(number), precision, real);
    RC_ASSERT(wide == std::wstring(narrow, narrow + std::char_traits<char>::length(narrow)));
}

RC_GTEST_PROP(WideFormatProperty, AnyFormatStaysInTheBuffer, ()) {
    const auto format = *rc::gen::container<std::u16string>(
        12,
        rc::gen::element(u'%', u'd', u'x', u'-', u'0', u'9', u'.', u'l', u'h', u'z', u'q', u'u'));
    char16_t buffer[32];
    const std::size_t units = FormatWide(buffer, 16, format.c_str(), 1, 2, 3, 4, 5, 6);
    RC_ASSERT(units < 16u);
    RC_ASSERT(buffer[units] == 0);
}

}  // namespace
}  // namespace platform
