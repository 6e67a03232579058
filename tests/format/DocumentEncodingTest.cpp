// Documents that declare an encoding of their own: what they say, and what they may cost.
#include <gtest/gtest.h>
#include <iconv.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/parsers/SAXParser.hpp>
#include <xercesc/sax/AttributeList.hpp>

#include "format/DocumentParse.h"
#include "tests/support/MemoryMeter.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {
namespace {

// Keeps all that it is told.
class Listener : public FaultReader {
public:
    std::u16string heard;

    void startElement(const XMLCh* const name, xercesc::AttributeList& attributes) override {
        heard.append(u"<").append(name);
        for (XMLSize_t i = 0; i < attributes.getLength(); ++i)
            heard.append(u" ")
                .append(attributes.getName(i))
                .append(u"=")
                .append(attributes.getValue(i));
        heard.append(u">");
    }
    void endElement(const XMLCh* const) override { heard.append(u"/"); }
    void characters(const XMLCh* const text, const XMLSize_t length) override {
        heard.append(text, length);
    }
};

std::string Encode(std::string text, const char* encoding) {
    const iconv_t converter = iconv_open(encoding, "UTF-8");
    EXPECT_NE(converter, reinterpret_cast<iconv_t>(-1)) << encoding;
    std::string out(text.size() * 8 + 16, '\0');
    char* from = text.data();
    char* to = out.data();
    std::size_t left = text.size(), room = out.size();
    EXPECT_EQ(iconv(converter, &from, &left, &to, &room), 0u) << encoding;
    iconv(converter, nullptr, nullptr, &to, &room);
    iconv_close(converter);
    return out.substr(0, out.size() - room);
}

std::string Declaration(const std::string& encoding) {
    return "<?xml version=\"1.0\" encoding=\"" + encoding + "\"?>";
}

std::string FaultOf(const std::string& text) {
    Listener listener;
    return ParseDocumentText(text, listener);
}

// What a document says, or of what it is accused.
std::u16string Heard(const std::string& text) {
    Listener listener;
    const std::string wrong = ParseDocumentText(text, listener);
    return wrong.empty() ? listener.heard : u"!" + std::u16string(wrong.begin(), wrong.end());
}

// The name by which the document declares its encoding, that of its declaration, and that of the
// rest.
struct Case {
    std::string declared;
    const char* declaration;
    const char* rest;
};
const std::vector<Case> kCases = {
    {"UTF-7", "ASCII", "UTF-7"},         {"IBM037", "IBM037", "IBM037"},
    {"IBM1026", "IBM037", "IBM1026"},    {"ibm1047", "IBM037", "IBM1047"},
    {"IBM500", "IBM037", "IBM500"},      {"UTF-8", "IBM037", "UTF-8"},
    {"UTF-8", "ASCII", "UTF-8"},         {"ISO-8859-1", "ASCII", "ISO-8859-1"},
    {"windows-1252", "ASCII", "CP1252"}, {"iso-8859-15", "ASCII", "ISO-8859-15"},
    {"GB18030", "ASCII", "GB18030"}};

TEST(DocumentEncoding, DocumentsAreReadInTheEncodingThatTheyDeclare) {
    const std::string body =
        "<a b='1' c=\"x&lt;'\"><!-- - --><d>7 \xC3\xA9 ]]</d><![CDATA[[&]]]></a>\n";
    for (const Case& each : kCases)
        EXPECT_EQ(
            Heard(Encode(Declaration(each.declared), each.declaration) + Encode(body, each.rest)),
            u"<a b=1 c=x<'><d>7 \u00E9 ]]/[&]/")
            << each.declared;
    EXPECT_EQ(Heard("\xEF\xBB\xBF" + Declaration("UTF-7") + "<a b='+AOk-+AGEAYg-'/>"),
              u"<a b=\u00E9ab>/");
    EXPECT_EQ(Heard(Declaration("Shift_JIS") + "<a><![CDATA[\x83\x5D]>]]></a>\n"), u"<a>\u30BE]>/");
    EXPECT_EQ(Heard(Declaration("ISO-2022-JP") + "<a>\x1B$B%<%=\x1B(B</a>\n"), u"<a>\u30BC\u30BD/");
    // Beyond the first plane.
    EXPECT_EQ(Heard(Declaration("UTF-7") + "<a>+2D3eAA-</a>"), u"<a>\U0001F600/");
}

// Whose bytes say that they are none is read as if it declared nothing.
TEST(DocumentEncoding, WideEncodingsOfNarrowTextsAreNotBelieved) {
    for (const char* const name : {"UTF-16", "utf-16", "UCS-4", "UTF-32"})
        EXPECT_EQ(Heard(Declaration(name) + "<a>\xC3\xA9</a>"), u"<a>\u00E9/") << name;
}

// The parser has begun with UTF-8 where it sees such a declaration.
TEST(DocumentEncoding, DeclarationBehindALineEndChangesNothing) {
    EXPECT_EQ(Heard("<?xml\nversion='1.0' encoding='UTF-7'?><a>+AGE-</a>"), u"<a>+AGE-/");
    EXPECT_EQ(Heard("<?xml\tversion='1.0' encoding='IBM1026'?><a>\xC3\xA9</a>"), u"<a>\u00E9/");
}

TEST(DocumentEncoding, WhatNobodyCanReadIsRefused) {
    for (const std::string& text : std::vector<std::string>{
             Declaration("nonesuch") + "<a/>", Declaration(std::string(5000, 'x')) + "<a/>",
             Declaration("UTF-16LE") + "<a/>", Declaration("UCS-4LE") + "<a/>",
             "<?xml\nversion='1.0' encoding='nonesuch'?><a/>",
             "<?xml version='1.0' encoding='UTF 7'?><a/>", "<?xml version='1.0' encoding=''?><a/>",
             Encode("<?xml version='1.0'?><a/>", "IBM037"),
             Encode("<?xml version='1.0' encoding=IBM037?><a/>", "IBM037"),
             Encode("<?xml version='1.0' encoding='IBM037'", "IBM037"),
             Declaration("UTF-7") + "<a>+2D0-</a>", Declaration("UTF-7") + "<a>+AAA-</a>",
             Declaration("UTF-7") + "<a/>\xC3", Declaration("Shift_JIS") + "<a/>\x83"})
        EXPECT_NE(FaultOf(text), "") << text.substr(0, 60);
}

// Whoever forgets the guard is not served.
TEST(DocumentEncoding, ParserTakesNoneThatWasNotPutIntoUtf8) {
    const std::string text = Declaration("UTF-7") + "<a/>";
    const xercesc::MemBufInputSource source(reinterpret_cast<const XMLByte*>(text.data()),
                                            text.size(), "text");
    FaultReader reader;
    const auto end = zelm::RunParser(*zelm::MakeDocumentParser(), &reader, source, [](auto&) {});
    EXPECT_EQ(end.kind, zelm::ParseEnd::Kind::Refused);
    EXPECT_NE(reader.fault.find("encoding"), std::string::npos) << reader.fault;
}

std::string Attributes(std::uint32_t count) {
    std::string text;
    for (std::uint32_t i = 0; i < count; ++i) text += " b" + std::to_string(i) + "='1'";
    return text;
}

std::string Base64Signs(std::string text) {
    for (const auto& [sign, code] : {std::pair("<", "+ADw-"), {"=", "+AD0-"}, {"'", "+ACc-"}})
        for (std::size_t at = 0; (at = text.find(sign, at)) != text.npos; at += 5)
            text.replace(at, 1, code);
    return text;
}

// An element of a hundred thousand attributes took hundreds of bytes for each of its text.
TEST(DocumentEncoding, NoEncodingHidesAttributes) {
    const std::string tag = "<a" + Attributes(20000) + "/>";
    const std::string hidden = Base64Signs(tag);
    std::string quoted = tag;
    std::replace(quoted.begin(), quoted.end(), '\'', '"');
    std::vector<std::string> texts = {
        Declaration("UTF-7") + hidden, "\xEF\xBB\xBF" + Declaration("UTF-7") + hidden,
        Encode("<?xml  version = '1.0'\n encoding\t= 'utf-7' standalone='yes' ?>", "IBM037") +
            hidden,
        // The second of two bytes is a sign of its own where that is not known.
        Declaration("Shift_JIS") + "<r><![CDATA[\x83\x5D]><!--]]>" + tag + "</r>",
        Declaration("GBK") + "<r><![CDATA[\x81\x5D]><!--]]>" + tag + "</r>",
        Declaration("ISO-2022-JP") + "<r>\x1B$B<!<-<-\x1B(B" + tag + "</r>",
        "<?xml\nversion='1.0' encoding='UTF-7'?><!--" + std::string(20000, ' ') + "-->" + hidden};
    for (const Case& each : kCases)
        texts.push_back(Encode(Declaration(each.declared), each.declaration) +
                        Encode(quoted, each.rest));
    for (const std::string& text : texts) {
        MemoryMeter::Reset();
        MemoryMeter::Switch(true);
        const std::string wrong = FaultOf(text);
        MemoryMeter::Switch(false);
        EXPECT_NE(wrong, "");
        EXPECT_LT(MemoryMeter::Peak(), 8 * static_cast<std::int64_t>(text.size()))
            << text.substr(0, 60);
    }
}

}  // namespace
}  // namespace zmctest
