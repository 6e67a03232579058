#include <algorithm>
#include <cstring>

#include "format/TileWalk.h"
#include "host/build/LevelReduction.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"
#include "tools/RasterView.h"
#include "tools/SampleDifferences.h"
#include "tools/Verification.h"

namespace zmctools {
namespace {

// Bytes of samples and masks of the finer part of a block.
constexpr std::uint64_t kBlockBytes = std::uint64_t{64} << 20;
// The same where a tile has so many that to read it once takes more.
constexpr std::uint64_t kMostBlockBytes = 4 * kBlockBytes;

template <class T>
class LevelsChecker {
public:
    LevelsChecker(zmchost::Raster& pyramid, zmchost::Resampling method,
                  zmchost::SampleWeights* weights)
        : raster(pyramid), reduction(pyramid, method, weights), bands(pyramid.Bands()) {}

    // A multiple of the tile's side: whole tiles are read once but for the margins. A part of a
    // tile where that is beyond what may be held.
    std::uint32_t BlockSide() const {
        std::uint32_t side = raster.TileSide();
        const std::uint64_t most = BytesAtOnce(kBlockBytes, side);
        const auto bytes = [&](std::uint64_t next) {
            return next * next * 4 * bands * (sizeof(T) + 1);
        };
        while (side > 1 && bytes(side) > kMostBlockBytes) side /= 2;
        while (side < 4096 && bytes(std::uint64_t{side} * 2) <= most) side *= 2;
        return side;
    }

    SampleDifferences Check(std::uint32_t level, TerminalProgress& bar, std::uint64_t& done,
                            std::uint64_t total) {
        const std::uint32_t code = zelm::ElementTraits<T>::code;
        SampleDifferences differences(code, code, bands, 0);
        const zelm::LevelGeometry blocks(raster.Width(level), raster.Height(level), BlockSide(), 0);
        zelm::VisitTiles(blocks, blocks.Whole(), [&](const zelm::TilePart& block) {
            CheckBlock(level, block.tile, differences);
            done += block.tile.Pixels();
            if (!bar.Show(done, total)) throw Interruption(raster.Name());
        });
        return differences;
    }

private:
    zmchost::Raster& raster;
    zmchost::LevelReduction<T> reduction;
    std::uint32_t bands;
    std::vector<T> stored;

    void CheckBlock(std::uint32_t level, const zmchost::Window& block,
                    SampleDifferences& differences) {
        const std::size_t samples = std::size_t{block.width} * bands;
        stored.resize(samples * block.height);
        raster.Read(level, block, raster.AllBands(), stored.data());
        reduction.Load(level, block);
        for (std::uint32_t row = 0; row < block.height; ++row)
            differences.Take({block.x, block.y + row, block.width, 1},
                             stored.data() + row * samples, reduction.Row(row));
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
                        zmchost::SampleWeights* weights, bool quiet) {
    CheckResult result{"levels", {}, {}};
    if (!zmchost::SupportsElementType(method, raster.PixelType()))
        throw UsageError("--resampling", std::string(zmchost::ResamplingName(method)) +
                                             " is not defined for this pixel type");
    if (raster.MaxLevel() == raster.MinLevel()) result.skipped = "there is one level only";
    std::uint64_t total = 0;
    for (std::uint32_t level = raster.MinLevel() + 1; level <= raster.MaxLevel(); ++level)
        total += std::uint64_t{raster.Width(level)} * raster.Height(level);
    zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
        LevelsChecker<T> checker(raster, method, weights);
        TerminalProgress bar("levels", !quiet);
        std::uint64_t done = 0;
        for (std::uint32_t level = raster.MinLevel() + 1; level <= raster.MaxLevel(); ++level)
            Tell(checker.Check(level, bar, done, total), level, method, result);
    });
    return result;
}

}  // namespace zmctools
