// Numbers of styles keep what a double would lose.
#include <gtest/gtest.h>

#include <rapidcheck.h>
#include <cmath>
#include <random>

#include "render/Number.h"

namespace zmcrender {
namespace {

TEST(Number, WholeNumbersOfSixtyFourBitsAreExact) {
    for (const char* text : {"0", "1", "-1", "9007199254740993", "18446744073709551615",
                             "-9223372036854775808", "-18446744073709551615"}) {
        const auto number = Number::Parse(text);
        ASSERT_TRUE(number && number->whole) << text;
        EXPECT_EQ(number->Text(), text);
    }
}

TEST(Number, FormsOfOneNumberAreEqual) {
    for (const char* text : {"+5", "5.0", "50e-1", ".5e1", "5."})
        EXPECT_EQ(Number::Parse(text), Number(5)) << text;
    EXPECT_EQ(Number::Parse("-0"), Number(0));
    EXPECT_EQ(Number::Parse("-2.50"), Number(-2.5));
}

TEST(Number, AnythingElseIsNone) {
    for (const char* text : {"", "+", "-", ".", "e5", "1e", "--1", "+-1", "1 ", " 1", "1,5", "0x10",
                             "inf", "nan", "-inf", "1e400", "1e-400", "1_0", "12abc"})
        EXPECT_FALSE(Number::Parse(text)) << text;
}

TEST(Number, AnyDoubleComesBackFromItsText) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        std::mt19937_64 random(seed);
        const double value = std::ldexp(static_cast<double>(static_cast<std::int64_t>(random())),
                                        static_cast<int>(random() % 200) - 100);
        const Number number(value);
        RC_ASSERT(Number::Parse(number.Text()) == number);
        RC_ASSERT(number.real == value);
    }));
}

TEST(Number, AnyIntegerComesBackFromItsText) {
    EXPECT_TRUE(rc::check([](std::int64_t a, std::uint64_t b) {
        RC_ASSERT(Number::Parse(std::to_string(a)) == Number(a));
        RC_ASSERT(Number::Parse(std::to_string(b)) == Number(b));
        RC_ASSERT(Number(a).Text() == std::to_string(a));
    }));
}

}  // namespace
}  // namespace zmcrender
