// What a layout settles, levels, tables, ends and completeness, changes in one step or not at all.
#include <gtest/gtest.h>

#include <cerrno>

#include "pyramid/PyramidRasterReader.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/FileFaults.h"
#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

using zelm::PyramidDataset;

class LayoutStateTest : public PyramidFileTest, public testing::WithParamInterface<std::uint32_t> {
protected:
    PyramidDescription Description(std::uint32_t levelMax, std::uint32_t side = 600) const {
        PyramidDescription d;
        d.samples = d.lines = side;
        d.bands = 2;
        d.levelMax = levelMax;
        d.ordering = GetParam();
        return d;
    }

    FileFault Fault(unsigned calls, std::size_t n, bool fromThenOn = false) const {
        return {directory.string(), calls, n, fromThenOn, FileFaultAction::Error, ENOSPC};
    }

    // Every operation on tiles and records is refused, and the file stays as it is.
    void ExpectNoLayout(PyramidDataset& dataset) {
        EXPECT_EQ(dataset.LevelMin + dataset.LevelMax + dataset.LevelCount, 0u);
        EXPECT_EQ(dataset.LevelOffsets, nullptr);
        EXPECT_EQ(dataset.TileOffsets.data, nullptr);
        EXPECT_EQ(dataset.TileDataStart + dataset.TileDataEnd + dataset.MetaDocumentOffset, 0u);
        EXPECT_FALSE(dataset.HasPyramid);
        const std::string before = zmctest::ReadText(path.string());
        Bytes pixels(256 * 256 * 2, 7);
        const BandList list({0, 1});
        for (const int level : {0, 1, 8}) {
            EXPECT_FALSE(ReadBytes(dataset, 0, 0, 2, 2, list, level, pixels));
            EXPECT_FALSE(WriteBytes(dataset, 0, 0, 2, 2, list, level, pixels));
            EXPECT_FALSE(WriteBytes(dataset, 0, 0, 256, 256, list, level, pixels));
        }
        EXPECT_FALSE(dataset.SetPalette(0, zelm::Palette()));
        EXPECT_TRUE(dataset.RefreshPyramidState());
        EXPECT_FALSE(dataset.HasPyramid);
        EXPECT_EQ(zmctest::ReadText(path.string()), before);
    }

    // All that ReadHeader settles is what a dataset has that was opened just now.
    void ExpectOpenState(const PyramidDataset& dataset) {
        const auto fresh = Open();
        ASSERT_TRUE(fresh);
        ExpectSameState(dataset, *fresh);
    }

    static void ExpectSameState(const PyramidDataset& a, const PyramidDataset& b) {
        EXPECT_EQ(a.VersionMajor, b.VersionMajor);
        EXPECT_EQ(a.VersionMinor, b.VersionMinor);
        EXPECT_EQ(a.BandCount, b.BandCount);
        EXPECT_EQ(a.Samples, b.Samples);
        EXPECT_EQ(a.Lines, b.Lines);
        EXPECT_EQ(a.TileSize, b.TileSize);
        EXPECT_EQ(a.LevelCount, b.LevelCount);
        EXPECT_EQ(a.LevelMin, b.LevelMin);
        EXPECT_EQ(a.LevelMax, b.LevelMax);
        EXPECT_EQ(a.TileDataEnd, b.TileDataEnd);
        EXPECT_EQ(a.HasPyramid, b.HasPyramid);
        EXPECT_EQ(a.PixelType, b.PixelType);
        EXPECT_EQ(a.Interleave, b.Interleave);
        EXPECT_EQ(a.TileOrdering, b.TileOrdering);
        EXPECT_EQ(a.TileCursor, b.TileCursor);
        EXPECT_EQ(a.BytesPerSample, b.BytesPerSample);
        EXPECT_EQ(a.TileDataStart, b.TileDataStart);
        EXPECT_EQ(a.MetaDocumentOffset, b.MetaDocumentOffset);
        ASSERT_EQ(a.LevelOffsets == nullptr, b.LevelOffsets == nullptr);
        for (std::uint32_t level = 0; a.LevelOffsets && level <= a.LevelMax; ++level)
            EXPECT_EQ(a.LevelOffsets[level], b.LevelOffsets[level]) << level;
        ASSERT_EQ(a.TileOffsets.shape.elements, b.TileOffsets.shape.elements);
        ASSERT_EQ(a.TileOffsets.data == nullptr, b.TileOffsets.data == nullptr);
        for (std::uint32_t i = 0; a.TileOffsets.data && i < a.TileOffsets.shape.elements; ++i)
            EXPECT_EQ(a.TileOffsets.data[i], b.TileOffsets.data[i]) << i;
    }

    void Save(const PyramidDescription& d) const {
        PyramidModel model(d);
        model.StoreAllImages();
        model.Save(path);
    }
};

TEST_P(LayoutStateTest, HeaderThatCannotBeWrittenLeavesNoLayout) {
    for (const bool fromThenOn : {true, false}) {
        bool met = true;
        for (std::size_t n = 1; met; ++n) {
            SCOPED_TRACE("write " + std::to_string(n));
            const auto dataset = Create(Description(0));
            FillLevel(*dataset, 0, PyramidModel(Description(0)).Image(0));
            dataset->RefreshPyramidState();
            ASSERT_TRUE(dataset->HasPyramid);
            FileFaults faults(Fault(zmctest::kWriteCall, n, fromThenOn));
            dataset->CreateFile(0, 8);
            faults.Disarm();
            met = faults.Failed() != 0;
            if (met) ExpectNoLayout(*dataset);
            // The dataset is what it was made as, and can make its file as soon as there is room.
            dataset->CreateFile(0, 8);
            EXPECT_EQ(dataset->LevelMax, 8u);
            EXPECT_TRUE(Open());
        }
    }
}

TEST_P(LayoutStateTest, FileWhoseSizeCannotBeToldHasNoLayout) {
    bool met = true;
    for (std::size_t n = 1; met; ++n) {
        SCOPED_TRACE("status " + std::to_string(n));
        const auto dataset = Create(Description(0));
        FileFaults faults(Fault(zmctest::kStatusCall, n));
        dataset->CreateFile(0, 8);
        faults.Disarm();
        met = faults.Failed() != 0;
        if (dataset->LevelOffsets) {
            EXPECT_TRUE(dataset->LevelMax == 8 || !dataset->Writable) << "made, or not touched";
        } else {
            ExpectNoLayout(*dataset);
        }
    }
}

TEST_P(LayoutStateTest, MemoryThatRunsOutLeavesTheOldLayoutOrNone) {
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        const auto dataset = Create(Description(0));
        const std::uint64_t end = dataset->TileDataEnd;
        faults.Rearm();
        dataset->CreateFile(0, 8);
        faults.Disarm();
        if (!dataset->LevelOffsets) return ExpectNoLayout(*dataset);
        if (dataset->LevelMax == 8) return ExpectOpenState(*dataset);
        EXPECT_EQ(dataset->LevelMax, 0u);
        EXPECT_EQ(dataset->TileDataEnd, end);
    });
}

TEST_P(LayoutStateTest, LevelsThatAreRefusedChangeNothing) {
    const auto dataset = Create(Description(2));
    FillLevel(*dataset, 2, PyramidModel(Description(2)).Image(2));
    dataset->RefreshPyramidState();
    const std::string before = zmctest::ReadText(path.string());
    for (const std::uint32_t levelMax : {1024u, 0xFFFFFFFFu}) {
        dataset->CreateFile(1, levelMax);
        EXPECT_EQ(zmctest::ReadText(path.string()), before);
        ExpectOpenState(*dataset);
    }
}

TEST_P(LayoutStateTest, HeaderThatIsReadAgainIsTakenWhole) {
    Save(Description(2));
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    for (const std::uint32_t side : {300u, 900u, 40u}) {
        const PyramidDescription other = Description(side == 900 ? 8 : 1, side);
        Save(other);
        ASSERT_FALSE(dataset->ReadHeader());
        ExpectOpenState(*dataset);
        EXPECT_EQ(ReadRect(*dataset, 0, 0, side, side, BandList({0, 1}), 0),
                  PyramidModel(other).Image(0));
    }
}

TEST_P(LayoutStateTest, HeaderThatCannotBeReadAgainChangesNothing) {
    Save(Description(2));
    const auto dataset = Open();
    const auto kept = Open();
    ASSERT_TRUE(dataset && kept);
    const std::string good = zmctest::ReadText(path.string());
    const auto expectKept = [&] {
        EXPECT_TRUE(dataset->ReadHeader()) << "true is failure";
        ExpectSameState(*dataset, *kept);
        EXPECT_TRUE(dataset->HeaderLoaded);
    };
    const auto replaced = [&](const std::string& from, const std::string& to) {
        std::string text = good;
        return text.replace(text.find(from), from.size(), to);
    };
    for (const std::string& bad :
         {std::string("II*"), good.substr(0, 19), good.substr(0, 100), "KOBT" + good.substr(1),
          replaced("KOBT", std::string("KOBT\x10", 5)), replaced("</HEADER>", "</HEADEX>"),
          replaced("<HEADER_TILESIZE>256", "<HEADER_TILESIZE>000"),
          replaced("<HEADER_BANDS>2", "<HEADER_BANDS>\xFF")}) {
        zmctest::WriteText(path.string(), bad);
        expectKept();
    }
    zmctest::WriteText(path.string(), good);
    bool met = true;
    for (std::size_t n = 1; met; ++n) {
        FileFaults faults(Fault(zmctest::kReadCall, n));
        const bool failed = dataset->ReadHeader();
        faults.Disarm();
        met = faults.Failed() != 0;
        EXPECT_EQ(failed, met) << "read " << n;
        ExpectSameState(*dataset, *kept);
    }
    ForEachAllocationFailing([&](AllocationFaults&) { dataset->ReadHeader(); });
    ExpectSameState(*dataset, *kept);
}

TEST_P(LayoutStateTest, TilesThatHaveBecomeTooLargeLeaveNoTables) {
    Save(Description(2));
    const auto dataset = Open();
    ASSERT_TRUE(dataset);
    auto large = Description(8);
    large.tile = 2049;
    PyramidModel(large).Save(path);
    const std::string before = zmctest::ReadText(path.string());
    ASSERT_FALSE(dataset->ReadHeader());
    ExpectOpenState(*dataset);
    EXPECT_EQ(dataset->LevelOffsets, nullptr);
    EXPECT_FALSE(dataset->SetPalette(0, zelm::Palette()));
    EXPECT_EQ(zmctest::ReadText(path.string()), before);
}

INSTANTIATE_TEST_SUITE_P(Orderings, LayoutStateTest, testing::Values(0u, 1u, 2u));

}  // namespace
}  // namespace zmctest
