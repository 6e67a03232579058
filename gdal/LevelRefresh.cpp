#include "gdal/LevelRefresh.h"

#include <algorithm>
#include <exception>
#include <map>
#include <optional>
#include <set>

#include "gdal/NoDataValues.h"
#include "gdal/Options.h"
#include "host/NoData.h"
#include "host/Reduction.h"

namespace zmcgdal {
namespace {

// Columns and rows of the coarser level that are made beyond a tile and dropped: the widest kernel
// reaches 5 finer pixels over the edge of its cell.
constexpr std::uint32_t kMargin = 3;

// The part of the finer level that a tile of the coarser one depends on. It begins on even
// coordinates, so that its cells are those of the whole level.
zmchost::Window SourceOf(const zmchost::Raster& raster, std::uint32_t level,
                         const zmchost::Window& tile) {
    const auto reach = [](std::uint32_t start, std::uint32_t extent, std::uint32_t limit) {
        const std::uint32_t first = start > kMargin ? start - kMargin : 0;
        const std::uint64_t end = std::uint64_t{start + extent + kMargin} * 2;
        // The odd last line belongs to no cell, but wide kernels tap it.
        const std::uint64_t last = end >= limit ? limit : end;
        return std::pair{first * 2, static_cast<std::uint32_t>(last - first * 2)};
    };
    const auto [x, width] = reach(tile.x, tile.width, raster.Width(level - 1));
    const auto [y, height] = reach(tile.y, tile.height, raster.Height(level - 1));
    return {x, y, width, height};
}

template <class T>
class TileMaker {
public:
    TileMaker(zmchost::Raster& pyramid, zmchost::Resampling resampling)
        : raster(pyramid),
          method(resampling),
          halo(zmchost::ReductionHalo(resampling)),
          bands(pyramid.Bands()) {
        for (std::uint32_t band = 0; band < bands; ++band)
            rules.push_back(zmchost::RuleOfBand<T>(pyramid.Props(), band));
    }

    void Make(std::uint32_t level, const zmchost::Window& tile) {
        const zmchost::Window source = SourceOf(raster, level, tile);
        fine.resize(std::size_t{source.width} * source.height * bands);
        mask.assign(fine.size(), 0);
        raster.Read(level - 1, source, raster.AllBands(), fine.data(), mask.data());
        coarse.resize(std::size_t{tile.width} * tile.height * bands);
        line.resize(std::size_t{source.width} / 2 * bands);
        for (std::uint32_t row = 0; row < tile.height; ++row) MakeRow(source, tile, row);
        raster.Write(level, tile, raster.AllBands(), coarse.data());
    }

private:
    zmchost::Raster& raster;
    zmchost::Resampling method;
    std::uint32_t halo;
    std::uint32_t bands;
    std::vector<zelm::NoDataRule<T>> rules;
    std::vector<T> fine, coarse, line;
    std::vector<unsigned char> mask;

    void MakeRow(const zmchost::Window& source, const zmchost::Window& tile, std::uint32_t row) {
        std::vector<const T*> rows;
        std::vector<const unsigned char*> masks;
        const std::size_t stride = std::size_t{source.width} * bands;
        const std::int64_t first = (std::int64_t{tile.y} + row) * 2 - halo - source.y;
        for (std::int64_t y = first; y < first + 2 + 2 * std::int64_t{halo}; ++y) {
            const bool inside = y >= 0 && y < source.height;
            const std::size_t at = inside ? static_cast<std::size_t>(y) * stride : 0;
            rows.push_back(inside ? fine.data() + at : nullptr);
            masks.push_back(inside ? mask.data() + at : nullptr);
        }
        zmchost::ReduceRow<T>(method, bands, source.width, {rows.data(), masks.data()},
                              rules.data(), line.data(), nullptr);
        const std::size_t skipped = std::size_t{tile.x - source.x / 2} * bands;
        const std::size_t samples = std::size_t{tile.width} * bands;
        std::copy_n(line.begin() + static_cast<std::ptrdiff_t>(skipped), samples,
                    coarse.begin() + static_cast<std::ptrdiff_t>(row * samples));
    }
};

CPLErr Refuse(const char* why) {
    CPLError(CE_Failure, CPLE_NotSupported, "%s", why);
    return CE_Failure;
}

// The levels that the factors mean; nothing if one of them is not in the file.
std::optional<std::set<std::uint32_t>> LevelsOf(Dataset& dataset, const std::vector<int>& factors) {
    std::set<std::uint32_t> levels;
    for (const int factor : factors) {
        const auto& all = dataset.Overviews();
        const auto match = std::find_if(all.begin(), all.end(), [&](const auto& overview) {
            return factor == 1 << (overview->Level() - dataset.Level());
        });
        if (match == all.end()) {
            CPLError(CE_Failure, CPLE_NotSupported,
                     "%s has no room for a level reduced by %d: a pyramid is laid out once",
                     dataset.GetDescription(), factor);
            return std::nullopt;
        }
        levels.insert((*match)->Level());
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
                const std::set<std::uint32_t>& levels, GDALProgressFunc progress,
                void* progressData) {
    TileMaker<T> maker(raster, method);
    const auto total = static_cast<double>(TilesOf(raster, levels));
    double done = 0;
    for (const std::uint32_t level : levels)
        for (std::uint32_t row = 0; row < raster.TilesDown(level); ++row)
            for (std::uint32_t column = 0; column < raster.TilesAcross(level); ++column) {
                maker.Make(level, raster.Tile(level, column, row));
                if (progress && !progress(++done / total, "", progressData)) return false;
            }
    return true;
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
    if (!levels) return CE_Failure;
    DropCaches(dataset);
    try {
        TellNoDataValues(dataset);
        bool finished = false;
        zelm::VisitElementType(pixelType, [&]<class T>(std::type_identity<T>) {
            finished = MakeLevels<T>(dataset.File().raster.Get(), *method, *levels, progress,
                                     progressData);
        });
        DropCaches(dataset);
        if (finished) return CE_None;
        CPLError(CE_Failure, CPLE_UserInterrupt, "cancelled");
    } catch (const std::exception& error) {
        CPLError(CE_Failure, CPLE_FileIO, "%s", error.what());
    }
    return CE_Failure;
}

}  // namespace zmcgdal
