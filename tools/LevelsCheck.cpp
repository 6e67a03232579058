#include <algorithm>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "host/build/LevelReduction.h"
#include "host/raster/RasterLanes.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"
#include "tools/RasterView.h"
#include "tools/SampleDifferences.h"
#include "tools/Verification.h"

namespace zmctools {
namespace {

// Bytes of samples and masks of the finer parts of the blocks of all threads.
constexpr std::uint64_t kBlockBytes = std::uint64_t{64} << 20;
// The same of one where a tile has so many that to read it once takes more.
constexpr std::uint64_t kMostBlockBytes = 4 * kBlockBytes;

template <class T>
class LevelsChecker {
public:
    LevelsChecker(zmchost::Raster& pyramid, zmchost::Resampling method,
                  zmchost::SampleWeights* weights, const CheckManner& checkManner)
        : raster(pyramid),
          manner(checkManner),
          bands(pyramid.Bands()),
          workers(FirstOf(pyramid, method, weights)),
          lanes(pyramid, workers.front()->reduction.ReadsMasks() ? 1 : manner.threads, LaneBytes(),
                kBlockBytes) {
        for (std::uint32_t lane = 1; lane < lanes.Count(); ++lane)
            workers.push_back(std::make_unique<Worker>(lanes.At(lane), method, weights));
    }

    // Calls tell(level, differences) behind each.
    void Check(const std::function<void(std::uint32_t, const SampleDifferences&)>& tell) {
        std::uint64_t total = 0;
        for (std::uint32_t level = raster.MinLevel() + 1; level <= raster.MaxLevel(); ++level)
            total += std::uint64_t{raster.Width(level)} * raster.Height(level);
        TerminalProgress bar("levels", !manner.quiet);
        std::uint64_t done = 0;
        std::mutex advancing;
        for (std::uint32_t level = raster.MinLevel() + 1; level <= raster.MaxLevel(); ++level) {
            // A file may claim a thousand levels that have no pixels, with many bands.
            if (raster.Width(level) == 0 || raster.Height(level) == 0) continue;
            for (const auto& worker : workers) worker->differences.emplace(kCode, kCode, bands, 0);
            lanes.RunBlocks(level, BlockSide(),
                            [&](std::uint32_t lane, const zmchost::Window& block) {
                                workers[lane]->CheckBlock(level, block);
                                const std::lock_guard lock(advancing);
                                done += block.Pixels();
                                if (!bar.Show(done, total)) throw Interruption(raster.Name());
                            });
            SampleDifferences all(kCode, kCode, bands, 0);
            for (const auto& worker : workers) all.Merge(*worker->differences);
            tell(level, all);
        }
    }

private:
    static constexpr std::uint32_t kCode = zelm::ElementTraits<T>::code;

    struct Worker {
        Worker(zmchost::Raster& pyramid, zmchost::Resampling method,
               zmchost::SampleWeights* weights)
            : raster(pyramid), reduction(pyramid, method, weights) {}

        void CheckBlock(std::uint32_t level, const zmchost::Window& block) {
            const std::size_t samples = std::size_t{block.width} * raster.Bands();
            stored.resize(samples * block.height);
            raster.Read(level, block, raster.AllBands(), stored.data());
            reduction.Load(level, block);
            for (std::uint32_t row = 0; row < block.height; ++row)
                differences->Take({block.x, block.y + row, block.width, 1},
                                  stored.data() + row * samples, reduction.Row(row));
        }

        zmchost::Raster& raster;
        zmchost::LevelReduction<T> reduction;
        std::optional<SampleDifferences> differences;  // of the level that is looked at
        std::vector<T> stored;
    };
    using Workers = std::vector<std::unique_ptr<Worker>>;

    zmchost::Raster& raster;
    const CheckManner& manner;
    std::uint32_t bands;
    Workers workers;  // one for each lane
    zmchost::RasterLanes lanes;

    static Workers FirstOf(zmchost::Raster& pyramid, zmchost::Resampling method,
                           zmchost::SampleWeights* weights) {
        Workers first;
        first.push_back(std::make_unique<Worker>(pyramid, method, weights));
        return first;
    }

    // Bytes of samples and masks of the finer part of a block of that side.
    std::uint64_t BlockBytes(std::uint64_t side) const {
        return side * side * 4 * bands * (sizeof(T) + 1);
    }
    // A lane holds a block of the least side that is worth it.
    std::uint64_t LaneBytes() const {
        return BlockBytes(std::max(std::uint32_t{kUsualTile}, raster.TileSide()));
    }

    // A multiple of the tile's side: whole tiles are read once but for the margins. A part of a
    // tile where that is beyond what may be held.
    std::uint32_t BlockSide() const {
        std::uint32_t side = raster.TileSide();
        const std::uint64_t most = BytesAtOnce(kBlockBytes / lanes.Count(), side);
        while (side > 1 && BlockBytes(side) > kMostBlockBytes) side /= 2;
        while (side < 4096 && BlockBytes(std::uint64_t{side} * 2) <= most) side *= 2;
        return side;
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

CheckResult CheckLevels(zmchost::Raster& raster, zmchost::Resampling method,
                        zmchost::SampleWeights* weights, const CheckManner& manner) {
    CheckResult result{"levels", {}, {}};
    if (!zmchost::SupportsElementType(method, raster.PixelType()))
        throw UsageError("--resampling", std::string(zmchost::ResamplingName(method)) +
                                             " is not defined for this pixel type");
    if (raster.MaxLevel() == raster.MinLevel()) result.skipped = "there is one level only";
    zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
        LevelsChecker<T>(raster, method, weights, manner)
            .Check([&](std::uint32_t level, const SampleDifferences& differences) {
                Tell(differences, level, method, result);
            });
    });
    return result;
}

}  // namespace zmctools
