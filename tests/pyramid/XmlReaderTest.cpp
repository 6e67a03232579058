#include "format/PyramidXMLReaderHandlers.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <locale>
#include <memory>
#include <thread>

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/RuntimeException.hpp>

#include "pyramid/PyramidDataset.h"
#include "tests/support/ProcessorTime.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

using ::testing::HasSubstr;

DocumentSource SourceOf(const std::string& text, const char* name = "ORVAPYRMETA") {
    auto* bytes = new XMLByte[text.size() + 1];
    std::memcpy(bytes, text.data(), text.size());
    return std::make_unique<xercesc::MemBufInputSource>(bytes, text.size(), name, true);
}

class XmlReaderTest : public ::testing::Test {
protected:
    int Parse(const std::string& text, xercesc::HandlerBase* handlers) {
        source = SourceOf(text);
        loaded = true;
        return dataset.ParseDocument(handlers, source, loaded);
    }
    // Parses a document with these children of the root.
    template <class Handlers>
    int ParseRecords(const std::string& records, Handlers& handlers) {
        return Parse("<DATASET>" + records + "</DATASET>", &handlers);
    }

    PyramidDataset dataset{String("no file")};
    DocumentSource source;
    bool loaded = false;
};

std::string Histogram(const std::string& children) {
    return "<HISTOGRAMS>" + children + "</HISTOGRAMS>";
}
std::string Stats(const std::string& children) {
    return "<BANDSTATISTICS>" + children + "</BANDSTATISTICS>";
}

std::unique_ptr<Palette> PaletteOf(const ColorList& colors) {
    auto palette = std::make_unique<Palette>();
    colors.CopyTo(*palette);
    return palette;
}

std::vector<std::uint64_t> CountsOf(const RasterBandHistogram<int>& histogram) {
    return {histogram.counts.data, histogram.counts.data + histogram.counts.shape.elements};
}

TEST(ElementNames, StatesFollowTheListWithTwoExchanged) {
    EXPECT_EQ(StateOf(-1), 0);
    EXPECT_EQ(StateOf(ElementName::DATASET), 1);
    EXPECT_EQ(StateOf(ElementName::BANDSTATISTICS), 2);
    EXPECT_EQ(StateOf(ElementName::HISTOGRAMS), 3);
    EXPECT_EQ(StateOf(ElementName::HEADER), 4);
    EXPECT_EQ(StateOf(ElementName::PALETTE), 5);
    EXPECT_EQ(StateOf(ElementName::RSTC_LEVEL), 6);
    EXPECT_EQ(StateOf(ElementName::HIST_COUNTS), 25);
    EXPECT_EQ(StateOf(ElementName::HEADER_PIXEL_TYPE), 36);
    EXPECT_EQ(StateOf(ElementName::PALETTE_RGBA), 39);
    EXPECT_EQ(FindElementName(u"PALETTE_RGBA"), 38);
    EXPECT_EQ(FindElementName(u"palette_rgba"), -1);
    EXPECT_EQ(FindElementName(u""), -1);
}

TEST_F(XmlReaderTest, ReservedElementsParseAndAreDropped) {
    PyramidXMLReaderHandlers<int> handlers;
    EXPECT_EQ(ParseRecords(Stats("<RSTC_SUMXY>1</RSTC_SUMXY><RSTC_COV>2</RSTC_COV>") +
                               Histogram("<HIST_TYPE>3</HIST_TYPE>"),
                           handlers),
              0);
    ASSERT_EQ(handlers.bandStats.shape.elements, 1u);
    EXPECT_EQ(handlers.bandStats.data[0].sumXY.shape.elements, 0u);
    EXPECT_EQ(handlers.bandStats.data[0].covariance.shape.elements, 0u);
    EXPECT_EQ(handlers.bandStats.data[0].flags, 0u);
    EXPECT_EQ(handlers.histograms.data[0].type, 0u);
    EXPECT_TRUE(handlers.stateStack.empty());
}

TEST_F(XmlReaderTest, TwoStatisticsOfABandStandInDocumentOrder) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(Stats("<RSTC_BAND>0</RSTC_BAND><RSTC_MEAN>1.5</RSTC_MEAN>") +
                     Stats("<RSTC_BAND>0</RSTC_BAND><RSTC_MEAN>2.5</RSTC_MEAN>"),
                 handlers);
    ASSERT_EQ(handlers.bandStats.shape.elements, 2u);
    EXPECT_EQ(handlers.bandStats.data[0].mean, 1.5);
    EXPECT_EQ(handlers.bandStats.data[1].mean, 2.5);
}

TEST_F(XmlReaderTest, LaterPaletteOfABandWins) {
    PyramidXMLReaderHandlers<int> handlers;
    const std::string band = "<PALETTE_BAND>0</PALETTE_BAND>";
    ParseRecords("<PALETTE>" + band +
                     "<PALETTE_RGBA>1|1|1|1</PALETTE_RGBA>"
                     "<PALETTE_RGBA>2|2|2|2</PALETTE_RGBA></PALETTE><PALETTE>" +
                     band + "<PALETTE_RGBA>3|4|5|6</PALETTE_RGBA></PALETTE>",
                 handlers);
    ASSERT_EQ(handlers.palettes.size(), 1u);
    EXPECT_EQ(handlers.palettes[0].Colors().size(), 1u);
    EXPECT_EQ(PaletteOf(handlers.palettes[0])->GetColor(0)->blue, 5);
}

TEST_F(XmlReaderTest, ColoursCountFromTheLastBeginningOfAPalette) {
    const std::string colour = "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA>";
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(colour + "<PALETTE/>", handlers);
    EXPECT_EQ(handlers.palettes[0].Colors().size(), 0u);
    ParseRecords("<PALETTE>" + colour + "<PALETTE>" + colour + "</PALETTE>" + colour + "</PALETTE>",
                 handlers);
    EXPECT_EQ(handlers.palettes[0].Colors().size(), 2u);
    // No element has to stand in its parent.
    ParseRecords(colour + colour, handlers);
    EXPECT_EQ(handlers.currentPalette.Colors().size(), 4u);
    EXPECT_EQ(handlers.palettes[0].Colors().size(), 2u);
}

// Sixty copies of a palette of some megabytes took gigabytes.
TEST_F(XmlReaderTest, PalettesWithinPalettesShareTheirColours) {
    constexpr std::uint32_t kDepth = 60;
    std::string text;
    for (std::uint32_t i = 0; i < kDepth; ++i) text += "<PALETTE>";
    for (std::uint32_t i = 0; i < kDepth; ++i)
        text += "<PALETTE_RGBA>" + std::to_string(i) + "</PALETTE_RGBA><PALETTE_BAND>" +
                std::to_string(i) + "</PALETTE_BAND></PALETTE>";
    PyramidXMLReaderHandlers<int> handlers;
    ASSERT_EQ(ParseRecords(text, handlers), 0);
    ASSERT_EQ(handlers.palettes.size(), kDepth);
    const auto all = handlers.palettes[kDepth - 1].Colors();
    for (std::uint32_t i = 0; i < kDepth; ++i) {
        const auto colors = handlers.palettes[i].Colors();
        ASSERT_EQ(colors.size(), i + 1);
        EXPECT_EQ(colors.back(), ColorList::Pack(static_cast<std::uint8_t>(i), 0, 0, 0));
        EXPECT_EQ(colors.data(), all.data());
    }
}

// A PALETTE without a number takes that of the one before, wherever that stood.
TEST_F(XmlReaderTest, BandOfAPaletteIsTheLastOneTold) {
    const auto palette = [](const std::string& children) {
        return "<PALETTE>" + children + "</PALETTE>";
    };
    const auto colours = [](std::size_t count) {
        std::string text;
        for (; count > 0; --count) text += "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA>";
        return text;
    };
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(palette(colours(1)) + palette("<PALETTE_BAND>3</PALETTE_BAND>" + colours(2)) +
                     palette(colours(3)) + "<PALETTE_BAND>5</PALETTE_BAND>" + palette(colours(4)),
                 handlers);
    ASSERT_EQ(handlers.palettes.size(), 3u);
    EXPECT_EQ(handlers.palettes[0].Colors().size(), 1u);
    EXPECT_EQ(handlers.palettes[3].Colors().size(), 3u) << "the later one of that band";
    EXPECT_EQ(handlers.palettes[5].Colors().size(), 4u) << "told outside of any palette";
}

TEST_F(XmlReaderTest, EveryStatisticHasItsFieldAndFlag) {
    PyramidXMLReaderHandlers<short> handlers;
    ParseRecords(Stats("<RSTC_RMS>7</RSTC_RMS><RSTC_SUM2>6</RSTC_SUM2><RSTC_SUM>5</RSTC_SUM>"
                       "<RSTC_STANDARDDEVIATION>4</RSTC_STANDARDDEVIATION><RSTC_MEAN>3</RSTC_MEAN>"
                       "<RSTC_MAXIMUM>2</RSTC_MAXIMUM><RSTC_MINIMUM>1</RSTC_MINIMUM>"
                       "<RSTC_LEVEL>9</RSTC_LEVEL><RSTC_BAND>8</RSTC_BAND>"),
                 handlers);
    const RasterBandStats<short>& stats = handlers.bandStats.data[0];
    EXPECT_EQ(stats.flags, StatsFlag::All);
    EXPECT_EQ(stats.band, 8u);
    EXPECT_EQ(stats.minimum, 1);
    EXPECT_EQ(stats.maximum, 2);
    EXPECT_EQ(stats.mean, 3);
    EXPECT_EQ(stats.standardDeviation, 4);
    EXPECT_EQ(stats.sum, 5);
    EXPECT_EQ(stats.sumOfSquares, 6);
    EXPECT_EQ(stats.rootMeanSquare, 7);
}

TEST_F(XmlReaderTest, MissingValuesAreDefaults) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(Stats("") + Histogram("") + "<PALETTE></PALETTE>", handlers);
    EXPECT_EQ(handlers.bandStats.data[0].band, 0u);
    EXPECT_EQ(handlers.bandStats.data[0].flags, 0u);
    const RasterBandHistogram<int>& histogram = handlers.histograms.data[0];
    EXPECT_EQ(histogram.band + histogram.level + histogram.binCount + histogram.source, 0u);
    EXPECT_EQ(histogram.binSize, 0);
    EXPECT_EQ(histogram.counts.shape.elements, 0u);
    ASSERT_EQ(handlers.palettes.count(0), 1u);
    EXPECT_EQ(handlers.palettes[0].Colors().size(), 0u);
}

TEST_F(XmlReaderTest, PixelValuesAreTruncatedAndCut) {
    PyramidXMLReaderHandlers<unsigned char> bytes;
    const std::string text = Stats(
        "<RSTC_MINIMUM>-1.9</RSTC_MINIMUM><RSTC_MAXIMUM>300.7"
        "</RSTC_MAXIMUM>");
    ParseRecords(text, bytes);
    EXPECT_EQ(bytes.bandStats.data[0].minimum, 255);
    EXPECT_EQ(bytes.bandStats.data[0].maximum, 44);
    PyramidXMLReaderHandlers<Complex<double>> complex;
    ParseRecords(Stats("<RSTC_MINIMUM>1.5 2.5</RSTC_MINIMUM>"), complex);
    EXPECT_TRUE(complex.bandStats.data[0].minimum == Complex<double>(1.5, 0));
    PyramidXMLReaderHandlers<std::uint64_t> wide;
    ParseRecords(Stats("<RSTC_MAXIMUM>13835058055282163712</RSTC_MAXIMUM>"), wide);
    EXPECT_EQ(wide.bandStats.data[0].maximum, 13835058055282163712u);
}

TEST_F(XmlReaderTest, ValuesWithoutDigitsAreZero) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(Stats("<RSTC_MEAN>abc</RSTC_MEAN><RSTC_BAND>x1</RSTC_BAND>"), handlers);
    EXPECT_EQ(handlers.bandStats.data[0].mean, 0);
    EXPECT_EQ(handlers.bandStats.data[0].flags, StatsFlag::Mean);
    EXPECT_EQ(handlers.bandStats.data[0].band, 0u);
}

TEST_F(XmlReaderTest, HistogramSourcesAreComparedExactly) {
    PyramidXMLReaderHandlers<int> handlers;
    std::string text;
    for (const char* word : {"Native", "Dynamic", "ORVA", "native", " ORVA", ""})
        text += Histogram(std::string("<HIST_SOURCE>") + word + "</HIST_SOURCE>");
    ParseRecords(text, handlers);
    const std::uint32_t expected[] = {1, 2, 3, 0, 0, 0};
    for (std::uint32_t i = 0; i < 6; ++i)
        EXPECT_EQ(handlers.histograms.data[i].source, expected[i]);
}

struct CountsCase {
    const char* bins;
    const char* text;
    std::vector<std::uint64_t> expected;
};

TEST_F(XmlReaderTest, HistogramCounts) {
    const CountsCase cases[] = {
        {"3", "1|2|3|4|5", {1, 2, 3}},
        {"3", "1", {1, 0, 0}},
        {"3", "||7", {0, 0, 7}},
        {"2", "1.9|-1", {1, 18446744073709551615u}},
        {"1", "18446744073709551615", {9223372036854775808u}},
        {"2", "9007199254740993|9223372036854777856", {9007199254740992u, 9223372036854777856u}},
        {"0", "1|2", {}},
    };
    for (const CountsCase& c : cases) {
        PyramidXMLReaderHandlers<int> handlers;
        ParseRecords(Histogram(std::string("<HIST_BINCOUNT>") + c.bins +
                               "</HIST_BINCOUNT><HIST_COUNTS>" + c.text + "</HIST_COUNTS>"),
                     handlers);
        EXPECT_EQ(CountsOf(handlers.histograms.data[0]), c.expected) << c.bins << ": " << c.text;
    }
}

TEST_F(XmlReaderTest, CountsBeforeTheirNumberAreDropped) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(Histogram("<HIST_COUNTS>1|2</HIST_COUNTS><HIST_BINCOUNT>2</HIST_BINCOUNT>"),
                 handlers);
    EXPECT_EQ(handlers.histograms.data[0].binCount, 2u);
    EXPECT_EQ(handlers.histograms.data[0].counts.shape.elements, 0u);
}

TEST_F(XmlReaderTest, EachPieceOfAListStartsAgain) {
    PyramidXMLReaderHandlers<int> handlers;
    // A new piece begins with a character reference.
    ParseRecords(Histogram("<HIST_BINCOUNT>3</HIST_BINCOUNT>"
                           "<HIST_COUNTS>1|2|3&#52;|5</HIST_COUNTS>"),
                 handlers);
    EXPECT_EQ(CountsOf(handlers.histograms.data[0]), (std::vector<std::uint64_t>{4, 5, 3}));
}

TEST_F(XmlReaderTest, LastPieceOfANumberCounts) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(Stats("<RSTC_MEAN>12&#51;45</RSTC_MEAN>"), handlers);
    EXPECT_EQ(handlers.bandStats.data[0].mean, 345);
}

TEST_F(XmlReaderTest, LaterListUnderAnotherNumberStaysInItsArray) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(Histogram("<HIST_BINCOUNT>2</HIST_BINCOUNT><HIST_COUNTS>1|2</HIST_COUNTS>"
                           "<HIST_BINCOUNT>9</HIST_BINCOUNT><HIST_COUNTS>3|4|5</HIST_COUNTS>"),
                 handlers);
    EXPECT_EQ(CountsOf(handlers.histograms.data[0]), (std::vector<std::uint64_t>{3, 4}));
}

TEST_F(XmlReaderTest, ImpossibleNumberOfBinsKeepsNoCounts) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(Histogram("<HIST_BINCOUNT>4000000000</HIST_BINCOUNT>"
                           "<HIST_COUNTS>1|2</HIST_COUNTS>"),
                 handlers);
    EXPECT_EQ(handlers.histograms.data[0].binCount, 4000000000u);
    EXPECT_EQ(handlers.histograms.data[0].counts.data, nullptr);
}

TEST_F(XmlReaderTest, SpareBinsAreSharedByTheHistogramsOfADocument) {
    PyramidXMLReaderHandlers<int> handlers;
    std::string text;
    for (int i = 0; i < 3; ++i)
        text += Histogram("<HIST_BINCOUNT>" + std::to_string(kSpareBins / 2 + 1) +
                          "</HIST_BINCOUNT><HIST_COUNTS>1</HIST_COUNTS>");
    ParseRecords(text, handlers);
    EXPECT_EQ(handlers.histograms.data[0].counts.shape.elements, kSpareBins / 2 + 1);
    EXPECT_EQ(handlers.histograms.data[1].counts.shape.elements, kSpareBins / 2 + 1);
    EXPECT_EQ(handlers.histograms.data[2].counts.shape.elements, 0u);
}

TEST_F(XmlReaderTest, PaletteCountLeavesANullColourAndNoLength) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(
        "<PALETTE><PALETTE_BAND>2</PALETTE_BAND><PALETTE_COUNT>2</PALETTE_COUNT>"
        "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA><PALETTE_RGBA>5|6|7|8</PALETTE_RGBA>"
        "</PALETTE>",
        handlers);
    const auto palette = PaletteOf(handlers.palettes[2]);
    EXPECT_EQ(palette->nextIndex, 2u);
    ASSERT_EQ(palette->colors.size(), 3u);
    EXPECT_EQ(palette->GetColor(2)->isNull, 1);
    EXPECT_EQ(palette->GetColor(1)->alpha, 8);
}

TEST_F(XmlReaderTest, ColourChannels) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(
        "<PALETTE><PALETTE_RGBA>1|2</PALETTE_RGBA>"
        "<PALETTE_RGBA>300|-1|1.9|x|9</PALETTE_RGBA></PALETTE>",
        handlers);
    const auto palette = PaletteOf(handlers.palettes[0]);
    const Color& shortOne = *palette->GetColor(0);
    EXPECT_EQ(shortOne.red, 1);
    EXPECT_EQ(shortOne.green, 2);
    EXPECT_EQ(shortOne.blue, 0);
    EXPECT_EQ(shortOne.alpha, 0);
    const Color& cut = *palette->GetColor(1);
    EXPECT_EQ(cut.red, 44);
    EXPECT_EQ(cut.green, 255);
    EXPECT_EQ(cut.blue, 1);
    EXPECT_EQ(cut.alpha, 0);
}

TEST_F(XmlReaderTest, ValuesOutsideTheirParentsMakeNoRecords) {
    PyramidXMLReaderHandlers<int> handlers;
    EXPECT_EQ(ParseRecords("<RSTC_MEAN>1</RSTC_MEAN><RSTC_BAND>1</RSTC_BAND>"
                           "<HIST_BINCOUNT>3</HIST_BINCOUNT><HIST_COUNTS>1|2|3</HIST_COUNTS>"
                           "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA><PALETTE_BAND>6</PALETTE_BAND>"
                           "<PALETTE_COUNT>6</PALETTE_COUNT><PALETTE/>",
                           handlers),
              0);
    EXPECT_EQ(handlers.bandStats.shape.elements, 0u);
    EXPECT_EQ(handlers.histograms.shape.elements, 0u);
    ASSERT_EQ(handlers.palettes.size(), 1u);
    ASSERT_EQ(handlers.palettes.count(6), 1u);
    EXPECT_TRUE(PaletteOf(handlers.palettes[6])->colors.empty())
        << "but the number of a band counts anywhere";
}

TEST_F(XmlReaderTest, RecordsWithinRecordsDoNotCrash) {
    PyramidXMLReaderHandlers<int> handlers;
    EXPECT_EQ(ParseRecords(Stats(Stats("<RSTC_BAND>1</RSTC_BAND>") + "<RSTC_BAND>2</RSTC_BAND>") +
                               Histogram(Histogram("") + "<HIST_BAND>2</HIST_BAND>"),
                           handlers),
              0);
    ASSERT_EQ(handlers.bandStats.shape.elements, 1u);
    EXPECT_EQ(handlers.bandStats.data[0].band, 1u);
    EXPECT_EQ(handlers.histograms.shape.elements, 1u);
}

TEST_F(XmlReaderTest, UnknownElementsLoseTheirTextAndKeepTheirChildren) {
    PyramidXMLReaderHandlers<int> handlers;
    ParseRecords(
        "<NEW>1" + Stats("<OTHER>5</OTHER><WRAP><RSTC_BAND>4</RSTC_BAND></WRAP>") + "</NEW>",
        handlers);
    ASSERT_EQ(handlers.bandStats.shape.elements, 1u);
    EXPECT_EQ(handlers.bandStats.data[0].band, 4u);
}

TEST_F(XmlReaderTest, HeaderElementsActAnywhere) {
    PyramidXMLReaderHandlers<char> handlers;
    ParseRecords(Stats("<HEADER_BANDS>12</HEADER_BANDS>"), handlers);
    EXPECT_EQ(handlers.header.bandCount, 12u);
    EXPECT_EQ(handlers.header.width, 0u) << "what is missing is zero";
}

TEST_F(XmlReaderTest, HeaderFields) {
    PyramidXMLReaderHandlers<char> handlers;
    HeaderText text;
    text.versionMajor = 3;
    text.versionMinor = 4;
    text.bands = 5;
    text.width = 4294967295u;
    text.height = 7;
    text.tileSize = 8;
    text.levelMin = 9;
    text.levelMax = 10;
    text.interleave = " BIL\n";
    text.ordering = "Morton";
    text.pixelType = "USHORT";
    EXPECT_EQ(Parse(text.Text(), &handlers), 0);
    EXPECT_EQ(handlers.header.versionMajor, 3u);
    EXPECT_EQ(handlers.header.versionMinor, 4u);
    EXPECT_EQ(handlers.header.bandCount, 5u);
    EXPECT_EQ(handlers.header.width, 4294967295u);
    EXPECT_EQ(handlers.header.height, 7u);
    EXPECT_EQ(handlers.header.tileSize, 8u);
    EXPECT_EQ(handlers.header.levelMin, 9u);
    EXPECT_EQ(handlers.header.levelMax, 10u);
    EXPECT_EQ(handlers.header.interleave, 1);
    EXPECT_EQ(handlers.header.tileOrdering, 2u);
    EXPECT_EQ(handlers.header.pixelType, 12u);
}

TEST_F(XmlReaderTest, HeaderWordsThatAreNotKnown) {
    for (const char* word : {"bip", "Unknown", "", "B\xC3\x8EP"}) {
        PyramidXMLReaderHandlers<char> handlers;
        HeaderText text;
        text.interleave = text.ordering = text.pixelType = word;
        handlers.header.interleave = -1;
        EXPECT_EQ(Parse(text.Text(), &handlers), 0);
        EXPECT_EQ(handlers.header.interleave, -1);
        EXPECT_EQ(handlers.header.tileOrdering, 0u);
        EXPECT_EQ(handlers.header.pixelType, 0u);
    }
}

TEST_F(XmlReaderTest, PendingRecordsGoWithTheHandlers) {
    PyramidXMLReaderHandlers<int> handlers;
    ::testing::internal::CaptureStderr();
    EXPECT_EQ(Parse("<DATASET><BANDSTATISTICS><RSTC_BAND>1", &handlers), 4);
    ::testing::internal::GetCapturedStderr();
    EXPECT_NE(handlers.pendingStats, nullptr);
}

TEST_F(XmlReaderTest, NullHandlersParseForNothing) {
    ::testing::internal::CaptureStderr();
    EXPECT_EQ(Parse("<DATASET/>", nullptr), 0);
    EXPECT_EQ(Parse("<DATASET>", nullptr), 4);
    EXPECT_EQ(Parse("<!DOCTYPE DATASET><DATASET/>", nullptr), 4);
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "");
}

TEST_F(XmlReaderTest, FatalErrorsAreToldWithTheirPlace) {
    PyramidXMLReaderHandlers<int> handlers;
    ::testing::internal::CaptureStderr();
    EXPECT_EQ(Parse("<DATASET>\n<A></B>\n</DATASET>", &handlers), 4);
    const std::string text = ::testing::internal::GetCapturedStderr();
    EXPECT_THAT(text, ::testing::StartsWith("\nFatal Error at file ORVAPYRMETA, line 2, char "));
    EXPECT_THAT(text, HasSubstr("\n Message: "));
    EXPECT_EQ(text.back(), '\n');
    EXPECT_NE(source, nullptr) << "a parse that ends by itself keeps its source";
    EXPECT_TRUE(loaded);
}

// The callbacks differ in their heading alone.
TEST_F(XmlReaderTest, MessagesOfTheThreeCallbacks) {
    PyramidXMLReaderHandlers<int> handlers;
    const xercesc::SAXParseException fault(u"caf\u00e9", u"", u"some file", 3, 14);
    ::testing::internal::CaptureStderr();
    handlers.warning(fault);
    handlers.error(fault);
    handlers.fatalError(fault);
    const std::string tail = " at file some file, line 3, char 14\n Message: caf\xC3\xA9\n";
    EXPECT_EQ(::testing::internal::GetCapturedStderr(),
              "\nWarning" + tail + "\nError" + tail + "\nFatal Error" + tail);
}

struct Throwing : xercesc::HandlerBase {
    int kind = 0;
    void startElement(const XMLCh* const, xercesc::AttributeList&) override {
        if (kind == 0) throw xercesc::OutOfMemoryException();
        if (kind == 1) throw std::bad_alloc();
        throw 7;
    }
};

TEST_F(XmlReaderTest, ExceptionsForgetTheSource) {
    Throwing handlers;
    ::testing::internal::CaptureStderr();
    EXPECT_EQ(Parse("<DATASET/>", &handlers), 5);
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "OutOfMemoryException\n");
    EXPECT_EQ(source, nullptr);
    EXPECT_FALSE(loaded);
    EXPECT_EQ(dataset.ParseDocument(&handlers, source, loaded), 4) << "and asking again is safe";
    ::testing::internal::CaptureStderr();
    handlers.kind = 1;
    EXPECT_EQ(Parse("<DATASET/>", &handlers), 5);
    handlers.kind = 2;
    EXPECT_EQ(Parse("<DATASET/>", &handlers), 4);
    ::testing::internal::GetCapturedStderr();
    EXPECT_EQ(source, nullptr);
    PyramidXMLReaderHandlers<int> good;
    EXPECT_EQ(Parse("<DATASET/>", &good), 0) << "the parser is as good as new";
}

struct BadSource : xercesc::MemBufInputSource {
    BadSource() : MemBufInputSource(reinterpret_cast<const XMLByte*>("<A/>"), 4, "bad") {}
    xercesc::BinInputStream* makeStream() const override {
        throw xercesc::RuntimeException(__FILE__, __LINE__,
                                        xercesc::XMLExcepts::Gen_NoDTDValidator);
    }
};

TEST_F(XmlReaderTest, XmlExceptionOutOfTheParse) {
    PyramidXMLReaderHandlers<int> handlers;
    source = std::make_unique<BadSource>();
    loaded = true;
    ::testing::internal::CaptureStderr();
    EXPECT_EQ(dataset.ParseDocument(&handlers, source, loaded), 4);
    const std::string text = ::testing::internal::GetCapturedStderr();
    EXPECT_FALSE(text.empty());
}

// --- documents made to harm ---

TEST_F(XmlReaderTest, DocumentTypesAreRefused) {
    zmctest::ScratchDirectory folder;
    zmctest::WriteText((folder / "secret"), "1");
    const std::string documents[] = {
        "<!DOCTYPE DATASET><DATASET/>",
        "<!DOCTYPE DATASET SYSTEM \"file://" + (folder / "secret") + "\"><DATASET/>",
        "<!DOCTYPE DATASET [<!ENTITY a \"1\">]><DATASET>&a;</DATASET>",
        "<!DOCTYPE DATASET [<!ENTITY a SYSTEM \"file://" + (folder / "secret") + "\">]><DATASET>" +
            Stats("<RSTC_BAND>&a;</RSTC_BAND>") + "</DATASET>",
    };
    for (const std::string& text : documents) {
        PyramidXMLReaderHandlers<int> handlers;
        ::testing::internal::CaptureStderr();
        EXPECT_EQ(Parse(text, &handlers), 4) << text;
        EXPECT_THAT(::testing::internal::GetCapturedStderr(), HasSubstr("\nFatal Error at file"));
        EXPECT_EQ(handlers.bandStats.shape.elements, 0u);
    }
}

// Seconds that a parse takes which is expected to be refused.
class HostileDocumentTest : public XmlReaderTest {
protected:
    double RefusalSeconds(const std::string& text) {
        PyramidXMLReaderHandlers<int> handlers;
        ::testing::internal::CaptureStderr();
        const ProcessorTime time;
        EXPECT_EQ(Parse(text, &handlers), 4);
        EXPECT_THAT(::testing::internal::GetCapturedStderr(), HasSubstr("\nFatal Error at file"));
        EXPECT_EQ(source, nullptr);
        EXPECT_FALSE(loaded);
        return time.Seconds();
    }
};

TEST_F(HostileDocumentTest, NestOfEntities) {
    std::string text = "<!DOCTYPE DATASET [<!ENTITY e0 \"x\">";
    for (int i = 1; i < 30; ++i) {
        text += "<!ENTITY e" + std::to_string(i) + " \"";
        for (int k = 0; k < 10; ++k) text += "&e" + std::to_string(i - 1) + ";";
        text += "\">";
    }
    PyramidXMLReaderHandlers<int> handlers;
    ::testing::internal::CaptureStderr();
    EXPECT_EQ(Parse(text + "]><DATASET>&e29;</DATASET>", &handlers), 4);
    ::testing::internal::GetCapturedStderr();
}

// The list of one histogram may lack 1,048,576 bins, and not one more.
TEST_F(XmlReaderTest, SpareBinsEndAtTheirLimit) {
    for (const std::uint32_t bins : {1048578u, 1048579u}) {
        PyramidXMLReaderHandlers<int> handlers;
        ParseRecords(Histogram("<HIST_BINCOUNT>" + std::to_string(bins) +
                               "</HIST_BINCOUNT><HIST_COUNTS>3|4</HIST_COUNTS>"),
                     handlers);
        const auto& histogram = handlers.histograms.data[0];
        EXPECT_EQ(histogram.binCount, bins);
        EXPECT_EQ(histogram.counts.shape.elements, bins == 1048578 ? bins : 0u);
    }
}

// The parser hands over a text in pieces of about a million characters, and every piece of a list
// begins again with the first bin.
TEST_F(XmlReaderTest, LongListsKeepTheirBinsAndMixTheirCounts) {
    for (const std::uint32_t bins : {500000u, 600000u, 1700000u}) {
        std::vector<std::uint64_t> written;
        std::string list;
        for (std::uint32_t i = 0; i < bins; ++i) {
            written.push_back(i % 9 + 1);
            list += (i == 0 ? "" : "|") + std::to_string(written.back());
        }
        PyramidXMLReaderHandlers<int> handlers;
        ParseRecords(Histogram("<HIST_BINCOUNT>" + std::to_string(bins) +
                               "</HIST_BINCOUNT><HIST_COUNTS>" + list + "</HIST_COUNTS>"),
                     handlers);
        ASSERT_EQ(handlers.histograms.shape.elements, 1u);
        EXPECT_EQ(handlers.histograms.data[0].binCount, bins);
        const std::vector<std::uint64_t> counts = CountsOf(handlers.histograms.data[0]);
        ASSERT_EQ(counts.size(), bins);
        EXPECT_EQ(counts == written, bins == 500000);
        EXPECT_EQ(counts.back() != 0, bins == 500000) << "behind the longest piece are zeros";
    }
}

// All pieces of a list count for its entries, wherever they begin.
TEST_F(XmlReaderTest, SpareBinsAreCountedOverTheWholeList) {
    for (const std::uint64_t bins : {kSpareBins + 4, kSpareBins + 5}) {
        PyramidXMLReaderHandlers<int> handlers;
        ParseRecords(Histogram("<HIST_BINCOUNT>" + std::to_string(bins) +
                               "</HIST_BINCOUNT><HIST_COUNTS>3<!-- -->|4<A/>|5|6</HIST_COUNTS>"),
                     handlers);
        EXPECT_EQ(handlers.histograms.data[0].counts.shape.elements,
                  bins == kSpareBins + 4 ? bins : 0u);
    }
}

TEST_F(HostileDocumentTest, DeepNesting) {
    std::string text;
    for (int i = 0; i < 200000; ++i) text += "<A>";
    EXPECT_LT(RefusalSeconds(text), 5);
}

TEST_F(HostileDocumentTest, ManyNames) {
    std::string text = "<DATASET>";
    for (int i = 0; i < 200000; ++i) text += "<N" + std::to_string(i) + "/>";
    EXPECT_LT(RefusalSeconds(text + "</DATASET>"), 5);
}

TEST_F(HostileDocumentTest, ManyAttributes) {
    std::string text = "<DATASET";
    for (int i = 0; i < 20000; ++i) text += " a" + std::to_string(i) + "=''";
    EXPECT_LT(RefusalSeconds(text + "/>"), 10);
    text = "<DATASET>";
    for (int i = 0; i < 200000; ++i) text += "<A a" + std::to_string(i) + "=''/>";
    EXPECT_LT(RefusalSeconds(text + "</DATASET>"), 5);
}

TEST_F(HostileDocumentTest, ManyElements) {
    std::string text = "<DATASET>";
    for (std::uint32_t i = 0; i < kMaxDocumentNodes; ++i) text += "<PALETTE/>";
    EXPECT_LT(RefusalSeconds(text + "</DATASET>"), 20);
}

TEST_F(HostileDocumentTest, ManyRecordsTakeTimeInProportion) {
    std::string text = "<DATASET>";
    const std::uint32_t count = 200000;
    for (std::uint32_t i = 0; i < count; ++i) text += "<BANDSTATISTICS/><HISTOGRAMS/>";
    PyramidXMLReaderHandlers<double> handlers;
    const ProcessorTime time;
    EXPECT_EQ(Parse(text + "</DATASET>", &handlers), 0);
    EXPECT_EQ(handlers.bandStats.shape.elements, count);
    EXPECT_LT(time.Seconds(), 20);
}

// One long text, many short pieces of text, and long names, read as a stream and as a tree.
TEST_F(HostileDocumentTest, LongTextsTakeTimeInProportion) {
    std::string references, names;
    for (int i = 0; i < 1000000; ++i) references += "&#65;";
    for (int i = 0; i < 16; ++i) names += "<" + std::string(1u << 20, 'N') + "/>";
    const std::string documents[] = {
        Histogram("<HIST_BINCOUNT>9</HIST_BINCOUNT><HIST_COUNTS>" + std::string(1u << 24, '|') +
                  "</HIST_COUNTS>"),
        Histogram("<HIST_BINCOUNT>4000000000</HIST_BINCOUNT><HIST_COUNTS>" + references +
                  "</HIST_COUNTS>"),
        names, "<!--" + std::string(1u << 24, 'c') + "-->"};
    for (const std::string& document : documents) {
        const std::string text = "<DATASET>" + document + "</DATASET>";
        PyramidXMLReaderHandlers<int> handlers;
        const ProcessorTime time;
        EXPECT_EQ(Parse(text, &handlers), 0);
        PyramidXMLDocument tree;
        EXPECT_TRUE(tree.ParseTree(*source));
        EXPECT_LT(time.Seconds(), 20) << text.substr(0, 100);
    }
}

}  // namespace
}  // namespace zmctest
