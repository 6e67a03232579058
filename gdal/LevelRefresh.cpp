#include "gdal/LevelRefresh.h"

#include <algorithm>
#include <bit>
#include <map>
#include <optional>
#include <set>

#include "format/TileWalk.h"
#include "gdal/GdalRasterSource.h"
#include "gdal/NoDataValues.h"
#include "gdal/Options.h"
#include "gdal/Reporting.h"
#include "host/build/LevelReduction.h"

namespace zmcgdal {
namespace {

template <class T>
class TileMaker {
public:
    TileMaker(zmchost::Raster& pyramid, zmchost::Resampling method, zmchost::SampleWeights& weights)
        : raster(pyramid), reduction(pyramid, method, &weights) {}

    void Make(std::uint32_t level, const zmchost::Window& tile) {
        const std::size_t samples = std::size_t{tile.width} * raster.Bands();
        coarse.resize(samples * tile.height);
        reduction.Load(level, tile);
        for (std::uint32_t row = 0; row < tile.height; ++row)
            std::copy_n(reduction.Row(row), samples, coarse.data() + row * samples);
        raster.Write(level, tile, raster.AllBands(), coarse.data());
    }

private:
    zmchost::Raster& raster;
    zmchost::LevelReduction<T> reduction;
    std::vector<T> coarse;
};

CPLErr Refuse(const char* why) {
    CPLError(CE_Failure, CPLE_NotSupported, "%s", why);
    return CE_Failure;
}

std::optional<std::uint32_t> LevelOf(Dataset& dataset, int factor) {
    for (const auto& overview : dataset.Overviews())
        if (std::int64_t{factor} == std::int64_t{1} << (overview->Level() - dataset.Level()))
            return overview->Level();
    return std::nullopt;
}

// A factor that a level could have, if the file went on: users ask for a row of them at a time.
bool IsBeyond(Dataset& dataset, int factor) {
    const std::uint32_t last = dataset.Overviews().back()->Level() - dataset.Level();
    return std::has_single_bit(static_cast<unsigned>(factor)) &&
           std::int64_t{factor} > std::int64_t{1} << last;
}

// The levels that the factors mean, without those beyond the last if there are others; nothing if
// one of them is not in the file.
std::optional<std::set<std::uint32_t>> LevelsOf(Dataset& dataset, const std::vector<int>& factors) {
    const bool anyFits = std::any_of(factors.begin(), factors.end(), [&](int factor) {
        return LevelOf(dataset, factor).has_value();
    });
    std::set<std::uint32_t> levels;
    for (const int factor : factors) {
        const auto level = LevelOf(dataset, factor);
        if (level) {
            levels.insert(*level);
            continue;
        }
        const bool passedOver = anyFits && IsBeyond(dataset, factor);
        CPLError(passedOver ? CE_Warning : CE_Failure, CPLE_NotSupported,
                 "%s has no room for a level reduced by %d: a pyramid is laid out once",
                 dataset.GetDescription(), factor);
        if (!passedOver) return std::nullopt;
    }
    return levels;
}

std::uint64_t TilesOf(const zmchost::Raster& raster, const std::set<std::uint32_t>& levels) {
    std::uint64_t tiles = 0;
    for (const std::uint32_t level : levels)
        tiles += std::uint64_t{raster.TilesAcross(level)} * raster.TilesDown(level);
    return tiles;
}

// False if the caller cancelled.
template <class T>
bool MakeLevels(zmchost::Raster& raster, zmchost::Resampling method,
                zmchost::SampleWeights& weights, const std::set<std::uint32_t>& levels,
                GDALProgressFunc progress, void* progressData) {
    TileMaker<T> maker(raster, method, weights);
    const auto total = static_cast<double>(TilesOf(raster, levels));
    double done = 0;
    return std::all_of(levels.begin(), levels.end(), [&](std::uint32_t level) {
        const zelm::LevelGeometry geometry = raster.Header().Geometry(level);
        return zelm::VisitTiles(geometry, geometry.Whole(), [&](const zelm::TilePart& part) {
            maker.Make(level, part.tile);
            return !progress || progress(++done / total, "", progressData);
        });
    });
}

// The reducers go by the no-data values that GDAL's user sees.
void TellNoDataValues(Dataset& dataset) {
    std::map<std::uint32_t, double> values;
    for (int number = 1; number <= dataset.GetRasterCount(); ++number) {
        const auto value = NoDataAsDouble(*dataset.GetRasterBand(number));
        if (value) values[static_cast<std::uint32_t>(number - 1)] = *value;
    }
    dataset.File().raster.Get().SetNoDataValues(values);
}

void DropCaches(Dataset& dataset) {
    dataset.FlushCache(false);
    for (const auto& overview : dataset.Overviews()) overview->FlushCache(false);
    dataset.File().tiles.Forget();
}

// False, told to GDAL, where some of the pixels that levels are made of are not in the file.
bool WritePixels(Dataset& dataset) {
    CPLErrorReset();
    DropCaches(dataset);
    return CPLGetLastErrorType() < CE_Failure;
}

}  // namespace

CPLErr RefreshLevels(Dataset& dataset, const char* resampling, const std::vector<int>& factors,
                     GDALProgressFunc progress, void* progressData) {
    if (dataset.GetAccess() != GA_Update)
        return Refuse("the levels of a pyramid are inside the file: open it for update");
    if (factors.empty()) return Refuse("the levels of a pyramid cannot be removed");
    const std::optional<zmchost::Resampling> method = ResamplingFrom(resampling);
    const std::uint32_t pixelType = dataset.File().info.header.pixelType;
    if (!method || !zmchost::SupportsElementType(*method, pixelType))
        return Refuse("this resampling is not known for the pixel type");
    const auto levels = LevelsOf(dataset, factors);
    if (!levels || !WritePixels(dataset)) return CE_Failure;
    bool finished = false;
    const auto make = [&] {
        for (const std::uint32_t level : *levels)
            dataset.File().CheckTile(level, dataset.File().info.header.bandCount,
                                     "make its levels anew");
        TellNoDataValues(dataset);
        zmchost::Raster& raster = dataset.File().raster.Get();
        GdalRasterSource weights(dataset);
        zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
            finished = MakeLevels<T>(raster, *method, weights, *levels, progress, progressData);
        });
        if (!finished) CPLError(CE_Failure, CPLE_UserInterrupt, "cancelled");
    };
    Reported(make, CPLE_FileIO);
    DropCaches(dataset);
    return finished ? CE_None : CE_Failure;
}

}  // namespace zmcgdal
