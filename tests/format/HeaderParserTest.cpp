#include "format/HeaderParser.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "format/DocumentLimits.h"
#include "format/DocumentParse.h"
#include "tests/support/XercesEnvironment.h"

namespace zelm {
namespace {

using testing::HasSubstr;

class HeaderParser : public testing::Test {
protected:
    // What is wrong with a header of this content, with the record left in `record`.
    std::string Parse(const std::string& content) {
        return ParseHeaderText("<DATASET><HEADER>" + content + "</HEADER></DATASET>", record);
    }
    PyramidHeaderRecord record;
};

TEST_F(HeaderParser, EveryValueHasItsElement) {
    EXPECT_EQ(Parse("<HEADER_VERSION_MAJOR>1</HEADER_VERSION_MAJOR>"
                    "<HEADER_VERSION_MINOR>2</HEADER_VERSION_MINOR><HEADER_BANDS>3</HEADER_BANDS>"
                    "<HEADER_PIXEL_HEIGHT>4</HEADER_PIXEL_HEIGHT>"
                    "<HEADER_PIXEL_WIDTH>5</HEADER_PIXEL_WIDTH><HEADER_LEVELMIN>6</HEADER_LEVELMIN>"
                    "<HEADER_LEVELMAX>7</HEADER_LEVELMAX><HEADER_TILESIZE>8</HEADER_TILESIZE>"
                    "<HEADER_INTERLEAVE>BSQ</HEADER_INTERLEAVE>"
                    "<HEADER_BUILD_METHOD>Morton</HEADER_BUILD_METHOD>"
                    "<HEADER_PIXEL_TYPE>Double</HEADER_PIXEL_TYPE>"),
              "");
    EXPECT_EQ(record.versionMajor, 1u);
    EXPECT_EQ(record.versionMinor, 2u);
    EXPECT_EQ(record.bandCount, 3u);
    EXPECT_EQ(record.height, 4u);
    EXPECT_EQ(record.width, 5u);
    EXPECT_EQ(record.levelMin, 6u);
    EXPECT_EQ(record.levelMax, 7u);
    EXPECT_EQ(record.tileSize, 8u);
    EXPECT_EQ(record.interleave, Interleave::BSQ);
    EXPECT_EQ(record.tileOrdering, TileOrder::Morton);
    EXPECT_EQ(record.pixelType, 5u);
}

TEST_F(HeaderParser, WhatIsMissingIsZero) {
    record.width = 9;
    record.pixelType = 9;
    EXPECT_EQ(Parse("<HEADER_WIDTH>3</HEADER_WIDTH><RSTC_BAND>3</RSTC_BAND>"), "");
    EXPECT_EQ(record.width, 0u);
    EXPECT_EQ(record.pixelType, 0u);
    EXPECT_EQ(record.interleave, Interleave::BIP);
}

TEST_F(HeaderParser, WordsThatNobodyKnows) {
    EXPECT_EQ(Parse("<HEADER_INTERLEAVE>bip</HEADER_INTERLEAVE><HEADER_PIXEL_TYPE>Nibble"
                    "</HEADER_PIXEL_TYPE><HEADER_BUILD_METHOD>Hilbert</HEADER_BUILD_METHOD>"),
              "");
    EXPECT_EQ(record.interleave, Interleave::None);
    EXPECT_EQ(record.tileOrdering, TileOrder::Scanline);
    EXPECT_EQ(record.pixelType, 0u);
}

TEST_F(HeaderParser, NumbersEndWhereTheirDigitsDo) {
    const std::pair<const char*, std::uint32_t> cases[] = {
        {" 12x", 12},         {"+3", 3},         {"3.9", 3},
        {"-1", 4294967295},   {"4294967297", 1}, {"&#49;&#50;", 2},
        {"1&#50;3", 23},      {"x", 0},          {"", 0},
        {"<![CDATA[7]]>", 7}, {"1<!-- -->2", 2}, {"4<A>5</A>", 4}};
    for (const auto& [text, number] : cases) {
        EXPECT_EQ(Parse("<HEADER_BANDS>" + std::string(text) + "</HEADER_BANDS>"), "");
        EXPECT_EQ(record.bandCount, number) << text;
    }
}

// What is refused leaves the record as it was, and says where it went wrong.
TEST_F(HeaderParser, WhatIsRefused) {
    std::string deep = "<DATASET>", names = "<DATASET>";
    for (std::uint32_t i = 0; i < kMaxDocumentDepth; ++i) deep += "<A>";
    for (std::uint32_t i = 0; i <= kMaxForeignNames; ++i) names += "<N" + std::to_string(i) + "/>";
    record.width = 7;
    for (const std::string& text :
         {std::string(), std::string(" "), std::string("<DATASET>"), std::string("<A></B>"),
          std::string("<A/><B/>"), std::string("<!DOCTYPE A><A/>"), std::string("<A>&b;</A>"),
          std::string("text"), std::string("<A/>\0", 5), std::string("<A/>\xC3"), deep,
          names + "</DATASET>"}) {
        EXPECT_THAT(ParseHeaderText(text, record), HasSubstr("line 1: ")) << text;
        EXPECT_EQ(record.width, 7u);
    }
    EXPECT_THAT(ParseHeaderText("<A>\n<B>\n</A>", record), HasSubstr("line 3: "));
    EXPECT_THAT(ParseHeaderText("<?xml version='1.0' encoding='NONE'?><A/>", record),
                testing::Not(testing::IsEmpty()));
    // The parser that is kept is none the worse for it.
    EXPECT_EQ(Parse("<HEADER_BANDS>3</HEADER_BANDS>"), "");
    EXPECT_EQ(record.bandCount, 3u);
}

TEST_F(HeaderParser, ManyThreadsAtOnce) {
    std::vector<std::thread> threads;
    std::vector<int> wrong(4);
    for (std::size_t number = 0; number < wrong.size(); ++number)
        threads.emplace_back([&wrong, number] {
            for (int i = 0; i < 200; ++i) {
                PyramidHeaderRecord mine;
                const std::string bands = std::to_string(number * 1000 + 1);
                const std::string text = "<D><HEADER_BANDS>" + bands + "</HEADER_BANDS>";
                const bool bad = i % 7 == 0;
                const bool refused = !ParseHeaderText(text + (bad ? "" : "</D>"), mine).empty();
                if (refused != bad || (!bad && mine.bandCount != number * 1000 + 1))
                    ++wrong[number];
            }
        });
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(wrong, std::vector<int>(4));
}

// A process that looks at many files keeps nothing of their names.
TEST_F(HeaderParser, ManyNamesCostNothingLater) {
    for (int i = 0; i < 200; ++i) {
        std::string names;
        for (int n = 0; n < 200; ++n)
            names += "<N" + std::to_string(i) + "_" + std::to_string(n) + "/>";
        ASSERT_EQ(Parse(names + "<HEADER_BANDS>" + std::to_string(i) + "</HEADER_BANDS>"), "");
        ASSERT_EQ(record.bandCount, static_cast<std::uint32_t>(i));
    }
}

// What was read is kept, and given to the same text alone.
TEST_F(HeaderParser, TextsThatAreAlikeAndNearlySo) {
    const auto read = [&](const std::string& text) {
        record = PyramidHeaderRecord();
        return ParseHeaderText(text, record).empty() ? static_cast<int>(record.bandCount) : -1;
    };
    const std::string five = "<D><HEADER_BANDS>5</HEADER_BANDS></D>";
    const std::string six = "<D><HEADER_BANDS>6</HEADER_BANDS></D>";
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(read(five), 5);
        EXPECT_EQ(read(five), 5);
        EXPECT_EQ(read(five + '\0'), -1);
        EXPECT_EQ(read(five.substr(0, five.size() - 1)), -1);
        EXPECT_EQ(read(five), 5);
        EXPECT_EQ(read(six), 6);
        EXPECT_EQ(read(six + std::string(5000, '\n')), 6);
        EXPECT_EQ(read(six), 6);
    }
}

TEST_F(HeaderParser, ListensToNobody) {
    PyramidHeaderRecord plain;
    TakeHeaderText(plain, ElementName::PALETTE_BAND, "5");
    TakeHeaderText(plain, ElementName::HEADER, "5");
    EXPECT_EQ(plain.bandCount, 0u);
    FaultReader reader;
    EXPECT_EQ(ParseDocumentText("<DATASET><RSTC_BAND>5</RSTC_BAND></DATASET>", reader), "");
}

// --- values that follow from the header ---

TEST(PyramidHeaderRecordTest, LevelsLieFromTheCoarsestOn) {
    PyramidHeaderRecord header;
    header.width = 1000;
    header.height = 777;
    header.bandCount = 3;
    header.tileSize = 256;
    header.levelMax = 2;
    header.pixelType = 1;
    EXPECT_EQ(header.LevelBytes(2), 145500u);
    EXPECT_EQ(header.LevelStart(2), 0u);
    EXPECT_EQ(header.LevelStart(1), 145500u);
    EXPECT_EQ(header.LevelStart(0), 727500u);
    EXPECT_EQ(header.TileDataBytes(), 3058500u);
    header.levelMin = 1;
    EXPECT_EQ(header.TileDataBytes(), 727500u);
    header.levelMin = 3;
    EXPECT_EQ(header.TileDataBytes(), 0u);
    header.levelMin = 0;
    header.levelMax = 1023;
    EXPECT_EQ(header.LevelBytes(32), 0u);
    EXPECT_EQ(header.LevelStart(9), 0u);
    EXPECT_EQ(header.Geometry(1).tilesAcross, 2u);
}

TEST(PyramidHeaderRecordTest, OrderingsOfNewFiles) {
    EXPECT_EQ(TileOrderFor(8, 1), TileOrder::Scanline);
    EXPECT_EQ(TileOrderFor(8, 2), TileOrder::Blocked);
    EXPECT_EQ(TileOrderFor(9, 1), TileOrder::Morton);
    EXPECT_EQ(TileOrderFor(9, 2), TileOrder::Morton);
    PyramidHeaderRecord header;
    for (const std::uint32_t order : {TileOrder::Scanline, TileOrder::Blocked}) {
        header.tileOrdering = order;
        EXPECT_FALSE(header.IsPlanar());
    }
    header.tileOrdering = TileOrder::Morton;
    EXPECT_TRUE(header.IsPlanar());
}

}  // namespace
}  // namespace zelm
