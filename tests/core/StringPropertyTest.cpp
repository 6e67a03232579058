// String and its conversions against naive models over standard strings.
#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "core/String.h"
#include "platform/TextConversion.h"

namespace zelm {
namespace {

using U16 = std::u16string;

const WideChar* Wide(const U16& text) { return reinterpret_cast<const WideChar*>(text.c_str()); }
U16 TextOf(const String& s) {
    const auto view = s.View();
    return U16(view.begin(), view.end());
}

// Few letters, so that texts have parts in common, and units from all over.
rc::Gen<U16> Texts() {
    const auto unit = rc::gen::weightedOneOf<char16_t>(
        {{6, rc::gen::element<char16_t>(u'a', u'b', u'A', u'B', u'0')},
         {1, rc::gen::cast<char16_t>(rc::gen::inRange<std::uint32_t>(1, 0x10000))}});
    return rc::gen::container<U16>(unit);
}

int Sign(int value) { return (value > 0) - (value < 0); }

RC_GTEST_PROP(StringProperty, AppendJoins, ()) {
    const U16 a = *Texts();
    const U16 b = *Texts();
    String s(Wide(a));
    RC_ASSERT(TextOf(s + String(Wide(b))) == a + b);
    s.Append(String(Wide(b)));
    RC_ASSERT(TextOf(s) == a + b);
    RC_ASSERT(s.length == (a + b).size());
}

RC_GTEST_PROP(StringProperty, SubstringIsThatOfTheStandard, ()) {
    const U16 a = *Texts();
    const auto start =
        *rc::gen::inRange<std::uint32_t>(0, static_cast<std::uint32_t>(a.size()) + 1);
    const auto count =
        *rc::gen::inRange<std::uint32_t>(0, static_cast<std::uint32_t>(a.size()) + 9);
    String out;
    String(Wide(a)).Substring(start, count, out);
    const U16 expected = count == 0 ? a.substr(start) : a.substr(start, count);
    RC_ASSERT(TextOf(out) == expected);
    RC_ASSERT(out.length == expected.size());
}

RC_GTEST_PROP(StringProperty, FindIsThatOfTheStandard, ()) {
    const U16 a = *Texts();
    const U16 needle = a.substr(*rc::gen::inRange<std::size_t>(0, a.size() + 1),
                                *rc::gen::inRange<std::size_t>(0, 4)) +
                       *rc::gen::element(U16(), U16(u"a"));
    const std::size_t at = a.find(needle);
    const std::uint32_t expected =
        at == U16::npos ? String::kNotFound : static_cast<std::uint32_t>(at);
    RC_ASSERT(String(Wide(a)).Find(String(Wide(needle))) == expected);
}

RC_GTEST_PROP(StringProperty, CompareOrdersAsTheStandard, ()) {
    const U16 a = *Texts();
    const U16 b = *rc::gen::oneOf(Texts(), rc::gen::just(a), rc::gen::just(a + u"x"));
    RC_ASSERT(Sign(String(Wide(a)).Compare(String(Wide(b)))) == Sign(a.compare(b)));
}

RC_GTEST_PROP(StringProperty, LowerFoldsEveryUnitByItself, ()) {
    const U16 a = *Texts();
    String s(Wide(a));
    s.ToLower();
    U16 expected = a;
    for (char16_t& unit : expected) unit = platform::ToLowerUnit(unit);
    RC_ASSERT(TextOf(s) == expected);
    s.ToLower();
    RC_ASSERT(TextOf(s) == expected);
}

TEST(StringConversion, LowerOfAsciiIsAsInTheAlphabet) {
    for (char16_t unit = 1; unit < 128; ++unit) {
        const bool upper = unit >= u'A' && unit <= u'Z';
        EXPECT_EQ(platform::ToLowerUnit(unit), upper ? unit + 32 : unit);
    }
}

void AppendUnits(U16& out, char32_t c) {
    if (c >= 0x10000) {
        out += static_cast<char16_t>(0xD800 + ((c - 0x10000) >> 10));
        out += static_cast<char16_t>(0xDC00 + ((c - 0x10000) & 0x3FF));
    } else {
        out += static_cast<char16_t>(c);
    }
}

struct Lead {
    int more;                    // bytes that follow
    unsigned char lowest, last;  // range of the first of them
};

// The table of well-formed sequences, row by row.
Lead LeadOf(unsigned char b) {
    if (b < 0x80) return {0, 0, 0};
    if (b < 0xC2) return {-1, 0, 0};
    if (b < 0xE0) return {1, 0x80, 0xBF};
    if (b == 0xE0) return {2, 0xA0, 0xBF};
    if (b == 0xED) return {2, 0x80, 0x9F};
    if (b < 0xF0) return {2, 0x80, 0xBF};
    if (b == 0xF0) return {3, 0x90, 0xBF};
    if (b < 0xF4) return {3, 0x80, 0xBF};
    if (b == 0xF4) return {3, 0x80, 0x8F};
    return {-1, 0, 0};
}

// Each longest start of a well-formed sequence that is cut short becomes one U+FFFD.
U16 NaiveUtf8ToUtf16(const std::string& bytes) {
    U16 out;
    for (std::size_t i = 0; i < bytes.size();) {
        const auto first = static_cast<unsigned char>(bytes[i++]);
        const Lead lead = LeadOf(first);
        char32_t c = lead.more <= 0 ? first : first & (0x3Fu >> lead.more);
        bool good = lead.more >= 0;
        for (int k = 0; good && k < lead.more; ++k) {
            const auto next = i < bytes.size() ? static_cast<unsigned char>(bytes[i]) : 0u;
            good = k == 0 ? next >= lead.lowest && next <= lead.last : (next & 0xC0) == 0x80;
            if (good) {
                c = c << 6 | (next & 0x3Fu);
                ++i;
            }
        }
        AppendUnits(out, good ? c : 0xFFFD);
    }
    return out;
}

std::string NaiveUtf16ToUtf8(const U16& text) {
    std::string out;
    for (std::size_t i = 0; i < text.size(); ++i) {
        char32_t c = text[i];
        if (c >= 0xD800 && c < 0xDC00 && i + 1 < text.size() && (text[i + 1] & 0xFC00) == 0xDC00)
            c = 0x10000 + ((c & 0x3FF) << 10) + (text[++i] & 0x3FFu);
        else if (c >= 0xD800 && c < 0xE000)
            c = 0xFFFD;
        const int more = c < 0x80 ? 0 : c < 0x800 ? 1 : c < 0x10000 ? 2 : 3;
        static constexpr unsigned kMarks[] = {0, 0xC0, 0xE0, 0xF0};
        out += static_cast<char>(kMarks[more] | c >> (6 * more));
        for (int k = more - 1; k >= 0; --k) out += static_cast<char>(0x80 | (c >> (6 * k) & 0x3F));
    }
    return out;
}

// Bytes that make up UTF-8 and near misses of it, none of them NUL.
rc::Gen<std::string> NearlyUtf8() {
    const auto byte = rc::gen::oneOf(
        rc::gen::element<char>('a', '\x80', '\x8F', '\x90', '\x9F', '\xA0', '\xBF', '\xC0', '\xC2',
                               '\xE0', '\xE2', '\xED', '\xEF', '\xF0', '\xF4', '\xF5', '\xFF'),
        rc::gen::cast<char>(rc::gen::inRange(1, 256)));
    return rc::gen::container<std::string>(byte);
}

RC_GTEST_PROP(StringConversion, AnyBytesDecodeAsTheNaiveModel, ()) {
    const std::string bytes = *NearlyUtf8();
    const String s(bytes.c_str());
    RC_ASSERT(TextOf(s) == NaiveUtf8ToUtf16(bytes));
    RC_ASSERT(s.length == bytes.size());
    RC_ASSERT(s.View().size() <= bytes.size());
}

RC_GTEST_PROP(StringConversion, AnyUnitsEncodeAsTheNaiveModel, ()) {
    const auto unit =
        rc::gen::oneOf(rc::gen::element<char16_t>(u'a', 0x7F, 0x80, 0x7FF, 0x800, 0xD7FF, 0xD800,
                                                  0xDBFF, 0xDC00, 0xDFFF, 0xE000, 0xFFFF),
                       rc::gen::cast<char16_t>(rc::gen::inRange<std::uint32_t>(1, 0x10000)));
    const U16 text = *rc::gen::container<U16>(unit);
    const String s(Wide(text));
    RC_ASSERT(std::string(s.GetUtf8()) == NaiveUtf16ToUtf8(text));
}

RC_GTEST_PROP(StringConversion, WellFormedTextSurvivesTheRoundTrip, ()) {
    const auto point =
        rc::gen::suchThat(rc::gen::oneOf(rc::gen::inRange<std::uint32_t>(1, 0x300),
                                         rc::gen::inRange<std::uint32_t>(1, 0x110000)),
                          [](std::uint32_t c) { return c < 0xD800 || c > 0xDFFF; });
    U16 text;
    for (const std::uint32_t c : *rc::gen::container<std::vector<std::uint32_t>>(point))
        AppendUnits(text, c);
    const String s(Wide(text));
    const String back(s.GetUtf8());
    RC_ASSERT(TextOf(back) == text);
    RC_ASSERT(back == s);
}

RC_GTEST_PROP(StringConversion, ASmallBufferGetsAPrefixAndTheNeededSize, ()) {
    const std::string bytes = *NearlyUtf8();
    const U16 expected = NaiveUtf8ToUtf16(bytes);
    const auto capacity = *rc::gen::inRange<std::size_t>(0, expected.size() + 2);
    std::vector<char16_t> out(capacity + 1, u'#');
    const std::size_t needed =
        platform::Utf8ToUtf16(bytes.data(), bytes.size(), out.data(), capacity);
    RC_ASSERT(needed == expected.size());
    RC_ASSERT(out[capacity] == u'#');
    if (capacity >= needed) RC_ASSERT(std::equal(expected.begin(), expected.end(), out.begin()));
}

TEST(StringConversion, ALoneCutSequenceIsOneReplacement) {
    EXPECT_EQ(TextOf(String("\xE2\x82")), u"\uFFFD");
    EXPECT_EQ(TextOf(String("\xC0\xAF")), u"\uFFFD\uFFFD");
    EXPECT_EQ(TextOf(String("\xED\xA0\x80")), u"\uFFFD\uFFFD\uFFFD");
    EXPECT_EQ(TextOf(String("\xF0\x9F\x98\x80")), u"\U0001F600");
}

}  // namespace
}  // namespace zelm
