#include "host/file/PyramidFileInfo.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <fstream>

#include "host/base/Error.h"

namespace zmchost {
namespace {

struct Fields {
    std::string major = "1", minor = "1", bands = "3", width = "1000", height = "777";
    std::string tileSize = "256", levelMin = "0", levelMax = "2";
    std::string interleave = "BSQ", ordering = "Blocked", type = "Byte";
};

std::string Leaf(const std::string& name, const std::string& value) {
    return "  <" + name + ">" + value + "</" + name + ">\n";
}

std::string Document(const Fields& f) {
    return "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"no\" ?>\n<DATASET>\n <HEADER>\n" +
           Leaf("HEADER_VERSION_MAJOR", f.major) + Leaf("HEADER_VERSION_MINOR", f.minor) +
           Leaf("HEADER_BANDS", f.bands) + Leaf("HEADER_PIXEL_HEIGHT", f.height) +
           Leaf("HEADER_PIXEL_WIDTH", f.width) + Leaf("HEADER_LEVELMIN", f.levelMin) +
           Leaf("HEADER_LEVELMAX", f.levelMax) + Leaf("HEADER_TILESIZE", f.tileSize) +
           Leaf("HEADER_INTERLEAVE", f.interleave) + Leaf("HEADER_BUILD_METHOD", f.ordering) +
           Leaf("HEADER_PIXEL_TYPE", f.type) + " </HEADER>\n</DATASET>\n";
}

std::string Bytes(std::uint64_t value) {
    std::string bytes;
    for (int i = 0; i < 8; ++i) bytes += static_cast<char>(value >> (8 * i) & 0xFF);
    return bytes;
}

std::string FileStart(const std::string& document) {
    return "KOBT" + Bytes(20 + document.size()) + Bytes(77) + document;
}

class PyramidFileInfoTest : public testing::Test {
protected:
    std::string name = testing::TempDir() + "PyramidFileInfoTest" +
                       testing::UnitTest::GetInstance()->current_test_info()->name();

    ~PyramidFileInfoTest() override { std::remove(name.c_str()); }

    // Reads a file with that header and `tileBytes` bytes behind it.
    PyramidFileInfo Read(const Fields& fields, std::size_t tileBytes = 0) {
        std::ofstream(name, std::ios::binary)
            << FileStart(Document(fields)) << std::string(tileBytes, '\x55');
        return ReadPyramidFileInfo(name);
    }
};

TEST_F(PyramidFileInfoTest, TellsEveryFieldOfTheHeader) {
    const PyramidHeader header = Read({}).header;
    EXPECT_EQ(header.versionMajor, 1u);
    EXPECT_EQ(header.versionMinor, 1u);
    EXPECT_EQ(header.bandCount, 3u);
    EXPECT_EQ(header.width, 1000u);
    EXPECT_EQ(header.height, 777u);
    EXPECT_EQ(header.tileSize, 256u);
    EXPECT_EQ(header.levelMin, 0u);
    EXPECT_EQ(header.levelMax, 2u);
    EXPECT_EQ(header.pixelType, 1u);
    EXPECT_EQ(header.interleave, 2);
    EXPECT_EQ(header.tileOrdering, 1u);
}

TEST_F(PyramidFileInfoTest, LaysTheCoarsestLevelFirst) {
    const PyramidFileInfo info = Read({});
    const std::uint64_t start = 20 + Document({}).size();
    EXPECT_EQ(info.header.tileDataStart, start);
    ASSERT_EQ(info.levels.size(), 3u);
    EXPECT_EQ(info.FindLevel(2)->offset, start);
    EXPECT_EQ(info.FindLevel(1)->offset, start + 145500);
    EXPECT_EQ(info.FindLevel(0)->offset, start + 727500);
    EXPECT_EQ(info.MetaDocumentOffset(), start + 3058500);
    EXPECT_EQ(info.FindLevel(0)->bytes, 2331000u);
    EXPECT_EQ(info.FindLevel(1)->width, 500u);
    EXPECT_EQ(info.FindLevel(1)->height, 388u);
    EXPECT_EQ(info.FindLevel(1)->tilesAcross, 2u);
    EXPECT_EQ(info.FindLevel(0)->tilesDown, 4u);
    EXPECT_EQ(info.FindLevel(3), nullptr);
}

TEST_F(PyramidFileInfoTest, CountsMissingBytes) {
    EXPECT_TRUE(Read({}, 3058500).complete);
    EXPECT_FALSE(Read({}, 3058500).HasMetadataDocument());
    EXPECT_TRUE(Read({}, 3058501).HasMetadataDocument());
    EXPECT_FALSE(Read({}, 3058499).complete);
    EXPECT_EQ(Read({}, 3058499).bytesMissing, 1u);
}

TEST_F(PyramidFileInfoTest, Version10IsNeverComplete) {
    Fields fields;
    fields.minor = "0";
    EXPECT_FALSE(Read(fields, 3058500).complete);
    EXPECT_EQ(Read(fields, 3058500).bytesMissing, 0u);
    fields.major = "2";
    EXPECT_TRUE(Read(fields, 3058500).complete);
}

TEST_F(PyramidFileInfoTest, LevelsMayStartAboveZeroAndShrinkToNothing) {
    Fields fields;
    fields.levelMin = "9";
    fields.levelMax = "40";
    const PyramidFileInfo info = Read(fields);
    EXPECT_EQ(info.FindLevel(0), nullptr);
    EXPECT_EQ(info.FindLevel(9)->width, 1u);
    EXPECT_EQ(info.FindLevel(10)->bytes, 0u);
    EXPECT_EQ(info.FindLevel(40)->bytes, 0u);
    // Nor does one that would look like the first.
    EXPECT_EQ(info.FindLevel(9)->height, 1u);
    for (const std::uint32_t level : {31u, 32u, 40u}) {
        EXPECT_EQ(info.FindLevel(level)->width, 0u) << level;
        EXPECT_EQ(info.FindLevel(level)->height, 0u) << level;
        EXPECT_EQ(info.FindLevel(level)->tilesAcross, 0u) << level;
        EXPECT_EQ(info.FindLevel(level)->tilesDown, 0u) << level;
    }
}

TEST_F(PyramidFileInfoTest, RefusesHeadersThatNobodyCanReadBy) {
    const std::pair<std::string Fields::*, const char*> cases[] = {
        {&Fields::tileSize, "0"},  {&Fields::tileSize, "2049"},   {&Fields::levelMax, "1024"},
        {&Fields::levelMin, "3"},  {&Fields::height, "<a>1</b>"}, {&Fields::height, "&x;"},
        {&Fields::type, "Nibble"}, {&Fields::height, "\x01"},     {&Fields::levelMax, "4294967295"},
        {&Fields::tileSize, ""}};
    for (const auto& [field, value] : cases) {
        Fields fields;
        fields.*field = value;
        EXPECT_THROW(Read(fields), Error) << value;
    }
}

// Numbers are read as the module reads them.
TEST_F(PyramidFileInfoTest, NumbersThatAreNone) {
    const std::pair<const char*, std::uint32_t> cases[] = {
        {"", 0}, {"many", 0}, {"-1", 4294967295}, {"4294967297", 1}, {" 12.9", 12}};
    for (const auto& [text, number] : cases) {
        Fields fields;
        fields.width = text;
        EXPECT_EQ(Read(fields).header.width, number) << text;
    }
}

TEST_F(PyramidFileInfoTest, TheLastLevelThatThereCanBe) {
    Fields fields;
    fields.levelMax = "1023";
    EXPECT_EQ(Read(fields).levels.size(), 1024u);
}

TEST_F(PyramidFileInfoTest, RefusesEveryCutFile) {
    const std::string whole = FileStart(Document({}));
    for (std::size_t size = 0; size < whole.size(); size += 7) {
        std::ofstream(name, std::ios::binary) << whole.substr(0, size);
        EXPECT_THROW(ReadPyramidFileInfo(name), Error) << size;
    }
}

TEST_F(PyramidFileInfoTest, RefusesSizesThatCannotBeCounted) {
    Fields fields;
    fields.width = fields.height = fields.bands = "4294967295";
    EXPECT_THROW(Read(fields), Error);
}

TEST_F(PyramidFileInfoTest, NoChangedByteDoesMoreThanRefuse) {
    const std::string whole = FileStart(Document({}));
    for (std::size_t at = 0; at < whole.size(); ++at)
        for (const char byte : {'\0', '<', '>', '&', '9', '\xFF'}) {
            std::string changed = whole;
            changed[at] = byte;
            std::ofstream(name, std::ios::binary) << changed;
            try {
                (void)ReadPyramidFileInfo(name);
            } catch (const Error&) {
            }
        }
}

TEST_F(PyramidFileInfoTest, NamesTheFileInFailures) {
    try {
        (void)ReadPyramidFileInfo(name);
        FAIL();
    } catch (const Error& error) {
        EXPECT_EQ(error.File(), name);
    }
}

TEST(PyramidFileInfo, KnowsAPyramidByItsStart) {
    const std::string whole = FileStart(Document({}));
    EXPECT_TRUE(LooksLikePyramid(whole));
    EXPECT_TRUE(LooksLikePyramid(whole.substr(0, 32)));
    EXPECT_FALSE(LooksLikePyramid(whole.substr(0, 20)));
    EXPECT_FALSE(LooksLikePyramid("KOBT" + Bytes(500) + Bytes(0) + "some other text"));
    EXPECT_FALSE(LooksLikePyramid("KOBU" + whole.substr(4)));
}

}  // namespace
}  // namespace zmchost
