#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sys/resource.h>

#include <algorithm>
#include <cmath>
#include <csignal>
#include <ctime>
#include <filesystem>
#include <limits>
#include <random>

#include <xercesc/dom/DOM.hpp>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/sax/HandlerBase.hpp>

#include "core/NumericConversion.h"
#include "format/NumberText.h"
#include "platform/File.h"
#include "pyramid/PyramidDataset.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

template <class Record>
Array<Record> ArrayOf(std::initializer_list<Record> records) {
    Array<Record> array;
    for (const Record& record : records) array.Append(record);
    return array;
}

template <class T>
RasterBandStats<T> StatsOf(std::uint32_t band, double mean) {
    RasterBandStats<T> stats;
    stats.band = band;
    stats.flags = StatsFlag::Mean;
    stats.mean = mean;
    return stats;
}

RGBAColor ColorOf(unsigned char r, unsigned char g, unsigned char b, unsigned char a) {
    unsigned char channels[4] = {r, g, b, a};
    return RGBAColor(Array<unsigned char>(channels, ArrayShape(4)));
}

// Captures what is written to the standard error stream while it lives.
class Stderr {
public:
    Stderr() { ::testing::internal::CaptureStderr(); }
    ~Stderr() {
        if (open) Text();
    }
    std::string Text() {
        open = false;
        return ::testing::internal::GetCapturedStderr();
    }

private:
    bool open = true;
};

class ArchiveTest : public ::testing::Test {
protected:
    using T = unsigned char;

    std::unique_ptr<PyramidDataset> Make(std::uint32_t pixelType = PixelTypeCode::Byte) {
        auto dataset = std::make_unique<PyramidDataset>(String(name.c_str()),
                                                        PyramidProps(10, 6, 2, pixelType));
        dataset->CreateFile(0, 0);
        EXPECT_TRUE(dataset->Writable);
        return dataset;
    }
    std::unique_ptr<PyramidDataset> Open() {
        auto dataset = std::make_unique<PyramidDataset>(String(name.c_str()));
        EXPECT_FALSE(dataset->ReadHeader()) << "false is success";
        return dataset;
    }
    // A finished file with this metadata document.
    void WriteFile(const std::string& document) {
        zmctest::WriteText(name, HeaderText().File() + document);
    }
    std::string DocumentText(const PyramidDataset& dataset) {
        const std::string bytes = zmctest::ReadText(name);
        return bytes.size() < dataset.MetaDocumentOffset ? std::string()
                                                         : bytes.substr(dataset.MetaDocumentOffset);
    }

    zmctest::ScratchDirectory folder;
    std::string name = (folder / "archive.pyr");
};

TEST_F(ArchiveTest, FileWithoutDocument) {
    const auto dataset = Make();
    EXPECT_FALSE(dataset->HasBandStats<T>(0));
    const RasterBandStats<T> stats = dataset->GetBandStats<T>(7);
    EXPECT_EQ(stats.band, 0u);
    EXPECT_EQ(stats.flags, 0u);
    EXPECT_EQ(dataset->GetHistograms<T>().shape.elements, 0u);
    const PalettePtr palette = dataset->GetPalette<T>(0);
    ASSERT_TRUE(palette);
    EXPECT_EQ(palette->nextIndex, 0u);
    EXPECT_TRUE(palette->colors.empty());
}

TEST_F(ArchiveTest, TreeIsThereAndEmptyFromTheStart) {
    PyramidDataset described(String(name.c_str()), PyramidProps(10, 6, 2, PixelTypeCode::Byte));
    PyramidDataset named{String(name.c_str())};
    for (PyramidDataset* dataset : {&described, &named}) {
        ASSERT_TRUE(dataset->MetaDocument);
        ASSERT_NE(dataset->MetaDocument->document, nullptr);
        EXPECT_EQ(dataset->MetaDocument->RecordCount(), 0u);
        EXPECT_TRUE(dataset->MetaDocument->WriteBandStatsElement(StatsOf<T>(0, 1)));
    }
    described.CreateFile(0, 0);
    EXPECT_TRUE(described.SetBandStats(Array<RasterBandStats<T>>()));
    EXPECT_TRUE(described.HasBandStats<T>(0));
    EXPECT_EQ(Open()->MetaDocument->RecordCount(), 1u);
}

// Opened before there was a document: its tree is the empty one, whatever others store meanwhile,
// and whether it has fetched that or not.
TEST_F(ArchiveTest, RecordsOfOthersDoNotJoinTheTree) {
    for (const bool fetches : {false, true}) {
        Make();
        const auto early = Open();
        EXPECT_TRUE(Open()->SetBandStats(ArrayOf({StatsOf<T>(1, 2.5)})));
        if (fetches) {
            EXPECT_TRUE(early->HasBandStats<T>(1));
        }
        EXPECT_TRUE(early->SetBandStats(ArrayOf({StatsOf<T>(0, 1)})));
        EXPECT_EQ(ValuesOf(DocumentText(*early), "RSTC_MEAN"), std::vector<std::string>{"1"});
    }
}

TEST_F(ArchiveTest, RecordThatWasOnlyFetchedIsNotStoredInTheNewFile) {
    Make();
    const auto early = Open();
    EXPECT_TRUE(Open()->SetBandStats(ArrayOf({StatsOf<T>(1, 2.5)})));
    EXPECT_TRUE(early->HasBandStats<T>(1));
    early->CreateFile(0, 0);
    EXPECT_TRUE(early->SetBandStats(ArrayOf({StatsOf<T>(0, 1)})));
    EXPECT_EQ(ValuesOf(DocumentText(*early), "RSTC_MEAN"), std::vector<std::string>{"1"});
}

// --- the tree of a document, which is made when it is asked for ---

std::string DocumentWith(const std::string& mean) {
    return "<DATASET><BANDSTATISTICS><RSTC_MEAN>" + mean +
           "</RSTC_MEAN></BANDSTATISTICS></DATASET>";
}

TEST_F(ArchiveTest, ReadingMakesNoTree) {
    WriteFile(DocumentWith("1"));
    const auto dataset = Open();
    EXPECT_TRUE(dataset->HasBandStats<T>(0));
    EXPECT_EQ(dataset->GetBandStats<T>(0).mean, 1);
    EXPECT_EQ(dataset->GetHistograms<T>().shape.elements, 0u);
    EXPECT_EQ(dataset->GetPalette<T>(0)->nextIndex, 0u);
    dataset->RefreshPyramidState();
    EXPECT_FALSE(dataset->MetaDocument.IsMade());
    EXPECT_TRUE(dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 2)})));
    EXPECT_TRUE(dataset->MetaDocument.IsMade());
}

TEST_F(ArchiveTest, TreeIsThatOfTheTextAtTheOpen) {
    WriteFile(DocumentWith("1"));
    for (const bool fetches : {false, true}) {
        const auto early = Open();
        WriteFile(DocumentWith("2"));
        EXPECT_EQ(fetches, fetches && early->LoadMetaDocument());
        EXPECT_EQ(early->GetBandStats<T>(0).mean, fetches ? 2 : 1);
        EXPECT_TRUE(early->SetBandStats(ArrayOf({StatsOf<T>(0, 3)})));
        EXPECT_EQ(ValuesOf(DocumentText(*early), "RSTC_MEAN"),
                  (std::vector<std::string>{"1", "3"}));
        WriteFile(DocumentWith("1"));
    }
}

TEST_F(ArchiveTest, TextThatAFetchHasDroppedMakesTheTree) {
    struct Throwing : xercesc::HandlerBase {
        void startElement(const XMLCh* const, xercesc::AttributeList&) override {
            throw std::bad_alloc();
        }
    } handlers;
    WriteFile(DocumentWith("1"));
    const auto early = Open();
    {
        Stderr messages;
        EXPECT_EQ(early->ParseDocument(&handlers, early->MetaSource, early->MetaLoaded),
                  PyramidDataset::kParseOutOfMemory);
    }
    EXPECT_EQ(early->MetaSource, nullptr);
    WriteFile(DocumentWith("2"));
    EXPECT_TRUE(early->SetBandStats(ArrayOf({StatsOf<T>(0, 3)})));
    EXPECT_EQ(ValuesOf(DocumentText(*early), "RSTC_MEAN"), (std::vector<std::string>{"1", "3"}));
}

TEST_F(ArchiveTest, TextThatWasDamagedAtTheOpenIsNeverGrown) {
    for (const char* const damaged : {"<DATASET>",
                                      "\x1A"
                                      "DATASET/>"}) {
        WriteFile(damaged);
        const auto early = Open();
        WriteFile(DocumentWith("2"));
        EXPECT_TRUE(early->LoadMetaDocument());
        EXPECT_TRUE(early->HasBandStats<T>(0)) << "fetches go by what is there";
        EXPECT_FALSE(early->SetBandStats(ArrayOf({StatsOf<T>(0, 3)})));
        EXPECT_EQ(early->MetaDocument->document, nullptr);
        EXPECT_EQ(DocumentText(*early), DocumentWith("2"));
    }
}

TEST_F(ArchiveTest, TreeThatNobodyAskedForOutlivesItsFile) {
    WriteFile(DocumentWith("1"));
    const auto made = Open();
    made->CreateFile(0, 0);
    EXPECT_TRUE(made->SetBandStats(ArrayOf({StatsOf<T>(0, 3)})));
    EXPECT_EQ(ValuesOf(DocumentText(*made), "RSTC_MEAN"), (std::vector<std::string>{"1", "3"}));
    WriteFile(DocumentWith("1"));
    const auto again = Open();
    WriteFile("");
    EXPECT_FALSE(again->ReadHeader()) << "false is success";
    EXPECT_EQ(again->MetaDocument->RecordCount(), 1u) << "a file without a document changes none";
}

TEST_F(ArchiveTest, TextsAreLetGoOfWhenTheyHaveServed) {
    WriteFile(DocumentWith("1"));
    const auto dataset = Open();
    const std::weak_ptr<xercesc::MemBufInputSource> text = dataset->MetaSource;
    EXPECT_FALSE(text.expired());
    EXPECT_TRUE(dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 2)})));
    EXPECT_TRUE(text.expired());
}

// In the same run, so that it holds on any machine: an open moves the bytes, and a tree is many
// times their work.
TEST_F(ArchiveTest, OpeningIsQuickerThanATree) {
    Palette palette;
    for (std::uint32_t i = 0; i < 65536; ++i) palette.AddColor(ColorOf(1, 2, 3, 4));
    ASSERT_TRUE(Make()->SetPalette(0, palette));
    const auto seconds = [](auto&& work) {
        const std::clock_t start = std::clock();
        work();
        return static_cast<double>(std::clock() - start) / CLOCKS_PER_SEC;
    };
    std::unique_ptr<PyramidDataset> dataset;
    double open = 1e9, tree = 1e9;
    for (int run = 0; run < 3; ++run) {
        open = std::min(open, seconds([&] { dataset = Open(); }));
        tree = std::min(tree, seconds([&] { dataset->MetaDocument.get(); }));
    }
    EXPECT_EQ(dataset->MetaDocument->RecordCount(), 1u);
    EXPECT_LT(open, tree / 2);
}

// Some bands of a level that is one tile go behind the tile, which is behind all tiles.
TEST_F(ArchiveTest, BytesBehindTheTilesDoNotStandInTheWayOfStores) {
    const auto dataset = Make();
    Array<int> second;
    second.Append(1);
    const std::vector<T> pixels(60, 0xEE);
    EXPECT_TRUE(dataset->WriteTileInterleaved(0, 0, 10, 6, second, 0, pixels.data()));
    EXPECT_GT(std::filesystem::file_size(name), dataset->TileDataEnd);
    EXPECT_TRUE(dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)})));
    EXPECT_TRUE(dataset->HasBandStats<T>(0));
    EXPECT_TRUE(Open()->HasBandStats<T>(0));
}

TEST_F(ArchiveTest, AnswersWithoutADocumentDiffer) {
    const auto dataset = Make();
    Array<RasterBandStats<T>> stats;
    Array<RasterBandHistogram<T>> histograms;
    histograms.Append(RasterBandHistogram<T>());
    Palette palette;
    palette.AddColor(ColorOf(1, 2, 3, 4));
    EXPECT_FALSE(dataset->LoadBandStats(stats));
    EXPECT_TRUE(dataset->LoadHistograms(histograms));
    EXPECT_EQ(histograms.shape.elements, 1u) << "untouched";
    EXPECT_TRUE(dataset->LoadPalette<T>(0, palette));
    EXPECT_EQ(palette.nextIndex, 1u) << "untouched";
}

TEST_F(ArchiveTest, RecordsAreFetchedByPosition) {
    const auto dataset = Make();
    EXPECT_TRUE(dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1), StatsOf<T>(1, 2)})));
    EXPECT_EQ(dataset->GetBandStats<T>(1).mean, 2);
    EXPECT_EQ(dataset->GetBandStats<T>(1).band, 1u);
}

TEST_F(ArchiveTest, NumberAndPositionDisagreeForASingleBand) {
    const auto dataset = Make();
    dataset->SetBandStats(ArrayOf({StatsOf<T>(1, 5)}));
    EXPECT_TRUE(dataset->HasBandStats<T>(1));
    EXPECT_FALSE(dataset->HasBandStats<T>(0));
    EXPECT_EQ(dataset->GetBandStats<T>(0).band, 1u);
    EXPECT_EQ(dataset->GetBandStats<T>(0).mean, 5);
}

TEST_F(ArchiveTest, BeyondTheRecordsIsTheDefault) {
    const auto dataset = Make();
    dataset->SetBandStats(ArrayOf({StatsOf<T>(1, 5)}));
    for (const int band : {1, 2, 1000000, -1}) {
        EXPECT_EQ(dataset->GetBandStats<T>(band).band, 0u);
        EXPECT_EQ(dataset->GetBandStats<T>(band).flags, 0u);
    }
}

TEST_F(ArchiveTest, FirstStatisticsStayInFront) {
    const auto dataset = Make();
    dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
    dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 2)}));
    EXPECT_EQ(dataset->GetBandStats<T>(0).mean, 1);
    EXPECT_EQ(ValuesOf(DocumentText(*dataset), "RSTC_MEAN"), (std::vector<std::string>{"1", "2"}));
}

TEST_F(ArchiveTest, LastPaletteWins) {
    const auto dataset = Make();
    Palette first, second;
    first.AddColor(ColorOf(1, 1, 1, 1));
    first.AddColor(ColorOf(2, 2, 2, 2));
    second.AddColor(ColorOf(9, 8, 7, 6));
    EXPECT_TRUE(dataset->SetPalette(1, first));
    EXPECT_TRUE(dataset->SetPalette(1, second));
    const PalettePtr palette = dataset->GetPalette<T>(1);
    EXPECT_EQ(palette->nextIndex, 1u);
    EXPECT_EQ(palette->GetColor(0)->red, 9);
    EXPECT_EQ(palette->GetColor(0)->alpha, 6);
    EXPECT_EQ(dataset->GetPalette<T>(0)->nextIndex, 0u);
}

TEST_F(ArchiveTest, HeldPaletteOutlivesTheNextFetch) {
    const auto dataset = Make();
    Palette stored;
    stored.AddColor(ColorOf(1, 2, 3, 4));
    dataset->SetPalette(0, stored);
    const PalettePtr held = dataset->GetPalette<T>(0);
    dataset->GetPalette<T>(1);
    EXPECT_EQ(held->GetColor(0)->green, 2);
    EXPECT_NE(held.Get(), dataset->CurrentPalette.Get());
}

TEST_F(ArchiveTest, HistogramKeepsItsLevelAndLosesItsSource) {
    const auto dataset = Make();
    RasterBandHistogram<T> histogram;
    histogram.band = 1;
    histogram.level = 2;
    histogram.source = HistogramSource::Native;
    histogram.type = 5;
    dataset->SetHistograms(ArrayOf({histogram, histogram}));
    const auto histograms = dataset->GetHistograms<T>();
    ASSERT_EQ(histograms.shape.elements, 2u);
    EXPECT_EQ(histograms.data[0].band, 1u);
    EXPECT_EQ(histograms.data[0].level, 2u);
    EXPECT_EQ(histograms.data[0].source, HistogramSource::ORVA);
    EXPECT_EQ(histograms.data[0].type, 0u);
}

TEST_F(ArchiveTest, RecordWithoutFlagsComesBackWithoutFlags) {
    const auto dataset = Make();
    RasterBandStats<T> stats;
    stats.band = 1;
    stats.mean = 3;
    dataset->SetBandStats(ArrayOf({stats}));
    EXPECT_EQ(dataset->GetBandStats<T>(0).band, 1u);
    EXPECT_EQ(dataset->GetBandStats<T>(0).flags, 0u);
    EXPECT_EQ(dataset->GetBandStats<T>(0).mean, 0);
}

TEST_F(ArchiveTest, StoreMakesAnUnfinishedFileLongEnough) {
    const auto dataset = Make();
    EXPECT_FALSE(dataset->HasPyramid);
    EXPECT_TRUE(dataset->SetBandStats(Array<RasterBandStats<T>>()));
    EXPECT_EQ(Compact(DocumentText(*dataset)), "<DATASET/>");
    EXPECT_FALSE(dataset->HasPyramid);
    dataset->RefreshPyramidState();
    EXPECT_TRUE(dataset->HasPyramid);
    EXPECT_EQ(dataset->MetaDocumentOffset, dataset->TileDataEnd);
}

TEST_F(ArchiveTest, FetchesComeFromTheFileAndConsecutiveOnesFromTheSource) {
    const auto dataset = Make();
    dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
    EXPECT_FALSE(dataset->MetaLoaded);
    EXPECT_TRUE(dataset->HasBandStats<T>(0));
    EXPECT_TRUE(dataset->MetaLoaded);
    std::filesystem::resize_file(name, dataset->MetaDocumentOffset);
    EXPECT_TRUE(dataset->HasBandStats<T>(0)) << "the text is kept until the next store";
    dataset->SetBandStats(Array<RasterBandStats<T>>());
    EXPECT_TRUE(dataset->HasBandStats<T>(0)) << "the tree keeps all that was stored";
}

TEST_F(ArchiveTest, ReadOnlyFileStoresNothing) {
    Make()->SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
    const std::string before = zmctest::ReadText(name);
    const auto dataset = Open();
    dataset->Writable = false;
    EXPECT_FALSE(dataset->SetBandStats(ArrayOf({StatsOf<T>(1, 1)})));
    EXPECT_FALSE(dataset->SetHistograms(Array<RasterBandHistogram<T>>()));
    EXPECT_FALSE(dataset->SetPalette(0, Palette()));
    EXPECT_EQ(zmctest::ReadText(name), before);
    EXPECT_TRUE(dataset->HasBandStats<T>(0));
    dataset->Writable = true;
    dataset->File.reset();
    EXPECT_FALSE(dataset->SetBandStats(ArrayOf({StatsOf<T>(1, 1)})));
}

TEST_F(ArchiveTest, ReopenedFileKeepsWhatItHeld) {
    Make()->SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
    {
        const auto dataset = Open();
        Palette palette;
        palette.AddColor(ColorOf(1, 2, 3, 4));
        EXPECT_TRUE(dataset->SetPalette(0, palette));
        EXPECT_TRUE(dataset->SetBandStats(ArrayOf({StatsOf<T>(1, 2)})));
    }
    const auto dataset = Open();
    EXPECT_EQ(Compact(DocumentText(*dataset)),
              "<DATASET>"
              "<BANDSTATISTICS><RSTC_BAND>0</RSTC_BAND><RSTC_LEVEL>0</RSTC_LEVEL>"
              "<RSTC_MEAN>1</RSTC_MEAN></BANDSTATISTICS>"
              "<PALETTE><PALETTE_BAND>0</PALETTE_BAND><PALETTE_COUNT>1</PALETTE_COUNT>"
              "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA></PALETTE>"
              "<BANDSTATISTICS><RSTC_BAND>1</RSTC_BAND><RSTC_LEVEL>0</RSTC_LEVEL>"
              "<RSTC_MEAN>2</RSTC_MEAN></BANDSTATISTICS></DATASET>");
    EXPECT_EQ(dataset->GetBandStats<T>(1).mean, 2);
}

TEST_F(ArchiveTest, NewFileTakesTheTreeAlong) {
    const auto dataset = Make();
    dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
    dataset->CreateFile(0, 0);
    dataset->SetBandStats(ArrayOf({StatsOf<T>(1, 2)}));
    EXPECT_EQ(ValuesOf(DocumentText(*dataset), "RSTC_MEAN"), (std::vector<std::string>{"1", "2"}));
}

TEST_F(ArchiveTest, RefusedRecordTakesItsStoreBack) {
    const auto dataset = Make();
    RasterBandHistogram<T> good, bad;
    bad.binCount = 4000000000u;
    EXPECT_FALSE(dataset->SetHistograms(ArrayOf({good, bad})));
    EXPECT_TRUE(dataset->SetHistograms(Array<RasterBandHistogram<T>>()));
    EXPECT_EQ(Compact(DocumentText(*dataset)), "<DATASET/>");
}

// Five bytes of text for each character, so that the document fills most of what it may.
TEST_F(ArchiveTest, RecordsThatMakeTheTextTooLongAreTakenBack) {
    const auto dataset = Make();
    xercesc::DOMDocument& tree = *dataset->EnsureMetaDocument()->document;
    const std::u16string text(kMaxDocumentBytes / 5 - 200, u'&');
    tree.getDocumentElement()->appendChild(tree.createTextNode(text.c_str()));
    RasterBandHistogram<T> histogram;
    histogram.binCount = 1000;
    EXPECT_FALSE(dataset->SetHistograms(ArrayOf({histogram})));
    EXPECT_EQ(std::filesystem::file_size(name), dataset->TileDataStart);
    EXPECT_EQ(dataset->MetaDocument->RecordCount(), 0u) << "shorter ones may still fit";
}

// --- all element types, with what is lost ---

template <class T>
std::vector<T> Extremes() {
    if constexpr (kIsComplex<T>) {
        using Part = decltype(T::re);
        return {T(Part(1.5), Part(2.5)), T(Part(-1) / 3, 0)};
    } else if constexpr (std::is_floating_point_v<T>) {
        return {T(0.1), T(-1) / 3, std::numeric_limits<T>::infinity(), T(1e30)};
    } else {
        return {std::numeric_limits<T>::min(), std::numeric_limits<T>::max(), T(77)};
    }
}

// What a pixel value is after its text: the digits of the type, through a double.
template <class T>
T AfterStore(const T& value) {
    if constexpr (kIsComplex<T>) {
        return FromDouble<T>(std::stod(FormatReal(value.re, 6)));
    } else if constexpr (std::is_floating_point_v<T>) {
        return static_cast<T>(std::stod(FormatReal(value, sizeof(T) == 4 ? 6 : 15)));
    } else if constexpr (sizeof(T) == 8) {
        const double real = static_cast<double>(value);
        if (real >= 18446744073709551616.0) return T(1) << 63;
        // The largest signed number rounds up to one that does not fit, which truncates to the
        // lowest.
        if (std::is_signed_v<T> && real >= 9223372036854775808.0)
            return std::numeric_limits<T>::min();
        return static_cast<T>(real);
    } else {
        return value;
    }
}

TEST_F(ArchiveTest, AllTypesThroughStoreAndReopen) {
    ForEachElementType([this](auto type) {
        using Pixel = typename decltype(type)::type;
        SCOPED_TRACE(ElementTraits<Pixel>::word);
        RasterBandStats<Pixel> stats;
        stats.band = 1;
        stats.count = 99;
        stats.flags = StatsFlag::All;
        stats.mean = 1.0 / 3;
        stats.standardDeviation = 1e-10;
        stats.sum = 123456789012345.0;
        stats.sumOfSquares = 1e300;
        stats.rootMeanSquare = -0.5;
        stats.sumXY.Append(1);
        stats.covariance.Append(2);
        RasterBandHistogram<Pixel> histogram;
        histogram.band = 1;
        histogram.level = 3;
        histogram.binSize = 0.1;
        histogram.binCount = 3;
        for (const std::uint64_t count :
             {std::uint64_t{5}, (std::uint64_t{1} << 53) + 1, std::uint64_t{1} << 60})
            histogram.counts.Append(count);
        Palette palette;
        palette.AddColor(ColorOf(0, 127, 128, 255));
        const auto extremes = Extremes<Pixel>();
        {
            const auto dataset = Make(ElementTraits<Pixel>::code);
            for (const Pixel& value : extremes) {
                stats.minimum = stats.maximum = value;
                histogram.minimum = histogram.maximum = value;
                EXPECT_TRUE(dataset->SetBandStats(ArrayOf({stats})));
                EXPECT_TRUE(dataset->SetHistograms(ArrayOf({histogram})));
            }
            EXPECT_TRUE(dataset->SetPalette(1, palette));
        }
        const auto dataset = Open();
        EXPECT_EQ(dataset->PixelType, ElementTraits<Pixel>::code);
        const auto histograms = dataset->template GetHistograms<Pixel>();
        ASSERT_EQ(histograms.shape.elements, extremes.size());
        for (std::uint32_t i = 0; i < extremes.size(); ++i) {
            const auto read = dataset->template GetBandStats<Pixel>(static_cast<int>(i));
            EXPECT_EQ(read.band, 1u);
            EXPECT_EQ(read.flags, StatsFlag::All);
            EXPECT_TRUE(read.minimum == AfterStore(extremes[i])) << i;
            EXPECT_TRUE(read.maximum == AfterStore(extremes[i])) << i;
            EXPECT_EQ(read.mean, 0.333333333333333);
            EXPECT_EQ(read.standardDeviation, 1e-10);
            EXPECT_EQ(read.sum, 123456789012345.0);
            EXPECT_EQ(read.sumOfSquares, 1e300);
            EXPECT_EQ(read.rootMeanSquare, -0.5);
            EXPECT_EQ(read.count, 0u);
            EXPECT_EQ(read.sumXY.shape.elements + read.covariance.shape.elements, 0u);
            const RasterBandHistogram<Pixel>& bins = histograms.data[i];
            EXPECT_EQ(bins.level, 3u);
            EXPECT_EQ(bins.binSize, 0.1);
            EXPECT_TRUE(bins.minimum == AfterStore(extremes[i])) << i;
            EXPECT_TRUE(bins.maximum == AfterStore(extremes[i])) << i;
            ASSERT_EQ(bins.counts.shape.elements, 3u);
            EXPECT_EQ(bins.counts.data[0], 5u);
            EXPECT_EQ(bins.counts.data[1], std::uint64_t{1} << 53) << "rounded to a double";
            EXPECT_EQ(bins.counts.data[2], std::uint64_t{1} << 60);
        }
        const PalettePtr colours = dataset->template GetPalette<Pixel>(1);
        ASSERT_EQ(colours->nextIndex, 1u);
        EXPECT_EQ(colours->GetColor(0)->green, 127);
        EXPECT_EQ(colours->GetColor(0)->blue, 128);
        EXPECT_EQ(colours->colors.size(), 2u) << "the count leaves a null colour behind";
    });
}

// --- documents that are not ours ---

TEST_F(ArchiveTest, UnparsableDocumentLeavesThePixels) {
    const std::string documents[] = {
        "<DATASET>", "garbage", "<DATASET/>\n</DATASET>", "<!DOCTYPE DATASET><DATASET/>",
        std::string("\0\0\0\0", 4), std::string("<DATASET/>\0", 11),
        std::string("<DATASET/>\n") + '\0' + "<BANDSTATISTICS/></DATASET>",
        // Beginnings of characters whose other bytes lie behind the end.
        "<DATASET/>\xFF", "<DATASET/>\n\xC3", "<DATASET/>\n\xF0\x9F\x97"};
    for (const std::string& document : documents) {
        SCOPED_TRACE(document);
        WriteFile(document);
        const std::string before = zmctest::ReadText(name);
        const auto dataset = Open();
        EXPECT_TRUE(dataset->HasPyramid);
        unsigned char pixel = 0;
        EXPECT_TRUE(dataset->ReadTile<T>(9, 5, 1, 1, Array<int>(), 0, &pixel));
        EXPECT_EQ(pixel, 1);
        ASSERT_TRUE(dataset->MetaDocument);
        EXPECT_EQ(dataset->MetaDocument->document, nullptr);
        EXPECT_FALSE(dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)})));
        EXPECT_FALSE(dataset->SetHistograms(Array<RasterBandHistogram<T>>()));
        EXPECT_FALSE(dataset->SetPalette(0, Palette()));
        EXPECT_EQ(zmctest::ReadText(name), before);
        Stderr messages;
        EXPECT_FALSE(dataset->HasBandStats<T>(0));
        EXPECT_EQ(dataset->GetBandStats<T>(0).flags, 0u);
        EXPECT_EQ(dataset->GetHistograms<T>().shape.elements, 0u);
        EXPECT_EQ(dataset->GetPalette<T>(0)->nextIndex, 0u);
        EXPECT_THAT(messages.Text(),
                    ::testing::StartsWith("\nFatal Error at file ORVAPYRMETA, line "));
    }
}

TEST_F(ArchiveTest, HugeDocumentIsNotLoadedAndNotOverwritten) {
    WriteFile("<DATASET/>");
    std::filesystem::resize_file(name, std::filesystem::file_size(name) + kMaxDocumentBytes);
    const auto dataset = Open();
    EXPECT_FALSE(dataset->MetaLoaded);
    EXPECT_EQ(dataset->MetaDocument->document, nullptr);
    EXPECT_FALSE(dataset->HasBandStats<T>(0));
    EXPECT_FALSE(dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)})));
}

// Its layout is not known, and the offset in its front may point anywhere, into the header as well.
TEST_F(ArchiveTest, FileOfTooLargeTilesIsNeverStoredTo) {
    HeaderText header;
    header.tileSize = PyramidDataset::kMaxTileSize + 1;
    for (const std::uint64_t offset : {std::uint64_t{0}, std::uint64_t{20}, std::uint64_t{600}}) {
        const std::string before = FileWithHeader(header.Text(), offset) + "<DATASET/>";
        zmctest::WriteText(name, before);
        const auto dataset = Open();
        EXPECT_FALSE(dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)})));
        EXPECT_FALSE(dataset->SetHistograms(Array<RasterBandHistogram<T>>()));
        EXPECT_FALSE(dataset->SetPalette(0, Palette()));
        EXPECT_EQ(zmctest::ReadText(name), before);
    }
}

TEST_F(ArchiveTest, RefusedDocumentIsLoadedAfreshAndRefusedAgain) {
    std::string deep;
    for (int i = 0; i < 100; ++i) deep += "<A>";
    WriteFile(deep);
    const auto dataset = Open();
    for (int i = 0; i < 2; ++i) {
        Stderr messages;
        EXPECT_FALSE(dataset->HasBandStats<T>(0));
        EXPECT_THAT(messages.Text(), ::testing::HasSubstr("nested too deeply"));
        EXPECT_FALSE(dataset->MetaLoaded);
        EXPECT_EQ(dataset->MetaSource, nullptr);
    }
}

TEST_F(ArchiveTest, LongerDocumentOfAnotherWriterIsReplacedWhole) {
    WriteFile("<?xml version='1.0' encoding='ISO-8859-1'?>" + std::string(3000, '\n') +
              "<DATASET>" + std::string(3000, ' ') + "<NOTE>caf\xE9</NOTE></DATASET>" +
              std::string(3000, '\n'));
    const auto size = std::filesystem::file_size(name);
    EXPECT_TRUE(Open()->SetBandStats(ArrayOf({StatsOf<T>(0, 1)})));
    const auto dataset = Open();
    EXPECT_TRUE(dataset->HasBandStats<T>(0));
    EXPECT_EQ(std::filesystem::file_size(name), size);
    EXPECT_THAT(DocumentText(*dataset), ::testing::HasSubstr("<NOTE>caf\xC3\xA9</NOTE>"));
}

// However far a store got before the process ended, its document is the old one, the new one, or
// none: never a part.
TEST_F(ArchiveTest, TornDocumentIsNeverHalfBelieved) {
    const auto dataset = Make();
    dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1), StatsOf<T>(1, 1)}));
    const std::string front = zmctest::ReadText(name).substr(0, dataset->MetaDocumentOffset);
    const std::string before = DocumentText(*dataset);
    dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 2), StatsOf<T>(1, 2)}));
    const std::string after = DocumentText(*dataset);
    ASSERT_GT(after.size(), before.size());
    Stderr messages;
    for (std::size_t written = 0; written <= after.size(); ++written) {
        const std::string rest = written < before.size() ? before.substr(written) : "";
        zmctest::WriteText(name, front + after.substr(0, written) + rest);
        PyramidDataset torn{String(name.c_str())};
        ASSERT_FALSE(torn.ReadHeader());
        Array<RasterBandStats<T>> stats;
        const bool loaded = torn.LoadBandStats(stats);
        const bool tree = torn.MetaDocument->document != nullptr;
        ASSERT_EQ(loaded, tree) << "what is not believed is not grown either";
        ASSERT_TRUE(!loaded || stats.shape.elements == 2 || stats.shape.elements == 4) << written;
    }
}

TEST_F(ArchiveTest, UnfinishedStoreIsNeitherBelievedNorGrown) {
    for (const std::string& document : {std::string("\x1A"), std::string("\x1A") + "DATASET/>",
                                        std::string(" \n\t"), std::string(200, '\n')}) {
        WriteFile(document);
        const std::string before = zmctest::ReadText(name);
        const auto dataset = Open();
        EXPECT_TRUE(dataset->HasPyramid);
        ASSERT_TRUE(dataset->MetaDocument);
        EXPECT_EQ(dataset->MetaDocument->document, nullptr);
        EXPECT_FALSE(dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)})));
        EXPECT_EQ(zmctest::ReadText(name), before);
        Stderr messages;
        EXPECT_FALSE(dataset->HasBandStats<T>(0));
        EXPECT_THAT(messages.Text(),
                    ::testing::StartsWith("\nFatal Error at file ORVAPYRMETA, line "));
    }
}

// A reader that came in the middle of a store sees its end.
TEST_F(ArchiveTest, TextUnderAStoreIsLoadedAgain) {
    const auto writer = Make();
    writer->SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
    const auto file = platform::File::Open(String(name.c_str()).wide, platform::File::Mode::Update);
    file->WriteAt(writer->MetaDocumentOffset, "\x1A", 1);
    const auto reader = Open();
    {
        Stderr messages;
        EXPECT_FALSE(reader->HasBandStats<T>(0));
        EXPECT_FALSE(reader->MetaLoaded);
    }
    file->WriteAt(writer->MetaDocumentOffset, "<", 1);
    EXPECT_TRUE(reader->HasBandStats<T>(0));
    EXPECT_TRUE(reader->MetaLoaded);
}

// The process may not make files longer than they are: as on a full disk.
TEST_F(ArchiveTest, FullDiskLosesNothing) {
    const auto dataset = Make();
    dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
    const std::string before = zmctest::ReadText(name);
    rlimit old{};
    ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &old), 0);
    const auto handler = std::signal(SIGXFSZ, SIG_IGN);
    for (const std::size_t room : {0u, 1u, 60u}) {
        const rlimit tight{before.size() + room, old.rlim_max};
        ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &tight), 0);
        dataset->SetBandStats(ArrayOf({StatsOf<T>(1, 2)}));
        setrlimit(RLIMIT_FSIZE, &old);
        EXPECT_EQ(zmctest::ReadText(name), before);
        EXPECT_TRUE(dataset->HasBandStats<T>(0));
        EXPECT_FALSE(dataset->HasBandStats<T>(1));
    }
    std::signal(SIGXFSZ, handler);
    EXPECT_TRUE(dataset->SetBandStats(Array<RasterBandStats<T>>()));
    EXPECT_TRUE(dataset->HasBandStats<T>(1)) << "the tree kept it";
}

// --- header documents ---

TEST_F(ArchiveTest, HeaderDocumentsThatAreRefused) {
    const std::string good = HeaderText().Text();
    const std::string documents[] = {"<DATASET>", "<!DOCTYPE DATASET>" + good,
                                     good + std::string(1, '\0'), std::string(40, '\0'),
                                     good + "\xE5\x9C"};
    for (const std::string& document : documents) {
        SCOPED_TRACE(document);
        zmctest::WriteText(name, FileWithHeader(document) + std::string(200, 'x'));
        Stderr messages;
        PyramidDataset dataset{String(name.c_str())};
        EXPECT_TRUE(dataset.ReadHeader()) << "true is failure";
        EXPECT_THAT(messages.Text(),
                    ::testing::StartsWith("\nFatal Error at file ORVAPYRHEADER, line "));
    }
}

TEST_F(ArchiveTest, HeaderRegionsThatAreRefused) {
    const std::uint64_t starts[] = {0, 19, 20, 1000, std::uint64_t{1} << 40, ~std::uint64_t{0}};
    for (const std::uint64_t start : starts) {
        zmctest::WriteText(name, "KOBT" + Bytes8(start) + Bytes8(0) + HeaderText().Text());
        PyramidDataset dataset{String(name.c_str())};
        EXPECT_TRUE(dataset.ReadHeader()) << start;
    }
}

TEST_F(ArchiveTest, HeaderLoadingAnswersInItsOwnSense) {
    zmctest::WriteText(name, HeaderText().File());
    PyramidDataset dataset{String(name.c_str())};
    PyramidHeaderRecord record;
    record.width = 77;
    EXPECT_FALSE(dataset.LoadHeaderDocument()) << "no file";
    EXPECT_FALSE(dataset.ParseHeaderDocument(record));
    ASSERT_TRUE(dataset.OpenFile(false));
    dataset.TileDataStart = 20;
    EXPECT_TRUE(dataset.LoadHeaderDocument()) << "an empty region";
    EXPECT_TRUE(dataset.ParseHeaderDocument(record)) << "and nothing is filled";
    EXPECT_EQ(record.width, 77u);
    dataset.TileDataStart = 20 + HeaderText().Text().size();
    EXPECT_FALSE(dataset.LoadHeaderDocument()) << "loaded";
    EXPECT_TRUE(dataset.HeaderLoaded);
    EXPECT_TRUE(dataset.ParseHeaderDocument(record));
    EXPECT_EQ(record.width, 10u);
}

// Whatever is done to a file, opening it and asking for everything ends, and ends well.
TEST_F(ArchiveTest, DamagedFilesAreOpenedOrRefused) {
    {
        const auto dataset = Make();
        RasterBandHistogram<T> histogram;
        histogram.binCount = 4;
        Palette palette;
        palette.AddColor(ColorOf(1, 2, 3, 4));
        dataset->SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
        dataset->SetHistograms(ArrayOf({histogram}));
        dataset->SetPalette(0, palette);
    }
    const std::string whole = zmctest::ReadText(name);
    std::mt19937 random(7);
    const auto below = [&](std::size_t n) { return random() % n; };
    Stderr messages;
    int opened = 0;
    for (int round = 0; round < 2000; ++round) {
        std::string bytes = whole;
        for (std::size_t change = 0; change <= below(3); ++change) {
            const std::size_t at = below(bytes.size()), length = below(12);
            switch (below(5)) {
                case 0:
                    bytes[at] = static_cast<char>(random());
                    break;
                case 1:
                    bytes[at] = "0123456789<>/|&"[below(15)];
                    break;
                case 2:
                    bytes.erase(at, length);
                    break;
                case 3:
                    bytes.insert(at, bytes.substr(below(bytes.size()), length));
                    break;
                default:
                    bytes.resize(std::max<std::size_t>(at, 1));
                    break;
            }
        }
        zmctest::WriteText(name, bytes);
        PyramidDataset dataset{String(name.c_str())};
        if (dataset.ReadHeader()) continue;
        ++opened;
        T pixels[64] = {};
        if (dataset.BytesPerSample == 1 && dataset.BandCount < 64)
            dataset.ReadTile<T>(0, 0, 1, 1, Array<int>(), 0, pixels);
        dataset.HasBandStats<T>(0);
        dataset.GetBandStats<T>(0);
        dataset.GetHistograms<T>();
        dataset.GetPalette<T>(0);
        dataset.SetBandStats(ArrayOf({StatsOf<T>(0, 1)}));
    }
    EXPECT_GT(opened, 200) << "most damage is behind the header";
    EXPECT_LT(opened, 2000);
}

}  // namespace
}  // namespace zmctest
