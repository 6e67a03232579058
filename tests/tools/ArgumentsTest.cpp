#include "tools/Arguments.h"

#include <gtest/gtest.h>

#include <cmath>

#include "tools/Message.h"

namespace zmctools {
namespace {

using List = std::vector<std::uint32_t>;

TEST(Arguments, CountsAreWholeNumbersUpToALimit) {
    EXPECT_EQ(ParseCount("--n", "0", 5), 0u);
    EXPECT_EQ(ParseCount("--n", "18446744073709551615", UINT64_MAX), UINT64_MAX);
    for (const char* const text :
         {"", "-1", "+1", " 1", "1 ", "1.0", "0x1", "six", "18446744073709551616"})
        EXPECT_THROW(ParseCount("--n", text, UINT64_MAX), UsageError) << text;
    EXPECT_THROW(ParseCount("--n", "6", 5), UsageError);
}

TEST(Arguments, NumbersMayBeNegativeOrNotFinite) {
    EXPECT_EQ(ParseNumber("--n", "-9999.5"), -9999.5);
    EXPECT_TRUE(std::isnan(ParseNumber("--n", "nan")));
    EXPECT_TRUE(std::isinf(ParseNumber("--n", "-inf")));
    for (const char* const text :
         {"", "1,5", "one", "1 2", " ", " 1", "1 ", "\t1", "0x", "1e", "."})
        EXPECT_THROW(ParseNumber("--n", text), UsageError) << text;
}

// They would become infinity, which nothing differs by, and 0, which is a sample of its own.
TEST(Arguments, NumbersThatNoDoubleHoldsAreRefused) {
    for (const char* const text : {"1e999", "-1e999", "1e-999", "-1e-400", "0x1p2000"})
        EXPECT_THROW(ParseNumber("--n", text), UsageError) << text;
    EXPECT_EQ(ParseNumber("--n", "0e-999"), 0);
    EXPECT_EQ(ParseNumber("--n", "1e-310"), 1e-310);
    EXPECT_EQ(ParseNumber("--n", "+1.7976931348623157e308"), 1.7976931348623157e308);
    EXPECT_EQ(ParseNumber("--n", "0x10"), 16);
}

TEST(Arguments, SizesHaveUnits) {
    EXPECT_EQ(ParseSize("--memory", "1000"), 1000u);
    EXPECT_EQ(ParseSize("--memory", "512K"), std::uint64_t{512} << 10);
    EXPECT_EQ(ParseSize("--memory", "256MiB"), std::uint64_t{256} << 20);
    EXPECT_EQ(ParseSize("--memory", "2gb"), std::uint64_t{2} << 30);
    for (const char* const text :
         {"", "K", "iB", "1T", "-1K", "1.5G", "18446744073709551615K", "5i", "5iB", " 5", "5 M"})
        EXPECT_THROW(ParseSize("--memory", text), UsageError) << text;
}

TEST(Arguments, BandsCountFromOne) {
    EXPECT_EQ(ParseBands("3,2,1", 3), (List{2, 1, 0}));
    EXPECT_EQ(ParseBands("2,2", 3), (List{1, 1}));
    EXPECT_EQ(ParseBands("", 3), (List{0, 1, 2}));
    for (const char* const text : {"0", "4", "1,", ",1", "a", "1;2", "4294967297"})
        EXPECT_THROW(ParseBands(text, 3), UsageError) << text;
}

TEST(Arguments, WindowsLieInsideTheLevel) {
    const zmchost::Window window = ParseWindow("10,20,90,30", 100, 50);
    EXPECT_EQ(window.x, 10u);
    EXPECT_EQ(window.y, 20u);
    EXPECT_EQ(window.width, 90u);
    EXPECT_EQ(window.height, 30u);
    EXPECT_EQ(ParseWindow("", 100, 50).width, 100u);
    for (const char* const text :
         {"0,0,101,1", "0,0,1,51", "100,0,1,1", "10,0,91,1", "0,0,0,1", "0,0,1", "0,0,1,1,1",
          "0,0,1,x", "-1,0,1,1", "1,1,18446744073709551615,1"})
        EXPECT_THROW(ParseWindow(text, 100, 50), UsageError) << text;
}

}  // namespace
}  // namespace zmctools
