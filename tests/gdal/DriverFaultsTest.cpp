// What the driver answers, and what it remembers, when the disk fails under it.
#include <gdal_priv.h>
#include <gtest/gtest.h>
#include <sys/resource.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <functional>
#include <optional>
#include <vector>

#include "tests/gdal/GdalTest.h"
#include "tests/support/FileFaults.h"

namespace zmcgdal {
namespace {

using Samples = std::vector<unsigned char>;
using zmctest::DatasetPtr;
using zmctest::FileFaultAction;
using zmctest::FileFaults;

constexpr int kSide = 200;

class DriverFaults : public zmctest::GdalTest {
protected:
    // Its bands hold their numbers.
    static DatasetPtr Memory(int bands, int side) {
        DatasetPtr dataset(Driver("MEM").Create("", side, side, bands, GDT_Byte, nullptr));
        for (int band = 1; band <= bands; ++band) dataset->GetRasterBand(band)->Fill(band);
        return dataset;
    }
    // A pyramid of that, of one tile as a rule.
    void Make(int bands, GDALColorTable* table = nullptr, int side = kSide) const {
        const DatasetPtr source = Memory(bands, side);
        if (table) source->GetRasterBand(1)->SetColorTable(table);
        ASSERT_TRUE(DatasetPtr(
            Driver("ZMCPyramid")
                .CreateCopy(name.c_str(), source.get(), FALSE, nullptr, nullptr, nullptr)));
    }
    DatasetPtr Open(unsigned flags = 0) const { return GdalTest::Open(name, flags); }
    // As large a part of a band as is read below.
    static CPLErr Fill(GDALDataset& dataset, int band, int value, int x = 0, int y = 0) {
        Samples samples(std::size_t{kSide} * kSide, static_cast<unsigned char>(value));
        return dataset.GetRasterBand(band)->RasterIO(GF_Write, x, y, kSide, kSide, samples.data(),
                                                     kSide, kSide, GDT_Byte, 0, 0, nullptr);
    }
    static Samples Read(GDALDataset& dataset, int band) {
        Samples samples(std::size_t{kSide} * kSide);
        EXPECT_EQ(dataset.GetRasterBand(band)->RasterIO(GF_Read, 0, 0, kSide, kSide, samples.data(),
                                                        kSide, kSide, GDT_Byte, 0, 0, nullptr),
                  CE_None);
        return samples;
    }
    static bool Holds(const Samples& samples, int value) {
        return std::all_of(samples.begin(), samples.end(),
                           [value](unsigned char each) { return each == value; });
    }

    const std::string name = folder / "a.pyr";
};

// Files of this process end at that size while an object of this class lives: a write across it
// moves a part and then fails.
class FileSizeLimit {
public:
    explicit FileSizeLimit(rlim_t size) : handler(std::signal(SIGXFSZ, SIG_IGN)) {
        getrlimit(RLIMIT_FSIZE, &before);
        const rlimit limit{size, before.rlim_max};
        setrlimit(RLIMIT_FSIZE, &limit);
    }
    ~FileSizeLimit() {
        setrlimit(RLIMIT_FSIZE, &before);
        std::signal(SIGXFSZ, handler);
    }
    FileSizeLimit(const FileSizeLimit&) = delete;
    FileSizeLimit& operator=(const FileSizeLimit&) = delete;

private:
    rlimit before{};
    void (*handler)(int);
};

TEST_F(DriverFaults, RecordsThatCouldNotBeReadAreAskedForAgain) {
    GDALColorTable table;
    const GDALColorEntry color{1, 2, 3, 255};
    table.SetColorEntry(1, &color);
    Make(1, &table);
    const DatasetPtr dataset = Open();
    ASSERT_TRUE(dataset);
    Read(*dataset, 1);
    GDALRasterBand& band = *dataset->GetRasterBand(1);
    const auto statistics = [&] {
        double mean = 0;
        return band.GetStatistics(FALSE, FALSE, nullptr, nullptr, &mean, nullptr) == CE_None;
    };
    const auto histogram = [&] {
        double low = 0, high = 0;
        int buckets = 0;
        GUIntBig* counts = nullptr;
        band.GetDefaultHistogram(&low, &high, &buckets, &counts, FALSE, nullptr, nullptr);
        CPLFree(counts);
        return buckets != 0;
    };
    const auto item = [&] { return band.GetMetadataItem("STATISTICS_MEAN") != nullptr; };
    {
        const FileFaults faults(
            {folder.String(), zmctest::kReadCall, 1, true, FileFaultAction::Error, EIO});
        EXPECT_FALSE(item());
        EXPECT_FALSE(statistics());
        EXPECT_FALSE(histogram());
        EXPECT_EQ(band.GetColorTable(), nullptr);
        EXPECT_GE(faults.Failed(), 4u);
    }
    EXPECT_TRUE(item());
    EXPECT_TRUE(statistics());
    EXPECT_TRUE(histogram());
    EXPECT_NE(band.GetColorTable(), nullptr);
}

TEST_F(DriverFaults, BlocksOfOtherBandsWaitUntilTheirTileIsWritten) {
    Make(3);
    {
        const DatasetPtr dataset = Open(GDAL_OF_UPDATE);
        ASSERT_TRUE(dataset);
        Fill(*dataset, 1, 11);
        Fill(*dataset, 2, 12);
        const FileFaults faults(
            {name, zmctest::kWriteCall, 1, false, FileFaultAction::Error, ENOSPC});
        CPLErrorReset();
        dataset->FlushCache(false);
        EXPECT_EQ(CPLGetLastErrorType(), CE_Failure);
        EXPECT_EQ(faults.Failed(), 1u);
    }
    const DatasetPtr dataset = Open();
    EXPECT_TRUE(Holds(Read(*dataset, 2), 12));
    EXPECT_TRUE(Holds(Read(*dataset, 3), 3));
}

TEST_F(DriverFaults, WhatAWriteThatFailedHasLeftIsReadFromTheFile) {
    Make(5);
    const DatasetPtr dataset = Open(GDAL_OF_UPDATE);
    ASSERT_TRUE(dataset);
    Read(*dataset, 1);
    Fill(*dataset, 2, 22);
    {
        const FileSizeLimit limit(std::size_t{kSide} * kSide * 5 / 2);
        CPLErrorReset();
        dataset->FlushCache(false);
        EXPECT_EQ(CPLGetLastErrorType(), CE_Failure);
    }
    const Samples torn = Read(*Open(), 2);
    EXPECT_NE(std::find(torn.begin(), torn.end(), 22), torn.end());
    EXPECT_NE(std::find(torn.begin(), torn.end(), 2), torn.end());
    EXPECT_EQ(Read(*dataset, 2), torn);
}

TEST_F(DriverFaults, LevelsAreNotMadeOfPixelsThatCouldNotBeWritten) {
    Make(1, nullptr, 600);
    const DatasetPtr dataset = Open(GDAL_OF_UPDATE);
    ASSERT_TRUE(dataset);
    Fill(*dataset, 1, 9);
    const FileFaults faults({name, zmctest::kWriteCall, 1, false, FileFaultAction::Error, ENOSPC});
    const int factors[] = {2};
    EXPECT_EQ(dataset->BuildOverviews("AVERAGE", 1, factors, 0, nullptr, nullptr, nullptr),
              CE_Failure);
    EXPECT_EQ(faults.Failed(), 1u);
}

TEST_F(DriverFaults, LevelsThatWereRenewedBeforeAFailureAreSeen) {
    Make(1, nullptr, 1200);
    const DatasetPtr dataset = Open(GDAL_OF_UPDATE);
    ASSERT_TRUE(dataset);
    for (int y = 0; y < 1200; y += kSide)
        for (int x = 0; x < 1200; x += kSide) Fill(*dataset, 1, 9, x, y);
    dataset->FlushCache(false);
    // Whoever looks on meanwhile leaves what he saw in GDAL's cache.
    const auto last = [](GDALDataset& looked) {
        unsigned char sample = 0;
        EXPECT_EQ(looked.GetRasterBand(1)->GetOverview(0)->RasterIO(
                      GF_Read, 599, 599, 1, 1, &sample, 1, 1, GDT_Byte, 0, 0, nullptr),
                  CE_None);
        return sample;
    };
    const auto look = [](double, const char*, void* data) -> int {
        (*static_cast<std::function<void()>*>(data))();
        return TRUE;
    };
    std::function<void()> looking = [&, looked = false]() mutable {
        EXPECT_EQ(looked ? 1 : last(*dataset), 1);
        looked = true;
    };
    {
        // The first level has nine tiles.
        const FileFaults faults(
            {name, zmctest::kWriteCall, 10, true, FileFaultAction::Error, ENOSPC});
        const int factors[] = {2, 4};
        EXPECT_EQ(dataset->BuildOverviews("AVERAGE", 2, factors, 0, nullptr, look, &looking),
                  CE_Failure);
        EXPECT_GT(faults.Failed(), 0u);
    }
    EXPECT_EQ(last(*Open()), 9);
    EXPECT_EQ(last(*dataset), 9);
}

TEST_F(DriverFaults, NewFileWithoutSomeOfItsBlocksIsNotMade) {
    DatasetPtr dataset(
        Driver("ZMCPyramid").Create(name.c_str(), kSide, kSide, 1, GDT_Byte, nullptr));
    ASSERT_TRUE(dataset);
    Fill(*dataset, 1, 7);
    const FileFaults faults(
        {folder.String(), zmctest::kWriteCall, 1, false, FileFaultAction::Error, ENOSPC});
    dataset.reset();
    EXPECT_EQ(faults.Failed(), 1u);
    EXPECT_TRUE(std::filesystem::is_empty(folder.String()));
}

TEST_F(DriverFaults, RasterThatTheDiskHasNoRoomForIsRefusedWhenItIsCreated) {
    const std::string place = folder / "disk";
    std::filesystem::create_directory(place);
    const zmctest::SmallDisk disk(place, "size=512k");
    if (!disk.IsMounted()) GTEST_SKIP() << "no right to mount a disk here";
    CPLErrorReset();
    EXPECT_FALSE(DatasetPtr(
        Driver("ZMCPyramid").Create((place + "/a.pyr").c_str(), 1000, 1000, 1, GDT_Byte, nullptr)));
    EXPECT_NE(std::string(CPLGetLastErrorMsg()).find("bytes of disk space"), std::string::npos);
    EXPECT_TRUE(std::filesystem::is_empty(place));
}

TEST_F(DriverFaults, WindowsOfAllBandsAnswerForTheirTiles) {
    constexpr int kLarge = 600;
    Samples samples(std::size_t{kLarge} * kLarge * 2, 7);
    const auto write = [&](GDALDataset& dataset) {
        return dataset.RasterIO(GF_Write, 0, 0, kLarge, kLarge, samples.data(), kLarge, kLarge,
                                GDT_Byte, 2, nullptr, 0, 0, 0, nullptr);
    };
    for (const bool again : {false, true}) {
        DatasetPtr dataset(
            Driver("ZMCPyramid").Create(name.c_str(), kLarge, kLarge, 2, GDT_Byte, nullptr));
        ASSERT_TRUE(dataset);
        {
            const FileFaults faults(
                {folder.String(), zmctest::kWriteCall, 4, false, FileFaultAction::Error, ENOSPC});
            EXPECT_EQ(write(*dataset), CE_Failure);
            EXPECT_EQ(faults.Failed(), 1u);
        }
        EXPECT_EQ(again ? write(*dataset) : CE_None, CE_None);
        dataset.reset();
        EXPECT_EQ(std::filesystem::exists(name), again);
    }
    EXPECT_TRUE(Holds(Read(*Open(), 2), 7));
}

TEST_F(DriverFaults, NewFileIsNotMadeWhereClosingItMeetsAFullDisk) {
    std::size_t points = 0;
    for (bool met = true; met; ++points) {
        DatasetPtr dataset(
            Driver("ZMCPyramid").Create(name.c_str(), 3 * kSide, 3 * kSide, 1, GDT_Byte, nullptr));
        ASSERT_TRUE(dataset);
        Fill(*dataset, 1, 7);
        dataset->FlushCache(false);
        FileFaults faults({folder.String(), zmctest::kWriteCall | zmctest::kResizeCall, points + 1,
                           false, FileFaultAction::Error, ENOSPC});
        CPLErrorReset();
        dataset.reset();
        met = faults.Failed() != 0;
        EXPECT_EQ(CPLGetLastErrorType() == CE_Failure, met) << points;
        EXPECT_EQ(std::filesystem::is_empty(folder.String()), met) << points;
    }
    // Blocks that nobody wrote, two levels of four and one tile, and the documents.
    EXPECT_GT(points, 8u + 5u);
}

TEST_F(DriverFaults, NewFileIsMadeOnceItsBlocksAreWritten) {
    DatasetPtr dataset(
        Driver("ZMCPyramid").Create(name.c_str(), kSide, kSide, 1, GDT_Byte, nullptr));
    ASSERT_TRUE(dataset);
    Fill(*dataset, 1, 7);
    {
        const FileFaults faults(
            {folder.String(), zmctest::kWriteCall, 1, false, FileFaultAction::Error, ENOSPC});
        dataset->FlushCache(false);
        EXPECT_EQ(faults.Failed(), 1u);
    }
    Fill(*dataset, 1, 8);
    dataset.reset();
    dataset = Open();
    ASSERT_TRUE(dataset);
    EXPECT_TRUE(Holds(Read(*dataset, 1), 8));
}

// The three stores of the driver's users; each answers for what has reached the file.
struct Setter {
    const char* name;
    CPLErr (*store)(GDALRasterBand&);
};

const Setter kSetters[] = {
    {"SetStatistics", [](GDALRasterBand& band) { return band.SetStatistics(1, 2, 1.5, 0.25); }},
    {"SetDefaultHistogram",
     [](GDALRasterBand& band) {
         std::vector<GUIntBig> counts(2000, 7);
         return band.SetDefaultHistogram(-0.5, 1999.5, 2000, counts.data());
     }},
    {"SetColorTable",
     [](GDALRasterBand& band) {
         GDALColorTable table;
         const GDALColorEntry color{1, 2, 3, 255};
         for (int i = 0; i < 256; ++i) table.SetColorEntry(i, &color);
         return band.SetColorTable(&table);
     }},
};

class DriverStores : public DriverFaults, public testing::WithParamInterface<Setter> {
protected:
    // Whether a store into the file, made anew, is told as one that failed.
    bool TellsFailure(const std::function<void()>& before, const std::function<void()>& after) {
        const DatasetPtr dataset = Open(GDAL_OF_UPDATE);
        EXPECT_TRUE(dataset);
        EXPECT_NE(dataset->GetRasterBand(1)->GetMetadataItem("STATISTICS_MEAN"), nullptr);
        CPLErrorReset();
        before();
        const CPLErr answer = GetParam().store(*dataset->GetRasterBand(1));
        const bool told = CPLGetLastErrorType() == CE_Failure;
        after();
        EXPECT_EQ(answer == CE_Failure, told);
        return answer == CE_Failure;
    }
};

TEST_P(DriverStores, TellWhatACallOfTheSystemDidNotDo) {
    Make(1);
    const std::string whole = zmctest::ReadText(name);
    for (const FileFaultAction action : {FileFaultAction::Error, FileFaultAction::Nothing})
        for (const bool fromThenOn : {false, true}) {
            std::size_t points = 0;
            for (bool met = true; met; ++points) {
                zmctest::WriteText(name, whole);
                std::optional<FileFaults> faults;
                const bool failed = TellsFailure(
                    [&] {
                        faults.emplace(zmctest::FileFault{
                            folder.String(), zmctest::kWriteCall | zmctest::kResizeCall, points + 1,
                            fromThenOn, action, ENOSPC});
                    },
                    [&] { faults->Disarm(); });
                met = faults->Failed() != 0;
                // A call that moves nothing is made again.
                const bool mayPass = action == FileFaultAction::Nothing && !fromThenOn;
                EXPECT_TRUE(mayPass || failed == met) << points;
                faults.reset();
                EXPECT_TRUE(Holds(Read(*Open(), 1), 1));
            }
            EXPECT_GT(points, 3u);
        }
}

TEST_P(DriverStores, TellThatTheDiskIsFull) {
    Make(1);
    const auto size = std::filesystem::file_size(name);
    std::optional<FileSizeLimit> limit;
    EXPECT_TRUE(TellsFailure([&] { limit.emplace(size); }, [&] { limit.reset(); }));
    EXPECT_TRUE(Holds(Read(*Open(), 1), 1));
    EXPECT_FALSE(TellsFailure([] {}, [] {}));
}

TEST_P(DriverStores, TellThatARealDiskIsFull) {
    const std::string place = folder / "disk";
    std::filesystem::create_directory(place);
    zmctest::SmallDisk disk(place, "size=512k");
    if (!disk.IsMounted()) GTEST_SKIP() << "no right to mount a disk here";
    Make(1);
    std::filesystem::copy(name, place + "/a.pyr");
    disk.Fill();
    const DatasetPtr dataset(
        GDALDataset::Open((place + "/a.pyr").c_str(), GDAL_OF_RASTER | GDAL_OF_UPDATE));
    ASSERT_TRUE(dataset);
    // What is left of the last block of the file takes the first few stores.
    CPLErr answer = CE_None;
    for (int i = 0; i < 100 && answer == CE_None; ++i) {
        CPLErrorReset();
        answer = GetParam().store(*dataset->GetRasterBand(1));
    }
    EXPECT_EQ(answer, CE_Failure);
    EXPECT_EQ(CPLGetLastErrorType(), CE_Failure);
    EXPECT_TRUE(Holds(Read(*dataset, 1), 1));
}

INSTANTIATE_TEST_SUITE_P(All, DriverStores, testing::ValuesIn(kSetters),
                         [](const auto& each) { return each.param.name; });

// GDAL does not look at what closing a sidecar answers, where a short text meets the full disk.
TEST_F(DriverFaults, StoresIntoTheSidecarTellThatTheDiskIsFull) {
    Make(1);
    for (const Setter& setter : kSetters) {
        const DatasetPtr dataset = Open();
        ASSERT_TRUE(dataset);
        const FileSizeLimit limit(10);
        CPLErrorReset();
        EXPECT_EQ(setter.store(*dataset->GetRasterBand(1)), CE_Failure) << setter.name;
        EXPECT_EQ(CPLGetLastErrorType(), CE_Failure) << setter.name;
    }
    const DatasetPtr dataset = Open(GDAL_OF_UPDATE);
    const FileSizeLimit limit(10);
    CPLErrorReset();
    dataset->ClearStatistics();
    EXPECT_EQ(CPLGetLastErrorType(), CE_Failure);
}

TEST_F(DriverFaults, RenewalThatFailsLeavesTheDocumentAsItWas) {
    GDALColorTable table;
    const GDALColorEntry color{1, 2, 3, 255};
    table.SetColorEntry(1, &color);
    Make(1, &table);
    const std::string whole = zmctest::ReadText(name);
    const char* const options[] = {"STATISTICS=YES", nullptr};
    for (const bool fromThenOn : {false, true}) {
        std::size_t points = 0, hidden = 0;
        for (bool met = true; met; ++points) {
            zmctest::WriteText(name, whole);
            std::filesystem::remove(name + ".aux.xml");
            DatasetPtr dataset(
                GDALDataset::Open(name.c_str(), GDAL_OF_RASTER | GDAL_OF_UPDATE, nullptr, options));
            ASSERT_TRUE(dataset);
            Fill(*dataset, 1, 9);
            dataset->FlushCache(false);
            FileFaults faults({folder.String(), zmctest::kWriteCall | zmctest::kResizeCall,
                               points + 1, fromThenOn, FileFaultAction::Error, ENOSPC});
            CPLErrorReset();
            dataset.reset();
            met = faults.Failed() != 0;
            EXPECT_EQ(CPLGetLastErrorType() == CE_Failure, met) << points;
            faults.Disarm();
            dataset = Open(GDAL_OF_UPDATE);  // puts in order what the disk did not take back
            ASSERT_TRUE(dataset) << points;
            EXPECT_NE(dataset->GetRasterBand(1)->GetColorTable(), nullptr) << points;
            EXPECT_TRUE(Holds(Read(*dataset, 1), 9)) << points;
            double mean = 0;
            const bool shown = dataset->GetRasterBand(1)->GetStatistics(
                                   FALSE, FALSE, nullptr, nullptr, &mean, nullptr) == CE_None;
            EXPECT_TRUE(!shown || mean == 9) << points;
            hidden += shown ? 0 : 1;
        }
        EXPECT_GT(points, 5u);
        EXPECT_GT(hidden, 3u);
    }
}

}  // namespace
}  // namespace zmcgdal
