// Tiles in the raster's own grid, at /tiles/NAME/{z}/{x}/{y}.FORMAT, and their TileJSON.
#include <cmath>

#include "describe/JsonNumbers.h"
#include "gdal/ErrorCatcher.h"
#include "render/Codec.h"
#include "serve/Conditions.h"
#include "serve/Documents.h"
#include "serve/Names.h"
#include "serve/Parameters.h"
#include "serve/PictureAnswer.h"
#include "serve/SampleAnswer.h"
#include "serve/Service.h"
#include "serve/Services.h"
#include "serve/Tile.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;
using zmcrender::PictureFormat;

struct Address {
    std::string name;
    std::uint64_t z = 0, x = 0, y = 0;
    std::string_view ending;  // in the request
};

Address AddressOf(const Request& request) {
    const std::size_t count = request.segments.size();
    if (count < 5) throw Refusal(404, "the address of a tile is /tiles/NAME/{z}/{x}/{y}.FORMAT");
    const auto [y, ending] = StemAndEnding(request.segments[count - 1]);
    return {NameOfSegments(request, 1, count - 3), TileNumber(request.segments[count - 3]),
            TileNumber(request.segments[count - 2]), TileNumber(y), ending};
}

bool WantsTileJson(const Request& request) {
    return request.segments.size() > 2 && request.segments.back() == "tile.json";
}

SampleShape ShapeOf(const ServedRaster& raster, const zmchost::Window& window, std::size_t bands) {
    return {raster.Header().pixelType, window.width, window.height,
            static_cast<std::uint32_t>(bands)};
}

// --- samples ---

bool TakesCompressed(const Request& request) {
    return request.Header("Accept-Encoding").has_value();
}

Answer RangeAnswer(const ServedRaster& raster, const TilePlace& tile, const ByteRange& range) {
    Answer answer =
        SampleAnswerOf(ShapeOf(raster, tile.window, raster.Header().bandCount), SampleFormat::Raw);
    answer.body = FileRange{raster.FilePtr(), range.offset, range.size};
    return answer;
}

Answer SampleTile(const Request& request, Service& service, ServedRaster& raster,
                  const TilePlace& tile, SampleFormat format) {
    request.AllowKeys({"bands"});
    if (const auto range = RangeOfTile(raster, tile);
        range && format == SampleFormat::Raw && !request.Value("bands"))
        return RangeAnswer(raster, tile, *range);
    const auto bands = BandsOf(request, raster.Header().bandCount);
    return ReadSamples(service, raster, tile.level, tile.window, bands, format, request.deadline);
}

// --- pictures ---

// What a thread that reads requests may make: of a tile of 512 x 512 bytes this takes 1 ms.
constexpr std::uint64_t kQuickBytes = std::uint64_t{1} << 20;
constexpr std::uint64_t kQuickPixels = std::uint64_t{256} << 10;

// Whether a tile is made in about a millisecond; other formats than JPEG take ten times as long.
bool IsQuick(const Request& request, ServedRaster& raster, const TilePlace& tile) {
    const std::uint64_t pixels = tile.window.Pixels();
    if (pixels > kQuickPixels || pixels * raster.PixelBytes() > kQuickBytes) return false;
    const zmcrender::Style style = StyleOf(request, {"quality"});
    return style.expression.empty() && !style.hillshade && raster.HasRenderer(style);
}

Answer PictureTile(const Request& request, const Service& service, ServedRaster& raster,
                   const TilePlace& tile, PictureFormat format) {
    const zmcrender::Style style = StyleOf(request, {"quality"});
    const int quality = QualityOf(request);
    return CodedLevelWindow(service, raster, style, tile.level, tile.window, format, quality,
                            request.deadline);
}

Validators ValidatorsOf(const ServedRaster& raster, bool isPicture) {
    return {isPicture ? raster.ETagWithCompanions("p") : raster.ETag("s"), std::nullopt};
}

Answer TileOfRaster(const Request& request, Service& service, ServedRaster& raster,
                    const TilePlace& tile, std::string_view ending) {
    const auto picture = zmcrender::PictureFormatOfName(ending);
    const Validators validators = ValidatorsOf(raster, picture.has_value());
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    Answer answer = picture
                        ? PictureTile(request, service, raster, tile, *picture)
                        : SampleTile(request, service, raster, tile, *SampleFormatOfName(ending));
    SetValidators(answer, validators);
    return answer;
}

Answer TileAnswer(const Request& request, Service& service) {
    const Address address = AddressOf(request);
    if (!zmcrender::PictureFormatOfName(address.ending) && !SampleFormatOfName(address.ending))
        throw Refusal(404, "the formats of tiles are jpg, png, webp, raw and npy");
    const ServedRasterPtr raster = service.catalog.Raster(address.name);
    const TilePlace tile = FindTile(*raster, address.z, address.x, address.y);
    return TileOfRaster(request, service, *raster, tile, address.ending);
}

// Small tiles as JPEG, in a style that was asked for before.
std::optional<Answer> QuickPicture(const Request& request, Service& service,
                                   const Address& address) {
    const ServedRasterPtr raster = service.catalog.RasterIfCurrent(address.name);
    if (!raster) return std::nullopt;
    const TilePlace tile = FindTile(*raster, address.z, address.x, address.y);
    if (!IsQuick(request, *raster, tile)) return std::nullopt;
    return TileOfRaster(request, service, *raster, tile, address.ending);
}

std::optional<Answer> QuickTile(const Request& request, Service& service) {
    if (WantsTileJson(request)) return std::nullopt;
    const Address address = AddressOf(request);
    if (request.mayCompute && zmcrender::PictureFormatOfName(address.ending) == PictureFormat::Jpeg)
        return QuickPicture(request, service, address);
    // Raw samples that lie in the file as they are sent.
    if (address.ending != "raw" || !request.query.empty() || TakesCompressed(request))
        return std::nullopt;
    const ServedRasterPtr raster = service.catalog.RasterIfOpen(address.name);
    if (!raster) return std::nullopt;
    const TilePlace tile = FindTile(*raster, address.z, address.x, address.y);
    const auto range = RangeOfTile(*raster, tile);
    if (!range) return std::nullopt;
    const Validators validators = ValidatorsOf(*raster, false);
    if (auto answer = AnswerOfConditions(request, validators)) return answer;
    Answer answer = RangeAnswer(*raster, tile, *range);
    SetValidators(answer, validators);
    return answer;
}

// --- TileJSON ---

Json LevelsOf(const ServedRaster& raster) {
    Json list = Json::array();
    for (std::uint32_t z = 0; z < raster.Levels(); ++z) {
        const std::uint32_t level = *raster.LevelOfZoom(z);
        const zelm::LevelGeometry geometry = raster.Geometry(level);
        list.push_back({{"z", z},
                        {"level", level},
                        {"width", geometry.samples},
                        {"height", geometry.lines},
                        {"tilesAcross", geometry.tilesAcross},
                        {"tilesDown", geometry.tilesDown}});
    }
    return list;
}

// Every format with its tiles. A style is a matter of pictures.
Json FormatsOf(const std::string& tiles, const std::string& style) {
    Json list = Json::array();
    const auto add = [&](const char* ending, const char* type, const std::string& query) {
        list.push_back(
            {{"format", ending}, {"type", type}, {"tiles", Json::array({tiles + ending + query})}});
    };
    for (const PictureFormat format : zmcrender::kPictureFormats)
        add(zmcrender::EndingOf(format), zmcrender::MediaType(format), style);
    for (const char* const ending : {"raw", "npy"})
        add(ending, MediaType(*SampleFormatOfName(ending)), "");
    return list;
}

Answer TileJson(const Request& request, Service& service) {
    const std::string name = NameOfSegments(request, 1, request.segments.size() - 1);
    const ServedRasterPtr raster = service.catalog.Raster(name);
    const Validators validators{raster->ETagWithCompanions(VariantOf(request.baseUrl)),
                                std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    // Parameters of the style are those of the tiles.
    const std::size_t question = request.target.find('?');
    const std::string style =
        question == request.target.npos ? "" : request.target.substr(question);
    StyleOf(request, {"quality"});
    const std::string tiles =
        request.baseUrl + "/tiles/" + PercentEncoded(name, true) + "/{z}/{x}/{y}.";
    Json document = {{"tilejson", "3.0.0"},
                     {"name", name},
                     {"scheme", "xyz"},
                     {"tiles", Json::array({tiles + "png" + style})},
                     {"format", "png"},
                     {"formats", FormatsOf(tiles, style)},
                     {"minzoom", 0},
                     {"maxzoom", raster->MostZoom()},
                     {"vector_layers", Json::array()},
                     {"tileSize", raster->Header().tileSize},
                     {"width", raster->Header().width},
                     {"height", raster->Header().height},
                     {"grid",
                      "the raster's own: tiles count from its upper left corner, levels "
                      "halve its size"},
                     {"levels", LevelsOf(*raster)}};
    if (const auto bounds = BoundsInDegrees(*raster)) document["bounds"] = *bounds;
    Answer answer = JsonAnswer(document);
    SetValidators(answer, validators);
    return answer;
}

Answer HandleTile(const Request& request, Service& service) {
    return WantsTileJson(request) ? TileJson(request, service) : TileAnswer(request, service);
}

}  // namespace

std::vector<Route> TileRoutes() {
    return {{"tiles",
             HandleTile,
             QuickTile,
             {{"tiles", "/tiles/{+name}/{z}/{x}/{y}.{format}",
               "tiles in the raster's own grid as jpg, png, webp, raw or npy; z 0 is the coarsest "
               "level. Style in the query"},
              {"tilejson", "/tiles/{+name}/tile.json", "the same as TileJSON 3.0.0"}}}};
}

}  // namespace zmcserve
