// Memory that runs out under the driver: GDAL is told, and nothing is thrown through it.
#include <gdal_pam.h>
#include <gdal_priv.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <memory>
#include <set>
#include <thread>
#include <vector>

#include "gdal/Band.h"
#include "gdal/Dataset.h"
#include "gdal/JobCrew.h"
#include "tests/gdal/GdalTest.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/ScratchDirectory.h"

namespace zmcgdal {
namespace {

using zmctest::AllocationFaults;
using zmctest::DatasetPtr;

constexpr int kSide = 300;

class DriverMemory : public zmctest::GdalTest {
protected:
    static void SetUpTestSuite() {
        GdalTest::SetUpTestSuite();
        // What a process makes once, GDAL's own included, is not what is looked at.
        zmctest::ScratchDirectory folder;
        Make(folder / "warm.pyr", GDT_Byte);
        const DatasetPtr dataset = Open(folder / "warm.pyr", GDAL_OF_UPDATE);
        ASSERT_TRUE(dataset);
        for (const Call& call : Calls()) call.make(*dataset);
    }

    static DatasetPtr Memory(GDALDataType type) {
        DatasetPtr dataset(Driver("MEM").Create("", kSide, kSide, 2, type, nullptr));
        for (int band = 1; band <= 2; ++band) dataset->GetRasterBand(band)->Fill(band);
        return dataset;
    }
    static void Make(const std::string& name, GDALDataType type, bool embeds = false) {
        const DatasetPtr source = Memory(type);
        CPLStringList options;
        if (embeds) {
            options.SetNameValue("EMBED", "YES");
            source->SetMetadataItem("KEY", "value");
            source->GetRasterBand(1)->SetDescription("first");
        }
        GDALColorTable table;
        const GDALColorEntry color{1, 2, 3, 255};
        table.SetColorEntry(1, &color);
        if (type == GDT_Byte) source->GetRasterBand(1)->SetColorTable(&table);
        ASSERT_TRUE(DatasetPtr(
            Driver("ZMCPyramid")
                .CreateCopy(name.c_str(), source.get(), FALSE, options.List(), nullptr, nullptr)));
    }
    // By the driver's own entry: what GDAL allocates around it is not ours.
    static DatasetPtr Open(const std::string& name, unsigned flags = 0) {
        GDALOpenInfo info(name.c_str(), static_cast<int>(GDAL_OF_RASTER | flags));
        return DatasetPtr(static_cast<GDALDataset*>(Driver("ZMCPyramid").pfnOpen(&info)));
    }

    struct Call {
        const char* name;
        bool updates;
        // Whether GDAL's user got what he asked for.
        bool (*make)(GDALDataset&);
    };
    static const std::vector<Call>& Calls();

    const std::string name = folder / "a.pyr";
};

CPLErr ReadBand(GDALRasterBand& band, GDALDataType type) {
    static std::vector<double> samples(std::size_t{kSide} * kSide * 2);
    return band.RasterIO(GF_Read, 0, 0, band.GetXSize(), band.GetYSize(), samples.data(),
                         band.GetXSize(), band.GetYSize(), type, 0, 0, nullptr);
}

GDALRasterBand& Second(GDALDataset& dataset) { return *dataset.GetRasterBand(2); }

const std::vector<DriverMemory::Call>& DriverMemory::Calls() {
    static const std::vector<Call> calls{
        {"ReadBlock", false,
         [](GDALDataset& d) {
             static std::vector<double> block(256 * 256 * 2);
             return Second(d).ReadBlock(1, 1, block.data()) == CE_None;
         }},
        {"ReadBand", false,
         [](GDALDataset& d) { return ReadBand(Second(d), GDT_Float64) == CE_None; }},
        {"ReadDataset", false,
         [](GDALDataset& d) {
             static std::vector<unsigned char> samples(std::size_t{kSide} * kSide * 2);
             return d.RasterIO(GF_Read, 0, 0, kSide, kSide, samples.data(), kSide, kSide, GDT_Byte,
                               2, nullptr, 2, 2 * kSide, 1, nullptr) == CE_None;
         }},
        {"ReadMask", false,
         [](GDALDataset& d) {
             GDALRasterBand* const mask = Second(d).GetMaskBand();
             return mask && ReadBand(*mask, GDT_Byte) == CE_None;
         }},
        {"Overview", false,
         [](GDALDataset& d) {
             if (Second(d).GetOverviewCount() == 0) return false;
             GDALRasterBand* const level = Second(d).GetOverview(0);
             return level && ReadBand(*level, GDT_Byte) == CE_None;
         }},
        {"Statistics", false,
         [](GDALDataset& d) {
             double mean = 0;
             return Second(d).GetStatistics(0, 0, nullptr, nullptr, &mean, nullptr) == CE_None;
         }},
        {"Histogram", false,
         [](GDALDataset& d) {
             double low = 0, high = 0;
             int buckets = 0;
             GUIntBig* counts = nullptr;
             Second(d).GetDefaultHistogram(&low, &high, &buckets, &counts, FALSE, nullptr, nullptr);
             CPLFree(counts);
             return buckets != 0;
         }},
        {"ColorTable", false,
         [](GDALDataset& d) { return d.GetRasterBand(1)->GetColorTable() != nullptr; }},
        {"Metadata", false, [](GDALDataset& d) { return CSLCount(Second(d).GetMetadata()) >= 4; }},
        {"MetadataItem", false,
         [](GDALDataset& d) { return Second(d).GetMetadataItem("STATISTICS_MEAN") != nullptr; }},
        {"SetStatistics", true,
         [](GDALDataset& d) { return Second(d).SetStatistics(1, 2, 1.5, 0.5) == CE_None; }},
        {"SetHistogram", true,
         [](GDALDataset& d) {
             GUIntBig counts[] = {1, 2, 3};
             return Second(d).SetDefaultHistogram(-0.5, 2.5, 3, counts) == CE_None;
         }},
        {"SetColorTable", true,
         [](GDALDataset& d) {
             static GDALColorTable table;
             return Second(d).SetColorTable(&table) == CE_None;
         }},
        {"WriteBlock", true,
         [](GDALDataset& d) {
             static std::vector<double> block(256 * 256 * 2);
             return Second(d).WriteBlock(0, 1, block.data()) == CE_None;
         }},
        {"RenewLevels", true,
         [](GDALDataset& d) {
             const int factors[] = {2};
             return static_cast<Dataset&>(d).IBuildOverviews("AVERAGE", 1, factors, 0, nullptr,
                                                             nullptr, nullptr, nullptr) == CE_None;
         }},
    };
    return calls;
}

TEST_F(DriverMemory, OpeningFailsWithAnError) {
    for (const bool embeds : {false, true}) {
        Make(name, GDT_Byte, embeds);
        GDALOpenInfo info(name.c_str(), GDAL_OF_RASTER);
        const std::size_t points = zmctest::ForEachAllocationFailing([&](AllocationFaults& faults) {
            faults.Disarm();
            CPLErrorReset();
            faults.Rearm();
            DatasetPtr dataset;
            EXPECT_NO_THROW(
                dataset.reset(static_cast<GDALDataset*>(Driver("ZMCPyramid").pfnOpen(&info))));
            faults.Disarm();
            EXPECT_TRUE(dataset || CPLGetLastErrorType() == CE_Failure);
        });
        EXPECT_GT(points, embeds ? 40u : 20u);
    }
}

// GDAL's own list of metadata does not survive memory that runs out while a domain comes into it.
void MakeDomains(GDALDataset& dataset) {
    for (GDALMajorObject* const object :
         {static_cast<GDALMajorObject*>(&dataset), static_cast<GDALMajorObject*>(&Second(dataset))})
        for (const char* const domain : {"", kOwnDomain}) object->SetMetadataItem("A", "b", domain);
}

// For each call: nothing is thrown, what fails is told, and the dataset is as good as before.
TEST_F(DriverMemory, CallsFailWithAnError) {
    Make(name, GDT_Byte);
    const std::string made = zmctest::ReadText(name);
    for (const Call& call : Calls()) {
        SCOPED_TRACE(call.name);
        const unsigned flags = call.updates ? unsigned{GDAL_OF_UPDATE} : 0u;
        EXPECT_TRUE(call.make(*Open(name, flags)));
        const std::size_t points = zmctest::ForEachAllocationFailing([&](AllocationFaults& faults) {
            faults.Disarm();
            // Stores add to the document, and with it to the allocations of the next.
            if (call.updates) zmctest::WriteText(name, made);
            const DatasetPtr dataset = Open(name, flags);
            // What GDAL makes itself for its first block, and its lock of a dataset that is
            // written.
            for (int band = 1; band <= 2; ++band)
                dataset->GetRasterBand(band)->GetLockedBlockRef(0, 0, TRUE)->DropLock();
            EXPECT_TRUE(!call.updates || ReadBand(Second(*dataset), GDT_Byte) == CE_None);
            if (call.updates) MakeDomains(*dataset);
            CPLErrorReset();
            faults.Rearm();
            bool done = false;
            EXPECT_NO_THROW(done = call.make(*dataset));
            faults.Disarm();
            EXPECT_TRUE(done || CPLGetLastErrorType() >= CE_Warning);
            CPLErrorReset();
            EXPECT_EQ(ReadBand(*dataset->GetRasterBand(1), GDT_Float64), CE_None);
        });
        EXPECT_GT(points, 0u);
    }
}

// A window that several threads are to read: whoever has no memory leaves its part to the others,
// and where the one that asked has none for several, it reads alone.
TEST_F(DriverMemory, LargeWindowsAreReadByThoseWhoHaveMemory) {
    constexpr int kLarge = 1024;  // 16 tiles
    const std::vector<unsigned char> whole(std::size_t{kLarge} * kLarge * 2, 3);
    const DatasetPtr source(Driver("MEM").Create("", kLarge, kLarge, 2, GDT_Byte, nullptr));
    for (int band = 1; band <= 2; ++band) source->GetRasterBand(band)->Fill(3);
    ASSERT_TRUE(
        DatasetPtr(Driver("ZMCPyramid")
                       .CreateCopy(name.c_str(), source.get(), FALSE, nullptr, nullptr, nullptr)));
    OpenOptions options;
    options.threads = 2;
    std::vector<unsigned char> pixels(whole.size());
    const auto read = [&](GDALDataset& dataset) {
        return dataset.RasterIO(GF_Read, 0, 0, kLarge, kLarge, pixels.data(), kLarge, kLarge,
                                GDT_Byte, 2, nullptr, 0, 0, 0, nullptr) == CE_None;
    };
    int goneOn = 0;
    zmctest::ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        const auto dataset =
            Dataset::FromFile(std::make_shared<OpenFile>(name, GA_ReadOnly, options), GA_ReadOnly);
        EXPECT_GT(dataset->File().tiles.ThreadsFor({0, 0, kLarge, kLarge}, 2), 1u);
        std::fill(pixels.begin(), pixels.end(), std::uint8_t{0});
        CPLErrorReset();
        faults.Rearm();
        bool done = false;
        EXPECT_NO_THROW(done = read(*dataset));
        faults.Disarm();
        if (done && faults.Failed() != 0) ++goneOn;
        EXPECT_TRUE(done ? pixels == whole : CPLGetLastErrorType() == CE_Failure)
            << CPLGetLastErrorMsg();
        EXPECT_TRUE(read(*dataset) && pixels == whole);
    });
    EXPECT_GT(goneOn, 0);
}

// The thread that has met it cannot even keep the reason.
TEST_F(DriverMemory, JobsOfThreadsWithoutMemoryAreDoneByTheCaller) {
    const auto caller = std::this_thread::get_id();
    std::atomic<bool> failed{false};
    std::set<std::uint64_t> done;  // by the caller alone
    const auto makeWorker = [&]() -> Worker {
        auto faults = std::make_shared<std::unique_ptr<AllocationFaults>>();
        return [&, faults](std::uint64_t job) {
            if (std::this_thread::get_id() == caller) {
                while (!failed) std::this_thread::yield();
                done.insert(job);
                return true;
            }
            CPLError(CE_Failure, CPLE_FileIO, "a reason longer than what lies in a text itself");
            *faults = std::make_unique<AllocationFaults>(1, zmctest::FaultMode::FromThenOn);
            failed = true;
            return false;
        };
    };
    EXPECT_TRUE(RunJobs(4, 2, makeWorker, {}));
    EXPECT_EQ(done.size(), 4u);
}

// New files: whatever runs out, there is a whole one or an error. Every 13th allocation of the
// thousands is enough: steps of a build fail in the same few ways.
TEST_F(DriverMemory, CreationFailsWithAnError) {
    const std::string target = folder / "new.pyr";
    // Without memory for good the threads of several would not come to an end.
    CPLStringList options;
    options.SetNameValue("NUM_THREADS", "1");
    std::size_t points = 0;
    for (const zmctest::FaultMode mode :
         {zmctest::FaultMode::Once, zmctest::FaultMode::FromThenOn}) {
        bool failed = true;
        for (std::size_t n = 1; failed; n += 13, ++points) {
            SCOPED_TRACE(n);
            CPLErrorReset();
            AllocationFaults faults(n, mode);
            DatasetPtr made;
            EXPECT_NO_THROW(
                made.reset(Driver("ZMCPyramid")
                               .pfnCreate(target.c_str(), 20, 10, 1, GDT_Byte, options.List())));
            EXPECT_NO_THROW(made.reset());
            faults.Disarm();
            failed = faults.Failed() != 0;
            const bool told = CPLGetLastErrorType() == CE_Failure;
            EXPECT_TRUE(told || Open(target));
            VSIUnlink(target.c_str());
        }
    }
    EXPECT_GT(points, 100u);
}

}  // namespace
}  // namespace zmcgdal
