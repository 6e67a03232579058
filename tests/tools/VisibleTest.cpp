// What of a text reaches a terminal.
#include "tools/Visible.h"

#include <gtest/gtest.h>

#include <string>

namespace zmctools {
namespace {

TEST(Visible, TextThatCanBeShownStaysAsItIs) {
    for (const std::string text : {"", "scene.pyr", "C:\\rasters\\a b", "M\u00fcnchen \u6771\u4eac",
                                   "\U0001F5FA", "\u00a0", "\u0416\u200b"})
        EXPECT_EQ(Visible(text), text);
}

TEST(Visible, CharactersThatSteerATerminalAreShownByTheirBytes) {
    EXPECT_EQ(Visible("a\x1b[2Jb"), "a\\x1b[2Jb");
    EXPECT_EQ(Visible(std::string_view("\0\n\r\t\x7f", 5)), "\\x00\\x0a\\x0d\\x09\\x7f");
    EXPECT_EQ(Visible("\u0080\u009b"), "\\xc2\\x80\\xc2\\x9b");
    EXPECT_EQ(Visible("\u202egpj\u2066\u200f\u2028"),
              "\\xe2\\x80\\xaegpj\\xe2\\x81\\xa6\\xe2\\x80\\x8f\\xe2\\x80\\xa8");
    for (int c = 1; c < 256; ++c)
        for (const char shown : Visible(std::string(1, static_cast<char>(c)) + 'x'))
            EXPECT_TRUE(shown >= ' ' && shown < 0x7f) << c;
}

TEST(Visible, BytesThatAreNoTextAreShownByTheirNumbers) {
    EXPECT_EQ(Visible("b\xff"
                      "d"),
              "b\\xffd");
    EXPECT_EQ(Visible("\x9b"
                      "31m"),
              "\\x9b31m");
    EXPECT_EQ(Visible("\xc3"), "\\xc3") << "cut off";
    EXPECT_EQ(Visible("\xe6\x9d"), "\\xe6\\x9d") << "cut off";
    EXPECT_EQ(Visible("\xc0\x9b"), "\\xc0\\x9b") << "longer than need be";
    EXPECT_EQ(Visible("\xe0\x80\x9b"), "\\xe0\\x80\\x9b") << "longer than need be";
    EXPECT_EQ(Visible("\xed\xa0\x80"), "\\xed\\xa0\\x80") << "half a character";
    EXPECT_EQ(Visible("\xf4\x90\x80\x80"), "\\xf4\\x90\\x80\\x80") << "beyond the last";
}

TEST(Visible, IsItsOwnForm) {
    const std::string once = Visible("a\x1b\xff\u202e\\x1b");
    EXPECT_EQ(Visible(once), once);
}

TEST(Shortened, CutsBetweenCharacters) {
    EXPECT_EQ(Shortened("abcdef", 6), "abcdef");
    EXPECT_EQ(Shortened("abcdefg", 6), "abc...");
    EXPECT_EQ(Shortened("ab\u6771\u4eac", 7), "ab...");
    EXPECT_EQ(Shortened("\u6771\u4eac", 2), "...");
}

}  // namespace
}  // namespace zmctools
