// What is told of a document that cannot be read.
#include "format/DocumentParse.h"

#include <gtest/gtest.h>

#include <xercesc/sax/SAXParseException.hpp>

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

}  // namespace
}  // namespace zmctest
