// The limits of documents at their exact values, as docs/format.md tells them.
#include "format/DocumentLimits.h"

#include <gtest/gtest.h>

#include "format/ElementNames.h"
#include "format/PyramidLimits.h"

namespace zmctest {

using namespace zelm;
namespace {

std::u16string Name(std::uint32_t i) {
    return {u'n', static_cast<char16_t>(u'a' + i / 26), static_cast<char16_t>(u'a' + i % 26)};
}

TEST(DocumentLimits, AreThoseOfTheFormat) {
    EXPECT_EQ(kMaxDocumentBytes, 268435456u);
    EXPECT_EQ(kMaxDocumentDepth, 64u);
    EXPECT_EQ(kMaxDocumentNodes, 1048576u);
    EXPECT_EQ(kMaxForeignNames, 256u);
    EXPECT_EQ(kMaxAttributes, 64u);
}

TEST(DocumentLimits, OfTheLayoutAreThoseOfTheFormat) {
    EXPECT_EQ(PyramidLimits::kMaxTileSize, 2048u);
    EXPECT_EQ(PyramidLimits::kMaxLevel, 1023u);
    EXPECT_EQ(PyramidLimits::kMaxTableBytes, 4294967296u);
    EXPECT_EQ(PyramidLimits::kMaxEagerTableBytes, 65536u);
    EXPECT_EQ(PyramidLimits::kMaxTileDataBytes, 4611686018427387904u);
    EXPECT_EQ(PyramidLimits::kMaxMortonTiles, 65536u);
    EXPECT_EQ(PyramidLimits::kMaxScratchBytes, 268435456u);
}

TEST(DocumentLimits, SixtyFourElementsMayBeOpen) {
    DocumentLimits limits;
    for (int i = 0; i < 64; ++i) EXPECT_EQ(limits.EnterElement(u"DATASET", 0), nullptr) << i;
    EXPECT_NE(limits.EnterElement(u"DATASET", 0), nullptr);
}

TEST(DocumentLimits, ElementsThatAreLeftDoNotCountAsOpen) {
    DocumentLimits limits;
    for (int i = 0; i < 200; ++i) {
        EXPECT_EQ(limits.EnterElement(u"DATASET", 0), nullptr);
        EXPECT_EQ(limits.depth, 1u);
        limits.LeaveElement();
        EXPECT_EQ(limits.depth, 0u);
    }
    limits.LeaveElement();
    EXPECT_EQ(limits.depth, 0u);
}

TEST(DocumentLimits, SixtyFourAttributesMayStandOnAnElement) {
    DocumentLimits limits;
    EXPECT_EQ(limits.EnterElement(u"DATASET", 64), nullptr);
    EXPECT_NE(limits.EnterElement(u"DATASET", 65), nullptr);
}

TEST(DocumentLimits, NamesOfTheFormatAreNotForeign) {
    DocumentLimits limits;
    for (std::uint32_t i = 0; i < 256; ++i) EXPECT_EQ(limits.TakeName(Name(i)), nullptr) << i;
    for (const auto& name : kElementNames) {
        EXPECT_EQ(limits.EnterElement(std::u16string_view(name), 0), nullptr);
        limits.LeaveElement();
    }
    EXPECT_EQ(limits.TakeName(Name(7)), nullptr);
    EXPECT_NE(limits.TakeName(Name(256)), nullptr);
    limits.Reset();
    EXPECT_EQ(limits.TakeName(Name(256)), nullptr);
}

TEST(DocumentLimits, EveryNodeCounts) {
    DocumentLimits limits;
    limits.nodes = kMaxDocumentNodes - 1;
    EXPECT_EQ(limits.TakeNode(), nullptr);
    EXPECT_NE(limits.TakeNode(), nullptr);
    limits.Reset();
    EXPECT_EQ(limits.nodes, 0u);
    EXPECT_EQ(limits.EnterElement(u"other", 0), nullptr);
    EXPECT_EQ(limits.nodes, 1u);
}

}  // namespace
}  // namespace zmctest
