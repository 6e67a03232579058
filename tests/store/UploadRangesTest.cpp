// The ranges of an upload: they tile the file, their sizes are what stores take, and each worker
// knows its own.
#include "store/UploadRanges.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <algorithm>
#include <numeric>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"

namespace zmcstore {
namespace {

using zmchost::Extent;
using zmchost::PartGrid;
using zmchost::PyramidHeader;

// Runs with gaps of any size between them, also none.
std::vector<Extent> AnyRuns(std::uint64_t longest) {
    std::vector<Extent> runs;
    std::uint64_t at = 0;
    const int count = *rc::gen::inRange(0, 40);
    for (int i = 0; i < count; ++i) {
        const std::uint64_t begin = at + *rc::gen::inRange<std::uint64_t>(0, longest);
        at = begin + *rc::gen::inRange<std::uint64_t>(1, longest);
        runs.push_back({begin, at});
    }
    return runs;
}

std::vector<Extent> RangesOf(const std::vector<std::uint64_t>& bounds) {
    std::vector<Extent> ranges;
    for (const std::uint64_t bound : bounds)
        ranges.push_back({ranges.empty() ? 0 : ranges.back().end, bound});
    return ranges;
}

std::uint64_t BytesOf(const std::vector<Extent>& extents) {
    return std::accumulate(extents.begin(), extents.end(), std::uint64_t{0},
                           [](std::uint64_t sum, const Extent& each) { return sum + each.Size(); });
}

RC_GTEST_PROP(UploadRanges, TileTheFileInSizesThatStoresTake, ()) {
    const auto least = *rc::gen::inRange<std::uint64_t>(1, 300);
    const std::vector<Extent> runs = AnyRuns(1000);
    const std::uint64_t end =
        (runs.empty() ? 0 : runs.back().end) + *rc::gen::inRange<std::uint64_t>(0, 500);
    const std::vector<std::uint64_t> bounds = PlanRanges(runs, end, least);
    for (const Extent& range : RangesOf(bounds)) {
        RC_ASSERT(range.begin < range.end);
        RC_ASSERT(range.Size() >= least);
        RC_ASSERT(range.Size() < 2 * std::max<std::uint64_t>(least, 16 << 20));
        RC_ASSERT(range.end <= end);
    }
    RC_ASSERT(end - (bounds.empty() ? 0 : bounds.back()) < least);
}

RC_GTEST_PROP(UploadRanges, OfALongRunAllButItsBeginningIsItsOwn, ()) {
    const auto least = *rc::gen::inRange<std::uint64_t>(1, 300);
    std::vector<Extent> runs = AnyRuns(1000);
    const std::uint64_t begin = (runs.empty() ? 0 : runs.back().end) + 1;
    const Extent run{begin, begin + *rc::gen::inRange<std::uint64_t>(2, 50) * least};
    runs.push_back(run);
    const auto bounds = PlanRanges(runs, run.end, least);
    const Share share = ShareOf({&run, 1}, bounds);
    RC_ASSERT(BytesOf(share.pieces) < least);
    RC_ASSERT(bounds.back() == run.end);
}

RC_GTEST_PROP(UploadRanges, SharesAreAllBytesOfEachOnce, ()) {
    const auto least = *rc::gen::inRange<std::uint64_t>(1, 300);
    const std::vector<Extent> runs = AnyRuns(1000);
    const std::uint64_t end = (runs.empty() ? 0 : runs.back().end) + 10;
    const auto bounds = PlanRanges(runs, end, least);
    const std::vector<Extent> ranges = RangesOf(bounds);
    std::vector<bool> taken(ranges.size());
    for (const Extent& run : runs) {
        const Share share = ShareOf({&run, 1}, bounds);
        std::vector<Extent> all = share.pieces;
        for (const std::uint64_t range : share.ranges) {
            RC_ASSERT(range < ranges.size());
            RC_ASSERT(!taken[range]);
            taken[range] = true;
            all.push_back(ranges[range]);
        }
        RC_ASSERT(BytesOf(all) == run.Size());
        RC_ASSERT(zmchost::Merged(all) == std::vector<Extent>{run});
    }
}

TEST(UploadRanges, TenThousandAreEnoughForTheLargestFile) {
    const std::uint64_t least = LeastRange(kMostFileBytes, 1);
    EXPECT_EQ(kMostRangeBytes / 2, least);
    EXPECT_LE(PlanRanges({}, kMostFileBytes, least).size(), kMostRanges - 1);
    EXPECT_EQ(kUsualLeastRange, LeastRange(1, kUsualLeastRange));
}

TEST(UploadRanges, WorkersOfLongRunsShareNothing) {
    constexpr std::uint64_t kLong = std::uint64_t{20} << 20;
    const std::vector<Extent> runs = {{700, 700 + kLong}, {700 + kLong, 700 + 2 * kLong}};
    const auto bounds = PlanRanges(runs, 700 + 2 * kLong, kUsualLeastRange);
    ASSERT_EQ((std::vector<std::uint64_t>{kUsualLeastRange, 700 + kLong, 700 + 2 * kLong}), bounds);
    EXPECT_EQ((std::vector<Extent>{{700, kUsualLeastRange}}),
              ShareOf({&runs[0], 1}, bounds).pieces);
    EXPECT_TRUE(ShareOf({&runs[1], 1}, bounds).pieces.empty());
}

PyramidHeader AnyHeader(std::uint32_t bands) {
    PyramidHeader header;
    header.versionMajor = header.versionMinor = 1;
    header.bandCount = bands;
    header.width = *rc::gen::inRange<std::uint32_t>(1, 5000);
    header.height = *rc::gen::inRange<std::uint32_t>(1, 5000);
    header.tileSize = zmchost::kTileSide;
    header.levelMax = *rc::gen::inRange<std::uint32_t>(0, 4);
    while (std::min(header.width, header.height) >> header.levelMax == 0) --header.levelMax;
    header.pixelType = zelm::ElementTraits<std::uint16_t>::code;
    header.tileOrdering = zelm::TileOrderFor(bands, 256);
    header.tileDataStart = 637;
    header.tileDataEnd = header.tileDataStart + header.TileDataBytes();
    return header;
}

// What parts fill, and the levels above them, is all tile data, each byte once.
RC_GTEST_PROP(PartExtents, PartsAndTheLevelsAboveAreTheWholeFile, ()) {
    const PyramidHeader header = AnyHeader(*rc::gen::element<std::uint32_t>(1, 3, 9, 12));
    PartGrid grid{header.width, header.height,
                  *rc::gen::inRange<std::uint32_t>(0, header.levelMax + 1),
                  *rc::gen::inRange<std::uint32_t>(1, 4), *rc::gen::inRange<std::uint32_t>(1, 4)};
    std::vector<Extent> all;
    std::uint64_t bytes = 0;
    for (std::uint64_t part = 0; part < grid.Count(); ++part)
        for (const Extent& extent : PartExtents(header, grid, part)) {
            all.push_back(extent);
            bytes += extent.Size();
        }
    std::uint64_t expected = 0;
    for (std::uint32_t level = 0; level <= grid.level; ++level)
        expected += header.LevelBytes(level);
    RC_ASSERT(bytes == expected);
    const std::vector<Extent> merged = zmchost::Merged(all);
    RC_ASSERT(BytesOf(merged) == expected);
    RC_ASSERT(merged.front().begin >= header.tileDataStart);
    RC_ASSERT(merged.back().end <= header.tileDataEnd);
}

}  // namespace
}  // namespace zmcstore
