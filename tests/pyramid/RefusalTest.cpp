// What a dataset and the parts below it refuse: fields that no file of ours has, calls out of
// order, and texts at the edge of what can be read.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/sax/AttributeList.hpp>

#include "format/NumberText.h"
#include "format/PyramidLimits.h"
#include "format/PyramidXMLReaderHandlers.h"
#include "pyramid/TileGather.h"
#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

using zelm::Array;
using zelm::ArrayShape;
using zelm::PyramidDataset;

class RefusalTest : public PyramidFileTest {
protected:
    static PyramidDescription Plain(std::uint32_t ordering = 0) {
        PyramidDescription d;
        d.samples = d.lines = 16;
        d.bands = 2;
        d.tile = 8;
        d.levelMax = 1;
        d.ordering = ordering;
        return d;
    }
    static bool Accepts(const PyramidDataset& dataset, std::uint32_t width = 1,
                        std::uint32_t height = 1, std::int32_t level = 0) {
        return dataset.AcceptsTile(0, 0, width, height, Array<int>(), level);
    }
};

TEST_F(RefusalTest, FieldsThatNoLayoutStandsBehind) {
    const auto refused = [&](auto change) {
        auto dataset = Create(Plain());
        EXPECT_TRUE(Accepts(*dataset));
        change(*dataset);
        return !Accepts(*dataset);
    };
    EXPECT_TRUE(refused([](PyramidDataset& d) { d.LevelOffsets.reset(); }));
    EXPECT_TRUE(refused([](PyramidDataset& d) { d.BandCount = 0; }));
    EXPECT_TRUE(refused([](PyramidDataset& d) { d.TileSize = 0; }));
    EXPECT_TRUE(refused([](PyramidDataset& d) { d.TileSize = PyramidDataset::kMaxTileSize + 1; }));
    EXPECT_TRUE(refused([](PyramidDataset& d) { d.LevelMin = 1; }));
}

TEST_F(RefusalTest, LevelsOutsideTheFile) {
    const auto dataset = Create(Plain());
    EXPECT_TRUE(Accepts(*dataset, 8, 8, 1));
    EXPECT_FALSE(Accepts(*dataset, 9, 8, 1));
    EXPECT_FALSE(Accepts(*dataset, 8, 9, 1));
    EXPECT_FALSE(Accepts(*dataset, 1, 1, 2));
    EXPECT_FALSE(Accepts(*dataset, 1, 1, -1));
}

// Sizes so close to 2^32 that the number of tiles wraps to nothing.
TEST_F(RefusalTest, TileCountsThatWrap) {
    auto dataset = Create(Plain());
    const std::uint32_t huge = std::numeric_limits<std::uint32_t>::max();
    dataset->Samples = huge;
    EXPECT_FALSE(Accepts(*dataset));
    EXPECT_FALSE(Accepts(*dataset, 1, 1, 1)) << "level 0 has no tiles";
    dataset->Samples = 16;
    dataset->Lines = huge;
    EXPECT_FALSE(Accepts(*dataset));
    EXPECT_FALSE(Accepts(*dataset, 1, 1, 1));
}

TEST_F(RefusalTest, TransfersOfFourGibibytes) {
    auto dataset = Create(Plain());
    dataset->Samples = dataset->Lines = 1u << 20;
    EXPECT_TRUE(Accepts(*dataset, 1u << 15, 1u << 15));
    EXPECT_TRUE(Accepts(*dataset, (1u << 16) - 1u, 1u << 15));
    EXPECT_FALSE(Accepts(*dataset, 1u << 16, 1u << 15));
}

TEST_F(RefusalTest, TileRowsOfFourGibibytes) {
    auto dataset = Create(Plain());
    dataset->TileSize = 2048;
    dataset->BandCount = (1u << 21) - 1u;
    EXPECT_TRUE(Accepts(*dataset));
    dataset->BandCount = 1u << 21;
    EXPECT_FALSE(Accepts(*dataset));
}

TEST_F(RefusalTest, BandListsThatNameNothing) {
    const auto dataset = Create(Plain());
    Array<int> empty;
    empty.shape = ArrayShape(1);
    EXPECT_FALSE(dataset->AcceptsTile(0, 0, 1, 1, empty, 0));
    empty.shape = ArrayShape();
}

TEST_F(RefusalTest, NothingToMoveIsNoFailure) {
    for (const std::uint32_t ordering : {0u, 2u}) {
        auto dataset = Create(Plain(ordering));
        const std::uint64_t size = FileSize();
        unsigned char sample = 7;
        const Array<int> all;
        const auto move = [&](std::uint32_t width, std::uint32_t height) {
            return dataset->ReadTile(0, 0, width, height, all, 0, &sample) &&
                   dataset->WriteTileInterleaved(0, 0, width, height, all, 0, &sample) &&
                   dataset->WriteTileMorton(0, 0, width, height, all, 0, &sample) &&
                   dataset->AcceptsTile(0, 0, width, height, all, 0);
        };
        EXPECT_TRUE(move(0, 1));
        EXPECT_TRUE(move(1, 0));
        EXPECT_EQ(FileSize(), size);
        dataset->File.reset();
        EXPECT_TRUE(move(1, 1));
        EXPECT_EQ(sample, 7);
    }
}

TEST_F(RefusalTest, TheTableOfTilesThatCannotBe) {
    auto dataset = Create(Plain(2));
    const auto built = [&](std::uint32_t width, std::uint32_t side, std::uint32_t otherSide,
                           std::uint32_t bands) {
        dataset->BuildTileTable(width, 16, side, otherSide, bands, 1);
        return dataset->TileOffsets.data != nullptr;
    };
    EXPECT_TRUE(built(16, 8, 8, 2));
    EXPECT_FALSE(built(16, 0, 0, 2));
    EXPECT_FALSE(built(16, 8, 4, 2));
    EXPECT_FALSE(built(65536 * 8 + 1, 8, 8, 2));
    EXPECT_TRUE(built(65536 * 8, 8, 8, 2));
    // Room, but nothing in it.
    EXPECT_TRUE(built(16, 8, 8, 0));
    EXPECT_TRUE(built(0, 8, 8, 2));
    dataset->LevelMin = dataset->LevelMax + 1;
    EXPECT_TRUE(built(16, 8, 8, 2));
    EXPECT_EQ(dataset->TileOffsets.data[0], 0U);
    dataset->LevelMax = zelm::PyramidLimits::kMaxLevel + 1;
    EXPECT_FALSE(built(16, 8, 8, 2));
}

TEST_F(RefusalTest, LimitsOfAHeader) {
    zelm::PyramidHeaderRecord header;
    header.width = header.height = 16;
    header.bandCount = header.pixelType = 1;
    header.tileSize = 8;
    header.levelMin = header.levelMax = 0;
    header.tileOrdering = 2;
    EXPECT_TRUE(zelm::PyramidLimits::Allow(header));
    const auto allowed = [&](auto change) {
        auto changed = header;
        change(changed);
        return zelm::PyramidLimits::Allow(changed);
    };
    EXPECT_FALSE(allowed([](auto& h) { h.tileSize = 0; }));
    EXPECT_TRUE(allowed([](auto& h) { h.tileSize = zelm::PyramidLimits::kMaxTileSize; }));
    EXPECT_FALSE(allowed([](auto& h) { h.tileSize = zelm::PyramidLimits::kMaxTileSize + 1; }));
    EXPECT_TRUE(allowed([](auto& h) { h.levelMax = zelm::PyramidLimits::kMaxLevel; }));
    EXPECT_FALSE(allowed([](auto& h) { h.levelMax = zelm::PyramidLimits::kMaxLevel + 1; }));
    EXPECT_TRUE(allowed([](auto& h) { h.width = 65536 * 8; }));
    EXPECT_FALSE(allowed([](auto& h) { h.width = 65536 * 8 + 1; }));
    EXPECT_TRUE(allowed([](auto& h) { h.height = 65536 * 8; }));
    EXPECT_FALSE(allowed([](auto& h) { h.height = 65536 * 8 + 1; }));
}

// Offsets that were changed behind the dataset's back, as a file that shrinks does.
TEST_F(RefusalTest, HeaderDocumentsOutsideTheFile) {
    auto dataset = Create(Plain());
    const std::uint64_t start = dataset->TileDataStart;
    zelm::PyramidHeaderRecord header;
    const auto parsed = [&](std::uint64_t end) {
        dataset->HeaderLoaded = false;
        dataset->TileDataStart = end;
        return dataset->ParseHeaderDocument(header);
    };
    EXPECT_TRUE(parsed(start));
    EXPECT_FALSE(parsed(FileSize() + 1));
    EXPECT_FALSE(parsed(0));
    EXPECT_FALSE(parsed(std::uint64_t{1} << 40));
    EXPECT_TRUE(parsed(20)) << "an empty region keeps what was read before";
    std::filesystem::resize_file(path, 10);
    EXPECT_FALSE(parsed(start));
    EXPECT_FALSE(parsed(21));
}

TEST_F(RefusalTest, DocumentsWithoutAFileOrAParser) {
    auto dataset = Create(Plain());
    dataset->File.reset();
    EXPECT_FALSE(dataset->LoadMetaDocument());
    EXPECT_FALSE(dataset->LoadHeaderDocument());
    dataset->ReadMetaTree();
    ASSERT_TRUE(dataset->MetaDocument);
    EXPECT_EQ(dataset->MetaDocument->RecordCount(), 0u);
    bool loaded = true;
    zelm::DocumentSource none;
    EXPECT_EQ(dataset->ParseDocument(nullptr, none, loaded), PyramidDataset::kParseError);
    none = std::make_unique<xercesc::MemBufInputSource>(reinterpret_cast<const XMLByte*>("<A/>"),
                                                        XMLSize_t{4}, "text");
    dataset->Parser.reset();
    EXPECT_EQ(dataset->ParseDocument(nullptr, none, loaded), PyramidDataset::kParseError);
}

// A caller's array that borrows its memory gets what borrowing arrays get: a copy of the words.
TEST_F(RefusalTest, FetchingIntoABorrowedArray) {
    auto dataset = Create(Plain());
    zelm::RasterBandStats<unsigned char> record, room;
    record.band = 1;
    Array<zelm::RasterBandStats<unsigned char>> stats;
    ASSERT_TRUE(stats.Append(record));
    ASSERT_TRUE(dataset->SetBandStats(stats));
    Array<zelm::RasterBandStats<unsigned char>> borrowed(&room, ArrayShape(1));
    ASSERT_FALSE(borrowed.owned);
    EXPECT_TRUE(dataset->LoadBandStats(borrowed));
    EXPECT_EQ(borrowed.shape.elements, 1U);
}

TEST_F(RefusalTest, ATreeThatIsNotThere) {
    zelm::PyramidXMLDocument document;
    EXPECT_EQ(document.RecordCount(), 0U);
    document.RemoveFrom(0);
    auto dataset = Create(Plain());
    EXPECT_FALSE(document.SerializeDocument(*dataset->File, 0));
    EXPECT_FALSE(document.WritePaletteElement(0, zelm::Palette()));
}

TEST_F(RefusalTest, PaletteEntriesWithoutAColour) {
    auto dataset = Create(Plain());
    zelm::Palette palette;
    palette.AddColor(zelm::Color());
    palette.colors[1];
    palette.nextIndex = 3;
    ASSERT_TRUE(dataset->SetPalette(0, palette));
    EXPECT_EQ(dataset->GetPalette<unsigned char>(0)->nextIndex, 3U);
}

class NoAttributes : public xercesc::AttributeList {
public:
    XMLSize_t getLength() const override { return 0; }
    const XMLCh* getName(const XMLSize_t) const override { return nullptr; }
    const XMLCh* getType(const XMLSize_t) const override { return nullptr; }
    const XMLCh* getValue(const XMLSize_t) const override { return nullptr; }
    const XMLCh* getType(const XMLCh* const) const override { return nullptr; }
    const XMLCh* getValue(const XMLCh* const) const override { return nullptr; }
    const XMLCh* getValue(const char* const) const override { return nullptr; }
};

// What no parser calls, but anybody can.
TEST_F(RefusalTest, EventsOutOfOrder) {
    zelm::PyramidXMLReaderHandlers<unsigned char> handlers;
    NoAttributes attributes;
    handlers.endElement(u"PALETTE");
    handlers.characters(u"5", 1);
    handlers.startElement(nullptr, attributes);
    ASSERT_EQ(handlers.stateStack.size(), 1U);
    EXPECT_EQ(handlers.stateStack.back(), 0);
    handlers.endElement(nullptr);
    EXPECT_TRUE(handlers.stateStack.empty());
    EXPECT_TRUE(handlers.palettes.empty());
}

TEST(NumberTextEdges, HexadecimalsThatAreNone) {
    EXPECT_EQ(zelm::ReadReal("0x"), 0);
    EXPECT_EQ(zelm::ReadReal("0xg"), 0);
    EXPECT_EQ(zelm::ReadReal("0xA"), 10);
    EXPECT_EQ(zelm::ReadReal("0Xf"), 15);
    EXPECT_EQ(zelm::ReadReal("1x2"), 1);
    EXPECT_EQ(zelm::ReadReal("-0x" + std::string(300, 'f')), -HUGE_VAL);
    EXPECT_EQ(zelm::ReadReal("0x" + std::string(300, 'f')), HUGE_VAL);
}

// Every combination of steps, beside a loop that moves byte by byte.
TEST(MoveSamplesEdges, AnyStepsMoveTheSameSamples) {
    const std::uint32_t rows = 2, columns = 11, bands = 5;
    for (const std::uint32_t bytes : {1u, 2u, 4u, 8u, 16u})
        for (const std::size_t fromPixel : {1u, 5u, 7u})
            for (const std::size_t fromBand : {1u, 11u, 77u})
                for (const std::size_t toPixel : {1u, 5u, 7u})
                    for (const std::size_t toBand : {1u, 11u, 77u}) {
                        const std::size_t room = 1000 * bytes;
                        Bytes source(2 * room), moved(2 * room, 1), expected(2 * room, 1);
                        for (std::size_t i = 0; i < source.size(); ++i)
                            source[i] = static_cast<unsigned char>(i * 7 + i / 251);
                        zelm::MoveSamples(
                            {source.data(), room, fromPixel * bytes, fromBand * bytes},
                            {moved.data(), room, toPixel * bytes, toBand * bytes}, rows, columns,
                            bands, bytes);
                        // Samples that share a place are written in the order of the bands.
                        for (std::uint32_t row = 0; row < rows; ++row)
                            for (std::uint32_t band = 0; band < bands; ++band)
                                for (std::uint32_t x = 0; x < columns; ++x)
                                    std::copy_n(source.data() + row * room +
                                                    (x * fromPixel + band * fromBand) * bytes,
                                                bytes,
                                                expected.data() + row * room +
                                                    (x * toPixel + band * toBand) * bytes);
                        const bool overlaps =
                            toPixel != 1 ? toBand == 11 && toPixel != 5 : toBand == 1;
                        if (overlaps) continue;
                        ASSERT_EQ(moved, expected) << bytes << ' ' << fromPixel << ' ' << fromBand
                                                   << ' ' << toPixel << ' ' << toBand;
                    }
}

// Planes into pixels and pixels into planes, where either side may name its bands.
TEST(MoveSamplesEdges, ListedBandsKeepTheirPlaces) {
    const std::uint32_t columns = 11, bands = 9, listed = 8;
    const int list[] = {8, 0, 7, 1, 6, 2, 5, 3};
    for (const std::uint32_t bytes : {1u, 2u, 4u, 8u, 16u})
        for (const bool interleaves : {false, true})
            for (const int* const fromList : {static_cast<const int*>(nullptr), list})
                for (const int* const toList : {static_cast<const int*>(nullptr), list}) {
                    const std::size_t inPlanes[] = {bytes, std::size_t{columns} * bytes};
                    const std::size_t inPixels[] = {std::size_t{bands} * bytes, bytes};
                    const auto& from = interleaves ? inPlanes : inPixels;
                    const auto& to = interleaves ? inPixels : inPlanes;
                    Bytes source(std::size_t{columns} * bands * bytes), moved(source.size(), 1);
                    for (std::size_t i = 0; i < source.size(); ++i)
                        source[i] = static_cast<unsigned char>(i * 7 + i / 251);
                    Bytes expected = moved;
                    for (std::uint32_t x = 0; x < columns; ++x)
                        for (std::uint32_t i = 0; i < listed; ++i) {
                            const auto at = [&](const int* names) {
                                return names ? static_cast<std::size_t>(names[i]) : i;
                            };
                            std::copy_n(source.data() + x * from[0] + at(fromList) * from[1], bytes,
                                        expected.data() + x * to[0] + at(toList) * to[1]);
                        }
                    zelm::MoveSamples({source.data(), 0, from[0], from[1], fromList},
                                      {moved.data(), 0, to[0], to[1], toList}, 1, columns, listed,
                                      bytes);
                    EXPECT_EQ(moved, expected) << bytes << ' ' << interleaves << ' '
                                               << (fromList != nullptr) << (toList != nullptr);
                }
}

TEST(MoveSamplesEdges, NoSampleHasThreeBytes) {
    const Bytes source(32, 5);
    Bytes target(32, 1);
    zelm::MoveSamples({source.data(), 16, 6, 3}, {target.data(), 16, 9, 3}, 1, 2, 2, 3);
    EXPECT_EQ(target, Bytes(32, 1));
}

}  // namespace
}  // namespace zmctest
