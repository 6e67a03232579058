// What a raster's document is parsed for, and how much of a level is read to make another.
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <memory>
#include <numeric>
#include <utility>
#include <vector>

#include "files/FileSource.h"
#include "host/build/LevelReduction.h"
#include "host/file/MetadataDocument.h"
#include "host/file/StoredRecords.h"
#include "host/raster/Raster.h"
#include "tests/support/CountingSource.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ParseCounter.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zelm::files::FileSource;
using zmctest::DocumentParses;
using zmctest::TestModule;
using Pixel = unsigned char;
using Stats = zelm::RasterBandStats<Pixel>;

Stats Mean(std::uint32_t band, double mean) {
    Stats stats;
    stats.band = band;
    stats.flags = zelm::StatsFlag::Mean;
    stats.mean = mean;
    return stats;
}

class StoredRecordsTest : public testing::Test {
protected:
    Raster Make(std::uint32_t bands) {
        const zmctest::MemorySource<Pixel> source(4, 4, bands);
        Raster raster = Raster::Create(TestModule(), file, source.props, 0);
        raster.Write<Pixel>(0, {0, 0, 4, 4}, std::vector<Pixel>(16 * bands, 1));
        return raster;
    }
    // One record at a time, in that order, as a host does that goes through the module's reader.
    static void Append(Raster& raster, const std::vector<Stats>& records) {
        for (const Stats& record : records)
            raster.Store([&] {
                raster.Visit([&]<class T>(zelm::RasterReader<T>& reader) {
                    if constexpr (std::is_same_v<T, Pixel>) {
                        zelm::Array<Stats> array;
                        array.Append(record);
                        reader.SetBandStats(array);
                    }
                });
            });
    }
    static void SetColors(Raster& raster, std::uint32_t band, unsigned count) {
        zelm::Palette palette;
        for (unsigned i = 0; i < count; ++i) palette.AddColor(zelm::Color());
        raster.SetBandPalette(band, palette);
    }

    zmctest::ScratchDirectory folder;
    const std::string file = folder / "a.pyr";
};

TEST_F(StoredRecordsTest, OneParseServesAllBandsAndKindsOfRecords) {
    constexpr std::uint32_t kBands = 200;
    {
        Raster raster = Make(kBands);
        std::vector<Stats> records;
        std::vector<zelm::RasterBandHistogram<Pixel>> histograms(kBands);
        for (std::uint32_t band = 0; band < kBands; ++band) {
            records.push_back(Mean(band, band));
            histograms[band].band = band;
        }
        raster.SetStatistics(records);
        raster.SetHistograms(histograms);
        SetColors(raster, 7, 3);
    }
    const Raster raster = Raster::Open(TestModule(), file);
    const std::size_t before = DocumentParses();
    for (std::uint32_t band = 0; band < kBands; ++band) {
        EXPECT_TRUE(raster.HasStatistics(band));
        EXPECT_EQ(raster.Statistics<Pixel>(band).mean, band);
        const zelm::PalettePtr palette = raster.BandPalette(band);
        EXPECT_EQ(palette ? palette->nextIndex : 0, band == 7 ? 3 : 0);
        EXPECT_EQ(raster.Histograms<Pixel>().size(), kBands);
    }
    EXPECT_EQ(DocumentParses() - before, 1u);
}

TEST_F(StoredRecordsTest, CheckBehindAStoreParsesOnceForAllBands) {
    Raster raster = Make(50);
    std::vector<Stats> records;
    for (std::uint32_t band = 0; band < 50; ++band) records.push_back(Mean(band, band));
    const std::size_t before = DocumentParses();
    raster.SetStatistics(records);
    EXPECT_EQ(DocumentParses() - before, 1u) << "there was no document ahead of it";
}

TEST_F(StoredRecordsTest, StoreIsSeenByTheNextQuestion) {
    Raster raster = Make(2);
    EXPECT_FALSE(raster.HasStatistics(0));
    raster.SetStatistics<Pixel>({Mean(0, 1), Mean(1, 2)});
    EXPECT_EQ(raster.Statistics<Pixel>(1).mean, 2);
    EXPECT_FALSE(raster.BandPalette(1));
    SetColors(raster, 1, 3);
    ASSERT_TRUE(raster.BandPalette(1));
    EXPECT_EQ(raster.BandPalette(1)->nextIndex, 3u);
    SetColors(raster, 1, 0);
    EXPECT_FALSE(raster.BandPalette(1)) << "an empty palette hides those before it";
    EXPECT_TRUE(raster.Histograms<Pixel>().empty());
    raster.SetHistograms<Pixel>({{}});
    EXPECT_EQ(raster.Histograms<Pixel>().size(), 1u);
    EXPECT_EQ(raster.Histograms<Pixel>().size(), 1u);
}

TEST_F(StoredRecordsTest, OldestRecordOfABandCountsAndTheNewestIsThereToo) {
    Raster raster = Make(3);
    Append(raster, {Mean(2, 20), Mean(0, 1), Mean(2, 21), Mean(0, 2)});
    EXPECT_EQ(raster.Statistics<Pixel>(0).mean, 1);
    EXPECT_FALSE(raster.HasStatistics(1));
    EXPECT_THROW(raster.Statistics<Pixel>(1), Error);
    const auto records = raster.Records<Pixel>();
    EXPECT_EQ(records->Statistics().size(), 4u);
    EXPECT_EQ(records->FirstStatistics(2)->mean, 20);
    EXPECT_EQ(records->NewestStatistics(2)->mean, 21);
    EXPECT_EQ(records->NewestStatistics(0)->mean, 2);
    EXPECT_EQ(records->NewestStatistics(1), nullptr);
}

// The module fetches by place, and what it gives for a band counts.
TEST_F(StoredRecordsTest, RecordAtTheBandsOwnPlaceComesFirst) {
    Raster raster = Make(3);
    Append(raster, {Mean(2, 20), Mean(0, 1), Mean(2, 21)});
    EXPECT_EQ(raster.Statistics<Pixel>(2).mean, 21);
}

TEST_F(StoredRecordsTest, PaletteThatIsHandedOutIsTheHoldersOwn) {
    Raster raster = Make(1);
    SetColors(raster, 0, 2);
    raster.BandPalette(0)->Clear();
    EXPECT_EQ(raster.BandPalette(0)->nextIndex, 2u);
}

// Colours of a palette inside another belong to both, as the module has it.
TEST_F(StoredRecordsTest, PalettesWithinPalettesAreThoseOfTheModule) {
    Raster raster = Make(3);
    const std::string colour = "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA>";
    const auto band = [](int number) {
        return "<PALETTE_BAND>" + std::to_string(number) + "</PALETTE_BAND>";
    };
    std::ofstream(file, std::ios::app)
        << "<DATASET><PALETTE>" << band(0) << "<PALETTE>" << band(1) << colour << "</PALETTE>"
        << band(2) << colour << "</PALETTE>" << colour << "<PALETTE></PALETTE></DATASET>";
    const Raster read = Raster::Open(TestModule(), file);
    for (std::uint32_t number = 0; number < 3; ++number) {
        const zelm::PalettePtr palette = read.BandPalette(number);
        read.Visit([&](auto& reader) {
            EXPECT_EQ(palette ? palette->nextIndex : 0, reader.GetPalette(number)->nextIndex);
        });
        EXPECT_EQ(palette ? palette->nextIndex : 0, number == 1 ? 1 : 0) << number;
    }
}

TEST_F(StoredRecordsTest, PaletteAroundAnotherHasItsColoursToo) {
    Raster raster = Make(3);
    const std::string colour = "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA>";
    std::ofstream(file, std::ios::app)
        << "<DATASET><PALETTE><PALETTE><PALETTE_BAND>1</PALETTE_BAND>" << colour
        << "</PALETTE><PALETTE_BAND>2</PALETTE_BAND>" << colour << "</PALETTE></DATASET>";
    const Raster read = Raster::Open(TestModule(), file);
    EXPECT_FALSE(read.BandPalette(0));
    EXPECT_EQ(read.BandPalette(1)->nextIndex, 1u);
    ASSERT_TRUE(read.BandPalette(2));
    EXPECT_EQ(read.BandPalette(2)->nextIndex, 2u);
    EXPECT_EQ(read.BandPalette(2)->colors.at(1)->blue, 3u);
    EXPECT_EQ(read.BandPalette(2)->colors.at(1)->alpha, 4u);
}

// Entries that lookups have left are there as well, and the colours are those of the module.
TEST_F(StoredRecordsTest, PaletteHasTheEntriesOfTheModules) {
    Raster raster = Make(1);
    const std::string colour = "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA>";
    const auto count = [](int number) {
        return "<PALETTE_COUNT>" + std::to_string(number) + "</PALETTE_COUNT>";
    };
    std::ofstream(file, std::ios::app) << "<DATASET><PALETTE>" << count(1) << colour << count(0)
                                       << count(9) << colour << colour << "</PALETTE></DATASET>";
    const Raster read = Raster::Open(TestModule(), file);
    const zelm::PalettePtr palette = read.BandPalette(0);
    ASSERT_TRUE(palette);
    EXPECT_EQ(palette->nextIndex, 3u);
    EXPECT_EQ(palette->colors.size(), 4u);
    const auto describe = [](const zelm::Palette& given) {
        std::vector<std::pair<std::uint32_t, std::vector<int>>> list;
        std::vector<std::string> names;
        for (const auto& [index, color] : given.colors) {
            list.push_back(
                {index, {color->red, color->green, color->blue, color->alpha, color->isNull}});
            names.push_back(color->name.GetUtf8());
        }
        return std::pair(list, names);
    };
    read.Visit(
        [&](auto& reader) { EXPECT_EQ(describe(*palette), describe(*reader.GetPalette(0))); });
}

// By the parse that reads the records, and in the words of the one that judges alone.
TEST_F(StoredRecordsTest, FaultIsToldByTheOneParse) {
    Make(1);
    const std::string start = zmctest::ReadText(file);
    const std::string good = "<DATASET><BANDSTATISTICS/></DATASET>";
    for (const std::string& document :
         {std::string(), good, good + "\n\n", good + "<", std::string("<OTHER/>"),
          std::string("  \n"), "\x1A" + good, good + std::string(1, '\0'), good + "\xC3",
          "<!DOCTYPE DATASET>" + good, std::string("<DATASET><DATASET>")}) {
        SCOPED_TRACE(document);
        zmctest::WriteText(file, start + document);
        const std::string judged = JudgeMetadata(file, PyramidHeader::Read(file));
        EXPECT_EQ(judged.empty(),
                  document.empty() || document.starts_with(good + "\n") || document == good);
        const Raster raster = Raster::Open(TestModule(), file);
        const std::size_t before = DocumentParses();
        EXPECT_EQ(raster.DocumentFault(), judged);
        EXPECT_EQ(raster.HasStatistics(0), judged.empty() && !document.empty());
        if (!document.empty() && !document.starts_with('\x1A')) {
            EXPECT_EQ(DocumentParses() - before, 1u);
        }
    }
    EXPECT_TRUE(Raster::Open(TestModule(), file)
                    .DocumentFault()
                    .starts_with("the metadata document is malformed: line 1: "));
}

TEST_F(StoredRecordsTest, DocumentBeyondTheLimitIsAFault) {
    Make(1);
    const std::uint64_t most = std::uint64_t{256} << 20;
    std::filesystem::resize_file(file, std::filesystem::file_size(file) + most + 1);
    const Raster raster = Raster::Open(TestModule(), file);
    EXPECT_EQ(raster.DocumentFault(), "the metadata document is longer than 256 MiB");
    EXPECT_EQ(raster.DocumentFault(), JudgeMetadata(file, PyramidHeader::Read(file)));
}

// A store that never ended costs a file of very many bands no look for each of them, however quick
// one is.
TEST_F(StoredRecordsTest, UnfinishedDocumentIsNotReadForEveryQuestion) {
    constexpr std::uint32_t kQuestions = 20000;
    {
        Raster made = Make(1);
        Append(made, {Mean(0, 1)});
    }
    std::string bytes = zmctest::ReadText(file);
    bytes[bytes.rfind("<?xml")] = '\x1A';
    zmctest::WriteText(file, bytes);
    const Raster raster = Raster::Open(TestModule(), file);
    const std::size_t before = DocumentParses();
    for (std::uint32_t i = 0; i < kQuestions; ++i) EXPECT_FALSE(raster.HasStatistics(0));
    EXPECT_GE(DocumentParses() - before, 2u) << "it is looked at again";
    EXPECT_LT(DocumentParses() - before, kQuestions / 10);
}

TEST_F(StoredRecordsTest, MalformedDocumentKeepsNothing) {
    {
        Raster raster = Make(1);
        raster.SetStatistics<Pixel>({Mean(0, 1)});
    }
    std::ofstream(file, std::ios::app) << "<";
    const Raster raster = Raster::Open(TestModule(), file);
    testing::internal::CaptureStderr();
    EXPECT_FALSE(raster.HasStatistics(0));
    EXPECT_TRUE(raster.Histograms<Pixel>().empty());
    EXPECT_FALSE(raster.BandPalette(0));
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
    EXPECT_TRUE(raster.Records<Pixel>()->IsSettled());
}

TEST_F(StoredRecordsTest, DocumentThatIsNotThereIsLookedForAgain) {
    Raster raster = Make(1);
    EXPECT_FALSE(raster.HasStatistics(0));
    EXPECT_FALSE(raster.Records<Pixel>()->IsSettled());
    Raster other = Raster::Open(TestModule(), file);
    other.SetStatistics<Pixel>({Mean(0, 1)});
    EXPECT_TRUE(raster.HasStatistics(0));
}

// --- what is read to make a level anew ---

class LevelReductionTest : public StoredRecordsTest,
                           public testing::WithParamInterface<std::pair<Resampling, bool>> {};

TEST_P(LevelReductionTest, ReadsNoHaloForAMethodThatNeedsNone) {
    constexpr std::uint32_t kSide = 2048;
    const auto [method, hasHalo] = GetParam();
    {
        const zmctest::MemorySource<Pixel> source(kSide, kSide, 1);
        Raster raster = Raster::Create(TestModule(), file, source.props, 1);
        for (std::uint32_t level = 0; level < 2; ++level) {
            const std::uint32_t side = kSide >> level;
            raster.Write<Pixel>(level, {0, 0, side, side},
                                std::vector<Pixel>(std::size_t{side} * side));
        }
    }
    const auto source = std::make_shared<zmctest::CountingSource>(
        FileSource::Open(file.c_str(), zelm::files::OpenMode::Read));
    Raster raster = Raster::Open(TestModule(), source, "a raster");
    LevelReduction<Pixel> reduction(raster, method);
    const std::uint32_t side = raster.TileSide();
    source->bytes = 0;
    reduction.Load(1, {side, side, side, side});
    const std::uint64_t own = std::uint64_t{4} * side * side;
    EXPECT_EQ(source->bytes > own, hasHalo) << source->bytes << " bytes for " << own;
    EXPECT_GE(source->bytes, own);
}

INSTANTIATE_TEST_SUITE_P(
    Methods, LevelReductionTest,
    testing::Values(std::pair(Resampling::Nearest, false), std::pair(Resampling::Average, false),
                    std::pair(Resampling::Median, false), std::pair(Resampling::Bilinear, true),
                    std::pair(Resampling::Lanczos, true)),
    [](const auto& each) { return std::string(ResamplingName(each.param.first)); });

}  // namespace
}  // namespace zmchost
