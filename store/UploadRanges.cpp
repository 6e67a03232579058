#include "store/UploadRanges.h"

#include <algorithm>

namespace zmcstore {
namespace {

using zmchost::Extent;

constexpr std::uint64_t kUsualRange = std::uint64_t{16} << 20;

class Cutter {
public:
    explicit Cutter(std::uint64_t leastBytes) : least(leastBytes) {}

    // The next bytes of one owner. A range that is still too short takes as many of them as it
    // lacks, if what is left of them then is enough for one of its own, and else all.
    void Take(const Extent& run) {
        if (run.begin == run.end) return;
        const std::uint64_t lacking = run.begin == begin ? 0 : least - (run.begin - begin);
        if (run.Size() >= lacking + least) {
            if (lacking != 0) Cut(run.begin + lacking);
            CutEvenly(run.end);
        } else if (run.end - begin >= least) {
            Cut(run.end);
        }
    }

    std::vector<std::uint64_t> bounds;

private:
    void Cut(std::uint64_t bound) {
        bounds.push_back(bound);
        begin = bound;
    }
    void CutEvenly(std::uint64_t end) {
        const std::uint64_t first = begin, bytes = end - begin;
        const std::uint64_t count =
            std::max<std::uint64_t>(1, bytes / std::max(least, kUsualRange));
        for (std::uint64_t i = 1; i < count; ++i) Cut(first + bytes / count * i);
        Cut(end);
    }

    const std::uint64_t least;
    std::uint64_t begin = 0;  // of the range that has no end yet
};

}  // namespace

std::uint64_t LeastRange(std::uint64_t fileBytes, std::uint64_t wanted) {
    constexpr std::uint64_t kMost = kMostRanges - 1;
    return std::max({wanted, (fileBytes + kMost - 1) / kMost, std::uint64_t{1}});
}

std::vector<std::uint64_t> PlanRanges(std::span<const Extent> runs, std::uint64_t end,
                                      std::uint64_t least) {
    Cutter cutter(least);
    std::uint64_t done = 0;
    for (const Extent& run : runs) {
        cutter.Take({done, run.begin});
        cutter.Take(run);
        done = run.end;
    }
    cutter.Take({done, end});
    return std::move(cutter.bounds);
}

Share ShareOf(std::span<const Extent> extents, std::span<const std::uint64_t> bounds) {
    Share share;
    for (const Extent& extent : extents) {
        std::uint64_t done = extent.begin;
        // The first range that begins in the extent.
        auto number = extent.begin == 0
                          ? std::size_t{0}
                          : static_cast<std::size_t>(
                                std::ranges::lower_bound(bounds, extent.begin) - bounds.begin()) +
                                1;
        for (; number < bounds.size() && bounds[number] <= extent.end; ++number) {
            const std::uint64_t begin = number == 0 ? 0 : bounds[number - 1];
            if (done < begin) share.pieces.push_back({done, begin});
            share.ranges.push_back(number);
            done = bounds[number];
        }
        if (done < extent.end) share.pieces.push_back({done, extent.end});
    }
    return share;
}

}  // namespace zmcstore
