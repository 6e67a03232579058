// The driver from inside the process, with sanitizers where those are on.
#include "gdal/Driver.h"

#include <cpl_minixml.h>
#include <gdal_alg.h>
#include <gdal_priv.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <numeric>
#include <random>
#include <set>
#include <thread>
#include <vector>

#include "gdal/Options.h"
#include "gdal/SampleType.h"
#include "gdal/SidecarStage.h"
#include "gdal/VsiSource.h"
#include "host/file/Limits.h"
#include "host/file/PyramidHeader.h"
#include "host/journal/MetadataJournal.h"
#include "tests/gdal/GdalTest.h"
#include "tests/support/LenientHeaders.h"
#include "tests/support/ParseCounter.h"
#include "tests/support/ScratchDirectory.h"

namespace zmcgdal {
namespace {

namespace fs = std::filesystem;
using zmctest::DatasetPtr;

class DriverTest : public zmctest::GdalTest {
protected:
    std::string Path(const char* file) const { return folder / file; }

    // Random bytes in memory; floating types get what the bytes happen to mean.
    static DatasetPtr Memory(int width, int height, int bands, GDALDataType type) {
        DatasetPtr dataset(Driver("MEM").Create("", width, height, bands, type, nullptr));
        std::vector<double> line(static_cast<std::size_t>(width) * 2);
        std::mt19937 random(5);
        for (int band = 1; band <= bands; ++band)
            for (int y = 0; y < height; ++y) {
                for (double& value : line) value = static_cast<double>(random() % 251);
                EXPECT_EQ(dataset->GetRasterBand(band)->RasterIO(
                              GF_Write, 0, y, width, 1, line.data(), width, 1, GDT_CFloat64, 0, 0),
                          CE_None);
            }
        return dataset;
    }

    static std::vector<unsigned char> Pixels(GDALDataset& dataset) {
        const GDALDataType type = dataset.GetRasterBand(1)->GetRasterDataType();
        const int width = dataset.GetRasterXSize(), height = dataset.GetRasterYSize();
        std::vector<unsigned char> pixels(
            static_cast<std::size_t>(width) * static_cast<std::size_t>(height) *
            static_cast<std::size_t>(dataset.GetRasterCount() * GDALGetDataTypeSizeBytes(type)));
        EXPECT_EQ(dataset.RasterIO(GF_Read, 0, 0, width, height, pixels.data(), width, height, type,
                                   dataset.GetRasterCount(), nullptr, 0, 0, 0),
                  CE_None);
        return pixels;
    }

    std::string MakeCopy(GDALDataset& source, const char* name = "copy.pyr") {
        const DatasetPtr made(
            Driver().CreateCopy(Path(name).c_str(), &source, TRUE, nullptr, nullptr, nullptr));
        EXPECT_TRUE(made);
        return Path(name);
    }
};

TEST_F(DriverTest, OneParseOfTheDocumentServesAllBandsAfterAnUpdateToo) {
    constexpr int kBands = 200;
    const std::string name = Path("a.pyr");
    DatasetPtr(Driver().CreateCopy(name.c_str(), Memory(4, 4, kBands, GDT_Byte).get(), FALSE,
                                   nullptr, nullptr, nullptr));
    {
        const DatasetPtr updated(Open(name, GDAL_OF_RASTER | GDAL_OF_UPDATE));
        ASSERT_TRUE(updated);
        for (const int band : {1, 90, 1})
            EXPECT_EQ(updated->GetRasterBand(band)->SetStatistics(1, 2, band + 0.5, 0.25), CE_None);
    }
    const DatasetPtr dataset = Open(name);
    ASSERT_TRUE(dataset);
    double mean = 0;
    EXPECT_EQ(dataset->GetRasterBand(1)->GetStatistics(0, 0, nullptr, nullptr, &mean, nullptr),
              CE_None);
    EXPECT_EQ(mean, 1.5);
    const std::size_t before = zmctest::DocumentParses();
    EXPECT_GT(before, 0u);
    for (int band = 2; band <= kBands; ++band) {
        GDALRasterBand& each = *dataset->GetRasterBand(band);
        const CPLErr has = each.GetStatistics(0, 0, nullptr, nullptr, &mean, nullptr);
        if (band == 90) {
            EXPECT_EQ(has, CE_None);
            EXPECT_EQ(mean, 90.5);
        }
        EXPECT_EQ(each.GetColorTable(), nullptr);
        double low = 0, high = 0;
        int buckets = 0;
        GUIntBig* counts = nullptr;
        each.GetDefaultHistogram(&low, &high, &buckets, &counts, FALSE, nullptr, nullptr);
        CPLFree(counts);
    }
    EXPECT_EQ(zmctest::DocumentParses(), before);
}

TEST_F(DriverTest, RegistersOnce) {
    const int before = GetGDALDriverManager()->GetDriverCount();
    GDALRegister_ZMCPyramid();
    EXPECT_EQ(GetGDALDriverManager()->GetDriverCount(), before);
}

TEST_F(DriverTest, EveryElementTypeHasADataTypeAndComesBack) {
#define ZMC_X(type, name, code)                                           \
    EXPECT_NE(GdalTypeOf(code, SignedByteAs::Own), GDT_Unknown) << #name; \
    EXPECT_EQ(PixelTypeFor(GdalTypeOf(code, SignedByteAs::FlaggedByte), code == 99), code) << #name;
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    EXPECT_EQ(PixelTypeFor(GDT_Byte, true), zelm::PixelTypeCode::Char);
    EXPECT_EQ(PixelTypeFor(GDT_Unknown, false), 0u);
    EXPECT_EQ(GdalTypeOf(7, SignedByteAs::Own), GDT_Unknown);
    EXPECT_EQ(GdalTypeOf(zelm::PixelTypeCode::Char, SignedByteAs::Int16), GDT_Int16);
}

// What GDAL prints and checks is told apart from what is done.
TEST_F(DriverTest, CreationOptionsDoWhatTheirDescriptionTells) {
    const CPLXMLTreeCloser list(CPLParseXMLString(kCreationOptionsXml));
    ASSERT_TRUE(list.get());
    const auto none = ParseCreationOptions(nullptr);
    ASSERT_TRUE(none);
    std::set<std::string> names;
    for (const CPLXMLNode* option = list->psChild; option; option = option->psNext) {
        if (!EQUAL(option->pszValue, "Option")) continue;
        const std::string name = CPLGetXMLValue(option, "name", "");
        names.insert(name);
        CPLStringList given;
        if (const char* const standard = CPLGetXMLValue(option, "default", nullptr))
            given.SetNameValue(name.c_str(), standard);
        const auto parsed = ParseCreationOptions(given.List());
        ASSERT_TRUE(parsed) << name;
        EXPECT_EQ(parsed->build.memory, none->build.memory) << name;
        EXPECT_EQ(parsed->build.bins, none->build.bins) << name;
        EXPECT_EQ(parsed->build.threads, none->build.threads) << name;
        EXPECT_EQ(parsed->build.levels, none->build.levels) << name;
        EXPECT_EQ(parsed->build.statistics, none->build.statistics) << name;
        EXPECT_EQ(parsed->build.ordering, none->build.ordering) << name;
        EXPECT_EQ(parsed->build.weights, none->build.weights) << name;
        EXPECT_EQ(parsed->signedByte, none->signedByte) << name;
        EXPECT_EQ(parsed->embed, none->embed) << name;
        std::size_t values = 0;
        for (const CPLXMLNode* value = option->psChild; value; value = value->psNext) {
            if (value->eType != CXT_Element || !EQUAL(value->pszValue, "Value")) continue;
            CPLStringList one;
            one.SetNameValue(name.c_str(), CPLGetXMLValue(value, "", ""));
            EXPECT_TRUE(ParseCreationOptions(one.List())) << one[0];
            ++values;
        }
        const bool methods = name == "RESAMPLING";
        EXPECT_EQ(methods ? values : 0, methods ? zmchost::kResamplings : 0) << name;
    }
    EXPECT_EQ(names,
              (std::set<std::string>{"BINS", "EMBED", "LEVELS", "MEMORY", "NUM_THREADS", "ORDERING",
                                     "PIXELTYPE", "RESAMPLING", "STATISTICS", "WEIGHTS"}));
}

TEST_F(DriverTest, CopiesOfEveryTypeHoldTheSamePixels) {
    for (const GDALDataType type :
         {GDT_Byte, GDT_UInt16, GDT_Int16, GDT_UInt32, GDT_Int32, GDT_UInt64, GDT_Int64,
          GDT_Float32, GDT_Float64, GDT_CFloat32, GDT_CFloat64})
        for (const int bands : {1, 3, 9}) {
            const DatasetPtr source = Memory(300, 270, bands, type);
            const DatasetPtr copy = Open(MakeCopy(*source));
            ASSERT_TRUE(copy);
            EXPECT_EQ(Pixels(*copy), Pixels(*source)) << GDALGetDataTypeName(type);
            for (int band = 1; band <= bands; ++band)
                EXPECT_EQ(GDALChecksumImage(GDALRasterBand::ToHandle(copy->GetRasterBand(band)), 0,
                                            0, 300, 270),
                          GDALChecksumImage(GDALRasterBand::ToHandle(source->GetRasterBand(band)),
                                            0, 0, 300, 270));
        }
}

TEST_F(DriverTest, BlocksWrittenInAnyOrderArriveWithASmallCache) {
    const GIntBig before = GDALGetCacheMax64();
    GDALSetCacheMax64(200000);
    for (const int bands : {2, 10}) {
        const DatasetPtr source = Memory(600, 500, bands, GDT_Byte);
        DatasetPtr made(
            Driver().Create(Path("new.pyr").c_str(), 600, 500, bands, GDT_Byte, nullptr));
        ASSERT_TRUE(made);
        std::vector<unsigned char> window(60 * 50);
        std::vector<int> order(static_cast<std::size_t>(100 * bands));
        std::iota(order.begin(), order.end(), 0);
        std::shuffle(order.begin(), order.end(), std::mt19937(3));
        for (const int i : order) {
            const int x = i % 10 * 60, y = i / 10 % 10 * 50, band = i / 100 + 1;
            for (GDALDataset* const dataset : {source.get(), made.get()})
                ASSERT_EQ(dataset->GetRasterBand(band)->RasterIO(
                              dataset == source.get() ? GF_Read : GF_Write, x, y, 60, 50,
                              window.data(), 60, 50, GDT_Byte, 0, 0),
                          CE_None);
        }
        made.reset();
        EXPECT_EQ(Pixels(*Open(Path("new.pyr"))), Pixels(*source));
    }
    GDALSetCacheMax64(before);
}

TEST_F(DriverTest, UpdatesAndRenewedLevelsReachTheFile) {
    const DatasetPtr source = Memory(600, 500, 3, GDT_Byte);
    const std::string name = MakeCopy(*source);
    DatasetPtr dataset = Open(name, GDAL_OF_RASTER | GDAL_OF_UPDATE);
    ASSERT_EQ(dataset->GetRasterBand(2)->Fill(9), CE_None);
    const int factors[] = {2, 4};
    ASSERT_EQ(dataset->BuildOverviews("LANCZOS", 2, factors, 0, nullptr, nullptr, nullptr),
              CE_None);
    dataset.reset();
    dataset = Open(name);
    unsigned char pixel = 0;
    GDALRasterBand& level = *dataset->GetRasterBand(2)->GetOverview(1);
    ASSERT_EQ(level.RasterIO(GF_Read, 149, 124, 1, 1, &pixel, 1, 1, GDT_Byte, 0, 0), CE_None);
    EXPECT_EQ(pixel, 9);
}

TEST_F(DriverTest, MasksFollowTheNoDataValueThatIsSet) {
    const DatasetPtr source = Memory(300, 270, 2, GDT_Int16);
    const DatasetPtr copy = Open(MakeCopy(*source));
    GDALRasterBand& band = *copy->GetRasterBand(2);
    EXPECT_EQ(band.GetMaskFlags(), GMF_ALL_VALID);
    copy->SetDescription("");  // nothing of this belongs into a sidecar
    for (const double value : {7.0, 8.0, 70000.0}) {
        band.SetNoDataValue(value);
        std::vector<std::int16_t> samples(300 * 270);
        std::vector<unsigned char> mask(300 * 270);
        ASSERT_EQ(band.RasterIO(GF_Read, 0, 0, 300, 270, samples.data(), 300, 270, GDT_Int16, 0, 0),
                  CE_None);
        ASSERT_EQ(band.GetMaskBand()->RasterIO(GF_Read, 0, 0, 300, 270, mask.data(), 300, 270,
                                               GDT_Byte, 0, 0),
                  CE_None);
        for (std::size_t i = 0; i < mask.size(); ++i)
            ASSERT_EQ(mask[i], samples[i] == value ? 0 : 255) << i;
    }
}

TEST_F(DriverTest, DatasetsInEightThreadsReadTheSame) {
    const DatasetPtr source = Memory(700, 600, 3, GDT_UInt16);
    const std::string name = MakeCopy(*source);
    const auto expected = Pixels(*source);
    std::vector<std::thread> threads;
    std::vector<char> same(8);
    for (std::size_t i = 0; i < same.size(); ++i)
        threads.emplace_back([&, i] {
            same[i] = 1;
            for (int run = 0; run < 3; ++run) same[i] &= Pixels(*Open(name)) == expected;
        });
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(same, std::vector<char>(8, 1));
}

TEST_F(DriverTest, DamagedFilesDoNoHarm) {
    const DatasetPtr source = Memory(300, 270, 2, GDT_Byte);
    const std::string name = MakeCopy(*source);
    const std::string whole = zmctest::ReadText(name);
    std::mt19937 random(11);
    CPLPushErrorHandler(CPLQuietErrorHandler);
    for (int run = 0; run < 150; ++run) {
        std::string damaged = whole;
        // In the header, in the statistics behind the tiles, or by a cut.
        const std::size_t at = run % 3 == 0 ? random() % 1000 : whole.size() - 1 - random() % 9000;
        damaged[at] = static_cast<char>(random());
        if (run % 5 == 0) damaged.resize(at);
        std::ofstream(Path("bad.pyr"), std::ios::binary) << damaged;
        const DatasetPtr dataset = Open(Path("bad.pyr"));
        if (!dataset || dataset->GetRasterXSize() > 5000 || dataset->GetRasterYSize() > 5000)
            continue;
        GDALRasterBand& band = *dataset->GetRasterBand(1);
        (void)band.GetMetadata();
        (void)band.GetColorTable();
        unsigned char pixels[64];
        const CPLErr result = band.RasterIO(GF_Read, 0, 0, 1, 1, pixels, 1, 1, GDT_Byte, 0, 0);
        EXPECT_LE(result, CE_Failure);
    }
    CPLPopErrorHandler();
}

TEST_F(DriverTest, CancelledCopiesLeaveNothing) {
    const DatasetPtr source = Memory(900, 800, 3, GDT_Byte);
    CPLPushErrorHandler(CPLQuietErrorHandler);
    for (double limit : {0.0, 0.3, 0.6, 0.9}) {
        const auto progress = [](double done, const char*, void* data) -> int {
            return done <= *static_cast<double*>(data);
        };
        const DatasetPtr made(Driver().CreateCopy(Path("gone.pyr").c_str(), source.get(), TRUE,
                                                  nullptr, progress, &limit));
        EXPECT_FALSE(made);
        EXPECT_TRUE(fs::is_empty(folder.String()));
    }
    CPLPopErrorHandler();
}

double MeanOf(GDALDataset& dataset) {
    double mean = 0;
    EXPECT_EQ(
        dataset.GetRasterBand(1)->GetStatistics(FALSE, FALSE, nullptr, nullptr, &mean, nullptr),
        CE_None);
    return mean;
}

TEST_F(DriverTest, StoreThatWasCutOffIsPutInOrder) {
    const std::string name = MakeCopy(*Memory(20, 10, 1, GDT_Byte));
    const double mean = MeanOf(*Open(name));
    const std::uint64_t document = zmchost::PyramidHeader::Read(name).tileDataEnd;
    const pid_t child = fork();
    if (child == 0) {
        const auto* const left = new zmchost::MetadataJournal(name);
        _exit(left ? 0 : 1);
    }
    waitpid(child, nullptr, 0);
    ASSERT_TRUE(fs::exists(zmchost::MetadataJournal::PathFor(name)));
    std::fstream(name, std::ios::in | std::ios::out | std::ios::binary)
            .seekp(static_cast<std::streamoff>(document))
        << '\x1A';
    const std::string damaged = zmctest::ReadText(name);
    CPLPushErrorHandler(CPLQuietErrorHandler);
    EXPECT_TRUE(Open(name));
    EXPECT_NE(std::string(CPLGetLastErrorMsg()).find("zmcraster recover"), std::string::npos);
    EXPECT_EQ(zmctest::ReadText(name), damaged) << "who opens for reading writes nothing";
    const DatasetPtr opened = Open(name, GDAL_OF_UPDATE);
    EXPECT_NE(std::string(CPLGetLastErrorMsg()).find("again the one of before"), std::string::npos);
    CPLPopErrorHandler();
    EXPECT_EQ(MeanOf(*opened), mean);
    EXPECT_FALSE(fs::exists(zmchost::MetadataJournal::PathFor(name)));
}

// What a build leaves that is ended between the names of its files.
TEST_F(DriverTest, StagedSidecarOfThisFileIsSeenAndGetsItsNameForUpdate) {
    const std::string name = MakeCopy(*Memory(20, 10, 1, GDT_Byte));
    const std::string usual = name + ".aux.xml";
    const auto unitOf = [&](unsigned flags) {
        const DatasetPtr dataset = Open(name, flags);
        return std::string(dataset->GetRasterBand(1)->GetUnitType());
    };
    const auto sidecar = [](const std::string& unit) {
        return "<PAMDataset><PAMRasterBand band=\"1\"><UnitType>" + unit +
               "</UnitType></PAMRasterBand></PAMDataset>";
    };
    zmctest::WriteText(usual, sidecar("old"));
    const auto source = OpenByName(name, false);
    const auto header = zmchost::PyramidHeader::Read(*source, name);
    const std::string base =
        fs::path(name).parent_path() / ("." + fs::path(name).filename().string() + ".zmcside-" +
                                        std::to_string(source->Identify().number) + "-");
    const std::string staged = base + std::to_string(header.tileDataEnd) + ".aux.xml";
    const std::string foreign = base + "1.aux.xml";
    zmctest::WriteText(foreign, sidecar("foreign"));
    EXPECT_EQ(unitOf(GDAL_OF_READONLY), "old") << "that is of another file";
    zmctest::WriteText(staged, sidecar("new"));
    EXPECT_EQ(unitOf(GDAL_OF_READONLY), "new");
    EXPECT_EQ(zmctest::ReadText(usual), sidecar("old")) << "who reads changes nothing";
    EXPECT_EQ(unitOf(GDAL_OF_UPDATE), "new");
    EXPECT_EQ(zmctest::ReadText(usual), sidecar("new"));
    EXPECT_FALSE(fs::exists(staged));
    EXPECT_TRUE(fs::exists(foreign)) << "the next build removes it";
    zmctest::WriteText(staged, "<PAMDataset />\n");
    EXPECT_EQ(unitOf(GDAL_OF_READONLY), "");
    EXPECT_EQ(unitOf(GDAL_OF_UPDATE), "");
    EXPECT_FALSE(fs::exists(usual));
}

std::set<std::string> NamesIn(const zmctest::ScratchDirectory& folder) {
    std::set<std::string> names;
    for (const auto& entry : fs::directory_iterator(folder.String()))
        names.insert(entry.path().filename());
    return names;
}

// To copy a mask takes minutes, and nothing tells of them but a lock.
TEST_F(DriverTest, CompanionsThatAreBeingWrittenAreNotLeftOver) {
    const std::string finished = MakeCopy(*Memory(20, 10, 1, GDT_Byte), "finished.pyr");
    const std::string target = Path("made.pyr");
    SidecarStage first(target);
    const std::string base = first.Begin(finished);
    for (const char* const ending : {".msk", ".aux.xml"}) {
        zmctest::WriteText(base + ending, ending);
        const SidecarStage second(target);
        EXPECT_EQ(zmctest::ReadText(base + ending), ending);
    }
    EXPECT_EQ(zmctest::ReadText(base + ".msk"), ".msk");
    first.Complete();
    fs::rename(finished, target);
    first.Settle();
    EXPECT_EQ(NamesIn(folder),
              (std::set<std::string>{"made.pyr", "made.pyr.aux.xml", "made.pyr.msk"}));
    EXPECT_EQ(zmctest::ReadText(target + ".aux.xml"), ".aux.xml");
    EXPECT_EQ(zmctest::ReadText(target + ".msk"), ".msk");
}

TEST_F(DriverTest, CompanionsOfABuildThatFailedGo) {
    const std::string finished = MakeCopy(*Memory(20, 10, 1, GDT_Byte), "finished.pyr");
    {
        SidecarStage stage(Path("made.pyr"));
        const std::string base = stage.Begin(finished);
        for (const char* const ending : {".msk", ".aux.xml"})
            zmctest::WriteText(base + ending, ending);
    }
    EXPECT_EQ(NamesIn(folder), std::set<std::string>{"finished.pyr"});
}

TEST_F(DriverTest, CompanionsOfABuildThatWasEndedGoWithTheNextOne) {
    const std::string finished = MakeCopy(*Memory(20, 10, 1, GDT_Byte), "finished.pyr");
    const pid_t child = fork();
    if (child == 0) {
        SidecarStage stage(Path("made.pyr"));
        const std::string base = stage.Begin(finished);
        for (const char* const ending : {".msk", ".aux.xml"})
            zmctest::WriteText(base + ending, ending);
        _exit(0);
    }
    waitpid(child, nullptr, 0);
    EXPECT_GT(NamesIn(folder).size(), 2u);
    const SidecarStage next(Path("made.pyr"));
    EXPECT_EQ(NamesIn(folder), std::set<std::string>{"finished.pyr"});
}

// Changes a limit until the end of a test.
class LimitsChanged {
public:
    explicit LimitsChanged(const char* text) { zmchost::Limits::Change(text); }
    ~LimitsChanged() {
        zmchost::Limits::Change("tile=" + std::to_string(before.tile) +
                                ",elements=" + std::to_string(before.elements));
    }
    LimitsChanged(const LimitsChanged&) = delete;
    LimitsChanged& operator=(const LimitsChanged&) = delete;

private:
    const zmchost::Limits before = zmchost::Limits::Current();
};

// Writes a block and stores statistics; how many of the two came to be.
int Updates(GDALDataset& dataset) {
    GDALRasterBand& band = *dataset.GetRasterBand(1);
    std::vector<unsigned char> block(256 * 256);
    CPLPushErrorHandler(CPLQuietErrorHandler);
    const bool written = band.WriteBlock(0, 0, block.data()) == CE_None;
    const bool stored = band.SetStatistics(0, 0, 0, 0) == CE_None;
    CPLPopErrorHandler();
    return written + stored;
}

TEST_F(DriverTest, WhatIsOpenKeepsToTheLimitsThatItWasOpenedBy) {
    const std::string name = MakeCopy(*Memory(256, 256, 1, GDT_Byte));
    const unsigned update = GDAL_OF_RASTER | GDAL_OF_UPDATE;
    const DatasetPtr before = Open(name, update);
    {
        const LimitsChanged lowered("tile=1000,elements=1");
        EXPECT_EQ(Updates(*before), 2);
        const DatasetPtr under = Open(name, update);
        EXPECT_EQ(Updates(*under), 0);
        const LimitsChanged raised("tile=100000,elements=1000");
        EXPECT_EQ(Updates(*under), 0);
    }
    EXPECT_EQ(Updates(*before), 2);
}

// Else the whole of its tile would be read before it is refused.
TEST_F(DriverTest, PixelOfATileBeyondTheLimitIsRefusedAtOnce) {
    const std::string name = MakeCopy(*Memory(256, 256, 2, GDT_Byte));
    const LimitsChanged lowered("tile=1000");
    const DatasetPtr dataset = Open(name, GDAL_OF_RASTER | GDAL_OF_UPDATE);
    unsigned char pixel[2] = {1, 2};
    EXPECT_EQ(dataset->GetRasterBand(1)->RasterIO(GF_Write, 0, 0, 1, 1, pixel, 1, 1, GDT_Byte, 0, 0,
                                                  nullptr),
              CE_Failure);
    EXPECT_EQ(dataset->RasterIO(GF_Write, 0, 0, 1, 1, pixel, 1, 1, GDT_Byte, 2, nullptr, 0, 0, 0,
                                nullptr),
              CE_Failure);
    EXPECT_FALSE(dataset->GetRasterBand(1)->TryGetLockedBlockRef(0, 0)) << "its tile was read";
}

// The numbers of the bands that a level has made.
std::set<int> BandsMade(GDALDataset& level) {
    std::set<int> made;
    for (int number = 1; number <= level.GetRasterCount(); ++number)
        if (level.GetRasterBand(number)) made.insert(number);
    return made;
}

TEST_F(DriverTest, ReducedWindowsMakeTheirBandsInTheLevelAloneThatTheyAreReadFrom) {
    constexpr int kBands = 1025;
    const char* const options[] = {"LEVELS=3", "STATISTICS=NO", nullptr};
    const std::string name = Path("a.pyr");
    ASSERT_TRUE(
        DatasetPtr(Driver().CreateCopy(name.c_str(), Memory(64, 32, kBands, GDT_Byte).get(), FALSE,
                                       const_cast<char**>(options), nullptr, nullptr)));
    const DatasetPtr dataset = Open(name);
    ASSERT_TRUE(dataset);
    int bands[] = {3, 700, 20};
    std::vector<unsigned char> together(16 * 8 * 3), apart(16 * 8 * 3);
    const auto read = [](auto& from, unsigned char* out, auto... rest) {
        return from.RasterIO(GF_Read, 0, 0, 64, 32, out, 16, 8, GDT_Byte, rest..., nullptr);
    };
    EXPECT_EQ(read(*dataset, together.data(), 3, bands, 0, 0, 0), CE_None);
    GDALRasterBand& last = *dataset->GetRasterBand(kBands);
    ASSERT_EQ(last.GetOverviewCount(), 3);
    const auto made = [&](int level) { return BandsMade(*last.GetOverview(level)->GetDataset()); };
    EXPECT_EQ(made(0), (std::set<int>{kBands}));
    EXPECT_EQ(made(1), (std::set<int>{3, 20, 700, kBands}));
    EXPECT_EQ(made(2), (std::set<int>{kBands}));
    bands[1] = 800;
    for (int i = 0; i < 3; ++i)
        EXPECT_EQ(read(*dataset->GetRasterBand(bands[i]), apart.data() + i * 16 * 8, 0, 0),
                  CE_None);
    EXPECT_EQ(made(0), (std::set<int>{kBands}));
    EXPECT_EQ(made(1), (std::set<int>{3, 20, 700, 800, kBands}));
    EXPECT_EQ(read(*dataset, together.data(), 3, bands, 0, 0, 0), CE_None);
    EXPECT_EQ(together, apart);
}

// Opening a pipe would wait for its other end.
TEST_F(DriverTest, PipesBesideARasterAreNotOpened) {
    const std::string name = MakeCopy(*Memory(20, 10, 1, GDT_Byte));
    for (const char* const ending : {".aux.xml", ".msk", ".ovr"}) {
        const std::string pipe = name + ending;
        fs::remove(pipe);
        ASSERT_EQ(mkfifo(pipe.c_str(), 0600), 0);
        alarm(60);
        CPLPushErrorHandler(CPLQuietErrorHandler);
        for (const int flags : {GDAL_OF_READONLY, GDAL_OF_UPDATE}) {
            const DatasetPtr dataset = Open(name, static_cast<unsigned>(flags));
            ASSERT_TRUE(dataset) << ending;
            EXPECT_NE(std::string(CPLGetLastErrorMsg()).find("is no regular file"),
                      std::string::npos);
            EXPECT_EQ(dataset->GetRasterBand(1)->GetMaskFlags(), GMF_ALL_VALID);
            unsigned char pixel = 0;
            EXPECT_EQ(dataset->GetRasterBand(1)->RasterIO(GF_Read, 0, 0, 1, 1, &pixel, 1, 1,
                                                          GDT_Byte, 0, 0, nullptr),
                      CE_None);
        }
        CPLPopErrorHandler();
        alarm(0);
        fs::remove(pipe);
    }
}

class LenientHeaders : public DriverTest,
                       public testing::WithParamInterface<zmctest::LenientHeader> {};

// What the module reads in a header is what is shown, and what buffers are made by.
TEST_P(LenientHeaders, SayTheSameToGdal) {
    const zmctest::LenientHeader& expected = GetParam();
    zmctest::WriteText(Path("a.pyr"), expected.File());
    const DatasetPtr dataset = Open(Path("a.pyr"));
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->GetRasterXSize(), static_cast<int>(expected.width));
    EXPECT_EQ(dataset->GetRasterYSize(), static_cast<int>(expected.height));
    ASSERT_EQ(dataset->GetRasterCount(), static_cast<int>(zmctest::LenientHeader::kBands));
    const auto item = [&](const char* name) {
        return std::string(dataset->GetMetadataItem(name, "ZMCPYRAMID"));
    };
    EXPECT_EQ(item("LEVEL_MIN"), std::to_string(expected.levelMin));
    EXPECT_EQ(item("LEVEL_MAX"), std::to_string(expected.levelMax));
    EXPECT_EQ(item("COMPLETE"), "YES");
    GDALRasterBand& band = *dataset->GetRasterBand(2);
    const GDALDataType type = band.GetRasterDataType();
    EXPECT_EQ(type, expected.pixelType == 12 ? GDT_UInt16 : GDT_Byte);
    const auto pixels = static_cast<std::size_t>(expected.width) * expected.height;
    std::vector<unsigned char> read(pixels * expected.sampleBytes);
    ASSERT_EQ(band.RasterIO(GF_Read, 0, 0, static_cast<int>(expected.width),
                            static_cast<int>(expected.height), read.data(),
                            static_cast<int>(expected.width), static_cast<int>(expected.height),
                            type, 0, 0, nullptr),
              CE_None);
    EXPECT_EQ(std::count(read.begin(), read.end(), 1), static_cast<std::ptrdiff_t>(read.size()));
    // Levels without pixels are nobody's overview, be their number 32 and more or less.
    for (int i = 0; i < band.GetOverviewCount(); ++i) {
        EXPECT_EQ(band.GetOverview(i)->GetXSize(), static_cast<int>(expected.width) >> (i + 1));
        EXPECT_GT(band.GetOverview(i)->GetYSize(), 0);
    }
    EXPECT_EQ(band.GetOverviewCount(), static_cast<int>(std::min(expected.levelMax, 8u)));
}

INSTANTIATE_TEST_SUITE_P(All, LenientHeaders, testing::ValuesIn(zmctest::kLenientHeaders),
                         [](const auto& each) { return each.param.name; });

}  // namespace
}  // namespace zmcgdal
