#include "platform/ParseNumber.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <bit>
#include <clocale>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <string>

#include "tests/support/ChildProcess.h"
#include "tests/support/NumberTexts.h"
#include "tests/support/ScratchDirectory.h"

namespace platform {
namespace {

std::uint64_t Bits(double value) { return std::bit_cast<std::uint64_t>(value); }

TEST(ParseReal, ReadsWhatTheLibraryReads) {
    for (const std::string& text : zmctest::RealTexts())
        EXPECT_TRUE(zmctest::SameReal(ParseReal(text.c_str()), zmctest::LibraryReal(text))) << text;
    EXPECT_EQ(Bits(ParseReal("-x")), Bits(0.0)) << "what is no number has no sign";
    EXPECT_EQ(Bits(ParseReal("-0x")), Bits(-0.0)) << "the number ends in front of the letter";
    EXPECT_EQ(ParseReal("-0X1p-3z"), -0.125);
    EXPECT_EQ(ParseReal("-Infinity"), -std::numeric_limits<double>::infinity());
}

RC_GTEST_PROP(ParseReal, GivesBackWhatPrintfWrites, (std::uint64_t bits)) {
    const double value = std::bit_cast<double>(bits);
    RC_PRE(!std::isnan(value));
    char text[64];
    std::snprintf(text, sizeof text, "%.17g", value);
    RC_ASSERT(Bits(ParseReal(text)) == bits);
    std::snprintf(text, sizeof text, "%a", value);
    RC_ASSERT(Bits(ParseReal(text)) == bits);
}

RC_GTEST_PROP(ParseReal, AgreesWithStrtod, ()) {
    const auto text =
        *rc::gen::container<std::string>(rc::gen::elementOf(std::string("0019.-+exXpP \tinfa")));
    const double expected = std::strtod(text.c_str(), nullptr);
    const double actual = ParseReal(text.c_str());
    RC_ASSERT(Bits(actual) == Bits(expected));
}

TEST(ParseReal, DoesNotDependOnTheLocale) {
    const zmctest::ScratchDirectory scratch;
    const auto made =
        zmctest::RunChild({"localedef", "-i", "de_DE", "-f", "UTF-8", scratch / "de_DE.UTF-8"});
    if (made.status != 0) GTEST_SKIP() << "no locale can be made here: " << made.err;
    ASSERT_EQ(setenv("LOCPATH", scratch.String().c_str(), 1), 0);
    ASSERT_NE(std::setlocale(LC_ALL, "de_DE.UTF-8"), nullptr);
    EXPECT_EQ(std::strtod("1,5", nullptr), 1.5) << "the locale has a comma";
    EXPECT_EQ(ParseReal("1.5"), 1.5);
    EXPECT_EQ(ParseReal("1,5"), 1);
    std::setlocale(LC_ALL, "C");
    unsetenv("LOCPATH");
}

TEST(ParseUnsigned32, SaturatesAndWraps) {
    EXPECT_EQ(ParseUnsigned32(" +0x10"), 16u);
    EXPECT_EQ(ParseUnsigned32("010"), 8u);
    EXPECT_EQ(ParseUnsigned32("4294967295"), 4294967295u);
    EXPECT_EQ(ParseUnsigned32("-1"), 4294967295u);
    EXPECT_EQ(ParseUnsigned32("-4294967295"), 1u);
    EXPECT_EQ(ParseUnsigned32(""), 0u);
    EXPECT_EQ(ParseUnsigned32("x"), 0u);
    for (const char* text :
         {"4294967296", "-4294967296", "18446744069414584321", "-18446744073709551615",
          "9223372036854775807", "-9223372036854775808", "99999999999999999999999"})
        EXPECT_EQ(ParseUnsigned32(text), 4294967295u) << text;
}

TEST(ParseSigned32, Saturates) {
    EXPECT_EQ(ParseSigned32("-0x10"), -16);
    EXPECT_EQ(ParseSigned32("2147483647"), 2147483647);
    EXPECT_EQ(ParseSigned32("2147483648"), 2147483647);
    EXPECT_EQ(ParseSigned32("4294967295"), 2147483647);
    EXPECT_EQ(ParseSigned32("-2147483649"), -2147483647 - 1);
    EXPECT_EQ(ParseSigned32("-99999999999999999999"), -2147483647 - 1);
}

}  // namespace
}  // namespace platform
