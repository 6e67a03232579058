// What a header says is the same for the module and for this library, whatever it looks like.
#include <gtest/gtest.h>

#include <algorithm>

#include "files/MemorySource.h"
#include "host/base/Error.h"
#include "host/file/MetadataDocument.h"
#include "host/file/PyramidFileInfo.h"
#include "host/raster/Raster.h"
#include "tests/support/LenientHeaders.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::LenientHeader;

class LenientHeaders : public testing::TestWithParam<LenientHeader> {
protected:
    void SetUp() override { zmctest::WriteText(file, GetParam().File()); }
    zmctest::ScratchDirectory folder;
    const std::string file = folder / "a.pyr";
};

TEST_P(LenientHeaders, SayTheSameToModuleAndHost) {
    const LenientHeader& expected = GetParam();
    const PyramidHeader header = PyramidHeader::Read(file);
    EXPECT_EQ(header.width, expected.width);
    EXPECT_EQ(header.height, expected.height);
    EXPECT_EQ(header.bandCount, LenientHeader::kBands);
    EXPECT_EQ(header.levelMin, expected.levelMin);
    EXPECT_EQ(header.levelMax, expected.levelMax);
    EXPECT_EQ(header.pixelType, expected.pixelType);
    EXPECT_EQ(header.tileDataEnd - header.tileDataStart, expected.TileBytes());

    const ModulePtr module = zmctest::TestModule();
    const zelm::RasterDataConnectionPtr connection = module->OpenPyramid(file);
    ASSERT_TRUE(connection);
    const zelm::RasterReaderDispatchPtr reader = connection->GetReader();
    ASSERT_TRUE(reader);
    ASSERT_TRUE(reader->Visit([&](auto& typed) {
        const zelm::RasterProps props = typed.GetRasterProps();
        EXPECT_EQ(props.samples, header.width);
        EXPECT_EQ(props.lines, header.height);
        EXPECT_EQ(props.bands, header.bandCount);
        EXPECT_EQ(props.pixelType, header.pixelType);
        EXPECT_EQ(props.interleave, header.interleave);
        EXPECT_EQ(static_cast<std::uint32_t>(typed.GetMinLevel()), header.levelMin);
        EXPECT_EQ(static_cast<std::uint32_t>(typed.GetMaxLevel()), header.levelMax);
        EXPECT_TRUE(typed.HasPyramid());
    }));
}

TEST_P(LenientHeaders, GiveBuffersOfTheRightSize) {
    const LenientHeader& expected = GetParam();
    Raster raster = Raster::Open(zmctest::TestModule(), file);
    const std::size_t bytes = std::size_t{expected.width} * expected.height *
                              LenientHeader::kBands * expected.sampleBytes;
    ASSERT_EQ(std::size_t{raster.Width()} * raster.Height() * raster.Bands() * raster.SampleSize(),
              bytes);
    std::vector<unsigned char> pixels(bytes + 16, 9);
    raster.Read(0, {0, 0, raster.Width(), raster.Height()}, raster.AllBands(), pixels.data());
    EXPECT_EQ(std::count(pixels.begin(), pixels.end(), 1), static_cast<std::ptrdiff_t>(bytes));
}

// The same from a source that is no file, and from the first bytes alone.
TEST_P(LenientHeaders, AreReadFromSources) {
    const std::string bytes = GetParam().File();
    zelm::files::MemorySource source({bytes.begin(), bytes.end()});
    const PyramidHeader header = PyramidHeader::Read(source, "memory");
    EXPECT_EQ(header.fileSize, bytes.size());
    EXPECT_EQ(header.tileDataEnd, bytes.size());
    EXPECT_EQ(ReadMetadataText(source, "memory", header), "");
    EXPECT_EQ(JudgeMetadata(source, "memory", header), "");
    const std::string_view start(bytes.data(), header.tileDataStart);
    EXPECT_TRUE(PyramidHeader::IsWhole(start));
    EXPECT_FALSE(PyramidHeader::IsWhole(start.substr(0, start.size() - 1)));
    EXPECT_EQ(PyramidHeader::Parse("start", start, bytes.size()).tileDataEnd, bytes.size());
}

INSTANTIATE_TEST_SUITE_P(All, LenientHeaders, testing::ValuesIn(zmctest::kLenientHeaders),
                         [](const auto& each) { return each.param.name; });

}  // namespace
}  // namespace zmchost
