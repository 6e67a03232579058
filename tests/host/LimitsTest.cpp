// What the libraries take on of a file: the usual limits, and how they are changed.
#include "host/file/Limits.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <iostream>
#include <ostream>
#include <string>

#include "format/DocumentLimits.h"
#include "tests/support/FailureOf.h"

namespace zmchost {

void PrintTo(const Limits& limits, std::ostream* stream) {
    *stream << limits.bands << ' ' << limits.tile << ' ' << limits.elements << ' ' << limits.header
            << ' ' << limits.document;
}

bool operator==(const Limits& a, const Limits& b) {
    return a.bands == b.bands && a.tile == b.tile && a.elements == b.elements &&
           a.header == b.header && a.document == b.document;
}

namespace {

using zmctest::FailureOf;

constexpr const char* kUsual =
    "bands=65536,tile=16777216,elements=131072,header=4194304,document=268435456";

// The limits are the process's, so each test leaves the usual ones.
class LimitsTest : public testing::Test {
protected:
    LimitsTest() { Limits::Change(kUsual); }
    ~LimitsTest() override { Limits::Change(kUsual); }

    static Limits After(const std::string& text) {
        Limits::Change(text);
        return Limits::Current();
    }
};

TEST_F(LimitsTest, TheUsualOnesAreThoseThatAreTold) {
    EXPECT_EQ(Limits(), Limits::Current());
    EXPECT_EQ(Limits().document, zelm::kMaxDocumentBytes);
}

TEST_F(LimitsTest, ATextChangesThoseThatItNamesAndKeepsTheOthers) {
    Limits expected;
    expected.bands = 100000;
    EXPECT_EQ(After("bands=100000"), expected);
    expected.tile = 1;
    expected.elements = 2;
    expected.header = 3;
    expected.document = 4;
    EXPECT_EQ(After("tile=1,elements=2,header=3,document=4"), expected);
    EXPECT_EQ(After(""), expected);
    expected.tile = 6;
    EXPECT_EQ(After("tile=5,tile=6,"), expected) << "the last word counts";
}

TEST_F(LimitsTest, UnitsAreThoseOfMemory) {
    EXPECT_EQ(After("tile=7K").tile, 7u << 10);
    EXPECT_EQ(After("tile=7M").tile, 7u << 20);
    EXPECT_EQ(After("tile=7G").tile, std::uint64_t{7} << 30);
    EXPECT_EQ(After("tile=0").tile, 0u);
    EXPECT_EQ(After("tile=18446744073709551615").tile, UINT64_MAX);
    EXPECT_EQ(After("tile=17179869183G").tile, std::uint64_t{17179869183} << 30);
}

TEST_F(LimitsTest, WhatIsNotUnderstoodIsRefusedAndChangesNothing) {
    for (const std::string text : {"bands",
                                   "bands=",
                                   "=1",
                                   ",",
                                   "bands=1,,tile=2",
                                   "bands=-1",
                                   "bands=+1",
                                   "bands= 1",
                                   "bands=1 ",
                                   "bands=1x",
                                   "bands=K",
                                   "bands=1KK",
                                   "bands=1k",
                                   "bands=0x10",
                                   "Bands=1",
                                   "nonesuch=1",
                                   "bands=1;tile=2",
                                   "bands=1.5",
                                   "bands=18446744073709551616",
                                   "tile=17179869184G",
                                   "bands=9,nonesuch=1"}) {
        EXPECT_EQ(FailureOf([&] { Limits::Change(text); }),
                  text +
                      ": cannot take it for limits: it is no list such as "
                      "bands=100000,tile=1G,document=64M");
        EXPECT_EQ(Limits::Current(), Limits()) << text;
    }
}

TEST_F(LimitsTest, WhatIsBeyondALimitIsToldWithTheWayToRaiseIt) {
    const Limits limits = After("bands=9");
    EXPECT_EQ(limits.Judge(&Limits::bands, 9, "it has 9 bands"), "");
    EXPECT_EQ(limits.Judge(&Limits::bands, 10, "it has 10 bands"),
              "it has 10 bands, beyond the limit of 9; ZMC_LIMITS=bands=10 raises it");
    EXPECT_EQ(
        Limits().Judge(&Limits::document, (1u << 28) + 1, "it has more"),
        "it has more, beyond the limit of 268435456; ZMC_LIMITS=document=268435457 raises it");
}

TEST_F(LimitsTest, TellTheirNamesAndValues) {
    EXPECT_EQ(Limits().Text(), "bands=65536, tile=16M, elements=131072, header=4M, document=256M");
}

// The environment is asked once in a process; each of these has one of its own.
class LimitsEnvironmentDeathTest : public testing::Test {
protected:
    LimitsEnvironmentDeathTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

    // Ends the process, and tells what the limits are in one with that variable.
    [[noreturn]] static void TellLimits(const char* environment, const char* change) {
        if (environment)
            setenv("ZMC_LIMITS", environment, 1);
        else
            unsetenv("ZMC_LIMITS");
        std::cerr << '[' << FailureOf([&] {
            if (change) Limits::Change(change);
            PrintTo(Limits::Current(), &std::cerr);
        }) << ']';
        std::exit(0);
    }
};

TEST_F(LimitsEnvironmentDeathTest, ChangesTheUsualOnes) {
    const testing::ExitedWithCode good(0);
    EXPECT_EXIT(TellLimits(nullptr, nullptr), good, "65536 16777216 131072 4194304 268435456");
    EXPECT_EXIT(TellLimits("", nullptr), good, "65536 16777216 131072 4194304 268435456");
    EXPECT_EXIT(TellLimits("tile=1G,bands=7", nullptr), good,
                "7 1073741824 131072 4194304 268435456");
}

TEST_F(LimitsEnvironmentDeathTest, IsChangedByTheProcess) {
    EXPECT_EXIT(TellLimits("tile=1G,bands=7", "bands=8"), testing::ExitedWithCode(0),
                "8 1073741824 131072 4194304 268435456");
}

TEST_F(LimitsEnvironmentDeathTest, ThatIsNotUnderstoodIsAFailureAndNoLimits) {
    EXPECT_EXIT(TellLimits("bands", nullptr), testing::ExitedWithCode(0),
                "\\[bands: cannot take it for limits: it is no list such as");
    EXPECT_EXIT(TellLimits("bands", "bands=8"), testing::ExitedWithCode(0),
                "\\[bands: cannot take it for limits: it is no list such as");
}

}  // namespace
}  // namespace zmchost
