// Rasters through the host's side, and what it makes of the module's silence.
#include "host/raster/Raster.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <rapidcheck.h>
#include <rapidcheck/gtest.h>
#include <sys/stat.h>

#include <cmath>
#include <filesystem>

#include "core/PixelVocabulary.h"
#include "host/build/PixelWork.h"
#include "host/build/PyramidBuilder.h"
#include "tests/support/FailureOf.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::FailureOf;
using zmctest::MemorySource;
using zmctest::ScratchDirectory;
using zmctest::TestModule;

template <class T>
zelm::RasterProps PropsOf(std::uint32_t samples, std::uint32_t lines, std::uint32_t bands) {
    return MemorySource<T>(samples, lines, bands).props;
}

std::string Build(const ScratchDirectory& folder, MemorySource<short>& source) {
    source.FillWithNoise(1);
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    return folder / "a.zmc";
}

TEST(Raster, OpeningTellsWhatIsWrong) {
    const ScratchDirectory folder;
    const auto open = [](const std::string& file) {
        return FailureOf([&] { Raster::Open(TestModule(), file); });
    };
    EXPECT_THAT(open(folder / "missing.zmc"), testing::HasSubstr("there is no such file"));
    EXPECT_THAT(open(folder.String()), testing::HasSubstr("it is not a file"));
    zmctest::WriteText(folder / "short", "KOBT");
    EXPECT_THAT(open(folder / "short"), testing::HasSubstr("it is no pyramid file"));
    zmctest::WriteText(folder / "text", std::string(100, 'x'));
    EXPECT_THAT(open(folder / "text"), testing::HasSubstr("it is no pyramid file"));
    zmctest::WriteText(folder / "zero", "KOBT" + std::string(96, '\0'));
    EXPECT_THAT(open(folder / "zero"), testing::HasSubstr("header is damaged"));
    std::string hostile = "KOBT" + std::string(16, '\0') + "<!DOCTYPE x [<!ENTITY a 'b'>]><x/>";
    hostile[4] = static_cast<char>(hostile.size());
    zmctest::WriteText(folder / "hostile", hostile);
    EXPECT_THAT(open(folder / "hostile"), testing::HasSubstr("cannot read the header"));
}

TEST(Raster, TellsItsShape) {
    const ScratchDirectory folder;
    MemorySource<short> source(1001, 513, 3);
    Raster raster = Raster::Open(TestModule(), Build(folder, source));
    EXPECT_EQ(raster.MaxLevel(), 2u);
    EXPECT_EQ(raster.Width(1), 500u);
    EXPECT_EQ(raster.Height(2), 128u);
    EXPECT_EQ(raster.TilesAcross(0), 4u);
    EXPECT_EQ(raster.TilesDown(0), 3u);
    EXPECT_EQ(raster.Tile(1, 1, 0).width, 244u);
    EXPECT_EQ(raster.PixelType(), zelm::PixelTypeCode::Int16);
    EXPECT_EQ(raster.Header().tileOrdering, zelm::TileOrder::Blocked);
    EXPECT_EQ(raster.Header().BytesMissing(), 0u);
    EXPECT_EQ(raster.Header().LevelOffset(2), raster.Header().tileDataStart);
    EXPECT_EQ(raster.Header().LevelOffset(0) + raster.Header().LevelBytes(0),
              raster.Header().tileDataEnd);
    EXPECT_THROW(raster.Width(3), Error);
    EXPECT_THROW(raster.Tile(0, 4, 0), Error);
}

TEST(Raster, RefusesWindowsBandsAndTypesThatItHasNot) {
    const ScratchDirectory folder;
    MemorySource<short> source(300, 200, 2);
    Raster raster = Raster::Open(TestModule(), Build(folder, source));
    EXPECT_THROW(raster.Read<short>(0, {1, 0, 300, 1}), Error);
    EXPECT_THROW(raster.Read<short>(0, {0, 200, 1, 1}), Error);
    EXPECT_THROW(raster.Read<short>(0, {4294967295u, 0, 2, 1}), Error);
    EXPECT_THROW(raster.Read<short>(7, {0, 0, 1, 1}), Error);
    EXPECT_THROW(raster.Read<float>(0, {0, 0, 1, 1}), Error);
    short pixel = 0;
    const std::uint32_t band = 2;
    EXPECT_THROW(raster.Read(0, {0, 0, 1, 1}, std::span(&band, 1), &pixel), Error);
}

// Any windows written one after the other, against a plain array; the module itself drops or
// misplaces most of these.
template <std::uint32_t kBands>
void ExpectAnyWriteReachesTheFile(std::uint32_t tileLines) {
    const ScratchDirectory folder;
    const std::uint32_t width = 600, height = 520;
    zelm::RasterProps props = PropsOf<short>(width, height, kBands);
    props.tileLines = tileLines;
    Raster raster = Raster::Create(TestModule(), folder / "a.zmc", props, 0);
    std::vector<short> model(std::size_t{width} * height * kBands);
    raster.Write(0, {0, 0, width, height}, model);
    ASSERT_TRUE(raster.IsComplete());
    for (int round = 0; round < 3; ++round) {
        Window window;
        window.x = *rc::gen::inRange(0u, width);
        window.y = *rc::gen::inRange(0u, height);
        window.width = *rc::gen::inRange(1u, width - window.x + 1);
        window.height = *rc::gen::inRange(1u, height - window.y + 1);
        const auto band = *rc::gen::inRange(0u, kBands);
        std::vector<short> pixels(std::size_t{window.width} * window.height);
        for (std::size_t i = 0; i < pixels.size(); ++i)
            pixels[i] = static_cast<short>(1 + round + static_cast<int>(i % 1000));
        raster.Write(0, window, std::span(&band, 1), pixels.data());
        for (std::uint32_t y = 0; y < window.height; ++y)
            for (std::uint32_t x = 0; x < window.width; ++x)
                model[(std::size_t{window.y + y} * width + window.x + x) * kBands + band] =
                    pixels[std::size_t{y} * window.width + x];
    }
    RC_ASSERT(raster.Read<short>(0, {0, 0, width, height}) == model);
}

RC_GTEST_PROP(Raster, AnyWriteReachesScanlineFiles, ()) { ExpectAnyWriteReachesTheFile<3>(1); }
RC_GTEST_PROP(Raster, AnyWriteReachesBlockedFiles, ()) { ExpectAnyWriteReachesTheFile<2>(256); }
RC_GTEST_PROP(Raster, AnyWriteReachesMortonFiles, ()) { ExpectAnyWriteReachesTheFile<9>(1); }

TEST(Raster, ReadsAnyWindow) {
    const ScratchDirectory folder;
    MemorySource<short> source(700, 600, 2);
    Raster raster = Raster::Open(TestModule(), Build(folder, source));
    rc::check([&] {
        const auto x = *rc::gen::inRange(0u, 700u);
        const auto y = *rc::gen::inRange(0u, 600u);
        const Window window{x, y, *rc::gen::inRange(1u, 701 - x), *rc::gen::inRange(1u, 601 - y)};
        const std::uint32_t bands[] = {1, 0};
        std::vector<short> pixels(std::size_t{window.width} * window.height * 2);
        raster.Read(0, window, bands, pixels.data());
        std::vector<short> expected(pixels.size());
        source.Read(window, bands, expected.data());
        RC_ASSERT(pixels == expected);
    });
}

TEST(Raster, MasksGoByTheBandAndNotByItsPlaceInTheList) {
    const ScratchDirectory folder;
    MemorySource<short> source(10, 10, 2);
    std::fill(source.pixels.begin(), source.pixels.end(), short{7});
    PyramidBuilder(TestModule()).Build(source, folder / "a.zmc");
    Raster raster = Raster::Open(TestModule(), folder / "a.zmc");
    raster.SetNoDataValues({{1, 7.0}});
    short pixels[2];
    unsigned char mask[2] = {0xF0, 0xF1};
    const std::uint32_t bands[] = {1, 0};
    raster.Read(0, {3, 3, 1, 1}, bands, pixels, mask);
    EXPECT_EQ(mask[0], 0xF1);
    EXPECT_EQ(mask[1], 0xF0);
    EXPECT_EQ(raster.NoDataValue(1), 7.0);
    EXPECT_EQ(raster.NoDataValue(0), std::nullopt);
}

TEST(Raster, MarkedSamplesAreWrittenAsNoData) {
    const ScratchDirectory folder;
    MemorySource<short> source(10, 10, 1);
    Raster raster = Raster::Open(TestModule(), Build(folder, source));
    raster.SetNoDataValues({{0, -5.0}});
    const short pixels[] = {1, 2};
    const unsigned char mask[] = {1, 0};
    raster.Write(0, {0, 0, 2, 1}, raster.AllBands(), pixels, mask);
    EXPECT_EQ(raster.Read<short>(0, {0, 0, 2, 1}), (std::vector<short>{-5, 2}));
    EXPECT_EQ(pixels[0], 1);
}

TEST(Raster, IncompleteFileIsNotRead) {
    const ScratchDirectory folder;
    Raster raster = Raster::Create(TestModule(), folder / "a.zmc", PropsOf<short>(600, 10, 1), 1);
    EXPECT_FALSE(raster.IsComplete());
    EXPECT_EQ(raster.Header().BytesMissing(), (600u * 10 + 300u * 5) * 2);
    EXPECT_EQ(raster.Width(1), 300u);
    EXPECT_THAT(FailureOf([&] {
                    raster.Read<short>(0, {0, 0, 1, 1});
                }),
                testing::HasSubstr("15000 bytes are missing"));
    EXPECT_THAT(FailureOf([&] { Raster::Open(TestModule(), folder / "a.zmc").Read<short>(0, {}); }),
                "no failure");
}

TEST(Raster, ReadOnlyFileTakesNothingAndSaysSo) {
    const ScratchDirectory folder;
    MemorySource<short> source(20, 20, 1);
    const std::string file = Build(folder, source);
    chmod(file.c_str(), 0444);
    Raster raster = Raster::Open(TestModule(), file);
    EXPECT_FALSE(raster.IsWritable());
    const auto refusal = testing::HasSubstr("the file is read-only");
    EXPECT_THAT(FailureOf([&] { raster.Write<short>(0, {0, 0, 1, 1}, {1}); }), refusal);
    EXPECT_THAT(FailureOf([&] { raster.SetStatistics<short>({{}}); }), refusal);
    EXPECT_THAT(FailureOf([&] { raster.SetHistograms<short>({{}}); }), refusal);
    EXPECT_THAT(FailureOf([&] { raster.SetBandPalette(0, zelm::Palette()); }), refusal);
    EXPECT_THAT(FailureOf([&] { Raster::Create(TestModule(), file, PropsOf<short>(2, 2, 1), 0); }),
                refusal);
}

TEST(Raster, StatisticsAreStoredOnceForAllBands) {
    const ScratchDirectory folder;
    Raster raster = Raster::Create(TestModule(), folder / "a.zmc", PropsOf<short>(5, 5, 2), 0);
    EXPECT_FALSE(raster.HasStatistics(0));
    EXPECT_THROW(raster.Statistics<short>(0), Error);
    zelm::RasterBandStats<short> first, second;
    first.flags = second.flags = zelm::StatsFlag::All;
    first.minimum = -3;
    second.band = 1;
    second.maximum = 12;
    EXPECT_THROW(raster.SetStatistics<short>({first}), Error);
    EXPECT_THROW(raster.SetStatistics<short>({second, first}), Error);
    raster.SetStatistics<short>({first, second});
    EXPECT_EQ(raster.Statistics<short>(0).minimum, -3);
    EXPECT_EQ(raster.Statistics<short>(1).maximum, 12);
    EXPECT_THROW(raster.SetStatistics<short>({first, second}), Error);
}

TEST(Raster, PaletteComesBack) {
    const ScratchDirectory folder;
    Raster raster = Raster::Create(TestModule(), folder / "a.zmc", PropsOf<short>(5, 5, 1), 0);
    EXPECT_FALSE(raster.BandPalette(0));
    zelm::Palette palette;
    palette.AddColor(zelm::Color());
    raster.SetBandPalette(0, palette);
    ASSERT_TRUE(raster.BandPalette(0));
    EXPECT_EQ(raster.BandPalette(0)->nextIndex, 1u);
    EXPECT_THROW(raster.SetBandPalette(1, palette), Error);
}

TEST(Raster, MemoryRasterWorksInTheCallersBuffer) {
    MemorySource<float> source(6, 4, 2);
    source.FillWithNoise(2);
    source.props.interleave = zelm::Interleave::BIP;
    Raster raster = Raster::OfMemory(TestModule(), source.pixels.data(), source.props);
    EXPECT_FALSE(raster.IsPyramid());
    EXPECT_EQ(raster.Read<float>(0, {0, 0, 6, 4}), source.pixels);
    raster.Write<float>(0, {1, 1, 1, 1}, {4.0f, 5.0f});
    EXPECT_EQ(source.pixels[(6 + 1) * 2 + 1], 5.0f);
    EXPECT_THROW(raster.Header(), Error);
}

TEST(PixelWork, MovesNoTilesOfAnotherType) {
    const ScratchDirectory folder;
    Raster raster = Raster::Create(TestModule(), folder / "a.zmc", PropsOf<short>(5, 5, 1), 0);
    PixelWorkSetup setup;
    setup.props = PropsOf<float>(5, 5, 1);
    const std::unique_ptr<PixelWork> work = MakePixelWork(raster, setup);
    std::byte pixels[100] = {};
    EXPECT_THROW(work->ReadTile(0, {0, 0, 5, 5}, pixels), Error);
}

}  // namespace
}  // namespace zmchost
