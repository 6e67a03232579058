#include "describe/Description.h"

#include <algorithm>
#include <span>

#include "core/PixelVocabulary.h"
#include "host/file/StoredRecords.h"

namespace zmcdescribe {
namespace {

Json LevelsOf(const zmchost::PyramidFileInfo& info) {
    Json levels = Json::array();
    const bool woven = info.header.IsPlanar();
    for (const zmchost::PyramidLevelInfo& level : info.levels)
        levels.push_back({{"level", level.level},
                          {"width", level.width},
                          {"height", level.height},
                          {"tilesAcross", level.tilesAcross},
                          {"tilesDown", level.tilesDown},
                          {"offset", woven ? Json() : JsonNumber(level.offset)},
                          {"bytes", JsonNumber(level.bytes)}});
    return levels;
}

template <class T>
Json StatisticsOf(const zmchost::Raster& raster) {
    Json list = Json::array();
    for (std::uint32_t band = 0; band < raster.Bands(); ++band) {
        if (!raster.HasStatistics(band)) continue;
        const auto record = raster.Statistics<T>(band);
        const auto value = [&](std::uint32_t flag, const auto& field) {
            return (record.flags & flag) != 0 ? JsonNumber(field) : Json();
        };
        namespace Flag = zelm::StatsFlag;
        list.push_back(
            {{"band", band + 1},
             {"minimum", value(Flag::Minimum, record.minimum)},
             {"maximum", value(Flag::Maximum, record.maximum)},
             {"mean", value(Flag::Mean, record.mean)},
             {"standardDeviation", value(Flag::StandardDeviation, record.standardDeviation)},
             {"sum", value(Flag::Sum, record.sum)},
             {"sumOfSquares", value(Flag::SumOfSquares, record.sumOfSquares)},
             {"rootMeanSquare", value(Flag::RootMeanSquare, record.rootMeanSquare)}});
    }
    return list;
}

template <class T>
std::span<const std::uint64_t> CountsOf(const zelm::RasterBandHistogram<T>& record) {
    return {record.counts.data, record.counts.data ? record.counts.shape.elements : 0};
}

template <class T>
Json HistogramsOf(const zmchost::Raster& raster, const TellCounts& tell) {
    Json list = Json::array();
    const auto records = raster.Records<T>();
    for (const auto& record : records->Histograms()) {
        Json histogram = {{"band", record.band + 1},
                          {"level", record.level},
                          {"binCount", record.binCount},
                          {"binSize", JsonNumber(record.binSize)},
                          {"minimum", JsonNumber(record.minimum)},
                          {"maximum", JsonNumber(record.maximum)}};
        tell(histogram, CountsOf(record));
        list.push_back(std::move(histogram));
    }
    return list;
}

Json ColorsOf(const zelm::ColorList& palette, std::size_t most) {
    Json::array_t colors;
    colors.reserve(std::min(most, palette.Colors().size()));
    for (const zelm::ColorList::Rgba color : palette.Colors()) {
        if (colors.size() == most) break;
        Json::array_t channels(4);
        for (int i = 0; i < 4; ++i)
            channels[static_cast<std::size_t>(i)] = zelm::ColorList::Channel(color, i);
        colors.emplace_back(std::move(channels));
    }
    return colors;
}

template <class T>
Json PalettesOf(const zmchost::Raster& raster, std::size_t most) {
    Json list = Json::array();
    const auto records = raster.Records<T>();
    for (std::uint32_t band = 0; band < raster.Bands(); ++band) {
        const zelm::ColorList* const palette = records->BandPalette(band);
        if (!palette) continue;
        Json entry = {{"band", band + 1}, {"colors", ColorsOf(*palette, most)}};
        if (most != kAllColors) entry["count"] = palette->Colors().size();
        list.push_back(std::move(entry));
    }
    return list;
}

template <class T>
std::uint64_t RecordValuesOf(const zmchost::Raster& raster) {
    std::uint64_t values = 0;
    const auto records = raster.Records<T>();
    for (const auto& record : records->Histograms()) values += CountsOf(record).size();
    for (std::uint32_t band = 0; band < raster.Bands(); ++band)
        if (const zelm::ColorList* const palette = records->BandPalette(band))
            values += palette->Colors().size();
    return values;
}

template <class Describe>
Json OfType(const zmchost::Raster& raster, Describe&& describe) {
    Json list = Json::array();
    zelm::VisitElementType(raster.PixelType(), [&](auto type) { list = describe(type); });
    return list;
}

}  // namespace

Json DescribeLayout(const std::string& name, const zmchost::PyramidFileInfo& info) {
    const zmchost::PyramidHeader& header = info.header;
    return {{"schema", kSchema},
            {"file", name},
            {"width", header.width},
            {"height", header.height},
            {"bands", header.bandCount},
            {"pixelType", zelm::PixelTypeName(header.pixelType)},
            {"interleave", zelm::InterleaveName(header.interleave)},
            {"tileOrdering", zelm::TileOrderName(header.tileOrdering)},
            {"tileSize", header.tileSize},
            {"version",
             std::to_string(header.versionMajor) + '.' + std::to_string(header.versionMinor)},
            {"levelMin", header.levelMin},
            {"levelMax", header.levelMax},
            {"complete", info.complete},
            {"bytesMissing", JsonNumber(info.bytesMissing)},
            {"levels", LevelsOf(info)},
            {"statistics", Json::array()},
            {"histograms", Json::array()},
            {"palettes", Json::array()}};
}

Json DescribeStatistics(const zmchost::Raster& raster) {
    return OfType(raster, [&]<class T>(std::type_identity<T>) { return StatisticsOf<T>(raster); });
}

void TellAllCounts(Json& histogram, std::span<const std::uint64_t> counts) {
    Json::array_t list;
    list.reserve(counts.size());
    for (const auto count : counts) list.push_back(JsonNumber(count));
    histogram["counts"] = std::move(list);
}

Json DescribeHistograms(const zmchost::Raster& raster, const TellCounts& tell) {
    return OfType(raster,
                  [&]<class T>(std::type_identity<T>) { return HistogramsOf<T>(raster, tell); });
}

Json DescribePalettes(const zmchost::Raster& raster, std::size_t most) {
    return OfType(raster,
                  [&]<class T>(std::type_identity<T>) { return PalettesOf<T>(raster, most); });
}

std::uint64_t RecordValues(const zmchost::Raster& raster) {
    std::uint64_t values = 0;
    zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
        values = RecordValuesOf<T>(raster);
    });
    return values;
}

void AddRecords(const zmchost::Raster& raster, Json& document) {
    document["statistics"] = DescribeStatistics(raster);
    document["histograms"] = DescribeHistograms(raster);
    document["palettes"] = DescribePalettes(raster);
}

}  // namespace zmcdescribe
