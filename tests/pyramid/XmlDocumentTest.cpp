#include "pyramid/PyramidXMLDocument.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>

#include <xercesc/dom/DOM.hpp>
#include <xercesc/framework/MemBufInputSource.hpp>

#include "core/PixelVocabulary.h"
#include "files/OpenSource.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {

using namespace zelm;
namespace {

class XmlDocumentTest : public ::testing::Test {
protected:
    XmlDocumentTest() { document.CreateDocument(); }

    // What SerializeDocument writes, at an offset that is not 0.
    std::string Raw() {
        const std::string name = (folder / "document");
        const String wide(name.c_str());
        const auto file = files::OpenSource(wide, files::OpenMode::Create);
        EXPECT_TRUE(document.SerializeDocument(*file, 7));
        return zmctest::ReadText(name).substr(7);
    }
    std::string Text() { return Compact(Raw()); }

    static bool Parse(PyramidXMLDocument& target, const std::string& text) {
        const xercesc::MemBufInputSource source(reinterpret_cast<const XMLByte*>(text.data()),
                                                text.size(), "test");
        return target.ParseTree(source);
    }

    zmctest::ScratchDirectory folder;
    PyramidXMLDocument document;
};

TEST_F(XmlDocumentTest, FreshDocumentHasARootAlone) {
    EXPECT_EQ(Text(), "<DATASET/>");
    EXPECT_THAT(Raw(), ::testing::StartsWith(
                           "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"no\" ?>"));
    EXPECT_EQ(document.RecordCount(), 0u);
}

TEST_F(XmlDocumentTest, HeaderElementsStandInTheirOrder) {
    PyramidHeaderRecord header;
    header.versionMajor = header.versionMinor = 1;
    header.bandCount = 3;
    header.width = 1600;
    header.height = 1200;
    header.tileSize = 256;
    header.levelMax = 3;
    header.pixelType = PixelTypeCode::Byte;
    header.interleave = Interleave::BSQ;
    header.tileOrdering = TileOrder::Blocked;
    EXPECT_TRUE(document.WriteHeaderElement(header));
    EXPECT_EQ(Text(),
              "<DATASET><HEADER>"
              "<HEADER_VERSION_MAJOR>1</HEADER_VERSION_MAJOR>"
              "<HEADER_VERSION_MINOR>1</HEADER_VERSION_MINOR>"
              "<HEADER_BANDS>3</HEADER_BANDS>"
              "<HEADER_PIXEL_HEIGHT>1200</HEADER_PIXEL_HEIGHT>"
              "<HEADER_PIXEL_WIDTH>1600</HEADER_PIXEL_WIDTH>"
              "<HEADER_LEVELMIN>0</HEADER_LEVELMIN>"
              "<HEADER_LEVELMAX>3</HEADER_LEVELMAX>"
              "<HEADER_TILESIZE>256</HEADER_TILESIZE>"
              "<HEADER_INTERLEAVE>BSQ</HEADER_INTERLEAVE>"
              "<HEADER_BUILD_METHOD>Blocked</HEADER_BUILD_METHOD>"
              "<HEADER_PIXEL_TYPE>Byte</HEADER_PIXEL_TYPE>"
              "</HEADER></DATASET>");
}

TEST_F(XmlDocumentTest, HeaderWords) {
    PyramidHeaderRecord header;
    for (const std::int32_t interleave : {-1, 0, 1, 2, 3, -7}) {
        header.interleave = interleave;
        document.WriteHeaderElement(header);
    }
    for (const std::uint32_t ordering : {0u, 1u, 2u, 3u}) {
        header.tileOrdering = ordering;
        document.WriteHeaderElement(header);
    }
    for (const std::uint32_t type :
         {1u, 2u, 3u, 4u, 5u, 6u, 9u, 12u, 13u, 14u, 15u, 95u, 96u, 98u, 99u, 0u, 7u}) {
        header.pixelType = type;
        document.WriteHeaderElement(header);
    }
    using Words = std::vector<std::string>;
    const std::string text = Text();
    Words words = ValuesOf(text, "HEADER_INTERLEAVE");
    words.resize(6);
    EXPECT_EQ(words, (Words{"None", "BIP", "BIL", "BSQ", "Unknown", "Unknown"}));
    words = ValuesOf(text, "HEADER_BUILD_METHOD");
    EXPECT_EQ(Words(words.begin() + 6, words.begin() + 10),
              (Words{"Scanline", "Blocked", "Morton", "Scanline"}));
    words = ValuesOf(text, "HEADER_PIXEL_TYPE");
    EXPECT_EQ(Words(words.begin() + 10, words.end()),
              (Words{"Byte", "Int16", "Int32", "Single", "Double", "ComplexSingle", "ComplexDouble",
                     "UInt16", "UInt32", "Int64", "UInt64", "Quad", "ComplexQuad", "Bool", "Char",
                     "Unknown", "Unknown"}));
}

TEST_F(XmlDocumentTest, MetadataElementsStandInTheirOrder) {
    RasterBandStats<unsigned char> stats;
    stats.flags = 1 | 2 | 4 | 8;
    stats.minimum = 3;
    stats.maximum = 251;
    stats.mean = 118.25;
    stats.standardDeviation = 41.5;
    RasterBandHistogram<unsigned char> histogram;
    histogram.binCount = 4;
    histogram.binSize = 64;
    histogram.maximum = 255;
    histogram.source = HistogramSource::Native;
    for (const std::uint64_t count : {120u, 4000u, 5120u, 16u}) histogram.counts.Append(count);
    Palette palette;
    unsigned char channels[4] = {0, 0, 0, 255};
    palette.AddColor(RGBAColor(Array<unsigned char>(channels, ArrayShape(4))));
    channels[0] = 255;
    palette.AddColor(RGBAColor(Array<unsigned char>(channels, ArrayShape(4))));
    EXPECT_TRUE(document.WriteBandStatsElement(stats));
    EXPECT_TRUE(document.WriteHistogramElement(histogram));
    EXPECT_TRUE(document.WritePaletteElement(0, palette));
    EXPECT_EQ(document.RecordCount(), 3u);
    EXPECT_EQ(Text(),
              "<DATASET>"
              "<BANDSTATISTICS><RSTC_BAND>0</RSTC_BAND><RSTC_LEVEL>0</RSTC_LEVEL>"
              "<RSTC_MINIMUM>3</RSTC_MINIMUM><RSTC_MAXIMUM>251</RSTC_MAXIMUM>"
              "<RSTC_MEAN>118.25</RSTC_MEAN>"
              "<RSTC_STANDARDDEVIATION>41.5</RSTC_STANDARDDEVIATION></BANDSTATISTICS>"
              "<HISTOGRAMS><HIST_BAND>0</HIST_BAND><HIST_LEVEL>0</HIST_LEVEL>"
              "<HIST_SOURCE>ORVA</HIST_SOURCE><HIST_BINCOUNT>4</HIST_BINCOUNT>"
              "<HIST_BINSIZE>64</HIST_BINSIZE><HIST_MIN>0</HIST_MIN><HIST_MAX>255</HIST_MAX>"
              "<HIST_COUNTS>120|4000|5120|16</HIST_COUNTS></HISTOGRAMS>"
              "<PALETTE><PALETTE_BAND>0</PALETTE_BAND><PALETTE_COUNT>2</PALETTE_COUNT>"
              "<PALETTE_RGBA>0|0|0|255</PALETTE_RGBA><PALETTE_RGBA>255|0|0|255</PALETTE_RGBA>"
              "</PALETTE></DATASET>");
}

TEST_F(XmlDocumentTest, StatisticsWithoutFlagsHaveTwoChildren) {
    RasterBandStats<double> stats;
    stats.band = 7;
    stats.mean = 3;
    document.WriteBandStatsElement(stats);
    EXPECT_EQ(Text(),
              "<DATASET><BANDSTATISTICS><RSTC_BAND>7</RSTC_BAND><RSTC_LEVEL>0</RSTC_LEVEL>"
              "</BANDSTATISTICS></DATASET>");
}

TEST_F(XmlDocumentTest, EachFlagWritesItsElement) {
    const char* const names[] = {"MINIMUM", "MAXIMUM", "MEAN", "STANDARDDEVIATION",
                                 "SUM",     "SUM2",    "RMS"};
    for (std::uint32_t bit = 0; bit < 7; ++bit) {
        document.CreateDocument();
        RasterBandStats<int> stats;
        stats.flags = 1u << bit;
        document.WriteBandStatsElement(stats);
        const std::string leaf = std::string("RSTC_") + names[bit];
        EXPECT_EQ(Text(),
                  "<DATASET><BANDSTATISTICS><RSTC_BAND>0</RSTC_BAND><RSTC_LEVEL>0</RSTC_LEVEL><" +
                      leaf + ">0</" + leaf + "></BANDSTATISTICS></DATASET>");
    }
}

TEST_F(XmlDocumentTest, HistogramWithoutBinsHasNoCounts) {
    RasterBandHistogram<short> histogram;
    histogram.counts.Append(9);
    document.WriteHistogramElement(histogram);
    const std::string text = Text();
    EXPECT_EQ(ValuesOf(text, "HIST_BINCOUNT"), std::vector<std::string>{"0"});
    EXPECT_NE(text.find("<HIST_COUNTS"), std::string::npos);
    EXPECT_EQ(text.find('9'), std::string::npos);
}

TEST_F(XmlDocumentTest, MissingCountsAreZero) {
    RasterBandHistogram<short> histogram;
    histogram.binCount = 5;
    for (const std::uint64_t count : {1u, 2u, 3u}) histogram.counts.Append(count);
    document.WriteHistogramElement(histogram);
    EXPECT_EQ(ValuesOf(Text(), "HIST_COUNTS"), std::vector<std::string>{"1|2|3|0|0"});
}

TEST_F(XmlDocumentTest, CountsAreWrittenExactly) {
    RasterBandHistogram<float> histogram;
    histogram.binCount = 2;
    histogram.counts.Append(std::numeric_limits<std::uint64_t>::max());
    histogram.counts.Append((std::uint64_t{1} << 53) + 1);
    document.WriteHistogramElement(histogram);
    EXPECT_EQ(ValuesOf(Text(), "HIST_COUNTS"),
              std::vector<std::string>{"18446744073709551615|9007199254740993"});
}

TEST_F(XmlDocumentTest, PaletteWithoutColoursHasTwoChildren) {
    document.WritePaletteElement(3, Palette());
    EXPECT_EQ(Text(),
              "<DATASET><PALETTE><PALETTE_BAND>3</PALETTE_BAND><PALETTE_COUNT>0</PALETTE_COUNT>"
              "</PALETTE></DATASET>");
}

TEST_F(XmlDocumentTest, PaletteOfMoreColoursThanADocumentHasElementsIsRefused) {
    Palette palette;
    palette.nextIndex = kMaxDocumentNodes + 1;
    EXPECT_FALSE(document.WritePaletteElement(0, palette));
    EXPECT_EQ(Text(), "<DATASET/>");
}

// A palette is written from its colours, and every other record from its elements.
TEST_F(XmlDocumentTest, PaletteIsLaidOutAsItsElementsWouldBe) {
    Palette palette;
    palette.nextIndex = 2;
    unsigned char channels[4] = {255, 0, 17, 9};
    palette.SetColor(1, RGBAColor(Array<unsigned char>(channels, ArrayShape(4))));
    const auto stats = [&] { return document.WriteBandStatsElement(RasterBandStats<int>()); };
    ASSERT_TRUE(stats() && document.WritePaletteElement(7, palette) && stats());
    const std::string written = Raw();
    document.CreateDocument();
    ASSERT_TRUE(stats());
    xercesc::DOMElement* const record = document.document->createElement(u"PALETTE");
    document.document->getDocumentElement()->appendChild(record);
    document.AppendValueElement(*record, ElementName::PALETTE_BAND, "7");
    document.AppendValueElement(*record, ElementName::PALETTE_COUNT, "2");
    document.AppendValueElement(*record, ElementName::PALETTE_RGBA, "0|0|0|0");
    document.AppendValueElement(*record, ElementName::PALETTE_RGBA, "255|0|17|9");
    ASSERT_TRUE(stats());
    EXPECT_EQ(written, Raw());
    EXPECT_EQ(written, Raw()) << "and so each time";
}

TEST_F(XmlDocumentTest, PaletteThatIsTakenBackIsForgotten) {
    Palette two;
    two.nextIndex = 2;
    document.WritePaletteElement(0, Palette());
    document.WritePaletteElement(1, two);
    document.RemoveFrom(1);
    document.WritePaletteElement(2, Palette());
    EXPECT_EQ(document.RecordCount(), 2u);
    EXPECT_EQ(Text(),
              "<DATASET><PALETTE><PALETTE_BAND>0</PALETTE_BAND><PALETTE_COUNT>0</PALETTE_COUNT>"
              "</PALETTE><PALETTE><PALETTE_BAND>2</PALETTE_BAND><PALETTE_COUNT>0</PALETTE_COUNT>"
              "</PALETTE></DATASET>");
    document.DropTree();
    document.CreateDocument();
    EXPECT_EQ(Text(), "<DATASET/>");
}

TEST_F(XmlDocumentTest, CommentsOfOthersStayBesideAPalette) {
    ASSERT_TRUE(Parse(document, "<!--a--><DATASET><PALETTE><!----></PALETTE></DATASET><!--b-->"));
    EXPECT_TRUE(document.WritePaletteElement(0, Palette()));
    EXPECT_EQ(Text(),
              "<!--a--><DATASET><PALETTE><!----></PALETTE><PALETTE><PALETTE_BAND>0</PALETTE_BAND>"
              "<PALETTE_COUNT>0</PALETTE_COUNT></PALETTE></DATASET><!--b-->");
}

TEST_F(XmlDocumentTest, IndexWithoutColourIsWrittenAsTheNullColour) {
    Palette palette;
    palette.nextIndex = 2;
    unsigned char channels[4] = {200, 1, 2, 3};
    palette.SetColor(1, RGBAColor(Array<unsigned char>(channels, ArrayShape(4))));
    palette.SetColor(9, RGBAColor(Array<unsigned char>(channels, ArrayShape(4))));
    document.WritePaletteElement(0, palette);
    EXPECT_EQ(ValuesOf(Text(), "PALETTE_RGBA"), (std::vector<std::string>{"0|0|0|0", "200|1|2|3"}));
    EXPECT_EQ(palette.colors.size(), 2u) << "writing changes no palette";
}

TEST_F(XmlDocumentTest, WithoutATreeEverythingIsRefused) {
    document.DropTree();
    EXPECT_FALSE(document.WriteHeaderElement(PyramidHeaderRecord()));
    EXPECT_FALSE(document.WriteBandStatsElement(RasterBandStats<int>()));
    EXPECT_FALSE(document.WriteHistogramElement(RasterBandHistogram<int>()));
    EXPECT_FALSE(document.WritePaletteElement(0, Palette()));
    const std::string name = (folder / "document");
    const auto file = files::OpenSource(name.c_str(), files::OpenMode::Create);
    EXPECT_FALSE(document.SerializeDocument(*file, 0));
    EXPECT_EQ(file->Size(), 0u);
}

TEST_F(XmlDocumentTest, RecordsBeyondTheLimitsAreRefusedWhole) {
    Palette palette;
    palette.nextIndex = kMaxDocumentNodes;
    EXPECT_FALSE(document.WritePaletteElement(0, palette));
    RasterBandHistogram<int> histogram;
    histogram.binCount = 4000000000u;
    EXPECT_FALSE(document.WriteHistogramElement(histogram));
    EXPECT_EQ(Text(), "<DATASET/>");
}

TEST_F(XmlDocumentTest, RecordsAreTakenBackFromAPosition) {
    for (std::uint32_t band = 0; band < 3; ++band) {
        RasterBandStats<int> stats;
        stats.band = band;
        document.WriteBandStatsElement(stats);
    }
    document.RemoveFrom(1);
    EXPECT_EQ(ValuesOf(Text(), "RSTC_BAND"), std::vector<std::string>{"0"});
    document.RemoveFrom(5);
    EXPECT_EQ(document.RecordCount(), 1u);
}

TEST_F(XmlDocumentTest, ReadOnlyFileIsAFailure) {
    const std::string name = (folder / "document");
    zmctest::WriteText(name, "old");
    const auto file = files::OpenSource(name.c_str(), files::OpenMode::Read);
    EXPECT_FALSE(document.SerializeDocument(*file, 0));
    EXPECT_EQ(zmctest::ReadText(name), "old");
}

TEST_F(XmlDocumentTest, OldTextBehindTheDocumentIsBlankedAndNothingIsCut) {
    const std::string name = (folder / "document");
    zmctest::WriteText(name, std::string(10000, 'x'));
    const auto file = files::OpenSource(name.c_str(), files::OpenMode::Update);
    EXPECT_TRUE(document.SerializeDocument(*file, 5));
    const std::string text = zmctest::ReadText(name);
    EXPECT_EQ(text.size(), 10000u);
    EXPECT_EQ(text.substr(0, 5), "xxxxx");
    EXPECT_EQ(Compact(text.substr(5)), "<DATASET/>");
    EXPECT_EQ(text.find('x', 5 + 50), std::string::npos);
}

TEST_F(XmlDocumentTest, ParsedTreeGrows) {
    PyramidXMLDocument parsed;
    ASSERT_TRUE(Parse(parsed,
                      "<?xml version=\"1.0\"?>\n<!-- kept -->\n<DATASET>\n\n"
                      "<FOREIGN a='1'>\xC3\xA9</FOREIGN>\n</DATASET>\n"));
    RasterBandStats<int> stats;
    EXPECT_TRUE(parsed.WriteBandStatsElement(stats));
    const std::string name = (folder / "document");
    const auto file = files::OpenSource(name.c_str(), files::OpenMode::Create);
    ASSERT_TRUE(parsed.SerializeDocument(*file, 0));
    const std::string text = Compact(zmctest::ReadText(name));
    EXPECT_NE(text.find("<!-- kept -->"), std::string::npos);
    EXPECT_NE(text.find("<FOREIGN a=\"1\">\xC3\xA9</FOREIGN><BANDSTATISTICS>"), std::string::npos)
        << text;
}

TEST_F(XmlDocumentTest, MalformedTextGivesNoTreeAndNoWord) {
    ::testing::internal::CaptureStderr();
    for (const char* text :
         {"", " ", "<DATASET>", "<DATASET></OTHER>", "<DATASET/>tail", "<DATASET/><DATASET/>",
          "no markup", "<!DOCTYPE DATASET><DATASET/>",
          "<!DOCTYPE DATASET [<!ENTITY a 'b'>]><DATASET>&a;</DATASET>",
          "<DATASET>&unknown;</DATASET>", "<DATASET>\x01</DATASET>", "<DATASET>\xFF</DATASET>"}) {
        PyramidXMLDocument parsed;
        EXPECT_FALSE(Parse(parsed, text)) << text;
        EXPECT_EQ(parsed.document, nullptr);
        EXPECT_FALSE(parsed.WriteBandStatsElement(RasterBandStats<int>()));
    }
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "");
}

std::string Nested(int depth) {
    std::string text;
    for (int i = 0; i < depth; ++i) text += "<A>";
    for (int i = 0; i < depth; ++i) text += "</A>";
    return text;
}

TEST_F(XmlDocumentTest, TreesAreBoundedInDepthAndNames) {
    PyramidXMLDocument parsed;
    EXPECT_TRUE(Parse(parsed, Nested(64)));
    EXPECT_FALSE(Parse(parsed, Nested(65)));
    // Empty elements count for their own depth alone.
    std::string wide = "<DATASET>";
    for (int i = 0; i < 1000; ++i) wide += "<B/><C></C>";
    EXPECT_TRUE(Parse(parsed, wide + "</DATASET>"));
    for (int i = 0; i < 300; ++i) wide += "<N" + std::to_string(i) + "/>";
    EXPECT_FALSE(Parse(parsed, wide + "</DATASET>"));
}

TEST_F(XmlDocumentTest, LeavingMoreThanWasEnteredStaysOutside) {
    DocumentLimits limits;
    limits.LeaveElement();
    EXPECT_EQ(limits.depth, 0u);
    EXPECT_EQ(limits.EnterElement(u"A", 0), nullptr);
    EXPECT_EQ(limits.depth, 1u);
}

// Each of these characters takes two bytes in the tree and five in the text.
TEST_F(XmlDocumentTest, ATextBeyondTheLimitIsNotWritten) {
    const std::u16string text(kMaxDocumentBytes / 5, u'&');
    document.document->getDocumentElement()->appendChild(
        document.document->createTextNode(text.c_str()));
    const std::string name = (folder / "document");
    const String wide(name.c_str());
    const auto file = files::OpenSource(wide, files::OpenMode::Create);
    EXPECT_FALSE(document.SerializeDocument(*file, 7));
    EXPECT_EQ(file->Size(), 0u);
}

TEST_F(XmlDocumentTest, TreesAreBoundedInNodes) {
    PyramidXMLDocument parsed;
    std::vector<std::string> pieces{"<!---->"};
    if (!zmctest::IsSanitized()) pieces.insert(pieces.end(), {"<A/>", "<?p?>", "<![CDATA[]]>"});
    for (const std::string& piece : pieces) {
        std::string text = "<DATASET>";
        for (std::uint32_t i = 0; i < kMaxDocumentNodes; ++i) text += piece;
        EXPECT_FALSE(Parse(parsed, text + "</DATASET>")) << piece;
    }
}

// A record counts for the children that it has, and no flags means two of them.
TEST_F(XmlDocumentTest, StatisticsCountForTheChildrenThatTheyHave) {
    std::string text = "<DATASET>";
    for (std::uint32_t i = 1; i < kMaxDocumentNodes - 3 - 10; ++i) text += "<A/>";
    PyramidXMLDocument parsed;
    ASSERT_TRUE(Parse(parsed, text + "</DATASET>"));
    RasterBandStats<int> stats;
    EXPECT_TRUE(parsed.WriteBandStatsElement(stats)) << "13 elements of room";
    stats.flags = StatsFlag::All;
    EXPECT_TRUE(parsed.WriteBandStatsElement(stats)) << "10 elements of room";
    EXPECT_FALSE(parsed.WriteBandStatsElement(RasterBandStats<int>()));
    parsed.RemoveFrom(parsed.RecordCount() - 1);
    for (int i = 0; i < 3; ++i) {
        stats.flags = i == 0 ? StatsFlag::Mean | StatsFlag::Sum : 0;
        EXPECT_EQ(parsed.WriteBandStatsElement(stats), i < 2) << "10, 5 and 2 elements of room";
    }
}

TEST_F(XmlDocumentTest, ManyRecordsWithoutFlagsAreTakenAndReadAgain) {
    const std::uint32_t bands = zmctest::WithSanitizers(10500u, 105000u);
    for (std::uint32_t band = 0; band < bands; ++band) {
        RasterBandStats<int> stats;
        stats.band = band;
        ASSERT_TRUE(document.WriteBandStatsElement(stats)) << band;
    }
    EXPECT_EQ(ValuesOf(Text(), "RSTC_BAND").size(), bands);
    const std::string text = Raw();
    PyramidXMLDocument parsed;
    EXPECT_TRUE(Parse(parsed, text));
}

TEST_F(XmlDocumentTest, RecordsFillATreeToItsLastElement) {
    constexpr std::uint32_t kHeader = 12, kEmptyPalette = 3;  // elements that each takes
    std::string text = "<DATASET>";
    for (std::uint32_t i = 1; i < kMaxDocumentNodes - 2 * kHeader - kEmptyPalette; ++i)
        text += "<A/>";
    PyramidXMLDocument parsed;
    ASSERT_TRUE(Parse(parsed, text + "</DATASET>"));
    EXPECT_TRUE(parsed.WriteHeaderElement(PyramidHeaderRecord()));
    EXPECT_TRUE(parsed.WriteHeaderElement(PyramidHeaderRecord()));
    EXPECT_TRUE(parsed.WritePaletteElement(0, Palette()));
    EXPECT_FALSE(parsed.WritePaletteElement(0, Palette()));
    // What is taken back makes room for as much.
    parsed.RemoveFrom(parsed.RecordCount() - 2);
    EXPECT_FALSE(parsed.WriteHistogramElement(RasterBandHistogram<int>()) &&
                 parsed.WriteHeaderElement(PyramidHeaderRecord()));
    EXPECT_TRUE(parsed.WritePaletteElement(0, Palette()));
    EXPECT_TRUE(parsed.WritePaletteElement(0, Palette()));
    EXPECT_FALSE(parsed.WritePaletteElement(0, Palette()));
}

}  // namespace
}  // namespace zmctest
