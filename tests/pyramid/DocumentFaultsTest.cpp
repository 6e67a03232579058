// Documents whose parser fails while memory is out.
#include <gtest/gtest.h>

#include <xercesc/framework/MemBufInputSource.hpp>

#include "pyramid/PyramidXMLDocument.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

using testsupport::AllocationFaults;
using testsupport::ForEachAllocationFailing;
using zelm::PyramidXMLDocument;

constexpr char kText[] = "<DATASET/>";

// A source that makes a document parse it a second time while the first is under way, which the
// parser library answers with an exception that has a message.
class NestingSource : public xercesc::MemBufInputSource {
public:
    explicit NestingSource(PyramidXMLDocument& parsed)
        : MemBufInputSource(reinterpret_cast<const XMLByte*>(kText), sizeof kText - 1, "nesting"),
          document(parsed) {}

    xercesc::BinInputStream* makeStream() const override {
        if (faults) faults->Rearm();
        try {
            taken = document.ParseTree(*this);
        } catch (...) {
            thrown = true;
        }
        if (faults) faults->Disarm();
        return MemBufInputSource::makeStream();
    }

    PyramidXMLDocument& document;
    AllocationFaults* faults = nullptr;
    mutable bool taken = true;
    mutable bool thrown = false;
};

TEST(DocumentFaults, AParserAtWorkIsRefusedWithAMessage) {
    const auto document = PyramidXMLDocument::Make();
    const NestingSource source(*document);
    testing::internal::CaptureStderr();
    document->ParseTree(source);
    EXPECT_NE(testing::internal::GetCapturedStderr().find("Exception message:"), std::string::npos);
    EXPECT_FALSE(source.taken);
    EXPECT_FALSE(source.thrown);
}

TEST(DocumentFaults, AMessageWithoutMemoryLetsNothingOut) {
    testing::internal::CaptureStderr();
    const std::size_t points = ForEachAllocationFailing([](AllocationFaults& faults) {
        faults.Disarm();
        const auto document = PyramidXMLDocument::Make();
        NestingSource source(*document);
        source.faults = &faults;
        document->ParseTree(source);
        EXPECT_FALSE(source.taken);
        EXPECT_FALSE(source.thrown);
    });
    testing::internal::GetCapturedStderr();
    EXPECT_GT(points, 0u);
}

}  // namespace
}  // namespace zmctest
