// Datasets whose memory or disk fails at each point in turn: nothing crashes, what is true is true,
// and the file is the old one or the new one for whoever opens it next.
#include <gtest/gtest.h>

#include <cerrno>

#include "tests/support/AllocationFaults.h"
#include "tests/support/FileFaults.h"
#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

using zelm::Array;
using zelm::PyramidDataset;

constexpr std::uint32_t kSide = 20;

class PyramidFaultsTest : public PyramidFileTest,
                          public testing::WithParamInterface<std::uint32_t> {
protected:
    PyramidDescription Description(std::uint32_t bands = 3, std::uint32_t tile = 8) const {
        PyramidDescription d;
        d.samples = d.lines = kSide;
        d.bands = bands;
        d.tile = tile;
        d.levelMax = 1;
        d.ordering = GetParam();
        return d;
    }

    Bytes Image(std::uint32_t bands) const {
        Bytes image(std::size_t{kSide} * kSide * bands);
        for (std::size_t i = 0; i < image.size(); ++i)
            image[i] = static_cast<unsigned char>(i * 31 + i / 255);
        return image;
    }

    void Make(const PyramidDescription& d) {
        auto dataset = Create(d);
        FillLevel(*dataset, 0, Image(d.bands));
        FillLevel(*dataset, 1, Bytes(std::size_t{kSide / 2} * (kSide / 2) * d.bands, 9));
        before = zmctest::ReadText(path.string());
    }
    void Restore() const { zmctest::WriteText(path.string(), before); }

    // Makes every kind of call on the folder fail in turn while `work` runs on a fresh dataset.
    template <class Work>
    void ForEachCallFailing(Work&& work) {
        for (const FileFaultAction action : {FileFaultAction::Error, FileFaultAction::Nothing}) {
            bool reached = true;
            for (std::size_t n = 1; reached; ++n) {
                SCOPED_TRACE("call " + std::to_string(n));
                Restore();
                FileFault fault;
                fault.folder = directory.string();
                fault.n = n;
                fault.action = action;
                fault.error = EIO;
                FileFaults faults(fault);
                work();
                faults.Disarm();
                reached = faults.Failed() != 0;
            }
        }
        Restore();
    }

    // Rectangles that read and merge in every way: whole tiles, parts, several tiles, lists.
    struct Request {
        std::uint32_t x, y, width, height;
        std::vector<int> bands;
    };
    static std::vector<Request> Requests(std::uint32_t bands) {
        const std::vector<int> all = AllBands(bands), some{static_cast<int>(bands) - 1, 0};
        return {{0, 0, 8, 8, all},  {0, 0, 8, 8, some},  {3, 2, 9, 7, all},    {3, 2, 9, 7, some},
                {2, 2, 1, 1, some}, {0, 0, 20, 8, some}, {16, 16, 4, 4, some}, {0, 0, 20, 20, all}};
    }

    std::string before;
};

TEST_P(PyramidFaultsTest, OpeningWithoutMemory) {
    Make(Description());
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        PyramidDataset dataset(zelm::String(path.c_str()));
        const bool failed = dataset.ReadHeader();
        faults.Disarm();
        if (!failed) {
            EXPECT_EQ(dataset.Samples, kSide);
        }
    });
    EXPECT_GT(points, 0U);
    EXPECT_EQ(zmctest::ReadText(path.string()), before);
}

TEST_P(PyramidFaultsTest, MakingAFileWithoutMemory) {
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        std::filesystem::remove(path);
        auto dataset = Describe(Description());
        faults.Rearm();
        dataset->CreateFile(0, 1);
        faults.Disarm();
        const auto opened = Open();
        if (opened) {
            EXPECT_EQ(opened->Samples, kSide);
        }
    });
}

TEST_P(PyramidFaultsTest, MakingAFileOnAFailingDisk) {
    Make(Description());
    ForEachCallFailing([&] {
        auto dataset = Describe(Description());
        dataset->CreateFile(0, 1);
    });
}

TEST_P(PyramidFaultsTest, ReadingWithoutMemory) {
    Make(Description());
    const Bytes image = Image(3);
    for (const Request& r : Requests(3)) {
        const Bytes whole = Crop(image, kSide, 3, r.x, r.y, r.width, r.height);
        const Bytes expected = PickBands(whole, 3, 1, r.bands);
        ForEachAllocationFailing([&](AllocationFaults& faults) {
            faults.Disarm();
            const auto dataset = Open();
            const BandList list(r.bands);
            Bytes out(expected.size(), 1);
            faults.Rearm();
            const bool read =
                dataset->ReadTile(r.x, r.y, r.width, r.height, list.View(), 0, out.data());
            faults.Disarm();
            if (read) {
                EXPECT_EQ(out, expected);
            }
        });
    }
}

TEST_P(PyramidFaultsTest, WritingWithoutMemory) {
    Make(Description());
    for (const Request& r : Requests(3))
        ForEachAllocationFailing([&](AllocationFaults& faults) {
            faults.Disarm();
            Restore();
            auto dataset = Open();
            const BandList list(r.bands);
            const Bytes pixels(std::size_t{r.width} * r.height * r.bands.size(), 77);
            faults.Rearm();
            bool wrote = false;
            if (GetParam() < 2)
                wrote = dataset->WriteTileInterleaved(r.x, r.y, r.width, r.height, list.View(), 0,
                                                      pixels.data());
            else
                wrote = dataset->WriteTileMorton(r.x, r.y, r.width, r.height, list.View(), 0,
                                                 pixels.data());
            faults.Disarm();
            // Several tiles are several steps; a single one is written or not.
            if (!wrote && r.width <= 8) {
                EXPECT_EQ(zmctest::ReadText(path.string()), before);
            }
        });
}

// The rows of this file are longer than the work space, those of the next its pixels too.
TEST_P(PyramidFaultsTest, ReadingAndMergingOnAFailingDisk) {
    for (const std::uint32_t bands : {3u, 20000u, 140000u}) {
        PyramidDescription d = Description(bands);
        if (bands > 3) {
            if (GetParam() >= 2) continue;
            d.samples = d.lines = 9;
        }
        auto made = Create(d);
        const BandList all(AllBands(bands)), some({static_cast<int>(bands) - 1, 0});
        Bytes pixels(std::size_t{4} * 2 * bands, 5);
        made->File->WriteAt(made->TileDataEnd - 1, pixels.data(), 1);
        made.reset();
        before = zmctest::ReadText(path.string());
        const auto touch = [&](const BandList& list, bool write) {
            const auto dataset = Open();
            if (!dataset) return;
            if (!write)
                ReadBytes(*dataset, 3, 3, 4, 2, list, 0, pixels);
            else if (GetParam() < 2)
                dataset->WriteTileInterleaved(3, 3, 4, 2, list.View(), 0, pixels.data());
        };
        for (const BandList* list : {&all, &some})
            for (const bool write : {false, true}) ForEachCallFailing([&] { touch(*list, write); });
        // A list of some bands that fills its tile.
        ForEachCallFailing([&] {
            const auto dataset = Open();
            if (dataset && GetParam() < 2)
                dataset->WriteTileInterleaved(8, 8, 1, 1, some.View(), 0, pixels.data());
        });
        const auto dataset = Open();
        ASSERT_TRUE(dataset);
        EXPECT_EQ(ReadRect(*dataset, 3, 3, 1, 1, some, 0), Bytes(2, 0));
    }
}

// A rectangle that cannot be read is left as it was where it is a whole tile in place, and zeros
// elsewhere.
TEST_P(PyramidFaultsTest, AFailingReadInventsNothingInAnyRectangle) {
    Make(Description());
    for (const Request& r : Requests(3)) {
        const auto dataset = Open();
        const BandList list(r.bands);
        Bytes out(std::size_t{r.width} * r.height * r.bands.size(), 1);
        FileFault fault;
        fault.folder = directory.string();
        fault.calls = zmctest::kReadCall;
        fault.n = 1;
        fault.fromThenOn = true;
        fault.error = EIO;
        FileFaults faults(fault);
        const bool read =
            dataset->ReadTile(r.x, r.y, r.width, r.height, list.View(), 0, out.data());
        faults.Disarm();
        EXPECT_TRUE(read);
        const bool inPlace = GetParam() < 2 && r.width == 8 && r.bands == AllBands(3);
        EXPECT_EQ(out, Bytes(out.size(), inPlace ? 1 : 0));
        EXPECT_TRUE(dataset->ReadTile(r.x, r.y, r.width, r.height, list.View(), 0, out.data()));
        EXPECT_EQ(out,
                  PickBands(Crop(Image(3), kSide, 3, r.x, r.y, r.width, r.height), 3, 1, r.bands));
    }
}

TEST_P(PyramidFaultsTest, StoringAndFetchingWithoutMemory) {
    Make(Description());
    Array<zelm::RasterBandStats<unsigned char>> stats;
    Array<zelm::RasterBandHistogram<unsigned char>> histograms;
    zelm::Palette palette;
    for (std::uint32_t band = 0; band < 12; ++band) {
        zelm::RasterBandStats<unsigned char> record;
        record.band = band;
        ASSERT_TRUE(stats.Append(record));
        zelm::RasterBandHistogram<unsigned char> histogram;
        histogram.band = band;
        histogram.binCount = 4;
        ASSERT_TRUE(histograms.Append(histogram));
        palette.AddColor(zelm::Color());
    }
    const auto store = [&](PyramidDataset& dataset) {
        return dataset.SetBandStats(stats) && dataset.SetHistograms(histograms) &&
               dataset.SetPalette(1, palette);
    };
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        Restore();
        auto dataset = Open();
        faults.Rearm();
        store(*dataset);
        faults.Disarm();
    });
    Restore();
    ASSERT_TRUE(store(*Open()));
    before = zmctest::ReadText(path.string());
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        auto dataset = std::make_unique<PyramidDataset>(zelm::String(path.c_str()));
        faults.Rearm();
        if (!dataset->ReadHeader()) {
            dataset->HasBandStats<unsigned char>(3);
            dataset->GetHistograms<unsigned char>();
            dataset->GetPalette<unsigned char>(1);
            dataset->EnsureMetaDocument();
        }
        faults.Disarm();
    });
    EXPECT_EQ(zmctest::ReadText(path.string()), before);
    EXPECT_TRUE(Open()->HasBandStats<unsigned char>(11));
    EXPECT_EQ(Open()->GetHistograms<unsigned char>().shape.elements, 12U);
}

TEST_P(PyramidFaultsTest, StoringOnAFailingDisk) {
    Make(Description());
    zelm::Palette palette;
    palette.AddColor(zelm::Color());
    ForEachCallFailing([&] {
        const auto dataset = std::make_unique<PyramidDataset>(zelm::String(path.c_str()));
        if (!dataset->ReadHeader()) dataset->SetPalette(0, palette);
    });
}

using WorkSpaceTest = PyramidFileTest;

// A work space that could not be had does not stand in the way of later ones.
TEST_F(WorkSpaceTest, MemoryThatComesBackServes) {
    PyramidDescription d;
    d.samples = d.lines = 9;
    d.bands = 2;
    d.tile = 8;
    d.ordering = 2;
    const auto dataset = Create(d);
    const BandList one({0}), both({0, 1});
    const unsigned char pixel[] = {77, 78};
    ReadRect(*dataset, 0, 0, 8, 8, one, 0);  // the table is there, and no work space yet
    const std::string before = zmctest::ReadText(path.string());
    const auto write = [&] { return dataset->WriteTileMorton(8, 8, 1, 1, both.View(), 0, pixel); };
    Bytes out(2, 3);
    {
        AllocationFaults faults(1, zmctest::FaultMode::FromThenOn);
        const bool wrote = write();
        const bool read = dataset->ReadTile(8, 8, 1, 1, both.View(), 0, out.data());
        faults.Disarm();
        EXPECT_FALSE(wrote);
        EXPECT_FALSE(read);
    }
    EXPECT_EQ(out, Bytes(2, 3));
    EXPECT_EQ(zmctest::ReadText(path.string()), before);
    EXPECT_TRUE(write());
    EXPECT_EQ(ReadRect(*dataset, 8, 8, 1, 1, both, 0), (Bytes{77, 78}));
}

INSTANTIATE_TEST_SUITE_P(Orderings, PyramidFaultsTest, testing::Values(0u, 1u, 2u));

}  // namespace
}  // namespace zmctest
