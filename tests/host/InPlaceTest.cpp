// Pyramids that are completed within the file whose finest level others have written.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "host/build/BuildFile.h"
#include "host/build/PyramidBuilder.h"
#include "host/raster/Raster.h"
#include "tests/support/FailureOf.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::FailureOf;
using zmctest::MemorySource;
using zmctest::ScratchDirectory;
using zmctest::TestModule;

// Tiles from the last to the first.
template <class T>
void WritePixels(const MemorySource<T>& source, const std::string& path) {
    Raster raster = Raster::Open(TestModule(), path);
    for (std::uint32_t row = raster.TilesDown(); row-- > 0;)
        for (std::uint32_t column = raster.TilesAcross(); column-- > 0;) {
            const Window tile = raster.Tile(0, column, row);
            std::vector<T> pixels;
            for (std::uint32_t y = tile.y; y < tile.y + tile.height; ++y) {
                const auto first =
                    source.pixels.begin() + (std::ptrdiff_t{y} * source.props.samples + tile.x) *
                                                static_cast<std::ptrdiff_t>(source.props.bands);
                pixels.insert(pixels.end(), first,
                              first + std::ptrdiff_t{tile.width} * source.props.bands);
            }
            raster.Write<T>(0, tile, pixels);
        }
}

class InPlace : public testing::Test {
protected:
    template <class T>
    void ExpectThatOfBuild(MemorySource<T>& source, BuildOptions options) {
        options.overwrite = true;
        std::uint64_t passedOver = 0, total = 0;
        options.progress = [&](const BuildProgress& state) {
            passedOver = state.done;
            total = state.total;
            return true;
        };
        const BuildReport built = builder.Build(source, folder / "built.zmc", options);
        BuildFile file(folder / "placed.zmc", true);
        builder.LayOut(source, file, folder / "placed.zmc", options);
        WritePixels(source, file.Path());
        source.beforeRead = [](const Window&) { FAIL() << "the source is asked for pixels"; };
        const BuildReport report = builder.Complete(source, file, folder / "placed.zmc", options);
        source.beforeRead = nullptr;
        file.Commit();
        EXPECT_EQ(report.fileSize, built.fileSize);
        EXPECT_EQ(report.maxLevel, built.maxLevel);
        EXPECT_EQ(passedOver, total);
        EXPECT_EQ(zmctest::ReadText(folder / "placed.zmc"),
                  zmctest::ReadText(folder / "built.zmc"));
    }

    const ScratchDirectory folder;
    const PyramidBuilder builder{TestModule()};
};

TEST_F(InPlace, CompletedFileIsThatOfBuildBitForBit) {
    for (const std::uint32_t bands : {1u, 3u, 11u})
        for (const Resampling method : {Resampling::Average, Resampling::Lanczos}) {
            BuildOptions options;
            options.resampling = method;
            MemorySource<unsigned char> bytes(701, 523, bands);
            bytes.FillWithNoise(5);
            bytes.props.noDataValues[0] = 17;
            ExpectThatOfBuild(bytes, options);
            MemorySource<double> reals(601, 300, bands);
            reals.FillWithNoise(6);
            ExpectThatOfBuild(reals, options);
        }
}

TEST_F(InPlace, NeitherColumnsNorThreadsNorOrderingChangeIt) {
    MemorySource<unsigned short> source(5000, 600, 2);
    source.FillWithNoise(7);
    for (const Ordering ordering : {Ordering::Scanline, Ordering::Blocked}) {
        BuildOptions options;
        options.ordering = ordering;
        options.resampling = Resampling::Cubic;
        for (const std::uint64_t mebibytes : {12u, 256u}) {
            options.memory = mebibytes << 20;
            options.threads = mebibytes == 12 ? 1 : 3;
            ExpectThatOfBuild(source, options);
        }
    }
}

TEST_F(InPlace, RasterWithoutLevelsAndStatisticsIsCompletedToo) {
    BuildOptions options;
    options.levels = 0;
    MemorySource<int> source(300, 400, 1);
    source.FillWithNoise(8);
    ExpectThatOfBuild(source, options);
    options.statistics = false;
    ExpectThatOfBuild(source, options);
}

TEST_F(InPlace, AnotherLayoutAndMissingPixelsAreRefused) {
    MemorySource<unsigned char> source(600, 500, 1);
    const std::string name = folder / "a.zmc";
    BuildFile file(name, true);
    builder.LayOut(source, file, name, {});
    EXPECT_THAT(FailureOf([&] { builder.Complete(source, file, name, {}); }),
                testing::HasSubstr("pixels of level 0 are missing"));
    WritePixels(source, file.Path());
    BuildOptions options;
    options.levels = 1;
    EXPECT_THAT(FailureOf([&] { builder.Complete(source, file, name, options); }),
                testing::HasSubstr("laid out for another raster"));
    options.levels.reset();
    options.ordering = Ordering::Scanline;
    EXPECT_THAT(FailureOf([&] { builder.Complete(source, file, name, options); }),
                testing::HasSubstr("laid out for another raster"));
    builder.Complete(source, file, name, {});
}

TEST_F(InPlace, LayingOutAnewDropsWhatWasThere) {
    MemorySource<unsigned char> source(600, 500, 1);
    source.FillWithNoise(9);
    const std::string name = folder / "a.zmc";
    BuildFile file(name, true);
    BuildOptions options;
    options.levels = 7;
    builder.LayOut(source, file, name, options);
    WritePixels(source, file.Path());
    builder.LayOut(source, file, name, {});
    EXPECT_THAT(FailureOf([&] { builder.Complete(source, file, name, {}); }),
                testing::HasSubstr("pixels of level 0 are missing"));
    WritePixels(source, file.Path());
    builder.Complete(source, file, name, {});
    builder.Build(source, folder / "built.zmc");
    EXPECT_EQ(zmctest::ReadText(file.Path()), zmctest::ReadText(folder / "built.zmc"));
}

TEST_F(InPlace, CancellingEndsIt) {
    MemorySource<unsigned char> source(600, 500, 1);
    BuildFile file(folder / "a.zmc", true);
    builder.LayOut(source, file, folder / "a.zmc", {});
    WritePixels(source, file.Path());
    BuildOptions options;
    options.progress = [](const BuildProgress&) { return false; };
    EXPECT_THROW(builder.Complete(source, file, folder / "a.zmc", options), Cancelled);
}

}  // namespace
}  // namespace zmchost
