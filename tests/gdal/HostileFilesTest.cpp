// Files that are made to be read one way and measured another, and files that change at the worst
// moment: whatever the driver's user asks for, no byte leaves his buffers.
#include <cpl_vsi.h>
#include <gdal_priv.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "gdal/LazyRaster.h"
#include "gdal/SampleType.h"
#include "host/base/Error.h"
#include "tests/gdal/GdalTest.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"

namespace zmcgdal {
namespace {

using zmctest::DatasetPtr;

// The bytes that a file in the middle of a change has instead of its own: "/vsimoments/NAME" is
// read by GDAL as NAME was put here, until so many reads have been made, and as something else from
// then on.
struct Moments {
    std::string first, then;
    std::size_t change = 0;  // the read, from 1, from which on it is `then`; 0 for never
    std::size_t reads = 0;

    const std::string& Now() const { return change != 0 && reads >= change ? then : first; }
};

Moments moments;
vsi_l_offset position;

void InstallMoments() {
    VSIFilesystemPluginCallbacksStruct* const calls = VSIAllocFilesystemPluginCallbacksStruct();
    calls->open = [](void*, const char* name, const char*) -> void* {
        position = 0;
        return std::strcmp(name, "a.pyr") == 0 ? &moments : nullptr;
    };
    calls->stat = [](void*, const char* name, VSIStatBufL* status, int) {
        if (std::strcmp(name, "a.pyr") != 0) return -1;
        status->st_size = static_cast<off_t>(moments.Now().size());
        status->st_mode = S_IFREG;
        return 0;
    };
    calls->tell = [](void*) { return position; };
    calls->seek = [](void*, vsi_l_offset offset, int whence) {
        position = offset;
        if (whence == SEEK_END) position += moments.Now().size();
        return 0;
    };
    calls->read = [](void*, void* buffer, size_t size, size_t count) -> size_t {
        ++moments.reads;
        const std::string& bytes = moments.Now();
        const std::size_t there = position < bytes.size() ? bytes.size() - position : 0;
        const std::size_t moved = std::min(size * count, there);
        std::memcpy(buffer, bytes.data() + position, moved);
        position += moved;
        return size == 0 ? 0 : moved / size;
    };
    calls->eof = [](void*) { return position >= moments.Now().size() ? 1 : 0; };
    calls->close = [](void*) { return 0; };
    VSIInstallPluginHandler("/vsimoments/", calls);
    VSIFreeFilesystemPluginCallbacksStruct(calls);
}

class HostileFiles : public zmctest::GdalTest {
protected:
    static void SetUpTestSuite() {
        GdalTest::SetUpTestSuite();
        static const bool installed = (InstallMoments(), true);
        ASSERT_TRUE(installed);
    }

    const std::string name = folder / "a.pyr";
};

// Samples of a window with room for no byte more than GDAL promises them, and a wall behind.
class WalledBuffer {
public:
    WalledBuffer(std::size_t samples, GDALDataType type)
        : size(samples * static_cast<std::size_t>(GDALGetDataTypeSizeBytes(type))),
          bytes(size + kWall, kBrick) {}
    ~WalledBuffer() {
        EXPECT_EQ(
            std::count(bytes.begin() + static_cast<std::ptrdiff_t>(size), bytes.end(), kBrick),
            std::ptrdiff_t{kWall});
    }
    WalledBuffer(const WalledBuffer&) = delete;
    WalledBuffer& operator=(const WalledBuffer&) = delete;

    void* Data() { return bytes.data(); }
    bool IsAll(unsigned char value) const {
        return std::all_of(bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(size),
                           [value](unsigned char byte) { return byte == value; });
    }

private:
    static constexpr std::size_t kWall = 1 << 16;
    static constexpr unsigned char kBrick = 0xB7;
    std::size_t size;
    std::vector<unsigned char> bytes;
};

// All that a user of GDAL can read of a dataset, by every road that pixels take; counts the roads
// that gave pixels. With `value` all of them have to be that byte.
int ReadAll(GDALDataset& dataset, int value = -1) {
    const int width = std::min(dataset.GetRasterXSize(), 700);
    const int height = std::min(dataset.GetRasterYSize(), 700);
    const int bands = std::min(dataset.GetRasterCount(), 10);
    GDALRasterBand& band = *dataset.GetRasterBand(bands);
    const GDALDataType type = band.GetRasterDataType();
    const auto pixels = static_cast<std::size_t>(width) * static_cast<std::size_t>(height);
    int given = 0;
    const auto take = [&](CPLErr result, const WalledBuffer& buffer, bool samples = true) {
        if (result != CE_None) return;
        ++given;
        EXPECT_TRUE(value < 0 || !samples || buffer.IsAll(static_cast<unsigned char>(value)));
    };
    int side = 0, same = 0;
    band.GetBlockSize(&side, &same);
    {
        WalledBuffer block(static_cast<std::size_t>(side) * static_cast<std::size_t>(same), type);
        const bool whole = width >= side && height >= side;
        take(band.ReadBlock(0, 0, block.Data()), block, whole);
    }
    WalledBuffer one(pixels, type), all(pixels * static_cast<std::size_t>(bands), type);
    take(band.RasterIO(GF_Read, 0, 0, width, height, one.Data(), width, height, type, 0, 0), one);
    take(dataset.RasterIO(GF_Read, 0, 0, width, height, all.Data(), width, height, type, bands,
                          nullptr, 0, 0, 0),
         all);
    const int size = GDALGetDataTypeSizeBytes(type);
    take(dataset.RasterIO(GF_Read, 0, 0, width, height, all.Data(), width, height, type, bands,
                          nullptr, GSpacing{size} * bands, GSpacing{size} * bands * width, size),
         all);
    {
        const int w = std::min(width, side), h = std::min(height, side);
        WalledBuffer tile(static_cast<std::size_t>(w) * static_cast<std::size_t>(h) *
                              static_cast<std::size_t>(bands),
                          type);
        take(dataset.RasterIO(GF_Read, 0, 0, w, h, tile.Data(), w, h, type, bands, nullptr,
                              GSpacing{size} * bands, GSpacing{size} * bands * w, size),
             tile);
    }
    {
        WalledBuffer mask(pixels, GDT_Byte);
        band.SetNoDataValue(77);
        take(band.GetMaskBand()->RasterIO(GF_Read, 0, 0, width, height, mask.Data(), width, height,
                                          GDT_Byte, 0, 0),
             mask, false);
        dataset.SetDescription("");  // nothing of this belongs into a sidecar
    }
    if (GDALRasterBand* const level = band.GetOverview(0)) {
        const int w = std::min(level->GetXSize(), 700), h = std::min(level->GetYSize(), 700);
        WalledBuffer coarse(static_cast<std::size_t>(w) * static_cast<std::size_t>(h), type);
        take(level->RasterIO(GF_Read, 0, 0, w, h, coarse.Data(), w, h, type, 0, 0), coarse);
    }
    return given;
}

// A file whose tiles would do for samples of 16 bytes, all of that value.
std::string FileWith(const zmctest::HeaderText& header, char value, const std::string& text) {
    std::size_t samples = 0;
    for (std::uint32_t level = header.levelMin; level <= std::min(header.levelMax, 31u); ++level)
        samples += std::size_t{header.width >> level} * (header.height >> level) * header.bands;
    return zmctest::FileWithHeader(text) + std::string(samples * 16, value);
}

zmctest::HeaderText Plain() {
    zmctest::HeaderText header;
    header.width = 300;
    header.height = 270;
    header.bands = 2;
    header.levelMax = 1;
    return header;
}

struct TwoTypes {
    const char* name;
    const char *first, *second, *before, *open, *close;
};

class SecondPixelType : public HostileFiles, public testing::WithParamInterface<TwoTypes> {};

// Which of the two counts is for the module to say; what matters is that all go by the same.
TEST_P(SecondPixelType, IsReadIntoBuffersOfTheSamplesThatAreRead) {
    const TwoTypes& types = GetParam();
    for (const char* const ordering : {"Blocked", "Morton"}) {
        zmctest::HeaderText header = Plain();
        header.pixelType = types.first;
        header.ordering = ordering;
        std::string text = header.Text();
        text.insert(text.find(types.before), std::string(types.open) + "<HEADER_PIXEL_TYPE>" +
                                                 types.second + "</HEADER_PIXEL_TYPE>" +
                                                 types.close);
        zmctest::WriteText(name, FileWith(header, 1, text));
        const auto module = SharedModule()->OpenPyramid(name);
        ASSERT_TRUE(module);
        std::uint32_t read = 0;
        module->GetReader()->Visit([&](auto& typed) { read = typed.GetRasterProps().pixelType; });
        for (const unsigned flags : {0u, unsigned{GDAL_OF_UPDATE}}) {
            const DatasetPtr dataset = Open(name, flags);
            ASSERT_TRUE(dataset);
            EXPECT_EQ(dataset->GetRasterBand(1)->GetRasterDataType(),
                      GdalTypeOf(read, SignedByteAs::Own));
            EXPECT_EQ(ReadAll(*dataset, 1), 7);
        }
        const DatasetPtr dataset = Open(name, GDAL_OF_UPDATE);
        const int factors[] = {2};
        EXPECT_EQ(dataset->BuildOverviews("NEAREST", 1, factors, 0, nullptr, nullptr, nullptr),
                  CE_None);
        EXPECT_EQ(ReadAll(*dataset, 1), 7);
    }
}

INSTANTIATE_TEST_SUITE_P(
    All, SecondPixelType,
    testing::Values(TwoTypes{"LargeInsideAnUnknownElement", "Byte", "ComplexDouble",
                             "<HEADER_VERSION_MAJOR>", "<HEADER_MOOD>", "</HEADER_MOOD>"},
                    TwoTypes{"SmallInsideAnUnknownElement", "ComplexDouble", "Byte",
                             "<HEADER_VERSION_MAJOR>", "<HEADER_MOOD>", "</HEADER_MOOD>"},
                    TwoTypes{"LargeInsideAnUnknownElementBehind", "Byte", "ComplexDouble",
                             "</HEADER>", "<HEADER_MOOD>", "</HEADER_MOOD>"},
                    TwoTypes{"SmallInsideAnUnknownElementBehind", "ComplexDouble", "Byte",
                             "</HEADER>", "<HEADER_MOOD>", "</HEADER_MOOD>"},
                    TwoTypes{"LargeBehindTheHeader", "Byte", "ComplexDouble", "</DATASET>",
                             "<OTHER>", "</OTHER>"},
                    TwoTypes{"SmallBehindTheHeader", "ComplexDouble", "Byte", "</DATASET>",
                             "<OTHER>", "</OTHER>"},
                    TwoTypes{"LargeTwice", "Byte", "ComplexDouble", "</HEADER>", "", ""},
                    TwoTypes{"SmallTwice", "ComplexDouble", "Byte", "</HEADER>", "", ""}),
    [](const auto& each) { return each.param.name; });

struct Rewrite {
    const char* name;
    std::function<void(zmctest::HeaderText&)> change;
};

const std::vector<Rewrite>& Rewrites() {
    using Header = zmctest::HeaderText;
    static const std::vector<Rewrite> all{
        {"LargerSamples", [](Header& h) { h.pixelType = "ComplexDouble"; }},
        {"OtherSamplesOfTheSize", [](Header& h) { h.pixelType = "Char"; }},
        {"MoreBands", [](Header& h) { h.bands = 5; }},
        {"FewerBands", [](Header& h) { h.bands = 1; }},
        {"MoreColumns", [](Header& h) { h.width = 600; }},
        {"FewerColumns", [](Header& h) { h.width = 17; }},
        {"MoreRows", [](Header& h) { h.height = 600; }},
        {"FewerRows", [](Header& h) { h.height = 17; }},
        {"LargerTiles", [](Header& h) { h.tileSize = 2048; }},
        {"SmallerTiles", [](Header& h) { h.tileSize = 16; }},
        {"AnotherOrdering", [](Header& h) { h.ordering = "Morton"; }},
        {"MoreLevels", [](Header& h) { h.levelMax = 8; }},
        {"AnotherFirstLevel", [](Header& h) { h.levelMin = 1; }},
        {"AnotherVersion", [](Header& h) { h.versionMinor = 0; }},
        {"Everything",
         [](Header& h) {
             h.pixelType = "ComplexDouble";
             h.bands = 5;
             h.width = 400;
             h.tileSize = 1024;
             h.ordering = "Morton";
         }},
    };
    return all;
}

class RewrittenFiles : public HostileFiles, public testing::WithParamInterface<Rewrite> {
protected:
    // Before and after. Both are long enough for either.
    std::string before, after;
    void SetUp() override {
        HostileFiles::SetUp();
        zmctest::HeaderText header = Plain();
        before = FileWith(header, 1, header.Text());
        GetParam().change(header);
        after = FileWith(header, 2, header.Text());
        before.resize(std::max(before.size(), after.size()), 1);
        after.resize(before.size(), 2);
    }
};

TEST_P(RewrittenFiles, KeepToTheirBuffersAfterARename) {
    zmctest::WriteText(name, before);
    const DatasetPtr dataset = Open(name);
    ASSERT_TRUE(dataset);
    zmctest::WriteText(folder / "b.pyr", after);
    std::filesystem::rename(folder / "b.pyr", name);
    // The file that was opened is read on.
    EXPECT_EQ(ReadAll(*dataset, 1), 7);
}

TEST_P(RewrittenFiles, AreRefusedWhenRewrittenInPlaceBeforeTheFirstRead) {
    for (const unsigned flags : {0u, unsigned{GDAL_OF_UPDATE}}) {
        zmctest::WriteText(name, before);
        const DatasetPtr dataset = Open(name, flags);
        ASSERT_TRUE(dataset);
        std::fstream(name, std::ios::in | std::ios::out | std::ios::binary) << after;
        CPLErrorReset();
        const bool sameLayout = std::string(GetParam().name) == "AnotherVersion";
        EXPECT_EQ(ReadAll(*dataset), sameLayout ? 7 : 0);
        EXPECT_EQ(CPLGetLastErrorType() == CE_Failure, !sameLayout);
    }
}

TEST_P(RewrittenFiles, KeepToTheirBuffersWhenRewrittenInPlaceBetweenReads) {
    zmctest::WriteText(name, before);
    const DatasetPtr dataset = Open(name);
    ASSERT_TRUE(dataset);
    ASSERT_EQ(ReadAll(*dataset, 1), 7);
    std::fstream(name, std::ios::in | std::ios::out | std::ios::binary) << after;
    dataset->FlushCache(false);
    EXPECT_EQ(ReadAll(*dataset), 7);
    std::filesystem::resize_file(name, 400);
    dataset->FlushCache(false);
    ReadAll(*dataset);
}

// The file is another one from some read on, whichever that is, and as it was the next time.
TEST_P(RewrittenFiles, KeepToTheirBuffersWheneverTheyChange) {
    // By then it has been opened, twice by the module, and read for the first time.
    constexpr std::size_t kMoments = 30;
    int opened = 0, read = 0;
    for (const bool back : {false, true})
        for (std::size_t change = 1; change <= kMoments; ++change) {
            moments = {back ? after : before, back ? before : after, change, 0};
            const DatasetPtr dataset = Open("/vsimoments/a.pyr");
            if (!dataset) continue;
            ++opened;
            read += ReadAll(*dataset);
        }
    EXPECT_GT(opened, 30);
    EXPECT_GT(read, 100);
}

INSTANTIATE_TEST_SUITE_P(All, RewrittenFiles, testing::ValuesIn(Rewrites()),
                         [](const auto& each) { return each.param.name; });

// Levels that hold nothing are laid out as nothing, and none of them is shown.
TEST_F(HostileFiles, LevelsUpToTheLastOfTheFormatAreOpened) {
    for (const std::uint32_t last : {31u, 32u, 33u, 40u, 63u, 64u, 70u, 255u, 1023u}) {
        zmctest::HeaderText header = Plain();
        header.levelMax = last;
        zmctest::WriteText(name, FileWith(header, 1, header.Text()));
        const DatasetPtr dataset = Open(name, GDAL_OF_UPDATE);
        ASSERT_TRUE(dataset) << last;
        EXPECT_EQ(dataset->GetRasterBand(1)->GetOverviewCount(), 8) << last;
        EXPECT_EQ(ReadAll(*dataset, 1), 7) << last;
        for (const int factor : {INT_MIN, -2, 0, 1, 3, 512, 1 << 30, INT_MAX})
            EXPECT_EQ(dataset->BuildOverviews("NEAREST", 1, &factor, 0, nullptr, nullptr, nullptr),
                      CE_Failure)
                << factor;
        const int factors[] = {2, 256};
        EXPECT_EQ(dataset->BuildOverviews("NEAREST", 2, factors, 0, nullptr, nullptr, nullptr),
                  CE_None);
        zmchost::Raster raster = zmchost::Raster::Open(SharedModule(), name);
        EXPECT_EQ(raster.MaxLevel(), last);
        EXPECT_EQ(raster.Width(last), 0u);
    }
    for (const std::uint32_t first : {32u, 64u, 1023u}) {
        zmctest::HeaderText header = Plain();
        header.levelMin = first;
        header.levelMax = 1023;
        zmctest::WriteText(name, FileWith(header, 1, header.Text()));
        EXPECT_FALSE(Open(name)) << first;
    }
    zmctest::HeaderText header = Plain();
    header.levelMax = 1024;
    zmctest::WriteText(name, FileWith(header, 1, header.Text()));
    EXPECT_FALSE(Open(name));
}

// Without levels of its own a file gets them beside it, from GDAL, which divides by the factor.
TEST_F(HostileFiles, LevelsReducedByNothingAreRefused) {
    zmctest::HeaderText header = Plain();
    header.levelMax = 0;
    zmctest::WriteText(name, header.File());
    for (const unsigned flags : {0u, unsigned{GDAL_OF_UPDATE}}) {
        const DatasetPtr dataset = Open(name, flags);
        ASSERT_TRUE(dataset);
        for (const int factor : {0, -1, INT_MIN}) {
            const int factors[] = {2, factor};
            EXPECT_EQ(dataset->BuildOverviews("NEAREST", 2, factors, 0, nullptr, nullptr, nullptr),
                      CE_Failure);
        }
    }
}

// GDAL counts to 2^31 - 1. The tiles are holes of a file.
TEST_F(HostileFiles, RastersAsLongAsGdalCountsAreReadAtTheirEnds) {
    for (const bool wide : {true, false}) {
        zmctest::HeaderText header;
        header.width = wide ? INT_MAX : 1;
        header.height = wide ? 1 : INT_MAX;
        header.tileSize = 2048;
        const std::string front = zmctest::FileWithHeader(header.Text());
        zmctest::WriteText(name, front);
        std::filesystem::resize_file(name, front.size() + INT_MAX);
        std::fstream(name, std::ios::in | std::ios::out | std::ios::binary).seekp(-1, std::ios::end)
            << '\7';
        const DatasetPtr dataset = Open(name);
        ASSERT_TRUE(dataset);
        const int x = wide ? INT_MAX - 600 : 0, y = wide ? 0 : INT_MAX - 600;
        const int width = wide ? 600 : 1, height = wide ? 1 : 600;
        std::vector<unsigned char> line(600, 9);
        const auto read = [&](auto& from, auto... bands) {
            std::fill(line.begin(), line.end(), 9);
            return from.RasterIO(GF_Read, x, y, width, height, line.data(), width, height, GDT_Byte,
                                 bands...) == CE_None &&
                   line[0] == 0 && line[599] == 7;
        };
        GDALRasterBand& band = *dataset->GetRasterBand(1);
        EXPECT_TRUE(read(band, 0, 0));
        EXPECT_TRUE(read(*dataset, 1, nullptr, 0, 0, 0, nullptr));
        band.SetNoDataValue(7);
        ASSERT_EQ(band.GetMaskBand()->RasterIO(GF_Read, x, y, width, height, line.data(), width,
                                               height, GDT_Byte, 0, 0),
                  CE_None);
        EXPECT_EQ(line[598], 255);
        EXPECT_EQ(line[599], 0);
        dataset->SetDescription("");
    }
    zmctest::HeaderText header;
    header.width = 1u << 31;
    header.height = 1;
    zmctest::WriteText(name, zmctest::FileWithHeader(header.Text()));
    EXPECT_FALSE(Open(name));
}

// A record that stands behind those of as many bands as there are is one of its band all the same.
TEST_F(HostileFiles, StatisticsOfOneBandStoredTwiceLeaveThoseOfTheNext) {
    zmctest::HeaderText header = Plain();
    header.levelMax = 0;
    zmctest::WriteText(name, header.File());
    {
        const DatasetPtr dataset = Open(name, GDAL_OF_UPDATE);
        ASSERT_TRUE(dataset);
        for (const int band : {1, 1, 2})
            EXPECT_EQ(dataset->GetRasterBand(band)->SetStatistics(1, 2, band + 0.5, 0.25), CE_None);
    }
    const zmchost::Raster raster = zmchost::Raster::Open(SharedModule(), name);
    EXPECT_EQ(raster.Statistics<unsigned char>(0).mean, 1.5);
    EXPECT_EQ(raster.Statistics<unsigned char>(1).mean, 2.5);
    const DatasetPtr dataset = Open(name);
    double mean = 0;
    EXPECT_EQ(dataset->GetRasterBand(2)->GetStatistics(0, 0, nullptr, nullptr, &mean, nullptr),
              CE_None);
    EXPECT_EQ(mean, 2.5);
}

}  // namespace
}  // namespace zmcgdal
