#include "tools/Suggestion.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

using zmctools::EditDistance;
using zmctools::Suggestion;

const std::vector<std::string> kNames = {"build", "info", "export", "hash", "verify"};

TEST(EditDistance, CountsTheLeastSteps) {
    EXPECT_EQ(EditDistance("", ""), 0U);
    EXPECT_EQ(EditDistance("", "abc"), 3U);
    EXPECT_EQ(EditDistance("abc", ""), 3U);
    EXPECT_EQ(EditDistance("abc", "abc"), 0U);
    EXPECT_EQ(EditDistance("bild", "build"), 1U);
    EXPECT_EQ(EditDistance("buuild", "build"), 1U);
    EXPECT_EQ(EditDistance("buidl", "build"), 1U);
    EXPECT_EQ(EditDistance("kitten", "sitting"), 3U);
    EXPECT_EQ(EditDistance("ca", "abc"), 3U);
}

TEST(Suggestion, IsTheNearestName) {
    EXPECT_EQ(Suggestion("bild", kNames), "build");
    EXPECT_EQ(Suggestion("verfiy", kNames), "verify");
    EXPECT_EQ(Suggestion("ihfo", kNames), "info");
}

TEST(Suggestion, OfEquallyNearNamesTheFirstCounts) {
    EXPECT_EQ(Suggestion("cat", {"bat", "hat"}), "bat");
}

TEST(Suggestion, IsNoneWhereNoNameIsNear) {
    EXPECT_EQ(Suggestion("stretch", kNames), "");
    EXPECT_EQ(Suggestion("", kNames), "");
    EXPECT_EQ(Suggestion("x", {"y"}), "");
    EXPECT_EQ(Suggestion("build", {}), "");
}

TEST(Suggestion, IsNotTheWordItself) { EXPECT_EQ(Suggestion("info", {"info"}), ""); }

TEST(Suggestion, IsNoneForWordsMuchLongerThanNames) {
    const std::string word(100, 'a');
    EXPECT_EQ(Suggestion(word, {word.substr(1)}), "");
}

}  // namespace
