// What rasters and builds answer to callers that ask for what is not there, and to a disk that does
// not take what it is given.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>

#include "core/PixelVocabulary.h"
#include "host/build/PyramidBuilder.h"
#include "host/file/SideFile.h"
#include "host/raster/Raster.h"
#include "platform/FileSystem.h"
#include "tests/support/FailureOf.h"
#include "tests/support/FileFaults.h"
#include "tests/support/MemorySource.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using testing::HasSubstr;
using zmctest::FailureOf;
using zmctest::FileFault;
using zmctest::FileFaults;
using zmctest::MemorySource;
using zmctest::TestModule;
using Pixel = unsigned char;

class HostRefusal : public testing::Test {
protected:
    // A file of 20 x 10 pixels of value 7.
    Raster Make(std::uint32_t bands = 1) {
        const MemorySource<Pixel> source(20, 10, bands);
        Raster raster = Raster::Create(TestModule(), file, source.props, 0);
        raster.Write<Pixel>(0, {0, 0, 20, 10}, std::vector<Pixel>(200 * bands, 7));
        return raster;
    }
    // The failure of `action` while every call of that kind on the folder fails, or the first
    // alone.
    template <class Action>
    std::string FailureWith(unsigned calls, Action&& action, bool fromThenOn = true) {
        FileFault fault;
        fault.folder = folder.String();
        fault.calls = calls;
        fault.n = 1;
        fault.fromThenOn = fromThenOn;
        fault.error = EIO;
        FileFaults faults(fault);
        const std::string failure = FailureOf(action);
        faults.Disarm();
        EXPECT_NE(faults.Failed(), 0U);
        return failure;
    }
    static zelm::RasterBandStats<Pixel> Mean(std::uint32_t band, double mean) {
        zelm::RasterBandStats<Pixel> stats;
        stats.band = band;
        stats.flags = zelm::StatsFlag::Mean;
        stats.mean = mean;
        return stats;
    }

    zmctest::ScratchDirectory folder;
    const std::string file = folder / "a.pyr";
};

TEST_F(HostRefusal, FilesThatCannotBeMade) {
    const zelm::RasterProps props = MemorySource<Pixel>(20, 10, 1).props;
    const auto create = [&](const std::string& name, std::uint32_t level = 0) {
        return FailureOf([&] { Raster::Create(TestModule(), name, props, level); });
    };
    EXPECT_THAT(create(folder.String()), HasSubstr("it is not a file"));
    EXPECT_THAT(create(folder / "no/such.pyr"), HasSubstr("such.pyr"));
    zmctest::WriteText(file, "text");
    ASSERT_EQ(chmod(file.c_str(), 0444), 0);
    EXPECT_THAT(create(file), HasSubstr("the file is read-only"));
    EXPECT_EQ(zmctest::ReadText(file), "text");
    ASSERT_EQ(chmod(file.c_str(), 0644), 0);
    // Nothing is laid out beyond the levels of the format.
    EXPECT_THAT(create(file, 1024), HasSubstr("it is no pyramid file"));
    EXPECT_EQ(zmctest::ReadText(file), "text");
    EXPECT_EQ(create(file, 1023), "no failure");
}

TEST_F(HostRefusal, OlderFilesAreNotTakenForNewOnes) {
    Make();
    const std::string before = zmctest::ReadText(file);
    const zelm::RasterProps props = MemorySource<Pixel>(21, 10, 1).props;
    for (const unsigned calls : {zmctest::kOpenCall, zmctest::kResizeCall}) {
        EXPECT_THAT(FailureWith(
                        calls, [&] { Raster::Create(TestModule(), file, props, 0); }, false),
                    HasSubstr("Input/output error"));
        EXPECT_EQ(zmctest::ReadText(file), before);
    }
    // What the module does not lay out at all.
    const auto create = [&](std::uint32_t bands, std::uint32_t level) {
        zelm::RasterProps large = MemorySource<Pixel>(20, 10, 1).props;
        large.bands = bands;
        return FailureOf([&] { Raster::Create(TestModule(), file, large, level); });
    };
    EXPECT_THAT(create(2000000000, 0), HasSubstr("an older file stands in its place"));
    EXPECT_EQ(zmctest::ReadText(file), before);
}

TEST_F(HostRefusal, MemoryThatIsNoRaster) {
    zelm::RasterProps props = MemorySource<Pixel>(4, 3, 2).props;
    props.interleave = zelm::Interleave::BIP;
    std::vector<Pixel> samples(24, 5);
    const auto wrap = [&](void* pixels) {
        return FailureOf([&] { Raster::OfMemory(TestModule(), pixels, props); });
    };
    EXPECT_EQ(wrap(samples.data()), "no failure");
    EXPECT_THAT(wrap(nullptr), HasSubstr("it has no samples"));
    props.pixelType = 77;
    EXPECT_NE(wrap(samples.data()), "no failure");
}

TEST_F(HostRefusal, MemoryRastersTakePartsAndNothing) {
    zelm::RasterProps props = MemorySource<Pixel>(4, 3, 2).props;
    props.interleave = zelm::Interleave::BIP;
    std::vector<Pixel> samples(24, 5);
    Raster raster = Raster::OfMemory(TestModule(), samples.data(), props);
    EXPECT_TRUE(raster.IsComplete());
    EXPECT_THAT(FailureOf([&] { raster.Header(); }), HasSubstr("it is no pyramid file"));
    EXPECT_EQ(raster.TileSide(), 4U);
    Pixel pixel = 9;
    const std::uint32_t second[] = {1};
    raster.Write(0, {1, 1, 0, 1}, second, &pixel);
    raster.Write(0, {1, 1, 1, 0}, second, &pixel);
    raster.Write(0, {1, 1, 1, 1}, {}, &pixel);
    EXPECT_EQ(samples, std::vector<Pixel>(24, 5));
    raster.Write(0, {1, 1, 1, 1}, second, &pixel);
    EXPECT_EQ(samples[2 * (4 + 1) + 1], 9);
    raster.Read(0, {0, 0, 0, 1}, second, nullptr);
    raster.Read(0, {0, 0, 1, 0}, second, nullptr);
    raster.Read(0, {0, 0, 1, 1}, {}, nullptr);
    EXPECT_NE(FailureOf([&] { raster.Read<Pixel>(1, {0, 0, 1, 1}); }), "no failure");
}

TEST_F(HostRefusal, LevelsBelowTheFirst) {
    zmctest::HeaderText header;
    header.levelMin = 1;
    header.levelMax = 2;
    zmctest::WriteText(file, header.File());
    Raster raster = Raster::Open(TestModule(), file);
    EXPECT_EQ(raster.Width(1), 5U);
    EXPECT_THAT(FailureOf([&] { raster.Width(0); }), HasSubstr("it has the levels 1 to 2"));
    EXPECT_THAT(FailureOf([&] { raster.Tile(1, 0, 1); }), HasSubstr("no such tile"));
    EXPECT_THAT(FailureOf([&] { raster.Tile(1, 1, 0); }), HasSubstr("no such tile"));
}

TEST_F(HostRefusal, ADiskThatDoesNotRead) {
    Raster raster = Make();
    EXPECT_THAT(FailureWith(zmctest::kReadCall,
                            [&] {
                                raster.Read<Pixel>(0, {0, 0, 20, 10});
                            }),
                HasSubstr("Input/output error"));
    EXPECT_EQ(raster.Read<Pixel>(0, {3, 4, 1, 1})[0], 7);
}

TEST_F(HostRefusal, ADiskThatTakesNothing) {
    Raster raster = Make();
    const auto failure = [&](auto&& action) { return FailureWith(zmctest::kWriteCall, action); };
    const std::string before = zmctest::ReadText(file);
    EXPECT_THAT(failure([&] {
                    raster.Write<Pixel>(0, {0, 0, 20, 10}, std::vector<Pixel>(200, 9));
                }),
                HasSubstr("Input/output error (writing "));
    EXPECT_THAT(failure([&] { raster.SetStatistics<Pixel>({Mean(0, 7)}); }),
                HasSubstr("Input/output error (writing "));
    zelm::RasterBandHistogram<Pixel> histogram;
    histogram.binCount = 2;
    ASSERT_TRUE(histogram.counts.Append(1));
    ASSERT_TRUE(histogram.counts.Append(2));
    EXPECT_THAT(failure([&] { raster.SetHistograms<Pixel>({histogram}); }),
                HasSubstr("Input/output error (writing "));
    zelm::Palette palette;
    palette.AddColor(zelm::Color());
    EXPECT_THAT(failure([&] { raster.SetBandPalette(0, palette); }),
                HasSubstr("Input/output error (writing "));
    EXPECT_EQ(zmctest::ReadText(file), before);
    EXPECT_FALSE(raster.BandPalette(0));
}

TEST_F(HostRefusal, RecordsOfOtherBands) {
    Raster raster = Make(2);
    EXPECT_THAT(FailureOf([&] { raster.SetStatistics<Pixel>({Mean(0, 7)}); }),
                HasSubstr("not those of all bands"));
    EXPECT_THAT(FailureOf([&] {
                    raster.SetStatistics<Pixel>({Mean(1, 7), Mean(0, 7)});
                }),
                HasSubstr("not those of all bands"));
    EXPECT_THAT(FailureOf([&] { raster.SetBandPalette(2, zelm::Palette()); }),
                HasSubstr("there is no such band"));
    EXPECT_THAT(FailureOf([&] { raster.Statistics<Pixel>(0); }), HasSubstr("the file has none"));
    EXPECT_NE(FailureOf([&] { raster.Statistics<float>(0); }), "no failure");
}

// The module fetches by place; a file that was written band by band has its records in any order.
TEST_F(HostRefusal, RecordsInAnyOrder) {
    Make(2);
    const auto record = [](int band, int mean) {
        return "<BANDSTATISTICS><RSTC_BAND>" + std::to_string(band) + "</RSTC_BAND><RSTC_MEAN>" +
               std::to_string(mean) + "</RSTC_MEAN></BANDSTATISTICS>";
    };
    const std::string front = zmctest::ReadText(file);
    zmctest::WriteText(file, front + "<DATASET>" + record(1, 10) + record(0, 20) + "</DATASET>");
    Raster raster = Raster::Open(TestModule(), file);
    EXPECT_EQ(raster.Statistics<Pixel>(0).mean, 20);
    EXPECT_EQ(raster.Statistics<Pixel>(1).mean, 10);
    // One that stands behind those of as many places as there are bands is its band's all the same.
    zmctest::WriteText(
        file, front + "<DATASET>" + record(1, 10) + record(1, 11) + record(0, 20) + "</DATASET>");
    Raster other = Raster::Open(TestModule(), file);
    EXPECT_EQ(other.Statistics<Pixel>(0).mean, 20);
    EXPECT_EQ(other.Statistics<Pixel>(1).mean, 11);
}

TEST_F(HostRefusal, SourcesWithoutPixels) {
    const auto build = [&](auto change) {
        MemorySource<Pixel> source(20, 10, 1);
        BuildOptions options;
        change(source, options);
        return FailureOf([&] { PyramidBuilder(TestModule()).Build(source, file, options); });
    };
    EXPECT_THAT(build([](auto& source, auto&) { source.props.samples = 0; }),
                HasSubstr("it has no pixels"));
    EXPECT_THAT(build([](auto& source, auto&) { source.props.lines = 0; }),
                HasSubstr("it has no pixels"));
    EXPECT_THAT(build([](auto& source, auto&) { source.props.bands = 0; }),
                HasSubstr("it has no pixels"));
    EXPECT_THAT(build([](auto& source, auto&) { source.props.pixelType = 77; }),
                HasSubstr("has no reader"));
    EXPECT_THAT(build([](auto&, auto& options) { options.bands = {1}; }), HasSubstr("it has 1"));
    EXPECT_EQ(build([](auto&, auto&) {}), "no failure");
}

// A palette of complex values is kept, and reduced by what complex values have.
TEST_F(HostRefusal, PalettesOfComplexPixels) {
    MemorySource<zelm::Complex<float>> source(600, 520, 1);
    source.FillWithNoise(3);
    zelm::PalettePtr palette(new zelm::Palette);
    palette->AddColor(zelm::Color());
    source.palettes[0] = palette;
    const BuildReport report = PyramidBuilder(TestModule()).Build(source, file);
    EXPECT_TRUE(SupportsElementType(report.resampling, source.props.pixelType));
    // One without colours is none.
    source.palettes[0].Reset(new zelm::Palette);
    BuildOptions options;
    options.overwrite = true;
    EXPECT_EQ(PyramidBuilder(TestModule()).Build(source, file, options).resampling,
              Resampling::Average);
    EXPECT_FALSE(Raster::Open(TestModule(), file).BandPalette(0));
}

// What nobody can lock nobody takes for stale. Whatever else hinders a lock does not hinder others.
TEST_F(HostRefusal, TemporaryFilesDoWithoutALockWhereThereIsNone) {
    const auto make = [&](unsigned calls, std::size_t n, int error) {
        FileFault fault;
        fault.folder = folder.String();
        fault.calls = calls;
        fault.n = n;
        fault.error = error;
        FileFaults faults(fault);
        platform::FileLock lock;
        const std::string path = SideFile::MakeTemporary(file, "kind", lock);
        const std::string reason = platform::LastErrorText();
        faults.Disarm();
        EXPECT_EQ(faults.Failed(), 1U);
        EXPECT_EQ(platform::RemoveEntry(path), !path.empty());
        EXPECT_TRUE(std::filesystem::is_empty(folder.String()));
        return path.empty() ? reason : "made";
    };
    for (const int error : {ENOLCK, EOPNOTSUPP, ENOTSUP})
        EXPECT_EQ(make(zmctest::kLockCall, 1, error), "made");
    for (const int error : {EIO, EINVAL, ENOMEM})
        EXPECT_EQ(make(zmctest::kLockCall, 1, error), platform::ErrorText(error));
    EXPECT_EQ(make(zmctest::kOpenCall, 2, EMFILE), platform::ErrorText(EMFILE));
}

TEST_F(HostRefusal, DisksThatFailABuild) {
    Make();
    const std::string before = zmctest::ReadText(file);
    MemorySource<Pixel> source(300, 300, 1);
    source.FillWithNoise(5);
    BuildOptions options;
    options.overwrite = true;
    options.threads = 1;
    for (const unsigned calls :
         {zmctest::kWriteCall, zmctest::kSyncCall, zmctest::kRenameCall, zmctest::kReadCall}) {
        const std::string failure =
            FailureWith(calls, [&] { PyramidBuilder(TestModule()).Build(source, file, options); });
        EXPECT_THAT(failure, HasSubstr("a.pyr")) << calls;
        EXPECT_EQ(zmctest::ReadText(file), before);
    }
}

}  // namespace
}  // namespace zmchost
