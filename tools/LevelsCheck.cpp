#include <algorithm>
#include <cstring>

#include "host/NoData.h"
#include "host/Reduction.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"
#include "tools/SampleDifferences.h"
#include "tools/Verification.h"

namespace zmctools {
namespace {

// Columns and rows of the coarser level that are made beyond a block and dropped: the widest kernel
// reaches 5 finer pixels over the edge of its cell.
constexpr std::uint32_t kMargin = 3;
// Bytes of samples and masks of the finer part of a block.
constexpr std::uint64_t kBlockBytes = std::uint64_t{64} << 20;

// The finer pixels [first, first + extent) that coarser ones depend on, from an even coordinate on,
// so that cells are those of the whole level.
std::pair<std::uint32_t, std::uint32_t> Reach(std::uint32_t start, std::uint32_t extent,
                                              std::uint32_t limit) {
    const std::uint32_t first = start > kMargin ? start - kMargin : 0;
    const std::uint64_t end =
        std::min<std::uint64_t>((std::uint64_t{start} + extent + kMargin) * 2, limit);
    return {first * 2, static_cast<std::uint32_t>(end - first * 2)};
}

template <class T>
class LevelsChecker {
public:
    LevelsChecker(zmchost::Raster& pyramid, zmchost::Resampling resampling)
        : raster(pyramid),
          method(resampling),
          halo(zmchost::ReductionHalo(resampling)),
          bands(pyramid.Bands()) {
        for (std::uint32_t band = 0; band < bands; ++band)
            rules.push_back(zmchost::RuleOfBand<T>(pyramid.Props(), band));
    }

    // A multiple of the tile's side: whole tiles are read once but for the margins.
    std::uint32_t BlockSide() const {
        std::uint32_t side = raster.TileSide();
        const auto bytes = [&](std::uint64_t next) {
            return next * next * 4 * bands * (sizeof(T) + 1);
        };
        while (side < 4096 && bytes(std::uint64_t{side} * 2) <= kBlockBytes) side *= 2;
        return side;
    }

    SampleDifferences Check(std::uint32_t level, TerminalProgress& bar, std::uint64_t& done,
                            std::uint64_t total) {
        const std::uint32_t code = zelm::ElementTraits<T>::code;
        SampleDifferences differences(code, code, bands, 0);
        const std::uint32_t side = BlockSide();
        for (std::uint32_t y = 0; y < raster.Height(level); y += side)
            for (std::uint32_t x = 0; x < raster.Width(level); x += side) {
                const zmchost::Window block{x, y, std::min(side, raster.Width(level) - x),
                                            std::min(side, raster.Height(level) - y)};
                CheckBlock(level, block, differences);
                done += std::uint64_t{block.width} * block.height;
                if (!bar.Show(done, total)) throw Interruption(raster.Name());
            }
        return differences;
    }

private:
    zmchost::Raster& raster;
    zmchost::Resampling method;
    std::uint32_t halo;
    std::uint32_t bands;
    std::vector<zelm::NoDataRule<T>> rules;
    std::vector<T> fine, stored, line;
    std::vector<unsigned char> mask;

    void CheckBlock(std::uint32_t level, const zmchost::Window& block,
                    SampleDifferences& differences) {
        const auto [x, width] = Reach(block.x, block.width, raster.Width(level - 1));
        const auto [y, height] = Reach(block.y, block.height, raster.Height(level - 1));
        const zmchost::Window source{x, y, width, height};
        fine.resize(std::size_t{width} * height * bands);
        mask.assign(fine.size(), 0);
        raster.Read(level - 1, source, raster.AllBands(), fine.data(), mask.data());
        stored.resize(std::size_t{block.width} * block.height * bands);
        raster.Read(level, block, raster.AllBands(), stored.data());
        line.resize(std::size_t{width} / 2 * bands);
        const std::size_t skipped = std::size_t{block.x - x / 2} * bands;
        for (std::uint32_t row = 0; row < block.height; ++row) {
            MakeRow(source, block.y + row);
            differences.Take({block.x, block.y + row, block.width, 1},
                             stored.data() + std::size_t{row} * block.width * bands,
                             line.data() + skipped);
        }
    }

    void MakeRow(const zmchost::Window& source, std::uint32_t coarseRow) {
        std::vector<const T*> rows;
        std::vector<const unsigned char*> masks;
        const std::size_t stride = std::size_t{source.width} * bands;
        const std::int64_t first = std::int64_t{coarseRow} * 2 - halo - source.y;
        for (std::int64_t y = first; y < first + 2 + 2 * std::int64_t{halo}; ++y) {
            const bool inside = y >= 0 && y < source.height;
            const std::size_t at = inside ? static_cast<std::size_t>(y) * stride : 0;
            rows.push_back(inside ? fine.data() + at : nullptr);
            masks.push_back(inside ? mask.data() + at : nullptr);
        }
        zmchost::ReduceRow<T>(method, bands, source.width, {rows.data(), masks.data()},
                              rules.data(), line.data(), nullptr);
    }
};

void Tell(const SampleDifferences& differences, std::uint32_t level, zmchost::Resampling method,
          CheckResult& result) {
    for (std::uint32_t band = 0; band < differences.Bands().size(); ++band) {
        const BandDifference& found = differences.Bands()[band];
        if (found.samples == 0) continue;
        result.problems.push_back("level " + std::to_string(level) + ", band " +
                                  std::to_string(band + 1) + ": " + std::to_string(found.samples) +
                                  " samples are not what " + zmchost::ResamplingName(method) +
                                  " makes of level " + std::to_string(level - 1) + ", first at " +
                                  std::to_string(found.x) + ',' + std::to_string(found.y) +
                                  "; --resampling names another method");
    }
}

}  // namespace

CheckResult CheckLevels(zmchost::Raster& raster, zmchost::Resampling method, bool quiet) {
    CheckResult result{"levels", {}, {}};
    if (!zmchost::SupportsElementType(method, raster.PixelType()))
        throw UsageError("--resampling", std::string(zmchost::ResamplingName(method)) +
                                             " is not defined for this pixel type");
    if (raster.MaxLevel() == raster.MinLevel()) result.skipped = "there is one level only";
    std::uint64_t total = 0;
    for (std::uint32_t level = raster.MinLevel() + 1; level <= raster.MaxLevel(); ++level)
        total += std::uint64_t{raster.Width(level)} * raster.Height(level);
    zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
        LevelsChecker<T> checker(raster, method);
        TerminalProgress bar("levels", !quiet);
        std::uint64_t done = 0;
        for (std::uint32_t level = raster.MinLevel() + 1; level <= raster.MaxLevel(); ++level)
            Tell(checker.Check(level, bar, done, total), level, method, result);
    });
    return result;
}

}  // namespace zmctools
