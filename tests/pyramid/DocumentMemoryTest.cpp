// What a document that takes no more holds of what it was given.
#include <gtest/gtest.h>

#include <cstdint>

#include <xercesc/dom/DOM.hpp>
#include <xercesc/dom/impl/DOMCasts.hpp>
#include <xercesc/dom/impl/DOMNodeImpl.hpp>

#include "colour/Palette.h"
#include "pyramid/PyramidXMLDocument.h"
#include "tests/support/MemoryMeter.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {
namespace {

TEST(DocumentMemory, RecordThatIsNotTakenIsForgotten) {
    constexpr int kColors = 20000;
    zelm::Palette palette;
    for (int i = 0; i < kColors; ++i) palette.AddColor(zelm::Color());
    zelm::PyramidXMLDocument document;
    ASSERT_TRUE(document.CreateDocument());
    xercesc::castToNodeImpl(document.document->getDocumentElement())->setReadOnly(true, false);
    const auto peakOf = [&](int times) {
        MemoryMeter::Reset();
        MemoryMeter::Switch(true);
        for (int i = 0; i < times; ++i) EXPECT_FALSE(document.WritePaletteElement(0, palette));
        MemoryMeter::Switch(false);
        return MemoryMeter::Peak();
    };
    const std::int64_t once = peakOf(1);
    EXPECT_GT(once, kColors);
    EXPECT_LT(peakOf(10), 2 * once);
}

}  // namespace
}  // namespace zmctest
