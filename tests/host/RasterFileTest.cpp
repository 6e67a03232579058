// The file of a raster: which one it is, whatever happens to its name, and what the raster tells of
// a disk that fails under it.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <numeric>
#include <set>

#include "files/FileSource.h"
#include "files/Lending.h"
#include "files/MemorySource.h"
#include "host/raster/Raster.h"
#include "tests/support/FailureOf.h"
#include "tests/support/FaultySource.h"
#include "tests/support/FileFaults.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using testing::HasSubstr;
using zelm::files::ByteSource;
using zelm::files::FileSource;
using zelm::files::OpenMode;
using zmctest::FailureOf;
using zmctest::FaultySource;
using zmctest::FileFaultAction;
using zmctest::FileFaults;
using zmctest::SourceFault;
using zmctest::TestModule;
using Pixel = unsigned char;

// Of all descriptors that this process has of a file.
std::set<int> AccessModes(const std::string& file) {
    std::set<int> modes;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        std::error_code gone;
        if (std::filesystem::read_symlink(entry.path(), gone) != std::filesystem::canonical(file))
            continue;
        modes.insert(fcntl(std::stoi(entry.path().filename()), F_GETFL) & O_ACCMODE);
    }
    return modes;
}

class RasterFileTest : public testing::Test {
protected:
    // A complete file of one level whose samples all have that value.
    void Make(const std::string& name, std::uint32_t side, Pixel value, std::uint32_t bands = 1) {
        const zmctest::MemorySource<Pixel> source(side, side, bands);
        Raster raster = Raster::Create(TestModule(), name, source.props, 0);
        raster.Write<Pixel>(0, {0, 0, side, side},
                            std::vector<Pixel>(std::size_t{side} * side * bands, value));
    }
    static unsigned SumOf(Raster& raster, const Window& window) {
        const auto pixels = raster.Read<Pixel>(0, window);
        return std::accumulate(pixels.begin(), pixels.end(), 0u);
    }
    static zelm::RasterBandStats<Pixel> Mean(double mean) {
        zelm::RasterBandStats<Pixel> stats;
        stats.flags = zelm::StatsFlag::Mean;
        stats.mean = mean;
        return stats;
    }
    FileFaults Fail(unsigned calls, FileFaultAction action, int error) {
        return FileFaults({folder.String(), calls, 1, true, action, error});
    }
    std::shared_ptr<FaultySource> Faulty(OpenMode mode = OpenMode::Update) {
        return std::make_shared<FaultySource>(FileSource::Open(file.c_str(), mode));
    }

    zmctest::ScratchDirectory folder;
    const std::string file = folder / "a.pyr";
};

// --- which file ---

TEST_F(RasterFileTest, ReadsTheFileThatItOpenedWhenAnotherTakesItsName) {
    Make(file, 512, 1);
    Make(folder / "other", 300, 200, 3);
    Raster raster = Raster::Open(TestModule(), file);
    EXPECT_EQ(raster.Change(), "");
    std::filesystem::rename(folder / "other", file);
    EXPECT_EQ(SumOf(raster, {0, 0, 256, 256}), 65536u);
    EXPECT_EQ(SumOf(raster, {256, 256, 256, 256}), 65536u);
    EXPECT_TRUE(raster.IsComplete());
    EXPECT_EQ(raster.Change(), "another file has taken its name");
}

TEST_F(RasterFileTest, ReadsTheFileThatItOpenedWhenItIsMovedOrRemoved) {
    Make(file, 20, 1);
    Raster raster = Raster::Open(TestModule(), file);
    std::filesystem::rename(file, folder / "elsewhere");
    EXPECT_EQ(SumOf(raster, {0, 0, 20, 20}), 400u);
    EXPECT_EQ(raster.Change(), "its name leads to no file any more");
    EXPECT_THAT(FailureOf([&] {
                    raster.Write<Pixel>(0, {0, 0, 1, 1}, {9});
                }),
                HasSubstr("its name leads to no file any more"));
    std::filesystem::remove(folder / "elsewhere");
    EXPECT_EQ(SumOf(raster, {0, 0, 20, 20}), 400u);
}

TEST_F(RasterFileTest, WritesNothingOnceAnotherFileHasItsName) {
    Make(file, 20, 1);
    Make(folder / "other", 20, 2);
    Raster raster = Raster::Open(TestModule(), file);
    std::filesystem::rename(folder / "other", file);
    const std::string other = zmctest::ReadText(file);
    const auto refusal = HasSubstr("another file has taken its name");
    EXPECT_THAT(FailureOf([&] { raster.Write<Pixel>(0, {0, 0, 1, 1}, {9}); }), refusal);
    EXPECT_THAT(FailureOf([&] { raster.SetStatistics<Pixel>({Mean(1)}); }), refusal);
    EXPECT_THAT(FailureOf([&] { raster.SetHistograms<Pixel>({}); }), refusal);
    EXPECT_THAT(FailureOf([&] { raster.SetBandPalette(0, zelm::Palette()); }), refusal);
    EXPECT_THAT(FailureOf([&] { raster.Store([] { FAIL(); }); }), refusal);
    EXPECT_EQ(zmctest::ReadText(file), other);
    EXPECT_EQ(SumOf(raster, {0, 0, 20, 20}), 400u);
}

TEST_F(RasterFileTest, OpenedForReadingItIsNeverWrittenTo) {
    Make(file, 20, 1);
    const std::string content = zmctest::ReadText(file);
    const auto written = std::filesystem::last_write_time(file);
    {
        Raster raster = Raster::Open(TestModule(), file, Access::Read);
        EXPECT_EQ(AccessModes(file), std::set<int>{O_RDONLY});
        EXPECT_FALSE(raster.IsWritable());
        raster.KeepCopies(true);
        const auto refusal = HasSubstr("the file is read-only");
        EXPECT_THAT(FailureOf([&] { raster.Write<Pixel>(0, {0, 0, 1, 1}, {9}); }), refusal);
        EXPECT_THAT(FailureOf([&] { raster.SetStatistics<Pixel>({Mean(1)}); }), refusal);
        EXPECT_THAT(FailureOf([&] { raster.SetHistograms<Pixel>({{}}); }), refusal);
        EXPECT_THAT(FailureOf([&] { raster.SetBandPalette(0, zelm::Palette()); }), refusal);
        EXPECT_THAT(FailureOf([&] { raster.Store([] { FAIL(); }); }), refusal);
        // The module says of its stores that they went well, and has nothing to write with.
        raster.Visit([&](auto& reader) { EXPECT_TRUE(reader.SetPalette(0, zelm::Palette())); });
        EXPECT_EQ(SumOf(raster, {0, 0, 20, 20}), 400u);
        EXPECT_EQ(raster.Change(), "");
    }
    EXPECT_EQ(zmctest::ReadText(file), content);
    EXPECT_EQ(std::filesystem::last_write_time(file), written);
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(folder.String()), {}), 1);
    const Raster raster = Raster::Open(TestModule(), file);
    EXPECT_TRUE(AccessModes(file).contains(O_RDWR)) << "the usual access is for writing";
}

TEST_F(RasterFileTest, ReadingAFileThatWasCutFails) {
    Make(file, 512, 1);
    Raster raster = Raster::Open(TestModule(), file);
    const auto size = std::filesystem::file_size(file);
    std::filesystem::resize_file(file, size - 1);
    EXPECT_THAT(FailureOf([&] {
                    SumOf(raster, {256, 256, 256, 256});
                }),
                HasSubstr("1 bytes are missing"));
    EXPECT_EQ(raster.Change(), "it was cut from " + std::to_string(size) + " to " +
                                   std::to_string(size - 1) + " bytes");
    std::filesystem::resize_file(file, 0);
    EXPECT_NE(FailureOf([&] { SumOf(raster, {0, 0, 256, 256}); }), "no failure");
}

TEST_F(RasterFileTest, FileThatIsCutDuringAReadIsMetByIt) {
    Make(file, 512, 1);
    const auto source = Faulty();
    Raster raster = Raster::Open(TestModule(), source, "a raster");
    source->beforeTransfer = [&](std::size_t) { std::filesystem::resize_file(file, 4000); };
    EXPECT_THAT(FailureOf([&] {
                    SumOf(raster, {0, 0, 256, 256});
                }),
                HasSubstr("a raster: cannot read 256 x 256 pixels at (0, 0): it was cut from"));
}

TEST_F(RasterFileTest, TellsThatOthersHaveWrittenToTheFileButNotThatItDid) {
    Make(file, 20, 1);
    Raster raster = Raster::Open(TestModule(), file);
    raster.Write<Pixel>(0, {0, 0, 1, 1}, {9});
    raster.SetStatistics<Pixel>({Mean(1)});
    EXPECT_EQ(raster.Change(), "");
    Raster::Open(TestModule(), file).SetBandPalette(0, zelm::Palette());
    EXPECT_EQ(raster.Change(), "others have written to it");
}

// A call of the disk that fails leaves what was written before it, and the time of that.
TEST_F(RasterFileTest, WhatItDidItselfIsNotLaidToOthersWhereItFailed) {
    Make(file, 300, 1, 3);
    Raster raster = Raster::Open(TestModule(), file);
    const std::vector<Pixel> pixels(std::size_t{300} * 300 * 3, 9);
    {
        const FileFaults faults(
            {folder.String(), zmctest::kWriteCall, 2, true, FileFaultAction::Error, ENOSPC});
        EXPECT_THAT(FailureOf([&] {
                        raster.Write<Pixel>(0, {0, 0, 300, 300}, pixels);
                    }),
                    HasSubstr("No space left"));
        EXPECT_GT(faults.Failed(), 0u);
    }
    EXPECT_EQ(raster.Change(), "");
    for (const bool copies : {false, true}) {
        raster.KeepCopies(copies);
        std::size_t last = 1;
        for (std::size_t n = 1; n <= last; ++n) {
            const FileFaults faults(
                {folder.String(), zmctest::kChangingCall, n, true, FileFaultAction::Error, ENOSPC});
            zelm::Palette palette;
            palette.AddColor(zelm::Color());
            if (FailureOf([&] { raster.SetBandPalette(0, palette); }) != "no failure") ++last;
            EXPECT_EQ(raster.Change(), "") << "call " << n;
        }
        EXPECT_GT(last, 3u);
    }
    std::filesystem::resize_file(file, std::filesystem::file_size(file) - 1);
    EXPECT_THAT(raster.Change(), HasSubstr("it was cut from"));
    raster.Write<Pixel>(0, {0, 0, 1, 1}, {1, 1, 1});
    EXPECT_THAT(raster.Change(), HasSubstr("it was cut from")) << "and not by itself";
}

TEST_F(RasterFileTest, SizeThatCannotBeToldIsNotTakenForNothing) {
    Make(file, 20, 1);
    const auto source = Faulty();
    Raster raster = Raster::Open(TestModule(), source, "a raster");
    const std::uint64_t size = raster.Header().fileSize;
    source->sizeError = EIO;
    EXPECT_THAT(FailureOf([&] { raster.IsComplete(); }), HasSubstr("Input/output error"));
    EXPECT_EQ(raster.Header().fileSize, size);
    EXPECT_EQ(raster.Header().BytesMissing(), 0u);
}

TEST_F(RasterFileTest, NameThatLooksLentIsThatOfAFile) {
    Make(file, 20, 1);
    const auto name = zelm::files::Lend(FileSource::Open(file.c_str(), OpenMode::Update));
    EXPECT_THAT(FailureOf([&] { Raster::Open(TestModule(), name.Utf8()); }),
                HasSubstr("there is no such file"));
}

TEST_F(RasterFileTest, NewFileThatIsRefusedGoesAgainAndAnOldOneStays) {
    zelm::RasterProps props = zmctest::MemorySource<Pixel>(20, 10, 1).props;
    props.bands = 2000000000;
    EXPECT_NE(FailureOf([&] { Raster::Create(TestModule(), file, props, 0); }), "no failure");
    EXPECT_FALSE(std::filesystem::exists(file));
    zmctest::WriteText(file, "text");
    EXPECT_NE(FailureOf([&] { Raster::Create(TestModule(), file, props, 0); }), "no failure");
    EXPECT_EQ(zmctest::ReadText(file), "text");
}

TEST_F(RasterFileTest, OpensASourceOfTheCaller) {
    Make(file, 20, 3);
    const std::string text = zmctest::ReadText(file);
    const auto source = std::make_shared<zelm::files::MemorySource>(
        zelm::files::MemorySource::Bytes(text.begin(), text.end()));
    std::filesystem::remove(file);
    Raster raster = Raster::Open(TestModule(), source, "memory");
    EXPECT_EQ(SumOf(raster, {0, 0, 20, 20}), 1200u);
    EXPECT_TRUE(raster.IsWritable());
    raster.KeepCopies(true);
    raster.SetStatistics<Pixel>({Mean(3)});
    raster.Write<Pixel>(0, {0, 0, 1, 1}, {4});
    EXPECT_EQ(raster.Change(), "");
    EXPECT_EQ(Raster::Open(TestModule(), source, "memory").Statistics<Pixel>(0).mean, 3);
    ASSERT_TRUE(source->Truncate(100));
    EXPECT_THAT(raster.Change(), HasSubstr("it was cut"));
    EXPECT_THAT(FailureOf([&] { Raster::Open(TestModule(), source, "memory"); }),
                HasSubstr("memory: cannot read the header"));
    EXPECT_THAT(FailureOf([&] { Raster::Open(TestModule(), nullptr, "none"); }),
                HasSubstr("there is no source"));
}

// --- a disk that fails ---

TEST_F(RasterFileTest, FailuresToldByTheDiskAreThrownWithTheirReason) {
    Make(file, 20, 1);
    Raster raster = Raster::Open(TestModule(), file);
    const std::string before = zmctest::ReadText(file);
    zelm::Palette palette;
    palette.AddColor(zelm::Color());
    const auto failure = [&](unsigned calls, int error, auto&& action) {
        FileFaults faults = Fail(calls, FileFaultAction::Error, error);
        const std::string told = FailureOf(action);
        faults.Disarm();
        EXPECT_NE(faults.Failed(), 0u);
        return told;
    };
    const std::string front = file + ": cannot ";
    EXPECT_THAT(failure(zmctest::kReadCall, EIO,
                        [&] {
                            SumOf(raster, {0, 0, 20, 20});
                        }),
                testing::MatchesRegex(front + "read 20 x 20 pixels at \\(0, 0\\): Input/output "
                                              "error \\(reading 400 bytes at offset [0-9]+\\)"));
    EXPECT_THAT(failure(zmctest::kStatusCall, EIO,
                        [&] {
                            SumOf(raster, {0, 0, 20, 20});
                        }),
                HasSubstr("Input/output error (asking for its size)"));
    const auto full = HasSubstr("No space left on device (writing ");
    EXPECT_THAT(failure(zmctest::kWriteCall, ENOSPC,
                        [&] {
                            raster.Write<Pixel>(0, {0, 0, 20, 20}, std::vector<Pixel>(400, 9));
                        }),
                full);
    EXPECT_THAT(failure(zmctest::kReadCall, EIO,
                        [&] {
                            raster.Write<Pixel>(0, {0, 0, 1, 1}, {9});
                        }),
                HasSubstr("Input/output error (reading "));
    const auto store = [&](auto&& action) {
        EXPECT_THAT(failure(zmctest::kWriteCall, ENOSPC, action), full);
    };
    store([&] { raster.SetStatistics<Pixel>({Mean(7)}); });
    store([&] { raster.SetHistograms<Pixel>({{}}); });
    store([&] { raster.SetBandPalette(0, palette); });
    EXPECT_EQ(zmctest::ReadText(file), before);
    EXPECT_EQ(SumOf(raster, {0, 0, 20, 20}), 400u) << "goes on, once the disk does";
}

TEST_F(RasterFileTest, RecordsThatCannotBeReadAreNotSaidToBeMissing) {
    Make(file, 20, 1);
    {
        Raster raster = Raster::Open(TestModule(), file);
        raster.SetStatistics<Pixel>({Mean(1)});
    }
    const auto size = std::filesystem::file_size(file);
    for (std::size_t n = 1;; ++n) {
        const auto source = Faulty();
        source->n = n;
        source->fromThenOn = true;
        bool has = false;
        const std::string failure = FailureOf(
            [&] { has = Raster::Open(TestModule(), source, "a raster").HasStatistics(0); });
        EXPECT_TRUE(has || failure != "no failure") << n;
        if (has) break;
        EXPECT_THAT(failure, HasSubstr("Input/output error"));
        ASSERT_LT(n, 20u);
    }
    EXPECT_EQ(std::filesystem::file_size(file), size);
}

// A disk that tells of an end where there is none: no zeros go for pixels.
TEST_F(RasterFileTest, EndThatIsNoneIsAFailure) {
    Make(file, 20, 1);
    Raster raster = Raster::Open(TestModule(), file);
    const std::string before = zmctest::ReadText(file);
    for (const bool write : {false, true}) {
        FileFaults faults = Fail(zmctest::kReadCall, FileFaultAction::Nothing, 0);
        EXPECT_THAT(FailureOf([&] {
                        if (write)
                            raster.Write<Pixel>(0, {0, 0, 1, 1}, {9});
                        else
                            SumOf(raster, {0, 0, 20, 20});
                    }),
                    HasSubstr("less was read than is there (reading "));
        faults.Disarm();
    }
    EXPECT_EQ(zmctest::ReadText(file), before);
}

// --- sources that misbehave ---

TEST_F(RasterFileTest, SourcesThatMisbehaveAreToldOrGotOver) {
    Make(file, 300, 1);
    const auto before = zmctest::ReadText(file);
    for (const SourceFault fault :
         {SourceFault::Fails, SourceFault::FailsPartway, SourceFault::AnswersShort,
          SourceFault::AnswersNothing, SourceFault::AnswersTooMuch, SourceFault::RunsOutOfMemory,
          SourceFault::Throws, SourceFault::ThrowsANumber}) {
        for (std::size_t n = 1; n < 40; ++n) {
            const auto source = Faulty();
            source->n = n;
            source->fault = fault;
            unsigned sum = 0;
            const std::string failure = FailureOf([&] {
                Raster raster = Raster::Open(TestModule(), source, "a raster");
                sum = SumOf(raster, {0, 0, 300, 300});
                raster.Write<Pixel>(0, {10, 10, 1, 1}, {1});
            });
            if (source->Transfers() < n) break;
            EXPECT_TRUE(failure != "no failure" || sum == 90000u)
                << static_cast<int>(fault) << ' ' << n;
            EXPECT_EQ(zmctest::ReadText(file), before) << "ones were written over ones";
        }
    }
}

TEST_F(RasterFileTest, SizeThatIsALieIsTold) {
    Make(file, 300, 1);
    const auto truth = std::filesystem::file_size(file);
    for (const std::uint64_t claimed :
         {std::uint64_t{0}, std::uint64_t{100}, truth - 1, truth + 1, truth * 1000,
          ByteSource::kUnknownSize - 1, ByteSource::kUnknownSize}) {
        const auto source = Faulty();
        source->claimedSize = claimed;
        unsigned sum = 0;
        const std::string failure = FailureOf([&] {
            Raster raster = Raster::Open(TestModule(), source, "a raster");
            sum = SumOf(raster, {0, 0, 300, 300});
        });
        EXPECT_TRUE(failure != "no failure" || sum == 90000u) << claimed;
        const bool canBe = claimed >= truth && claimed != ByteSource::kUnknownSize;
        EXPECT_TRUE(canBe || failure != "no failure") << claimed;
    }
}

TEST_F(RasterFileTest, TwoRastersShareOneSource) {
    Make(file, 300, 1);
    const std::shared_ptr<ByteSource> source = FileSource::Open(file.c_str(), OpenMode::Update);
    Raster first = Raster::Open(TestModule(), source, "first");
    Raster second = Raster::Open(TestModule(), source, "second");
    first.Write<Pixel>(0, {0, 0, 300, 300}, std::vector<Pixel>(90000, 2));
    EXPECT_EQ(SumOf(second, {0, 0, 300, 300}), 180000u);
    EXPECT_EQ(second.Change(), "others have written to it");
}

}  // namespace
}  // namespace zmchost
