// What is told of a document that cannot be read.
#include "format/DocumentParse.h"

#include <gtest/gtest.h>

#include <string>

#include <xercesc/sax/SAXParseException.hpp>

#include "tests/support/ProcessorTime.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {
namespace {

TEST(FaultReader, TheFirstFaultIsTold) {
    FaultReader reader;
    reader.error({u"one", u"", u"", 3, 1});
    reader.fatalError({u"two", u"", u"", 4, 1});
    EXPECT_EQ(reader.fault, "line 3: one");
}

TEST(ParseDocumentText, FaultsAreTold) {
    FaultReader reader;
    EXPECT_EQ(ParseDocumentText("<DATASET/>", reader), "");
    const std::string wrong = ParseDocumentText("<DATASET>\n", reader);
    EXPECT_EQ(wrong.substr(0, 8), "line 2: ");
    EXPECT_EQ(wrong, reader.fault);
}

// Whoever throws out of a parse has said nothing of the text.
TEST(ParseDocumentText, ParseThatEndsWithoutAFaultIsAFailureToo) {
    struct Thrower : FaultReader {
        void Enter(std::int32_t) override { throw 5; }
    } thrower;
    EXPECT_EQ(ParseDocumentText("<DATASET/>", thrower), "it cannot be parsed");
    FaultReader reader;
    EXPECT_EQ(ParseDocumentText("<DATASET/>", reader), "") << "the next parse";
}

std::string WithAttributes(int count, const char* quote = "'") {
    std::string text;
    for (int i = 0; i < count; ++i) text += " b" + std::to_string(i) + " = " + quote + ">=" + quote;
    return text;
}

std::string Guarded(std::string text) {
    EXPECT_FALSE(zelm::GuardText(reinterpret_cast<unsigned char*>(text.data()), text.size()).bytes);
    return text;
}

std::string FaultOf(const std::string& text) {
    FaultReader reader;
    return ParseDocumentText(text, reader);
}

TEST(GuardText, AnElementEndsBehindTheFirstAttributeTooMany) {
    for (const char* const quote : {"'", "\""}) {
        const std::string good = "<a><b" + WithAttributes(64, quote) + "/></a>";
        EXPECT_EQ(Guarded(good), good);
        EXPECT_EQ(FaultOf(good), "");
        const std::string most = "<a>\n<b" + WithAttributes(65, quote);
        EXPECT_EQ(Guarded(most + "/></a>"), most + ">></a>");
        EXPECT_EQ(Guarded(most + " c='1' d='2'/></a>"), most + ">c='1' d='2'/></a>");
        EXPECT_EQ(Guarded(most), most) << "the text ends there by itself";
        EXPECT_EQ(FaultOf(most + " c='1' d='2'/></a>"), FaultOf(most + "/></a>"));
        EXPECT_NE(FaultOf(most + "/></a>").find("attributes"), std::string::npos);
    }
}

TEST(GuardText, WhatOnlyLooksLikeAttributesStays) {
    const std::string tag = "<b" + WithAttributes(70) + "/>";
    for (const std::string& text :
         {"<!--" + tag + "--><a/>", "<!-->" + tag + "--><a/>", "<!-- -> ->" + tag + "--><a/>",
          "<a><![CDATA[" + tag + "]]></a>", "<a><![CDATA[>]>" + tag + "]]>b</a>",
          "<?p " + tag + "?><a/>", "<?p >" + tag + "?><a/>", "<a>" + WithAttributes(70) + "</a>",
          "<a b='" + WithAttributes(70, "\"") + "'/>"}) {
        EXPECT_EQ(Guarded(text), text);
        EXPECT_EQ(FaultOf(text), "") << text;
    }
    EXPECT_NE(Guarded("<!-- --><a/>" + tag), "<!-- --><a/>" + tag) << "behind them it is looked on";
    EXPECT_NE(Guarded("<?p ? ?><a><![CDATA[]]>" + tag), "<?p ? ?><a><![CDATA[]]>" + tag);
}

TEST(GuardText, TornMarkupIsLeftToTheParser) {
    for (const std::string text : {"<", "<!", "<!-", "<!--", "<!-->", "<!--->", "<![", "<![CDATA[",
                                   "<?", "<?>", "<a b='", "<a b", "<a <b='1'", "<!DOCTYPE a>", ""})
        EXPECT_EQ(Guarded(text), text);
}

// To store them all took fifteen seconds and more than a gigabyte.
TEST(ParseDocumentText, MillionsOfAttributesAreRefusedAtOnce) {
    std::string text = "<a";
    for (int i = 0; i < 2'000'000; ++i) text += " b" + std::to_string(i) + "='1'";
    const ProcessorTime time;
    EXPECT_NE(FaultOf(text + "/>").find("attributes"), std::string::npos);
    EXPECT_LT(time.Seconds(), 5);
}

}  // namespace
}  // namespace zmctest
