#include "connection/ConnectionStrings.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <cmath>
#include <limits>
#include <string>
#include <vector>

#include "core/ElementTypes.h"
#include "tests/support/MemoryRaster.h"
#include "tests/support/NumberTexts.h"

namespace zmctest {

using namespace zelm;
namespace {

std::string Find(const String& source, const String& key, bool expected) {
    String value("before");
    EXPECT_EQ(FindParameterValue(source, key, value), expected);
    EXPECT_NE(value.wide, nullptr);
    return value.GetUtf8();
}

std::uint32_t Unsigned(const std::string& text) {
    std::uint32_t value = 4711;
    EXPECT_TRUE(ReadUnsignedParameter(("A=" + text).c_str(), "A", value));
    return value;
}

std::int32_t Signed(const std::string& text) {
    std::int32_t value = 4711;
    EXPECT_TRUE(ReadSignedParameter(("A=" + text).c_str(), "A", value));
    return value;
}

bool Pair(const std::string& text, double& first, double& second) {
    return ReadDoublePairParameter(("A=" + text).c_str(), "A", first, second);
}

double Double(const std::string& text) {
    double first = 4711, second = 0;
    EXPECT_TRUE(Pair(text + ",1", first, second));
    return first;
}

std::vector<std::string> Split(const String& source, const String& delimiter, bool expected) {
    Array<String> out;
    out.Append("before");
    EXPECT_EQ(SplitString(source, delimiter, out), expected);
    std::vector<std::string> tokens;
    for (std::uint32_t i = 0; i < out.shape.elements; ++i)
        tokens.emplace_back(out.data[i].GetUtf8());
    return tokens;
}

using Tokens = std::vector<std::string>;

TEST(FindParameterValue, FindsEachKey) {
    EXPECT_EQ(Find("A=1;B=2", "A", true), "1");
    EXPECT_EQ(Find("A=1;B=2", "B", true), "2");
    EXPECT_EQ(Find("A=1;B=2", "C", false), "");
}

TEST(FindParameterValue, FirstOccurrenceCountsWhereverItStands) {
    EXPECT_EQ(Find("XA=1;A=2", "A", true), "1");
    EXPECT_EQ(Find("FILENAME=x", "NAME", true), "x");
    EXPECT_EQ(Find("A=1;A=2", "A", true), "1");
    EXPECT_EQ(Find("B=A=5;A=2", "A", true), "5");
}

TEST(FindParameterValue, EmptyValueIsFalse) {
    EXPECT_EQ(Find("A=;B=2", "A", false), "");
    EXPECT_EQ(Find("B=2;A=", "A", false), "");
}

TEST(FindParameterValue, EmptySourceOrKeyIsFalse) {
    EXPECT_EQ(Find("", "A", false), "");
    EXPECT_EQ(Find(String(), "A", false), "");
    EXPECT_EQ(Find("=1", "", false), "");
    EXPECT_EQ(Find("=1", String(), false), "");
}

TEST(FindParameterValue, NothingIsTrimmedOrFolded) {
    EXPECT_EQ(Find("A= x ;B=2", "A", true), " x ");
    EXPECT_EQ(Find("a=1", "A", false), "");
    EXPECT_EQ(Find("A=1;", "A", true), "1");
}

TEST(FindParameterValue, TextOutsideAscii) {
    EXPECT_EQ(Find("NAME=gr\xC3\xBC\xC3\x9F;B=2", "B", true), "2");
    EXPECT_EQ(Find("NAME=gr\xC3\xBC\xC3\x9F", "NAME", true), "gr\xC3\xBC\xC3\x9F");
}

TEST(FindParameterValue, AMegabyteOfSeparators) {
    const std::string many(1 << 20, ';');
    EXPECT_EQ(Find(many.c_str(), "A", false), "");
    EXPECT_EQ(Find((many + "A=1" + many).c_str(), "A", true), "1");
}

TEST(ReadUnsignedParameter, TakesEveryBase) {
    EXPECT_EQ(Unsigned("0x10"), 16u);
    EXPECT_EQ(Unsigned("0Xff"), 255u);
    EXPECT_EQ(Unsigned("010"), 8u);
    EXPECT_EQ(Unsigned("10"), 10u);
    EXPECT_EQ(Unsigned(" \t12"), 12u);
}

TEST(ReadUnsignedParameter, ReadsAsFarAsItGoes) {
    EXPECT_EQ(Unsigned("abc"), 0u);
    EXPECT_EQ(Unsigned("12abc"), 12u);
    EXPECT_EQ(Unsigned("089"), 0u);
    EXPECT_EQ(Unsigned("7\xC3\xBC"), 7u);
    EXPECT_EQ(Unsigned("--1"), 0u);
    EXPECT_EQ(Unsigned("0b11"), 0u);
    EXPECT_EQ(Unsigned("0x"), 0u);
}

TEST(ReadUnsignedParameter, HasThirtyTwoBits) {
    EXPECT_EQ(Unsigned("4294967295"), 4294967295u);
    EXPECT_EQ(Unsigned("4294967296"), 4294967295u);
    EXPECT_EQ(Unsigned("99999999999999999999999"), 4294967295u);
    EXPECT_EQ(Unsigned("-1"), 4294967295u);
    EXPECT_EQ(Unsigned("-4294967295"), 1u);
    EXPECT_EQ(Unsigned("-4294967296"), 4294967295u);
    EXPECT_EQ(Unsigned("-99999999999999999999999"), 4294967295u);
    EXPECT_EQ(Unsigned("18446744069414584321"), 4294967295u);
    EXPECT_EQ(Unsigned("-18446744073709551615"), 4294967295u);
}

TEST(ReadUnsignedParameter, MissingKeyLeavesTheValueAlone) {
    std::uint32_t value = 4711;
    EXPECT_FALSE(ReadUnsignedParameter("B=1", "A", value));
    EXPECT_FALSE(ReadUnsignedParameter("A=", "A", value));
    EXPECT_EQ(value, 4711u);
}

TEST(ReadSignedParameter, SaturatesAtThirtyTwoBits) {
    EXPECT_EQ(Signed("-1"), -1);
    EXPECT_EQ(Signed("-0x10"), -16);
    EXPECT_EQ(Signed("2147483648"), 2147483647);
    EXPECT_EQ(Signed("-2147483649"), std::numeric_limits<std::int32_t>::min());
    EXPECT_EQ(Signed("-99999999999999999999"), std::numeric_limits<std::int32_t>::min());
    EXPECT_EQ(Signed("x"), 0);
    std::int32_t value = 4711;
    EXPECT_FALSE(ReadSignedParameter("B=1", "A", value));
    EXPECT_EQ(value, 4711);
}

TEST(ReadPixelTypeParameter, TakesTheNumbersThatHaveAReader) {
    for (int number = -2; number < 130; ++number) {
        std::uint32_t code = 4711;
        const std::string text = "A=" + std::to_string(number);
        bool known = false;
#define ZMC_X(type, name, typeCode) known = known || number == typeCode;
        ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
        EXPECT_EQ(ReadPixelTypeParameter(text.c_str(), "A", code), known) << text;
        EXPECT_EQ(code, known ? static_cast<std::uint32_t>(number) : 4711u) << text;
    }
}

TEST(ReadPixelTypeParameter, RefusesWordsAndMissingKeys) {
    std::uint32_t code = 4711;
    EXPECT_FALSE(ReadPixelTypeParameter("A=Byte", "A", code));
    EXPECT_FALSE(ReadPixelTypeParameter("B=1", "A", code));
    EXPECT_FALSE(ReadPixelTypeParameter("A=4294967297", "A", code)) << "saturated, not wrapped";
    EXPECT_EQ(code, 4711u);
    EXPECT_TRUE(ReadPixelTypeParameter("A=0x63", "A", code));
    EXPECT_EQ(code, 99u);
}

TEST(ReadDoublePairParameter, WantsTwoNumbers) {
    double first = 8, second = 9;
    for (const char* text : {"1", "1,2,3", ",", ",1,", "", ";"}) {
        EXPECT_FALSE(Pair(text, first, second)) << text;
        EXPECT_EQ(first, 8);
        EXPECT_EQ(second, 9);
    }
    EXPECT_TRUE(Pair("1,,2", first, second));
    EXPECT_EQ(first, 1.0);
    EXPECT_EQ(second, 2.0);
    EXPECT_TRUE(Pair("a,b", first, second));
    EXPECT_EQ(first, 0.0);
    EXPECT_EQ(second, 0.0);
}

TEST(ReadDoublePairParameter, ReadsNumbersAsTheLibraryDoes) {
    for (const std::string& text : zmctest::RealTexts()) {
        if (text.empty()) continue;  // there is no number to be a pair with
        EXPECT_TRUE(zmctest::SameReal(Double(text), zmctest::LibraryReal(text))) << text;
    }
}

TEST(ReadDoublePairParameter, AMegabyteOfTokensIsRefusedAtOnce) {
    std::string many;
    for (int i = 0; i < 1 << 19; ++i) many += "1,";
    double first = 0, second = 0;
    EXPECT_FALSE(Pair(many, first, second));
}

TEST(ReadPointerParameter, ReadsWhatPrintfWrites) {
    int object = 0;
    const MemoryRasterText text(&object);
    void* pointer = nullptr;
    EXPECT_TRUE(ReadPointerParameter(text.Text().c_str(), "PIXELDATA", &pointer));
    EXPECT_EQ(pointer, &object);
}

TEST(ReadPointerParameter, ReadsBareDigits) {
    void* pointer = nullptr;
    EXPECT_TRUE(ReadPointerParameter("PIXELDATA=000000001A2B3C40", "PIXELDATA", &pointer));
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(pointer), 0x1A2B3C40u);
}

TEST(ReadPointerParameter, UnreadableAddressIsNullAndTrue) {
    int object = 0;
    void* pointer = &object;
    EXPECT_TRUE(ReadPointerParameter("PIXELDATA=zz", "PIXELDATA", &pointer));
    EXPECT_EQ(pointer, nullptr);
}

TEST(ReadPointerParameter, MissingKeyOrTarget) {
    int object = 0;
    void* pointer = &object;
    EXPECT_FALSE(ReadPointerParameter("B=1", "PIXELDATA", &pointer));
    EXPECT_EQ(pointer, nullptr);
    EXPECT_FALSE(ReadPointerParameter("PIXELDATA=1", "PIXELDATA", nullptr));
}

TEST(SplitString, DropsEmptyStretches) {
    EXPECT_EQ(Split("1,,2", ",", true), (Tokens{"1", "2"}));
    EXPECT_EQ(Split(",1,", ",", true), (Tokens{"1"}));
    EXPECT_EQ(Split(",,,", ",", true), Tokens{});
    EXPECT_EQ(Split("abc", ",", true), (Tokens{"abc"}));
}

TEST(SplitString, EmptySourceOrDelimiterIsFalse) {
    EXPECT_EQ(Split("", ",", false), Tokens{});
    EXPECT_EQ(Split(String(), ",", false), Tokens{});
    EXPECT_EQ(Split("a", "", false), Tokens{});
    EXPECT_EQ(Split("a", String(), false), Tokens{});
}

TEST(SplitString, MatchesTheFirstUnitAndSkipsTheWholeDelimiter) {
    EXPECT_EQ(Split("a--b-xc", "--", true), (Tokens{"a", "b", "c"}));
    EXPECT_EQ(Split("ab-", "---", true), (Tokens{"ab"}));
    EXPECT_EQ(Split("-", "-----", true), Tokens{});
}

TEST(SplitString, ResultHasTheShapeOfAppendedElements) {
    Array<String> out;
    ASSERT_TRUE(SplitString("1,2,3", ",", out));
    EXPECT_EQ(out.shape.dimensions, 1u);
    EXPECT_EQ(out.shape.extents[0], 3u);
    EXPECT_EQ(out.capacity, 3u);
}

TEST(SplitString, AViewTakesNothing) {
    String buffer[2] = {"x", "y"};
    Array<String> view(buffer, ArrayShape(2));
    EXPECT_TRUE(SplitString("1,2", ",", view));
    EXPECT_TRUE(buffer[0] == "x");
    EXPECT_EQ(view.shape.elements, 2u);
}

TEST(ExtractFormatName, FirstElementOfTheTable) {
    EXPECT_TRUE(ExtractFormatName(Argument({"x", "Pyramid", "MemoryRaster"})) == "Pyramid");
    EXPECT_TRUE(ExtractFormatName(Argument({"pyramid", "Memory Raster"})) == "");
    EXPECT_TRUE(ExtractFormatName(Argument({})) == "");
    EXPECT_NE(ExtractFormatName(Argument({})).wide, nullptr);
}

TEST(ExtractConnectionParameters, DropsEveryFormatWord) {
    Array<String> out;
    out.Append("before");
    EXPECT_TRUE(ExtractConnectionParameters(Argument({"Pyramid", "a", "MemoryRaster"}), out));
    ASSERT_EQ(out.shape.elements, 1u);
    EXPECT_TRUE(out.data[0] == "a");
    EXPECT_TRUE(ExtractConnectionParameters(Argument({}), out));
    EXPECT_EQ(out.shape.elements, 0u);
}

TEST(ExtractConnectionParameters, PassesOnWhatIsNoFormatWord) {
    Array<String> out;
    EXPECT_TRUE(ExtractConnectionParameters(Argument({"a", "b", "c"}), out));
    ASSERT_EQ(out.shape.elements, 3u);
    EXPECT_TRUE(out.data[2] == "c");
}

TEST(ExtractConnectionParameters, AnElementWithoutTextIsAParameter) {
    Array<String> argument;
    argument.Append(String());
    Array<String> out;
    EXPECT_TRUE(ExtractConnectionParameters(argument, out));
    ASSERT_EQ(out.shape.elements, 1u);
    EXPECT_EQ(out.data[0].wide, nullptr);
}

TEST(ExtractConnectionParameters, AViewTakesNothing) {
    String buffer[1] = {"x"};
    Array<String> view(buffer, ArrayShape(1));
    EXPECT_TRUE(ExtractConnectionParameters(Argument({"a"}), view));
    EXPECT_TRUE(buffer[0] == "x");
}

TEST(SplitConnection, GivesWordAndParameters) {
    String kind;
    Array<String> parameters;
    SplitConnection(Argument({"a", "MemoryRaster"}), kind, parameters);
    EXPECT_TRUE(kind == "MemoryRaster");
    ASSERT_EQ(parameters.shape.elements, 1u);
    EXPECT_TRUE(parameters.data[0] == "a");
}

TEST(ConnectionStrings, ManyElementsTakeLinearTime) {
    String value("p");
    Array<String> argument, out;
    ASSERT_TRUE(argument.SetShape(ArrayShape(200000)));
    for (std::uint32_t i = 0; i < argument.shape.elements; ++i) argument.data[i] = value;
    EXPECT_TRUE(ExtractConnectionParameters(argument, out));
    EXPECT_EQ(out.shape.elements, 200000u);
}

RC_GTEST_PROP(ConnectionStrings, AnyTextIsAnswered, (const std::string& text)) {
    const String source(text.c_str());
    String value;
    std::uint32_t number = 0;
    double pair[2];
    void* pointer = nullptr;
    Array<String> tokens;
    for (const char* key : {"A", ";", "=", "0x"}) {
        if (FindParameterValue(source, key, value)) RC_ASSERT(!value.IsEmpty());
        ReadUnsignedParameter(source, key, number);
        ReadDoublePairParameter(source, key, pair[0], pair[1]);
        ReadPointerParameter(source, key, &pointer);
    }
    SplitString(source, ";", tokens);
}

}  // namespace
}  // namespace zmctest
