// Sentences of docs/format.md on what readers meet that the module does not write.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "core/PixelVocabulary.h"
#include "pyramid/PyramidDataset.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

class FormatTest : public ::testing::Test {
protected:
    using T = unsigned char;

    // A dataset on a file of these bytes; null if it does not open.
    std::unique_ptr<PyramidDataset> Open(const std::string& bytes) {
        zmctest::WriteText(name, bytes);
        auto dataset = std::make_unique<PyramidDataset>(String(name.c_str()));
        if (dataset->ReadHeader()) return nullptr;
        return dataset;
    }
    // With this header document and enough tile data for a small raster.
    std::unique_ptr<PyramidDataset> OpenHeader(const std::string& document) {
        return Open(FileWithHeader(document) + std::string(1000, '\1'));
    }
    // With this metadata document.
    std::unique_ptr<PyramidDataset> OpenMeta(const std::string& document) {
        return Open(HeaderText().File() + document);
    }

    zmctest::ScratchDirectory folder;
    std::string name = (folder / "format.pyr");
};

std::string With(std::string text, const std::string& old, const std::string& now) {
    const std::size_t at = text.find(old);
    EXPECT_NE(at, std::string::npos) << old;
    return text.replace(at, old.size(), now);
}

std::string Leaf(const std::string& name, const std::string& value) {
    return "<" + name + ">" + value + "</" + name + ">";
}

std::string Stats(const std::string& children) {
    return "<DATASET><BANDSTATISTICS>" + children + "</BANDSTATISTICS></DATASET>";
}

// --- the header ---

TEST_F(FormatTest, NumbersOfTheHeaderHaveSignsAndAnEnd) {
    const std::pair<const char*, std::uint32_t> cases[] = {
        {"-1", 4294967295u},
        {"+3", 3u},
        {"\n 3 columns", 3u},
        {"3.9", 3u},
        {"", 0u},
        {"many", 0u},
        {"4294967297", 1u},
        {"9223372036854775808", 4294967295u},
        {"-9223372036854775809", 0u},
        {"0x10", 0u},
    };
    for (const auto& [text, value] : cases) {
        const auto dataset = OpenHeader(
            With(HeaderText().Text(), Leaf("HEADER_BANDS", "1"), Leaf("HEADER_BANDS", text)));
        ASSERT_TRUE(dataset) << text;
        EXPECT_EQ(dataset->BandCount, value) << text;
    }
}

TEST_F(FormatTest, HeaderElementsThatAreMissing) {
    const std::string whole = HeaderText().Text();
    const auto without = [&](const char* leaf, const char* value) {
        return OpenHeader(With(whole, Leaf(leaf, value), ""));
    };
    auto dataset = without("HEADER_PIXEL_TYPE", "Byte");
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->PixelType, 0u);
    EXPECT_EQ(dataset->BytesPerSample, 1u);
    dataset = without("HEADER_VERSION_MAJOR", "1");
    ASSERT_TRUE(dataset);
    EXPECT_FALSE(dataset->HasPyramid);
    dataset = without("HEADER_INTERLEAVE", "BIP");
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->Interleave, Interleave::BIP);
    dataset = without("HEADER_BUILD_METHOD", "Blocked");
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->TileOrdering, TileOrder::Scanline);
    EXPECT_FALSE(without("HEADER_TILESIZE", "256"));
    EXPECT_FALSE(OpenHeader("<DATASET/>")) << "its tiles have no size";
}

TEST_F(FormatTest, ARasterWithoutBandsOrPixelsIsComplete) {
    HeaderText header;
    header.bands = 0;
    for (int i = 0; i < 2; ++i) {
        const auto dataset = Open(FileWithHeader(header.Text()));
        ASSERT_TRUE(dataset);
        EXPECT_EQ(dataset->TileDataEnd, dataset->TileDataStart);
        EXPECT_TRUE(dataset->HasPyramid);
        header.bands = 1;
        header.width = 0;
    }
}

TEST_F(FormatTest, LevelMinAboveLevelMaxHoldsNoLevel) {
    HeaderText header;
    header.levelMin = 2;
    header.levelMax = 1;
    const auto dataset = Open(FileWithHeader(header.Text()));
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->TileDataEnd, dataset->TileDataStart);
    EXPECT_TRUE(dataset->HasPyramid);
    for (const int level : {0, 1, 2, 3})
        EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, Array<int>(), level)) << level;
}

TEST_F(FormatTest, NamesOfTheRootAndOfParentsDoNotMatter) {
    const std::string text = HeaderText().Text();
    const auto dataset = OpenHeader("<OTHER>" + text + "</OTHER>");
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->Samples, 10u);
    EXPECT_TRUE(OpenHeader("<HEADER_BANDS>1" + text + "</HEADER_BANDS>"));
    EXPECT_TRUE(
        OpenMeta("<OTHER>" + Stats(Leaf("RSTC_BAND", "4")) + "</OTHER>")->HasBandStats<T>(4));
}

TEST_F(FormatTest, OfTwoEqualElementsTheLaterCounts) {
    const std::string text = HeaderText().Text();
    const auto dataset =
        OpenHeader(With(text, "</HEADER>", Leaf("HEADER_BANDS", "2") + "</HEADER>"));
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->BandCount, 2u);
    const auto stats =
        OpenMeta(Stats(Leaf("RSTC_MEAN", "1") + Leaf("RSTC_MEAN", "2")))->GetBandStats<T>(0);
    EXPECT_EQ(stats.mean, 2);
}

TEST_F(FormatTest, WordsAreCaseSensitive) {
    HeaderText header;
    header.pixelType = "byte";
    header.ordering = "MORTON";
    header.interleave = "bsq";
    const auto dataset = OpenHeader(header.Text());
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->PixelType, 0u);
    EXPECT_EQ(dataset->TileOrdering, TileOrder::Scanline);
    EXPECT_EQ(dataset->Interleave, Interleave::None);
    EXPECT_FALSE(OpenHeader(With(HeaderText().Text(), "HEADER_TILESIZE>256</HEADER_TILESIZE",
                                 "Header_TileSize>256</Header_TileSize")));
}

// --- Morton ---

TEST_F(FormatTest, MortonExampleWithARaggedEdge) {
    HeaderText header;
    header.width = 1000;
    header.height = 777;
    header.levelMax = 2;
    header.ordering = "Morton";
    const auto dataset = OpenHeader(header.Text());
    ASSERT_TRUE(dataset);
    const auto offsets = [&](std::uint32_t level, std::uint32_t tiles) {
        const std::uint64_t* const row = dataset->TileOffsets.data + level * 16;
        std::vector<std::uint64_t> result(row, row + tiles);
        for (std::uint64_t& offset : result) offset -= dataset->TileDataStart;
        return result;
    };
    using Offsets = std::vector<std::uint64_t>;
    EXPECT_EQ(offsets(0, 16),
              (Offsets{0, 65536, 262144, 393216, 131072, 196608, 452608, 518144, 577536, 705536,
                       775680, 875008, 771072, 773376, 934400, 936704}));
    EXPECT_EQ(offsets(1, 4), (Offsets{327680, 643072, 841216, 938792}));
    EXPECT_EQ(offsets(2, 1), Offsets{971000});
    EXPECT_EQ(dataset->TileDataEnd - dataset->TileDataStart, 1019500u);
}

// A tile is read in the size that it has in the grid of its level, into what lies behind it.
TEST_F(FormatTest, MortonTilesOverlapWhereTheirSizeIsNotDivisible) {
    HeaderText header;
    header.bands = 2;
    header.width = header.height = 2400;
    header.tileSize = 300;
    header.levelMax = 3;
    header.ordering = "Morton";
    constexpr std::uint64_t finer = 2400 * 2400 + 1200 * 1200 + 600 * 600;
    constexpr std::uint64_t place = 296 * 296, tile = 300 * 300;
    std::string data(2 * (finer + tile), '\0');
    const std::string front = FileWithHeader(header.Text());
    for (std::uint64_t i = 0; i < data.size(); ++i)
        data[i] = static_cast<char>(i < finer ? 1 : i < finer + place ? 2 : 3);
    const auto dataset = Open(front + data);
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->TileDataEnd, dataset->TileDataStart + data.size());
    std::vector<unsigned char> pixels(tile);
    int list[] = {0};
    EXPECT_TRUE(
        dataset->ReadTile<T>(0, 0, 300, 300, Array<int>(list, ArrayShape(1)), 3, pixels.data()));
    EXPECT_EQ(std::count(pixels.begin(), pixels.end(), 2), std::ptrdiff_t{place});
    EXPECT_EQ(std::count(pixels.begin(), pixels.end(), 3), std::ptrdiff_t{2384})
        << "the first samples of the next band";
}

TEST_F(FormatTest, MortonLevelsAboveTheTileHaveBytesAndNoAddress) {
    HeaderText header;
    header.width = header.height = 16;
    header.tileSize = 4;
    header.levelMax = 3;
    header.ordering = "Morton";
    const auto dataset = OpenHeader(header.Text());
    ASSERT_TRUE(dataset);
    EXPECT_EQ(dataset->TileDataEnd - dataset->TileDataStart, 256u + 64u + 16u + 4u);
    int list[] = {0};
    const Array<int> bands(list, ArrayShape(1));
    EXPECT_TRUE(dataset->AcceptsTile(0, 0, 1, 1, bands, 2));
    EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, bands, 3));
}

// --- the metadata document ---

TEST_F(FormatTest, EncodingsThatAreRead) {
    const std::string records = Stats(Leaf("RSTC_BAND", "4"));
    const auto declared = [&](const std::string& encoding) {
        return OpenMeta("<?xml version=\"1.0\" encoding=\"" + encoding + "\"?>" + records)
            ->HasBandStats<T>(4);
    };
    EXPECT_TRUE(OpenMeta(records)->HasBandStats<T>(4));
    EXPECT_TRUE(OpenMeta("\xEF\xBB\xBF" + records)->HasBandStats<T>(4));
    for (const char* encoding : {"UTF-8", "US-ASCII", "ISO-8859-1", "windows-1252"})
        EXPECT_TRUE(declared(encoding)) << encoding;
    std::string wide = "\xFF\xFE";
    for (const char c : records) wide += {c, '\0'};
    ::testing::internal::CaptureStderr();
    EXPECT_FALSE(declared("none-such"));
    EXPECT_FALSE(OpenMeta(wide)->HasBandStats<T>(4)) << "it is full of NUL";
    ::testing::internal::GetCapturedStderr();
}

TEST_F(FormatTest, StatisticsOfBytesAreCut) {
    const std::pair<const char*, int> cases[] = {{"3.7", 3},  {"300", 44}, {"-5", 251}, {"nan", 0},
                                                 {"-inf", 0}, {"1e30", 0}, {"none", 0}};
    for (const auto& [text, value] : cases) {
        const auto stats = OpenMeta(Stats(Leaf("RSTC_MINIMUM", text)))->GetBandStats<T>(0);
        EXPECT_EQ(stats.minimum, value) << text;
        EXPECT_EQ(stats.flags, StatsFlag::Minimum);
    }
}

TEST_F(FormatTest, ValuesBeyondSixtyFourBits) {
    for (const char* text : {"nan", "inf", "-inf", "1e30"}) {
        const auto dataset = OpenMeta(Stats(Leaf("RSTC_MINIMUM", text)));
        EXPECT_EQ(dataset->GetBandStats<int>(0).minimum, 0) << text;
        EXPECT_EQ(dataset->GetBandStats<std::int64_t>(0).minimum,
                  std::numeric_limits<std::int64_t>::min());
        EXPECT_EQ(dataset->GetBandStats<std::uint64_t>(0).minimum, 9223372036854775808u);
    }
    const auto dataset =
        OpenMeta(Stats(Leaf("RSTC_MINIMUM", "nan") + Leaf("RSTC_MAXIMUM", "-INF")));
    EXPECT_TRUE(std::isnan(dataset->GetBandStats<float>(0).minimum));
    EXPECT_EQ(dataset->GetBandStats<double>(0).maximum, -std::numeric_limits<double>::infinity());
}

TEST_F(FormatTest, CountsNearTheEndOfSixtyFourBits) {
    const auto count = [&](const char* text) {
        const auto histograms = OpenMeta("<DATASET><HISTOGRAMS>" + Leaf("HIST_BINCOUNT", "1") +
                                         Leaf("HIST_COUNTS", text) + "</HISTOGRAMS></DATASET>")
                                    ->GetHistograms<T>();
        return histograms.data[0].counts.data[0];
    };
    EXPECT_EQ(count("18446744073709551615"), 9223372036854775808u);
    EXPECT_EQ(count("18446744073709550592"), 9223372036854775808u);
    EXPECT_EQ(count("18446744073709550591"), 18446744073709549568u);
    EXPECT_EQ(count("9223372036854775807"), 9223372036854775808u);
    EXPECT_EQ(count("-1"), 18446744073709551615u);
}

TEST_F(FormatTest, ColoursOfOddParts) {
    const auto colours =
        OpenMeta("<DATASET><PALETTE>" + Leaf("PALETTE_RGBA", "256|511|-1|2.9") +
                 Leaf("PALETTE_RGBA", "1|2|3|4|5") + "<PALETTE_RGBA/>" + Leaf("PALETTE_RGBA", "") +
                 Leaf("PALETTE_RGBA", " ") + "</PALETTE></DATASET>")
            ->GetPalette<T>(0);
    ASSERT_EQ(colours->nextIndex, 3u) << "an element without text is no colour";
    EXPECT_EQ(colours->GetColor(0)->red, 0);
    EXPECT_EQ(colours->GetColor(0)->green, 255);
    EXPECT_EQ(colours->GetColor(0)->blue, 255);
    EXPECT_EQ(colours->GetColor(0)->alpha, 2);
    EXPECT_EQ(colours->GetColor(1)->alpha, 4);
    EXPECT_EQ(colours->GetColor(2)->red, 0);
}

TEST_F(FormatTest, SingleStatisticsKeepSixDigits) {
    RasterProps props = PyramidProps(10, 6, 1, PixelTypeCode::Single);
    PyramidDataset dataset(String(name.c_str()), props);
    dataset.CreateFile(0, 0);
    RasterBandStats<float> stats;
    stats.flags = StatsFlag::Minimum | StatsFlag::Maximum | StatsFlag::Mean;
    stats.minimum = 1234567;
    stats.maximum = 0.1f;
    stats.mean = 1234567.25;
    Array<RasterBandStats<float>> records;
    records.Append(stats);
    ASSERT_TRUE(dataset.SetBandStats(records));
    const auto read = dataset.GetBandStats<float>(0);
    EXPECT_EQ(read.minimum, 1234570.0f);
    EXPECT_EQ(read.maximum, 0.1f);
    EXPECT_EQ(read.mean, 1234567.25) << "a real, whatever the type";
}

TEST_F(FormatTest, AllHistogramsAreKeptInTheirOrder) {
    std::string text = "<DATASET>";
    for (const char* band : {"1", "0", "1"})
        text += "<HISTOGRAMS>" + Leaf("HIST_BAND", band) + "</HISTOGRAMS>";
    const auto histograms = OpenMeta(text + "</DATASET>")->GetHistograms<T>();
    ASSERT_EQ(histograms.shape.elements, 3u);
    EXPECT_EQ(histograms.data[0].band, 1u);
    EXPECT_EQ(histograms.data[1].band, 0u);
    EXPECT_EQ(histograms.data[2].band, 1u);
}

}  // namespace
}  // namespace zmctest
