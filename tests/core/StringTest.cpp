#include "core/String.h"

#include <gtest/gtest.h>

#include <clocale>
#include <sstream>
#include <string>

namespace zelm {
namespace {

const WideChar* Wide(const char16_t* text) { return reinterpret_cast<const WideChar*>(text); }

TEST(String, DefaultHasNoBufferAndNoNarrowForms) {
    const String s;
    EXPECT_EQ(s.wide, nullptr);
    EXPECT_EQ(s.ansi, nullptr);
    EXPECT_EQ(s.utf8, nullptr);
    EXPECT_EQ(s.length, 0u);
    EXPECT_EQ(s.GetUtf8(), nullptr);
    EXPECT_EQ(s.GetAnsi(), nullptr);
}

TEST(String, EmptyTextHasABufferAndEmptyNarrowForms) {
    const String s("");
    ASSERT_NE(s.wide, nullptr);
    EXPECT_EQ(s.wide[0], 0);
    EXPECT_EQ(s.length, 0u);
    ASSERT_NE(s.GetUtf8(), nullptr);
    EXPECT_STREQ(s.GetUtf8(), "");
    ASSERT_NE(s.GetAnsi(), nullptr);
    EXPECT_STREQ(s.GetAnsi(), "");
}

TEST(String, NullTextsGiveTheNullState) {
    EXPECT_EQ(String(static_cast<const char*>(nullptr)).wide, nullptr);
    EXPECT_EQ(String(static_cast<const WideChar*>(nullptr)).wide, nullptr);
    String s("text");
    s = static_cast<const char*>(nullptr);
    EXPECT_EQ(s.wide, nullptr);
    EXPECT_EQ(s.length, 0u);
    s = Wide(u"text");
    s = static_cast<const WideChar*>(nullptr);
    EXPECT_EQ(s.wide, nullptr);
}

TEST(String, NullComesBeforeEmptyInComparison) {
    const String null;
    const String empty("");
    EXPECT_EQ(null.Compare(empty), -1);
    EXPECT_EQ(empty.Compare(null), 1);
    EXPECT_EQ(null.Compare(String()), 0);
    EXPECT_EQ(empty.Compare(String("")), 0);
    EXPECT_FALSE(null == "");
    EXPECT_TRUE(null == static_cast<const char*>(nullptr));
    EXPECT_FALSE(empty == static_cast<const char*>(nullptr));
}

TEST(String, ComparisonIsTheSignedDifferenceOfTheFirstUnitsThatDiffer) {
    EXPECT_EQ(String("abc").Compare(String("abd")), -1);
    EXPECT_EQ(String("abz").Compare(String("aba")), 'z' - 'a');
    EXPECT_EQ(String("abc").Compare(String("ab")), 'c');
    EXPECT_EQ(String("ab").Compare(String("abc")), -'c');
    EXPECT_EQ(String("a").Compare(String("A")), 'a' - 'A');
    // Units are unsigned: the highest comes after every other.
    EXPECT_EQ(String(Wide(u"\uFFFD")).Compare(String("a")), 0xFFFD - 'a');
    EXPECT_TRUE(String("a") < String("b"));
}

TEST(String, LengthOfNarrowTextIsItsBytes) {
    const String s("\xC3\xA9");  // one character, one unit
    EXPECT_EQ(s.length, 2u);
    EXPECT_EQ(s.View().size(), 1u);
    EXPECT_EQ(s.wide[0], 0xE9);
    EXPECT_EQ(String(Wide(u"\u00E9")).length, 1u);
    String joined = s + String("\xE2\x82\xAC");
    EXPECT_EQ(joined.length, 5u);
    EXPECT_EQ(joined.View().size(), 2u);
    EXPECT_EQ(String(joined).length, 5u);
}

TEST(String, CopyTakesTextAndLengthButNotTheCaches) {
    const String s("abc");
    s.GetUtf8();
    s.GetAnsi();
    const String copy(s);
    EXPECT_EQ(copy.utf8, nullptr);
    EXPECT_EQ(copy.ansi, nullptr);
    EXPECT_EQ(copy.length, 3u);
    EXPECT_NE(copy.wide, s.wide);
    EXPECT_TRUE(copy == s);
}

TEST(String, NarrowFormsAreCached) {
    const String s("abc");
    EXPECT_EQ(s.GetUtf8(), s.GetUtf8());
    EXPECT_EQ(s.GetAnsi(), s.GetAnsi());
}

TEST(String, AssignmentDropsEarlierNarrowForms) {
    String s("one");
    EXPECT_STREQ(s.GetUtf8(), "one");
    s = String("two");
    EXPECT_STREQ(s.GetUtf8(), "two");
    s = "three";
    EXPECT_STREQ(s.GetUtf8(), "three");
    s = Wide(u"four");
    EXPECT_STREQ(s.GetUtf8(), "four");
    EXPECT_STREQ(s.GetAnsi(), "four");
    s = std::string("five");
    EXPECT_STREQ(s.GetUtf8(), "five");
    EXPECT_STREQ(s.GetAnsi(), "five");
}

TEST(String, AssigningAnEmptyStandardStringGivesTheNullState) {
    String s("text");
    s = std::string();
    EXPECT_EQ(s.wide, nullptr);
    EXPECT_EQ(s.length, 0u);
}

TEST(String, StandardStringEndsAtItsFirstNul) {
    String s;
    s = std::string("ab\0cd", 5);
    EXPECT_TRUE(s == "ab");
    EXPECT_EQ(s.length, 2u);
}

TEST(String, SelfAssignmentLeavesTheNullState) {
    String s("text");
    const String& same = s;
    s = same;
    EXPECT_EQ(s.wide, nullptr);
    EXPECT_EQ(s.length, 0u);
}

TEST(String, AssignmentFromItsOwnBuffers) {
    String s("text");
    s = s.GetUtf8();
    EXPECT_TRUE(s == "text");
    const WideChar* tail = s.wide + 2;
    s = tail;
    EXPECT_TRUE(s == "xt");
}

TEST(String, AppendingNullKeepsTheTextAndDropsTheCaches) {
    String s("abc");
    s.GetUtf8();
    s.GetAnsi();
    s.Append(String());
    EXPECT_EQ(s.utf8, nullptr);
    EXPECT_EQ(s.ansi, nullptr);
    EXPECT_TRUE(s == "abc");
    EXPECT_EQ(s.length, 3u);
}

TEST(String, AppendingToNullCopies) {
    String s;
    s.Append(String("abc"));
    EXPECT_TRUE(s == "abc");
    String t;
    t.Append(String(""));
    EXPECT_TRUE(t == "");
    String u;
    u.Append(String());
    EXPECT_EQ(u.wide, nullptr);
}

TEST(String, AppendingItself) {
    String s("ab");
    s += s;
    EXPECT_TRUE(s == "abab");
    EXPECT_EQ(s.length, 4u);
}

TEST(String, SubstringWithCountZeroOrTooLargeRunsToTheEnd) {
    String out("old");
    out.GetUtf8();
    String("abcde").Substring(2, 0, out);
    EXPECT_TRUE(out == "cde");
    EXPECT_EQ(out.length, 3u);
    EXPECT_STREQ(out.GetUtf8(), "cde");
    String("abcde").Substring(2, 100, out);
    EXPECT_TRUE(out == "cde");
    String("abcde").Substring(2, 4, out);
    EXPECT_TRUE(out == "cde");
    String("abcde").Substring(2, 0xFFFFFFFFu, out);
    EXPECT_TRUE(out == "cde");
    String("abcde").Substring(1, 2, out);
    EXPECT_TRUE(out == "bc");
    EXPECT_EQ(out.length, 2u);
}

TEST(String, SubstringAtTheEndIsEmptyAndNotNull) {
    String out;
    String("abc").Substring(3, 0, out);
    ASSERT_NE(out.wide, nullptr);
    EXPECT_TRUE(out == "");
    String().Substring(0, 0, out);
    ASSERT_NE(out.wide, nullptr);
    EXPECT_EQ(out.length, 0u);
}

TEST(String, SubstringMayBeWrittenIntoItsOwnString) {
    String s("abcde");
    s.GetUtf8();
    s.Substring(1, 2, s);
    EXPECT_TRUE(s == "bc");
    EXPECT_EQ(s.length, 2u);
    EXPECT_STREQ(s.GetUtf8(), "bc");
    s.Substring(0, 0, s);
    EXPECT_TRUE(s == "bc");
    s.Substring(2, 5, s);
    EXPECT_TRUE(s == "");
}

TEST(String, SubstringFromBehindTheEndIsEmpty) {
    const String s("abc");
    for (const std::uint32_t start : {4u, 100u, 0xFFFFFFFFu})
        for (const std::uint32_t count : {0u, 1u, 3u, 0xFFFFFFFFu}) {
            String out("old");
            s.Substring(start, count, out);
            ASSERT_NE(out.wide, nullptr);
            EXPECT_TRUE(out == "") << start << ' ' << count;
            EXPECT_EQ(out.length, 0u) << start << ' ' << count;
        }
}

TEST(String, CopyTakesTheLengthOfATextThatIsNull) {
    String lost;
    lost.length = 6;  // as narrow text leaves it where memory ran out
    const String copy(lost);
    EXPECT_EQ(copy.wide, nullptr);
    EXPECT_EQ(copy.length, 6u);
    String assigned("old");
    assigned = lost;
    EXPECT_EQ(assigned.wide, nullptr);
    EXPECT_EQ(assigned.length, 6u);
    const String& same = assigned;
    assigned = same;
    EXPECT_EQ(assigned.length, 0u) << "a string that is assigned to itself is null";
}

TEST(String, SubstringBeyondTheTerminatorReadsNothing) {
    // Four bytes but two units, so that a start within `length` lies behind the text.
    const String s("\xC3\xA9\xC3\xA9");
    String out;
    s.Substring(3, 1, out);
    EXPECT_EQ(out.View().size(), 0u);
    EXPECT_EQ(out.length, 1u);
    s.Substring(1, 0, out);
    EXPECT_EQ(out.View(), (std::basic_string_view<WideChar>(Wide(u"\u00E9"))));
}

TEST(String, FindOfNullIsNotFoundAndOfEmptyIsAtTheStart) {
    EXPECT_EQ(String().Find(String("a")), String::kNotFound);
    EXPECT_EQ(String("a").Find(String()), String::kNotFound);
    EXPECT_EQ(String().Find(String()), String::kNotFound);
    EXPECT_EQ(String("a").Find(String("")), 0u);
    EXPECT_EQ(String("abcabc").Find(String("ca")), 2u);
    EXPECT_EQ(String("abc").Find(String("abcd")), 4294967295u);
}

TEST(String, ToLowerFoldsUnitsAndDropsTheCaches) {
    String s(Wide(u"AbZ\u00C9\u0416\u0130 9[\xD801\xDC00"));
    s.GetUtf8();
    s.ToLower();
    EXPECT_EQ(s.utf8, nullptr);
    const auto text = s.View();
    EXPECT_EQ(text[0], 'a');
    EXPECT_EQ(text[2], 'z');
    EXPECT_EQ(text[3], 0xE9);
    EXPECT_EQ(text[4], 0x436);
    EXPECT_EQ(text[7], '9');
    EXPECT_EQ(text[8], '[');
    // A letter outside the plane of single units keeps both surrogates.
    EXPECT_EQ(text[9], 0xD801);
    EXPECT_EQ(text[10], 0xDC00);
    String().ToLower();
}

TEST(String, AnsiInTheClassicLocaleMarksWhatDoesNotFit) {
    EXPECT_STREQ(String("plain").GetAnsi(), "plain");
    EXPECT_STREQ(String("a\xE2\x82\xAC").GetAnsi(), "a?");
}

// Characters that show nothing count like any other: a soft hyphen, a joiner, a mark of direction.
TEST(String, AnsiMarksCharactersThatShowNothing) {
    EXPECT_STREQ(String(u"a\u00AD\u200D\u200Fb").GetAnsi(), "a???b");
    EXPECT_STREQ(String(u"a\xD801 \xDC00").GetAnsi(), "a? ?");
}

TEST(String, AnsiInALocaleOfUtf8IsTheUtf8Form) {
    if (!std::setlocale(LC_CTYPE, "C.UTF-8")) GTEST_SKIP() << "no such locale";
    const String text(u"a\u00AD\u20AC\xD801 \xDC00\U0001F30D");
    const std::string ansi = text.GetAnsi();
    std::setlocale(LC_CTYPE, "C");
    EXPECT_EQ(ansi, text.GetUtf8());
    EXPECT_NE(ansi.find("\xEF\xBF\xBD \xEF\xBF\xBD"), std::string::npos);
}

TEST(String, ReadTrimmedTokenStopsAtWhiteSpace) {
    std::istringstream stream("  BIP\r\n next");
    String token;
    ReadTrimmedToken(stream, token);
    EXPECT_TRUE(token == "BIP");
    ReadTrimmedToken(stream, token);
    EXPECT_TRUE(token == "next");
}

TEST(String, ReadTrimmedTokenEndsAStringAtAZeroAndANarrowTextNot) {
    const std::string text("ab\0c \0d", 7);
    std::istringstream strings(text);
    String token;
    ReadTrimmedToken(strings, token);
    EXPECT_TRUE(token == "ab");
    ReadTrimmedToken(strings, token);
    ASSERT_NE(token.wide, nullptr) << "there was a token";
    EXPECT_TRUE(token == "");
    std::istringstream narrow(text);
    std::string bytes;
    ReadTrimmedToken(narrow, bytes);
    EXPECT_EQ(bytes, std::string("ab\0c", 4));
}

TEST(String, ReadTrimmedTokenOnAnExhaustedStreamIsEmpty) {
    std::istringstream stream(" \r\n\t ");
    String token("old");
    ReadTrimmedToken(stream, token);
    EXPECT_EQ(token.length, 0u);
    ReadTrimmedToken(stream, token);
    EXPECT_EQ(token.length, 0u);
}

}  // namespace
}  // namespace zelm
