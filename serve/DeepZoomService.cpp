// Deep Zoom: the descriptor at /dzi/NAME.dzi, and its tiles at
// /dzi/NAME_files/{level}/{column}_{row}.FORMAT.
//
// Its levels count from 0, a single pixel, to the whole size; each is twice as large as the one
// before, rounded up.
#include <bit>

#include "render/Codec.h"
#include "serve/Conditions.h"
#include "serve/Documents.h"
#include "serve/Names.h"
#include "serve/Parameters.h"
#include "serve/PictureAnswer.h"
#include "serve/Service.h"
#include "serve/Services.h"
#include "serve/Tile.h"

namespace zmcserve {
namespace {

constexpr std::string_view kDescriptor = ".dzi";
constexpr std::string_view kTiles = "_files";

// "scene.pyr.dzi" without its ending; nothing of a name that has another, or nothing in front.
std::optional<std::string> Without(std::string_view ending, const std::string& name) {
    if (name.size() <= ending.size() || !std::string_view(name).ends_with(ending))
        return std::nullopt;
    return name.substr(0, name.size() - ending.size());
}

// Of the descriptor: which format it tells. Viewers pass its query on to the tiles, whose addresses
// tell theirs.
constexpr std::string_view kFormat = "format";

zmcrender::Style DeepZoomStyle(const Request& request) {
    return StyleOf(request, {"quality", kFormat});
}

// Levels finer than the first.
std::uint32_t MostDeepLevel(const zmchost::Window& whole) {
    const std::uint32_t longer = std::max(whole.width, whole.height);
    return static_cast<std::uint32_t>(std::bit_width(longer - 1));
}

Answer Descriptor(const Request& request, Service& service, const std::string& name) {
    const std::string_view format = request.Value(kFormat).value_or("jpg");
    if (!zmcrender::PictureFormatOfName(format))
        throw Refusal(400, "format: it is none of jpg, png and webp");
    DeepZoomStyle(request);
    QualityOf(request);
    const ServedRasterPtr raster = service.catalog.Raster(name);
    CheckHasPixels(*raster);
    const Validators validators{raster->ETag("dzi" + std::string(format)), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const zmchost::Window whole = raster->Whole();
    Answer answer;
    answer.type = "application/xml";
    answer.body =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
        "<Image xmlns=\"http://schemas.microsoft.com/deepzoom/2008\" Format=\"" +
        std::string(format) + "\" Overlap=\"0\" TileSize=\"" +
        std::to_string(TileSideOf(service, *raster)) + "\"><Size Width=\"" +
        std::to_string(whole.width) + "\" Height=\"" + std::to_string(whole.height) +
        "\"/></Image>\n";
    answer.compressible = true;
    SetValidators(answer, validators);
    return answer;
}

struct DeepTile {
    std::uint32_t level = 0, column = 0, row = 0;
    zmcrender::PictureFormat format = zmcrender::PictureFormat::Jpeg;
};

DeepTile DeepTileOf(std::string_view level, std::string_view file) {
    const auto [place, ending] = StemAndEnding(file);
    const auto numbers = Split(place, '_');
    const auto format = zmcrender::PictureFormatOfName(ending);
    if (!format) throw Refusal(404, "the formats of tiles are jpg, png and webp");
    if (numbers.size() != 2) throw Refusal(400, Quoted(file) + " is no {column}_{row} of a tile");
    return {TileNumber(level), TileNumber(numbers[0]), TileNumber(numbers[1]), *format};
}

// The part of a scale that a tile shows.
zmchost::Window WindowOfDeepTile(const DeepTile& tile, const zmchost::Window& whole,
                                 std::uint32_t scale, std::uint32_t side) {
    const std::uint32_t width = zmcrender::ExtentInScale(whole.width, scale);
    const std::uint32_t height = zmcrender::ExtentInScale(whole.height, scale);
    const std::uint64_t x = std::uint64_t{tile.column} * side, y = std::uint64_t{tile.row} * side;
    if (x >= width || y >= height) throw Refusal(404, kNoTile);
    const auto left = static_cast<std::uint32_t>(x), top = static_cast<std::uint32_t>(y);
    return {left, top, std::min(side, width - left), std::min(side, height - top)};
}

Answer DeepTileAnswer(const Request& request, Service& service, const std::string& name,
                      const DeepTile& tile) {
    const ServedRasterPtr raster = service.catalog.Raster(name);
    CheckHasPixels(*raster);
    const zmchost::Window whole = raster->Whole();
    const std::uint32_t most = MostDeepLevel(whole);
    if (tile.level > most) throw Refusal(404, kNoTile);
    const std::uint32_t scale = most - tile.level;
    const auto window = WindowOfDeepTile(tile, whole, scale, TileSideOf(service, *raster));
    const Validators validators{raster->ETagWithCompanions("p"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const zmcrender::Style style = DeepZoomStyle(request);
    const int quality = QualityOf(request);
    Answer answer =
        CodedAnswer(RenderScaleWindow(service, *raster, style, scale, window, request.deadline),
                    tile.format, quality);
    SetValidators(answer, validators);
    return answer;
}

Answer HandleDeepZoom(const Request& request, Service& service) {
    const std::size_t count = request.segments.size();
    if (const auto name = Without(kDescriptor, NameOfRest(request)))
        return Descriptor(request, service, *name);
    if (count > 3)
        if (const auto name = Without(kTiles, NameOfSegments(request, 1, count - 2)))
            return DeepTileAnswer(
                request, service, *name,
                DeepTileOf(request.segments[count - 2], request.segments[count - 1]));
    throw Refusal(404, "the addresses are /dzi/NAME.dzi and /dzi/NAME_files/{level}/{x}_{y}.jpg");
}

}  // namespace

std::vector<Route> DeepZoomRoutes() {
    return {{"dzi",
             HandleDeepZoom,
             nullptr,
             {{"dzi", "/dzi/{+name}.dzi{?format,quality}",
               "the raster as a Deep Zoom image, of tiles in the format jpg, png or webp. Style in "
               "the query, which viewers pass on to the tiles"},
              {"dzi-tiles", "/dzi/{+name}_files/{level}/{column}_{row}.{format}{?quality}",
               "its tiles; level 0 is a single pixel. Style in the query"}}}};
}

}  // namespace zmcserve
