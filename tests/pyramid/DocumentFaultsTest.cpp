// Documents whose parser fails while memory is out.
#include <gtest/gtest.h>

#include <xercesc/framework/MemBufInputSource.hpp>

#include "pyramid/PyramidXMLDocument.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

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

using FetchFaults = PyramidFileTest;

// What comes back is all that was stored, or what a file without records gives.
TEST_F(FetchFaults, AreWholeOrNothing) {
    using Pixel = unsigned char;
    constexpr std::uint32_t kRecords = 20, kBins = 7;
    PyramidDescription d;
    d.samples = d.lines = 4;
    zelm::Array<zelm::RasterBandHistogram<Pixel>> stored;
    zelm::Palette colours;
    for (std::uint32_t i = 0; i < kRecords; ++i) {
        zelm::RasterBandHistogram<Pixel> histogram;
        histogram.band = i;
        histogram.binCount = kBins;
        for (std::uint32_t bin = 0; bin < kBins; ++bin) histogram.counts.Append(bin + 1);
        stored.Append(histogram);
        colours.AddColor(zelm::RGBAColor(
            zelm::Array<Pixel>(std::vector<Pixel>(4, Pixel(i + 1)).data(), zelm::ArrayShape(4))));
    }
    const auto dataset = Create(d);
    ASSERT_TRUE(dataset->SetHistograms(stored) && dataset->SetPalette(0, colours));
    testing::internal::CaptureStderr();
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        const auto histograms = dataset->GetHistograms<Pixel>();
        const zelm::PalettePtr palette = dataset->GetPalette<Pixel>(0);
        faults.Disarm();
        if (const std::uint32_t count = histograms.shape.elements) {
            ASSERT_EQ(count, kRecords);
            for (std::uint32_t i = 0; i < count; ++i) {
                ASSERT_EQ(histograms.data[i].counts.shape.elements, kBins) << i;
                EXPECT_EQ(histograms.data[i].counts.data[kBins - 1], kBins);
            }
        }
        if (palette && palette->nextIndex != 0) {
            ASSERT_EQ(palette->nextIndex, kRecords);
            for (std::uint32_t i = 0; i < kRecords; ++i)
                EXPECT_EQ(palette->GetColor(i)->green, i + 1);
        } else if (palette) {
            EXPECT_TRUE(palette->colors.empty());
        }
    });
    testing::internal::GetCapturedStderr();
    EXPECT_GT(points, 100u);
}

// Of two palettes, one of which ends within the other, each is kept whole or the fetch is none.
TEST_F(FetchFaults, PaletteWithinAnotherIsWholeOrNothing) {
    PyramidDescription d;
    d.samples = d.lines = 4;
    PyramidModel model(d);
    model.StoreAllImages();
    const std::string text =
        "<DATASET><PALETTE><PALETTE_BAND>0</PALETTE_BAND><PALETTE_RGBA>1|2|3|4</PALETTE_RGBA>"
        "<PALETTE><PALETTE_RGBA>5|6|7|8</PALETTE_RGBA></PALETTE></PALETTE></DATASET>";
    model.file.insert(model.file.end(), text.begin(), text.end());
    model.Save(path);
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    // The inner one begins afresh, and the outer one ends with what is there then.
    const zelm::PalettePtr whole = dataset->GetPalette<unsigned char>(0);
    ASSERT_EQ(whole->nextIndex, 1u);
    ASSERT_EQ(whole->GetColor(0)->red, 5);
    testing::internal::CaptureStderr();
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        const zelm::PalettePtr palette = dataset->GetPalette<unsigned char>(0);
        faults.Disarm();
        if (!palette || palette->nextIndex == 0) return;
        ASSERT_EQ(palette->nextIndex, 1u);
        EXPECT_EQ(palette->GetColor(0)->red, 5);
    });
    testing::internal::GetCapturedStderr();
    EXPECT_GT(points, 10u);
}

// Memory that is short at a store is no reason to refuse the next.
TEST_F(FetchFaults, TreeThatFoundNoMemoryIsMadeByTheNextStore) {
    PyramidDescription d;
    d.samples = d.lines = 4;
    zelm::Palette colours;
    colours.AddColor(zelm::Color());
    ASSERT_TRUE(Create(d)->SetPalette(0, colours));
    testing::internal::CaptureStderr();
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        const auto dataset = Open();
        faults.Rearm();
        const bool made = dataset->EnsureMetaDocument() != nullptr;
        faults.Disarm();
        ASSERT_TRUE(made || faults.Failed() != 0);
        EXPECT_EQ(made, dataset->MetaDocument.IsMade());
        ASSERT_TRUE(dataset->EnsureMetaDocument());
        ASSERT_TRUE(dataset->EnsureMetaDocument()->document);
        EXPECT_EQ(dataset->EnsureMetaDocument()->RecordCount(), 1u);
    });
    testing::internal::GetCapturedStderr();
    EXPECT_GT(points, 20u);
}

// An object, its name, its count of references and its entry; nothing of it is made twice, and a
// tree has no part in it.
TEST_F(FetchFaults, FetchOfAPaletteAllocatesFourTimesForEachColour) {
    constexpr std::uint32_t kColours = 4096;
    PyramidDescription d;
    d.samples = d.lines = 4;
    zelm::Palette colours;
    for (std::uint32_t i = 0; i < kColours; ++i) colours.AddColor(zelm::Color());
    ASSERT_TRUE(Create(d)->SetPalette(0, colours));
    const auto dataset = Open();
    dataset->GetPalette<unsigned char>(0);
    const std::size_t count = zmctest::CountAllocations([&] {
        const auto other = Open();
        ASSERT_EQ(other->GetPalette<unsigned char>(0)->nextIndex, kColours);
    });
    EXPECT_LT(count, kColours * 4 + 1000);
}

// One text for all of them.
TEST_F(FetchFaults, StoreOfAPaletteAllocatesNothingForEachColour) {
    PyramidDescription d;
    d.samples = d.lines = 4;
    zelm::Palette colours;
    for (std::uint32_t i = 0; i < 4096; ++i) colours.AddColor(zelm::Color());
    const auto dataset = Create(d);
    EXPECT_LT(zmctest::CountAllocations([&] { ASSERT_TRUE(dataset->SetPalette(0, colours)); }),
              1000u);
}

}  // namespace
}  // namespace zmctest
