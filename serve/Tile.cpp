#include "serve/Tile.h"

#include <ogr_spatialref.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <memory>

#include "gdal/ErrorCatcher.h"
#include "serve/Parameters.h"

namespace zmcserve {

std::uint32_t TileNumber(std::string_view text) {
    const bool isNumber = !text.empty() && std::all_of(text.begin(), text.end(),
                                                       [](char c) { return c >= '0' && c <= '9'; });
    if (!isNumber) throw Refusal(400, Quoted(text) + " is no number of a tile");
    const auto number = WholeNumber(text, 0xffffffffu);
    if (!number) throw Refusal(404, kNoTile);
    return static_cast<std::uint32_t>(*number);
}

TilePlace FindTile(const ServedRaster& raster, std::uint64_t zoom, std::uint64_t column,
                   std::uint64_t row) {
    const auto level = raster.LevelOfZoom(zoom);
    if (!level) throw Refusal(404, kNoTile);
    const zelm::LevelGeometry geometry = raster.Geometry(*level);
    if (column >= geometry.tilesAcross || row >= geometry.tilesDown) throw Refusal(404, kNoTile);
    const auto x = static_cast<std::uint32_t>(column), y = static_cast<std::uint32_t>(row);
    return {*level, x, y, geometry.Tile(x, y)};
}

std::optional<ByteRange> RangeOfTile(const ServedRaster& raster, const TilePlace& tile) {
    const zmchost::PyramidHeader& header = raster.Header();
    if (header.IsPlanar()) return std::nullopt;
    const ByteRange range{
        header.LevelOffset(tile.level) +
            raster.Geometry(tile.level).TileOffset(tile.column, tile.row, raster.PixelBytes()),
        tile.window.Pixels() * raster.PixelBytes()};
    if (range.offset + range.size > raster.File().Size())
        throw Refusal(404, "the file is incomplete, and has no such tile as yet");
    return range;
}

Answer ReadSamples(const Service& service, ServedRaster& raster, std::uint32_t level,
                   const zmchost::Window& window, std::span<const std::uint32_t> bands,
                   SampleFormat format, const Deadline& deadline) {
    const SampleShape shape{raster.Header().pixelType, window.width, window.height,
                            static_cast<std::uint32_t>(bands.size())};
    CheckWindow(service, window.Pixels(), bands.size() * raster.SampleBytes());
    const std::string front = format == SampleFormat::Npy ? NpyHeader(shape) : std::string();
    std::vector<unsigned char> bytes(front.size() + shape.Bytes());
    std::memcpy(bytes.data(), front.data(), front.size());
    const auto reader = raster.Borrow(deadline);
    reader->Pixels().Read(level, window, bands, bytes.data() + front.size());
    raster.File().CheckUnchanged();
    Answer answer = SampleAnswerOf(shape, format);
    answer.body = std::move(bytes);
    return answer;
}

std::optional<std::array<double, 4>> BoundsInDegrees(ServedRaster& raster) {
    const Georeference& place = raster.Place();
    if (!place.transform || place.wkt.empty()) return std::nullopt;
    const zmcgdal::ErrorCatcher quiet(CE_Failure);
    OGRSpatialReference own, degrees;
    if (own.SetFromUserInput(place.wkt.c_str()) != OGRERR_NONE) return std::nullopt;
    degrees.SetWellKnownGeogCS("WGS84");
    own.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
    degrees.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
    const std::unique_ptr<OGRCoordinateTransformation> transformation(
        OGRCreateCoordinateTransformation(&own, &degrees));
    if (!transformation) return std::nullopt;
    const zelm::LevelGeometry finest = raster.Geometry(raster.FinestLevel());
    const double width = finest.samples, height = finest.lines;
    constexpr double kFar = std::numeric_limits<double>::infinity();
    double x[2] = {kFar, -kFar}, y[2] = {kFar, -kFar};
    for (const auto& [column, line] : {std::pair(0.0, 0.0), std::pair(width, 0.0),
                                       std::pair(0.0, height), std::pair(width, height)}) {
        double east = column, north = line;
        Apply(*place.transform, east, north);
        x[0] = std::min(x[0], east), x[1] = std::max(x[1], east);
        y[0] = std::min(y[0], north), y[1] = std::max(y[1], north);
    }
    std::array<double, 4> bounds{};
    constexpr int kPointsOnAnEdge = 21;
    if (!transformation->TransformBounds(x[0], y[0], x[1], y[1], &bounds[0], &bounds[1], &bounds[2],
                                         &bounds[3], kPointsOnAnEdge))
        return std::nullopt;
    for (const double bound : bounds)
        if (!std::isfinite(bound)) return std::nullopt;
    return bounds;
}

}  // namespace zmcserve
