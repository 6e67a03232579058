// PixelWork: what a build does with samples and needs their type for. The builder itself moves
// bytes; one object of this class, made for the raster's type, does the rest.
//
// Rows are pixel-interleaved, with the mask byte of a sample at the sample's place. Operations on
// different rows may run on several threads; those of one lane, and those that use the reader,
// must not overlap.
#ifndef ZMC_HOST_BUILD_PIXELWORK_H
#define ZMC_HOST_BUILD_PIXELWORK_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "host/build/BandWeights.h"
#include "host/build/FullStatistics.h"
#include "host/raster/RasterSource.h"
#include "host/reduce/Reduction.h"
#include "raster/RasterProps.h"

namespace zmchost {

// The rows of a level that a coarser row is made of, null where the level ends.
struct RowWindow {
    static constexpr std::uint32_t kMaxRows = 2 + 2 * kMaxReductionHalo;
    const std::byte* rows[kMaxRows] = {};
    const unsigned char* masks[kMaxRows] = {};
    bool anyMask = false;
};

class PixelWork {
public:
    virtual ~PixelWork() = default;

    // Whether samples can be marked at all: a band has a no-data value, values may be infinite, or
    // masks hide some.
    virtual bool NeedsMasks() const = 0;
    // Sets every byte of a row's mask to 1 for a sample that is not valid, else 0; true if there
    // is one that is not. Where masks hide samples kHiddenBit stays as it is, and counts as well.
    virtual bool MarkRow(const std::byte* row, unsigned char* mask, std::uint32_t width) const = 0;
    // Whether ReduceRow may mark samples although nothing is marked in the source.
    virtual bool MayMark() const = 0;

    // `mask` may be null where the source has no masks and nothing may be marked.
    virtual void ReduceRow(const RowWindow& source, std::uint32_t sourceWidth, std::byte* row,
                           unsigned char* mask) const = 0;

    // Gathers the statistics of a row of level 0; the mask may be null.
    virtual void TakeStatistics(std::uint32_t lane, const std::byte* row, const unsigned char* mask,
                                std::uint32_t width) = 0;
    // Whether histograms need level 0 once more, and the same for that second walk.
    virtual bool NeedsSecondWalk() const = 0;
    virtual void BeginSecondWalk() = 0;
    virtual void TakeCounts(std::uint32_t lane, const std::byte* row, const unsigned char* mask,
                            std::uint32_t width) = 0;

    // For builds in parts: what the statistics have gathered as numbers, and what another object of
    // the same setup has, taken in; false, and nothing is, where the numbers are of another kind.
    // Both, and the counts of the second walk, which are saved and merged likewise, can be begun
    // anew.
    virtual std::string SaveSums() = 0;
    virtual void ClearSums() = 0;
    virtual bool MergeSums(std::string_view packed) = 0;
    virtual std::string SaveCounts() = 0;
    virtual bool MergeCounts(std::string_view packed) = 0;
    virtual void ClearCounts() = 0;

    // Whole tiles with all bands, through the module's reader. False if the module says so, which
    // it does not where the disk failed: Failure tells why that did not do all that was asked of it
    // since the last question, and is empty if it did.
    virtual std::string Failure() = 0;
    virtual bool ReadTile(std::uint32_t level, const Window& tile, std::byte* pixels) = 0;
    virtual bool WriteTile(std::uint32_t level, const Window& tile, std::byte* pixels,
                           unsigned char* cleanMask) = 0;

    // Hands statistics and histograms to the module, and the former back; none if there are none.
    virtual std::vector<FullStatistics> StoreStatistics() = 0;
    virtual std::uint64_t StatisticsMemory() const = 0;
};

struct PixelWorkSetup {
    zelm::RasterProps props;  // of the target: bands, pixel type, no-data values
    BandWeights weights;
    Resampling resampling = Resampling::Average;
    std::uint32_t lanes = 1;
    std::uint32_t bins = 256;
    bool statistics = true;
    std::uint64_t countersBudget = 0;  // bytes that tables of every value may take
};

class Raster;

// The work on the type of `target`, which outlives it. Where the properties tell another type than
// the raster's, moving tiles throws.
std::unique_ptr<PixelWork> MakePixelWork(Raster& target, const PixelWorkSetup& setup);

}  // namespace zmchost

#endif
