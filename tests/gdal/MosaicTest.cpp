// Mosaics against a model that looks at every sample by itself.
#include "gdal/Mosaic.h"

#include <ogr_spatialref.h>
#include <sys/resource.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <random>
#include <string>
#include <vector>

#include "gdal/GeoKeys.h"
#include "gdal/MosaicSurvey.h"
#include "host/base/Error.h"
#include "host/base/PackedNumbers.h"
#include "tests/gdal/GdalTest.h"

namespace {

using zmcgdal::Mosaic;
using zmcgdal::MosaicLayout;
using zmcgdal::MosaicWishes;
using zmcgdal::Overlap;

// One scene, and what is known of it. Samples are pixel-interleaved.
struct Picture {
    int x = 0, y = 0, width = 0, height = 0;
    std::optional<double> noData;
    std::vector<double> samples;
};

class MosaicTest : public zmctest::GdalTest {
protected:
    static constexpr int kBands = 2;
    std::mt19937 random{7};

    int Number(int low, int high) { return std::uniform_int_distribution(low, high)(random); }

    std::string Save(const Picture& picture, GDALDataType type, int number, double aside = 0) {
        const std::string file = folder / ("scene" + std::to_string(number) + ".tif");
        const zmctest::DatasetPtr made(Driver("GTiff").Create(
            file.c_str(), picture.width, picture.height, kBands, type, nullptr));
        double transform[] = {1000 + (picture.x + aside) * 5.0, 5, 0,
                              9000 - picture.y * 5.0,           0, -5};
        EXPECT_EQ(made->SetGeoTransform(transform), CE_None);
        OGRSpatialReference system;
        system.importFromEPSG(32633);
        EXPECT_EQ(made->SetSpatialRef(&system), CE_None);
        for (int band = 1; picture.noData && band <= kBands; ++band)
            EXPECT_EQ(made->GetRasterBand(band)->SetNoDataValue(*picture.noData), CE_None);
        auto samples = picture.samples;
        EXPECT_EQ(made->RasterIO(GF_Write, 0, 0, picture.width, picture.height, samples.data(),
                                 picture.width, picture.height, GDT_Float64, kBands, nullptr,
                                 kBands * 8, kBands * 8 * picture.width, 8, nullptr),
                  CE_None);
        return file;
    }

    Picture Draw(int most, std::optional<double> noData) {
        Picture picture{Number(0, most), Number(0, most), Number(1, 40), Number(1, 30), noData, {}};
        picture.samples.resize(static_cast<std::size_t>(picture.width * picture.height * kBands));
        for (double& sample : picture.samples) sample = Number(0, 9);
        return picture;
    }

    static std::vector<double> ReadAll(GDALDataset& dataset, int x, int y, int width, int height,
                                       std::vector<int> bands = {1, 2}) {
        std::vector<double> samples(static_cast<std::size_t>(width * height) * bands.size(), -1);
        const auto step = static_cast<GSpacing>(bands.size());
        EXPECT_EQ(dataset.RasterIO(GF_Read, x, y, width, height, samples.data(), width, height,
                                   GDT_Float64, static_cast<int>(bands.size()), bands.data(),
                                   step * 8, step * 8 * width, 8, nullptr),
                  CE_None);
        return samples;
    }
};

// Mean, minimum, maximum or median of values in the order of the scenes, of integers or not.
double Expected(Overlap overlap, std::vector<double> values, bool whole) {
    if (overlap == Overlap::Last) return values.back();
    if (overlap == Overlap::First) return values.front();
    if (overlap == Overlap::Mean) {
        double sum = 0;
        for (const double value : values) sum += value;
        const double mean = sum / static_cast<double>(values.size());
        return whole ? std::round(mean) : static_cast<double>(static_cast<float>(mean));
    }
    std::sort(values.begin(), values.end());
    if (overlap == Overlap::Minimum) return values.front();
    return overlap == Overlap::Maximum ? values.back() : values[(values.size() - 1) / 2];
}

TEST_F(MosaicTest, ShowsWhatTheModelShows) {
    for (int round = 0; round < 24; ++round) {
        const auto overlap = static_cast<Overlap>(round % 6);
        const GDALDataType type = round % 4 == 0   ? GDT_Float32
                                  : round % 4 == 1 ? GDT_Byte
                                  : round % 4 == 2 ? GDT_Int16
                                                   : GDT_UInt32;
        // Means may not fall on the value that marks no data.
        const double mark = 200;
        std::vector<Picture> pictures;
        std::vector<std::string> names;
        for (int i = 0; i < 12; ++i) {
            pictures.push_back(
                Draw(60, i % 3 == 0 ? std::optional(i == 0 ? mark : 3.0) : std::nullopt));
            if (i == 0)
                for (double& sample : pictures[0].samples) sample = sample < 3 ? mark : sample;
            names.push_back(Save(pictures.back(), type, i));
        }
        MosaicWishes wishes;
        wishes.overlap = overlap;
        wishes.threads = 2;
        Mosaic mosaic("mosaic", zmcgdal::SurveyMosaic("mosaic", names, wishes), 2);
        int left = 1000, top = 1000, right = 0, bottom = 0;
        for (const Picture& each : pictures) {
            left = std::min(left, each.x);
            top = std::min(top, each.y);
            right = std::max(right, each.x + each.width);
            bottom = std::max(bottom, each.y + each.height);
        }
        ASSERT_EQ(mosaic.GetRasterXSize(), right - left);
        ASSERT_EQ(mosaic.GetRasterYSize(), bottom - top);
        const auto made = ReadAll(mosaic, 0, 0, right - left, bottom - top);
        for (int y = top; y < bottom; ++y)
            for (int x = left; x < right; ++x)
                for (int band = 0; band < kBands; ++band) {
                    std::vector<double> values;
                    for (const Picture& each : pictures) {
                        if (x < each.x || x >= each.x + each.width || y < each.y ||
                            y >= each.y + each.height)
                            continue;
                        const double sample = each.samples[static_cast<std::size_t>(
                            ((y - each.y) * each.width + x - each.x) * kBands + band)];
                        if (sample != each.noData.value_or(-1)) values.push_back(sample);
                    }
                    const double wanted =
                        values.empty() ? mark : Expected(overlap, values, type != GDT_Float32);
                    ASSERT_EQ(made[static_cast<std::size_t>(
                                  ((y - top) * (right - left) + x - left) * kBands + band)],
                              wanted)
                        << "round " << round << " at " << x << ", " << y;
                }
    }
}

TEST_F(MosaicTest, IsTheSameInEveryWindow) {
    for (const char* const resampling : {"near", "cubic"}) {
        std::vector<std::string> names;
        for (int i = 0; i < 9; ++i)
            names.push_back(Save(Draw(80, i == 4 ? std::optional(3.0) : std::nullopt), GDT_Int16, i,
                                 i % 2 * 0.37));
        MosaicWishes wishes;
        wishes.overlap = Overlap::Mean;
        wishes.resampling = resampling;
        Mosaic mosaic("mosaic", zmcgdal::SurveyMosaic("mosaic", names, wishes), 3);
        const int width = mosaic.GetRasterXSize(), height = mosaic.GetRasterYSize();
        const auto whole = ReadAll(mosaic, 0, 0, width, height);
        for (int i = 0; i < 40; ++i) {
            const int x = Number(0, width - 1), y = Number(0, height - 1);
            const int across = Number(1, width - x), down = Number(1, height - y);
            const int band = Number(1, 2);
            const auto part = ReadAll(mosaic, x, y, across, down, {band});
            for (int line = 0; line < down; ++line)
                for (int column = 0; column < across; ++column)
                    ASSERT_EQ(part[static_cast<std::size_t>(line * across + column)],
                              whole[static_cast<std::size_t>(
                                  ((y + line) * width + x + column) * kBands + band - 1)]);
        }
    }
}

TEST_F(MosaicTest, LayoutComesBackFromItsBytes) {
    std::vector<std::string> names;
    for (int i = 0; i < 5; ++i) names.push_back(Save(Draw(50, 3.0), GDT_Byte, i, i * 0.2));
    names.push_back((folder / "missing.tif"));
    MosaicWishes wishes;
    wishes.skipBroken = true;
    const MosaicLayout layout = zmcgdal::SurveyMosaic("mosaic", names, wishes);
    ASSERT_EQ(layout.scenes.size(), 5u);
    ASSERT_EQ(layout.leftOut.size(), 1u);
    EXPECT_EQ(layout.leftOut[0].name, names[5]);
    EXPECT_EQ(layout.leftOut[0].reason, "there is no such file");
    const std::string bytes = layout.Pack();
    const auto again = MosaicLayout::Unpack(bytes);
    ASSERT_TRUE(again);
    EXPECT_EQ(again->Pack(), bytes);
    for (std::size_t size = 0; size < bytes.size(); ++size)
        ASSERT_FALSE(MosaicLayout::Unpack(bytes.substr(0, size))) << size;
    // Whatever bytes come: a layout that can be, or none.
    for (std::size_t place = 0; place < bytes.size(); ++place) {
        std::string damaged = bytes;
        damaged[place] = static_cast<char>(damaged[place] ^ 0xFF);
        if (const auto some = MosaicLayout::Unpack(damaged)) {
            for (const auto& scene : some->scenes) {
                ASSERT_LE(scene.place.Right(), some->width);
                ASSERT_LT(scene.driver, some->drivers.size());
            }
        }
    }
}

TEST_F(MosaicTest, ScenesThatChangedAreRefused) {
    const std::vector<std::string> names = {Save(Draw(1, {}), GDT_Byte, 0),
                                            Save(Draw(1, {}), GDT_Byte, 1)};
    Mosaic mosaic("mosaic", zmcgdal::SurveyMosaic("mosaic", names, {}), 1);
    EXPECT_NO_THROW(mosaic.CheckAll());
    std::ofstream(names[1], std::ios::app) << "more";
    EXPECT_THROW(mosaic.CheckAll(), zmchost::Error);
    EXPECT_NO_THROW(mosaic.CheckRead());  // nothing was read
    std::vector<unsigned char> samples(
        static_cast<std::size_t>(mosaic.GetRasterXSize() * mosaic.GetRasterYSize()));
    CPLErrorReset();
    EXPECT_EQ(mosaic.GetRasterBand(1)->RasterIO(
                  GF_Read, 0, 0, mosaic.GetRasterXSize(), mosaic.GetRasterYSize(), samples.data(),
                  mosaic.GetRasterXSize(), mosaic.GetRasterYSize(), GDT_Byte, 0, 0, nullptr),
              CE_Failure);
    EXPECT_NE(std::string(CPLGetLastErrorMsg()).find(names[1]), std::string::npos);
}

TEST_F(MosaicTest, KeysOfTiffsTellSystemsApart) {
    const auto one = zmcgdal::GeoKeysOf(Save(Draw(1, {}), GDT_Byte, 0));
    const auto other = zmcgdal::GeoKeysOf(Save(Draw(9, {}), GDT_Int16, 1));
    ASSERT_TRUE(one);
    EXPECT_GT(one->size(), 20u);
    EXPECT_EQ(one, other);
    const std::string file = (folder / "else");
    EXPECT_FALSE(zmcgdal::GeoKeysOf(file));
    for (const std::string& bytes :
         {std::string(), std::string("II"), std::string(40, 'I'),
          std::string("II*\0\x08\0\0\0\xff\xff", 10),
          std::string("MM\0+\0\x08\0\0\xff\xff\xff\xff\xff\xff\xff\xff", 16)}) {
        std::ofstream(file, std::ios::binary) << bytes;
        EXPECT_FALSE(zmcgdal::GeoKeysOf(file)) << bytes.size();
    }
}

// Behind a good beginning, a list that claims as many items as there are bytes, of which the first
// is none.
TEST(MosaicLayoutBytes, CountsThatAreNotBorneOutTakeNoMemory) {
    MosaicLayout layout;
    layout.width = layout.height = 1;
    layout.pixelType = 1;
    layout.bands.resize(1);
    layout.drivers = {"GTiff"};
    layout.scenes.resize(1);
    layout.scenes[0].place = {0, 0, 1, 1};
    const std::string good = layout.Pack();
    ASSERT_TRUE(MosaicLayout::Unpack(good));
    layout.scenes.clear();
    const std::string empty = layout.Pack();
    constexpr std::size_t kBytes = std::size_t{32} << 20;
    zmchost::NumberPacker claim;
    claim.Put(std::uint64_t{kBytes});
    // The last two numbers count the scenes and those that were left out.
    const std::string front = empty.substr(0, empty.size() - 2) + claim.Bytes();
    const auto largest = [] {
        rusage usage{};
        getrusage(RUSAGE_SELF, &usage);
        return usage.ru_maxrss;  // in KiB
    };
    for (const char filler : {'\xff', '\x7f', '\0'}) {
        const std::string bytes = front + std::string(kBytes, filler);
        const long before = largest();
        EXPECT_FALSE(MosaicLayout::Unpack(bytes));
        EXPECT_LT(largest() - before, 512 << 10) << int{filler};
    }
}

}  // namespace
