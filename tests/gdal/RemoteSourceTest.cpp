// What is fetched of a file behind a network: ranges, their store, and the source that plans them.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <map>
#include <numeric>
#include <random>
#include <thread>

#include "core/ElementTypes.h"
#include "gdal/Fetcher.h"
#include "gdal/RangeStore.h"
#include "gdal/RemoteSource.h"
#include "gdal/WindowTiles.h"

namespace zmctest {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using zmcgdal::ByteRange;
using zmcgdal::Bytes;
using zmcgdal::ClippedSource;
using zmcgdal::FetchError;
using zmcgdal::Merged;
using zmcgdal::NetworkPart;
using zmcgdal::RangeStore;
using zmcgdal::RemoteSource;
using zmcgdal::WindowTiles;

std::mt19937 random(1);

std::uint64_t Below(std::uint64_t limit) {
    return std::uniform_int_distribution<std::uint64_t>(0, limit - 1)(random);
}

Bytes RandomBytes(std::size_t size) {
    Bytes bytes(size);
    for (unsigned char& byte : bytes) byte = static_cast<unsigned char>(Below(256));
    return bytes;
}

Bytes Part(const Bytes& bytes, const ByteRange& range) {
    const auto begin = bytes.begin() + static_cast<std::ptrdiff_t>(range.offset);
    return {begin, begin + static_cast<std::ptrdiff_t>(range.size)};
}

TEST(MergedRanges, JoinsNeighboursAndSmallGaps) {
    EXPECT_THAT(Merged({{30, 10}, {0, 10}, {10, 10}}, 0),
                ElementsAre(ByteRange{0, 20}, ByteRange{30, 10}));
    EXPECT_THAT(Merged({{30, 10}, {0, 20}}, 10), ElementsAre(ByteRange{0, 40}));
    EXPECT_THAT(Merged({{30, 10}, {0, 20}}, 9), ElementsAre(ByteRange{0, 20}, ByteRange{30, 10}));
    EXPECT_THAT(Merged({{0, 40}, {10, 10}, {50, 0}}, 0), ElementsAre(ByteRange{0, 40}));
    EXPECT_THAT(Merged({{5, 0}}, 100), IsEmpty());
}

TEST(MergedRanges, CoverWhatWasAskedForAndNoLargeGap) {
    constexpr std::size_t kSpace = 200;
    for (int round = 0; round < 500; ++round) {
        const std::uint64_t gap = Below(20);
        std::vector<ByteRange> ranges(Below(12));
        std::vector<bool> asked(kSpace), covered(kSpace);
        for (ByteRange& range : ranges) {
            range = {Below(150), Below(50)};
            std::fill_n(asked.begin() + static_cast<std::ptrdiff_t>(range.offset), range.size,
                        true);
        }
        std::uint64_t end = 0;
        for (const ByteRange& range : Merged(ranges, gap)) {
            EXPECT_TRUE(end == 0 || range.offset - end > gap);
            end = range.End();
            EXPECT_TRUE(asked[range.offset] && asked[end - 1]);
            std::uint64_t hole = 0;
            for (std::uint64_t at = range.offset; at < end; ++at) {
                covered[at] = true;
                hole = asked[at] ? 0 : hole + 1;
                EXPECT_LE(hole, gap);
            }
        }
        for (std::size_t at = 0; at < kSpace; ++at) EXPECT_TRUE(covered[at] || !asked[at]);
    }
}

// Every byte that is held reads as it was put in first.
TEST(Store, HoldsWhatAMapOfBytesWouldHold) {
    constexpr std::size_t kSpace = 300;
    for (int round = 0; round < 200; ++round) {
        RangeStore store(1 << 20);
        std::map<std::uint64_t, unsigned char> model;
        for (int step = 0; step < 30; ++step) {
            const std::uint64_t offset = Below(kSpace);
            const Bytes bytes = RandomBytes(Below(60));
            for (std::size_t i = 0; i < bytes.size(); ++i) model.emplace(offset + i, bytes[i]);
            store.Put(offset, bytes);
            ASSERT_EQ(store.Held(), model.size());
            const std::uint64_t from = Below(kSpace);
            const std::size_t size = Below(80);
            Bytes expected, got(size);
            for (auto at = model.find(from); at != model.end() && expected.size() < size; ++at) {
                if (at->first != from + expected.size()) break;
                expected.push_back(at->second);
            }
            got.resize(store.Read(from, got.data(), size));
            ASSERT_EQ(got, expected);
            ASSERT_EQ(store.Holds({from, size}), expected.size() == size);
        }
    }
}

TEST(Store, ForgetsWhatWasNotLookedAtForLongest) {
    RangeStore store(30);
    for (const std::uint64_t offset : {0U, 100U, 200U}) {
        store.BeginGroup();
        store.Put(offset, Bytes(10, 1));
    }
    unsigned char byte = 0;
    EXPECT_EQ(store.Read(5, &byte, 1), 1U);
    store.BeginGroup();
    store.Put(300, Bytes(10, 1));
    EXPECT_TRUE(store.Holds({0, 10}));
    EXPECT_FALSE(store.Holds({100, 1}));
    EXPECT_TRUE(store.Holds({200, 10}));
    EXPECT_TRUE(store.Holds({300, 10}));
}

TEST(Store, KeepsAGroupWholeThatIsLargerThanItself) {
    RangeStore store(30);
    store.Put(0, Bytes(10, 1));
    store.BeginGroup();
    store.Put(100, Bytes(25, 2));
    store.Put(200, Bytes(25, 3));
    EXPECT_TRUE(store.Holds({100, 25}));
    EXPECT_TRUE(store.Holds({200, 25}));
    EXPECT_EQ(store.Held(), 50U);
}

zmchost::PyramidHeader HeaderOf(std::uint32_t width, std::uint32_t height, std::uint32_t bands,
                                std::uint32_t tileSize) {
    zmchost::PyramidHeader header;
    header.versionMajor = header.versionMinor = 1;
    header.width = width;
    header.height = height;
    header.bandCount = bands;
    header.tileSize = tileSize;
    header.levelMax = 3;
    header.pixelType = zelm::PixelTypeCode::UInt16;
    header.tileOrdering = zelm::TileOrderFor(bands, 2);
    header.tileDataStart = 1000;
    header.tileDataEnd = header.tileDataStart + header.TileDataBytes();
    header.fileSize = header.tileDataEnd;
    return header;
}

// The ranges of a window's tiles one by one: by counting bytes, or by the whole table.
std::vector<ByteRange> NaiveTiles(const zmchost::PyramidHeader& header, std::uint32_t level,
                                  const zelm::Rectangle& window,
                                  const std::vector<std::uint32_t>& bands) {
    const zelm::LevelGeometry grid = header.Geometry(level);
    const zelm::LevelGeometry zero = header.Geometry(0);
    zelm::Array<std::uint64_t> table;
    const std::uint64_t tiles = std::uint64_t{zero.tilesAcross} * zero.tilesDown;
    if (header.IsPlanar()) {
        std::uint64_t cursor = header.tileDataStart;
        zelm::TileTable{zero, header.levelMin, header.levelMax, header.bandCount, 2}.Place(table,
                                                                                           cursor);
    }
    std::vector<ByteRange> found;
    std::uint64_t place = header.LevelOffset(level);
    for (std::uint32_t row = 0; row < grid.tilesDown; ++row)
        for (std::uint32_t column = 0; column < grid.tilesAcross; ++column) {
            const zelm::Rectangle tile = grid.Tile(column, row);
            const std::uint64_t bytes = tile.Pixels() * 2;
            const bool touched = !Intersection(tile, window).IsEmpty();
            const std::uint64_t index = std::uint64_t{row} * grid.tilesAcross + column;
            if (!header.IsPlanar() && touched) found.push_back({place, bytes * header.bandCount});
            if (header.IsPlanar() && touched)
                for (const std::uint32_t band : bands)
                    found.push_back(
                        {table.data[(level * header.bandCount + band) * tiles + index], bytes});
            place += bytes * header.bandCount;
        }
    return found;
}

TEST(TilesOfAWindow, AreThoseOfAWalkThroughTheFile) {
    for (int round = 0; round < 200; ++round) {
        const auto bands = static_cast<std::uint32_t>(round % 2 == 0 ? 1 + Below(8) : 9 + Below(4));
        const auto header = HeaderOf(static_cast<std::uint32_t>(40 + Below(300)),
                                     static_cast<std::uint32_t>(40 + Below(300)), bands, 32);
        const auto level = static_cast<std::uint32_t>(Below(4));
        const zelm::LevelGeometry grid = header.Geometry(level);
        const auto x = static_cast<std::uint32_t>(Below(grid.samples));
        const auto y = static_cast<std::uint32_t>(Below(grid.lines));
        const zelm::Rectangle window{x, y, static_cast<std::uint32_t>(1 + Below(grid.samples - x)),
                                     static_cast<std::uint32_t>(1 + Below(grid.lines - y))};
        std::vector<std::uint32_t> shown = {bands - 1, 0};
        if (bands == 1) shown.pop_back();
        const auto expected = NaiveTiles(header, level, window, shown);
        WindowTiles tiles(header, level, window, shown);
        ASSERT_EQ(tiles.First(1 << 30), expected);
        const std::size_t first = Below(expected.size());
        const std::size_t count = 1 + Below(expected.size() - first);
        const std::vector<ByteRange> part(
            expected.begin() + static_cast<std::ptrdiff_t>(first),
            expected.begin() + static_cast<std::ptrdiff_t>(first + count));
        std::uint64_t most = 0;
        for (const ByteRange& range : part) most += range.size;
        ASSERT_EQ(tiles.From(part.front().End() - 1, most), part);
        ASSERT_THAT(tiles.From(5, 1 << 30), IsEmpty());
        ASSERT_THAT(tiles.From(header.tileDataEnd, 1 << 30), IsEmpty());
        ASSERT_THAT(tiles.First(0), ElementsAre(expected.front()));
    }
}

TEST(TilesOfAWindow, AreToldInPartsWhereTheyAreMany) {
    const auto header = HeaderOf(1000, 500, 1, 1);
    WindowTiles tiles(header, 0, header.Geometry(0).Whole(), {0});
    const auto first = tiles.First(1 << 30);
    EXPECT_EQ(first.size(), WindowTiles::kMostTiles);
    const auto next = tiles.From(first.back().End(), 1 << 30);
    EXPECT_EQ(next.size(), WindowTiles::kMostTiles);
    EXPECT_EQ(next.front().offset, first.back().End());
}

// Gives out parts of `bytes`, and remembers which.
class FakeFetcher final : public zmcgdal::Fetcher {
public:
    explicit FakeFetcher(Bytes content) : bytes(std::move(content)) {}
    Bytes FetchFront() override {
        return Part(bytes, {0, std::min<std::uint64_t>(kFrontBytes, bytes.size())});
    }
    std::uint64_t Size() const override { return bytes.size(); }
    std::vector<Bytes> Fetch(std::span<const ByteRange> ranges) override {
        if (fails) throw FetchError("the network is down");
        std::vector<Bytes> fetched;
        for (const ByteRange& range : ranges) fetched.push_back(Part(bytes, range));
        asked.insert(asked.end(), ranges.begin(), ranges.end());
        ++groups;
        return fetched;
    }

    const Bytes bytes;
    std::vector<ByteRange> asked;
    int groups = 0;
    bool fails = false;
};

struct Remote {
    explicit Remote(Bytes content, std::uint64_t store = 1 << 22) {
        auto made = std::make_unique<FakeFetcher>(std::move(content));
        fetcher = made.get();
        source = std::make_shared<RemoteSource>(std::move(made), store);
    }
    FakeFetcher* fetcher;
    std::shared_ptr<RemoteSource> source;
};

TEST(RemoteFile, ReadsAsTheFileItself) {
    const Bytes content = RandomBytes(400000);
    for (const std::uint64_t store : {0U, 1000U, 100000U, 1U << 22}) {
        const Remote remote(content, store);
        for (int round = 0; round < 100; ++round) {
            const std::uint64_t offset = Below(410000);
            Bytes got(Below(50000));
            const std::uint64_t there = offset < content.size() ? content.size() - offset : 0;
            const std::size_t count = std::min<std::uint64_t>(got.size(), there);
            int error = -1;
            ASSERT_EQ(remote.source->ReadAt(offset, got.data(), got.size(), &error), count);
            ASSERT_EQ(error, 0);
            got.resize(count);
            ASSERT_EQ(got, count == 0 ? Bytes() : Part(content, {offset, count}));
        }
    }
}

TEST(RemoteFile, AnswersItsFrontWithoutARequest) {
    const Remote remote(RandomBytes(100000));
    Bytes got(16384);
    EXPECT_EQ(remote.source->ReadAt(0, got.data(), got.size()), got.size());
    EXPECT_EQ(remote.source->Size(), 100000U);
    EXPECT_THAT(remote.fetcher->asked, IsEmpty());
}

TEST(RemoteFile, FetchesAPlanInOneGroup) {
    const auto header = HeaderOf(600, 500, 3, 64);
    const Remote remote(RandomBytes(header.tileDataEnd));
    const zelm::Rectangle window{100, 300, 200, 100};
    WindowTiles tiles(header, 0, window, {0, 1, 2});
    const auto ranges = NaiveTiles(header, 0, window, {0, 1, 2});
    remote.source->Plan(tiles);
    for (const ByteRange& range : ranges) {
        Bytes got(range.size);
        EXPECT_EQ(remote.source->ReadAt(range.offset, got.data(), got.size()), got.size());
        EXPECT_EQ(got, Part(remote.fetcher->bytes, range));
    }
    remote.source->EndPlan();
    EXPECT_EQ(remote.fetcher->groups, 1);
    EXPECT_TRUE(remote.source->Advise(tiles));
    EXPECT_EQ(remote.fetcher->groups, 1);
}

TEST(RemoteFile, KeepsToItsStoreWhateverIsPlanned) {
    const auto header = HeaderOf(900, 700, 10, 64);
    const Remote remote(RandomBytes(header.tileDataEnd), 1 << 20);
    std::vector<std::uint32_t> bands(10);
    std::iota(bands.begin(), bands.end(), 0U);
    const auto ranges = NaiveTiles(header, 0, header.Geometry(0).Whole(), bands);
    remote.source->Plan({header, 0, header.Geometry(0).Whole(), bands});
    std::uint64_t wanted = 0, fetched = 0;
    for (const ByteRange& range : ranges) {
        Bytes got(range.size);
        EXPECT_EQ(remote.source->ReadAt(range.offset, got.data(), got.size()), got.size());
        wanted += range.size;
    }
    for (const ByteRange& range : remote.fetcher->asked) {
        EXPECT_LE(range.size, 1U << 20);
        fetched += range.size;
    }
    EXPECT_LE(remote.fetcher->groups, static_cast<int>(wanted / (1 << 19)) + 2);
    EXPECT_LE(fetched, 2 * wanted);
}

TEST(RemoteFile, FetchesPartsOfTilesThatAreLargerThanItsStore) {
    const auto header = HeaderOf(2000, 1000, 8, 1000);
    const Remote remote(RandomBytes(header.tileDataEnd), 1 << 20);
    const WindowTiles tiles(header, 0, header.Geometry(0).Whole(), {0});
    EXPECT_TRUE(remote.source->Advise(tiles));
    remote.source->Plan(tiles);
    const std::uint64_t place = header.LevelOffset(0) + 10000000;
    Bytes got(1000);
    EXPECT_EQ(remote.source->ReadAt(place, got.data(), got.size()), got.size());
    EXPECT_EQ(got, Part(remote.fetcher->bytes, {place, got.size()}));
    for (const ByteRange& range : remote.fetcher->asked) EXPECT_LE(range.size, 1U << 19);
}

TEST(RemoteFile, TellsWhyNothingCame) {
    const Remote remote(RandomBytes(100000));
    remote.fetcher->fails = true;
    char byte = 7;
    int error = 0;
    EXPECT_EQ(remote.source->ReadAt(50000, &byte, 1, &error), 0U);
    EXPECT_EQ(error, EIO);
    EXPECT_EQ(byte, 7);
    EXPECT_EQ(remote.source->TakeTrouble(), "the network is down");
    EXPECT_EQ(remote.source->TakeTrouble(), "");
    remote.fetcher->fails = false;
    EXPECT_EQ(remote.source->ReadAt(50000, &byte, 1, &error), 1U);
}

TEST(RemoteFile, ServesSeveralThreads) {
    const Bytes content = RandomBytes(300000);
    const Remote remote(content, 50000);
    std::vector<std::thread> threads;
    for (std::uint64_t first = 0; first < 4; ++first)
        threads.emplace_back([&, first] {
            for (std::uint64_t at = first * 1000; at + 3000 < content.size(); at += 7000) {
                Bytes got(3000);
                EXPECT_EQ(remote.source->ReadAt(at, got.data(), got.size()), got.size());
                EXPECT_EQ(got, Part(content, {at, got.size()}));
            }
        });
    for (std::thread& thread : threads) thread.join();
}

TEST(RemoteFile, EndsEarlierWhereItIsClipped) {
    const Bytes content = RandomBytes(100000);
    const Remote remote(content);
    ClippedSource clipped(remote.source, 60000);
    Bytes got(1000);
    int error = -1;
    EXPECT_EQ(clipped.Size(), 60000U);
    EXPECT_EQ(clipped.ReadAt(59900, got.data(), got.size(), &error), 100U);
    EXPECT_EQ(error, 0);
    EXPECT_EQ(clipped.ReadAt(70000, got.data(), got.size(), &error), 0U);
    EXPECT_EQ(error, 0);
    EXPECT_EQ(clipped.ReadAt(100, got.data(), got.size()), got.size());
    EXPECT_EQ(got, Part(content, {100, 1000}));
    EXPECT_EQ(ClippedSource(remote.source, 200000).Size(), 100000U);
}

TEST(NetworkNames, AreFoundWithinOtherNames) {
    EXPECT_EQ(NetworkPart("/vsicurl/http://a/b.pyr"), "/vsicurl/http://a/b.pyr");
    EXPECT_EQ(NetworkPart("/vsis3/bucket/b.pyr"), "/vsis3/bucket/b.pyr");
    EXPECT_EQ(NetworkPart("/vsizip//vsicurl/http://a/b.zip/c.pyr"), "/vsicurl/http://a/b.zip");
    EXPECT_EQ(NetworkPart("/vsizip/{/vsicurl/http://a/b}/c.pyr"), "/vsicurl/http://a/b");
    EXPECT_EQ(NetworkPart("/vsitar//vsicurl/http://a/b.tar.gz/c"), "/vsicurl/http://a/b.tar.gz");
    EXPECT_EQ(NetworkPart("/vsigzip//vsigs/a/b.gz"), "/vsigs/a/b.gz");
    EXPECT_EQ(NetworkPart("/vsisubfile/1_2,/vsicurl/http://a/b"), "/vsicurl/http://a/b");
    EXPECT_EQ(NetworkPart("/vsimem/a.pyr"), "");
    EXPECT_EQ(NetworkPart("http.pyr"), "");
}

}  // namespace
}  // namespace zmctest
