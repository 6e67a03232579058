#include "serve/MapTile.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "serve/Conditions.h"
#include "serve/LayerId.h"
#include "serve/Parameters.h"
#include "serve/PictureAnswer.h"
#include "serve/Tile.h"

namespace zmcserve {
namespace {

using zmcrender::Picture;

constexpr std::string_view kOwn = "own-";

// Of a level that are warped for a tile: sixteen times what fits one pixel to one.
constexpr std::uint64_t kMostSourcePixels = std::uint64_t{2} << 20;

void CheckMercatorTile(const MapTile& tile) {
    if (tile.matrix > Mercator::kMostZoom) throw Refusal(404, kNoTile);
    const std::uint32_t tiles = std::uint32_t{1} << tile.matrix;
    if (tile.row >= tiles || tile.column >= tiles) throw Refusal(404, kNoTile);
}

Picture Transparent(std::uint32_t side, std::uint32_t colours, std::uint32_t depth) {
    Picture picture{side, side, colours + 1, depth, {}};
    picture.bytes.resize(picture.LineBytes() * side);
    return picture;
}

// At the upper left of a transparent square.
Picture Padded(const Picture& picture, std::uint32_t side) {
    if (picture.width == side && picture.height == side) return picture;
    const std::size_t alpha = picture.HasAlpha() ? 1 : 0;
    const std::size_t sample = picture.depth / 8, from = picture.channels * sample;
    Picture padded =
        Transparent(side, static_cast<std::uint32_t>(picture.channels - alpha), picture.depth);
    const std::size_t to = padded.channels * sample;
    for (std::uint32_t y = 0; y < picture.height; ++y)
        for (std::uint32_t x = 0; x < picture.width; ++x) {
            unsigned char* const pixel = &padded.bytes[y * padded.LineBytes() + x * to];
            std::memcpy(pixel, &picture.bytes[y * picture.LineBytes() + x * from], from);
            if (alpha == 0) std::memset(pixel + from, 0xFF, sample);
        }
    return padded;
}

Picture OwnTile(const Service& service, ServedRaster& raster, const MapTile& tile,
                const MapLook& look, const Deadline& deadline) {
    const TilePlace place = FindTile(raster, tile.matrix, tile.column, tile.row);
    const std::uint32_t side = raster.Header().tileSize;
    if (side > service.limits.side || std::uint64_t{side} * side > service.limits.pixels)
        throw Refusal(400, "a whole tile would have " + std::to_string(side) + " x " +
                               std::to_string(side) + " pixels, which is beyond the limit");
    return Padded(
        RenderLevelWindow(service, raster, look.style, place.level, place.window, deadline), side);
}

Picture MercatorTile(const Service& service, ServedRaster& raster, const MapTile& tile,
                     const MapLook& look, const Deadline& deadline) {
    const auto reader = raster.Borrow(deadline);
    const Mercator& plane = reader->InMercator();
    const PlaneExtent extent = Mercator::ExtentOfTile(tile.matrix, tile.column, tile.row);
    const auto renderer = JudgedRenderer(service, raster, look.style, *reader);
    const std::uint64_t pixelBytes = renderer->Bands().size() * raster.SampleBytes();
    const auto source = SourceOf(raster, plane, extent, Mercator::kTileSide,
                                 std::min(kMostSourcePixels, service.limits.window / pixelBytes));
    if (!source)
        return Transparent(Mercator::kTileSide, renderer->Colours(), renderer->Settings().depth);
    const Picture picture = RenderLevelWindow(service, raster, *reader, look.style, source->level,
                                              source->window, deadline);
    return WarpToPlane(picture, raster, *source, plane, extent, Mercator::kTileSide,
                       look.resampling);
}

// As a pixel of the finest level, of a place in pixels of it.
std::optional<Pixel> PixelAt(const ServedRaster& raster, double x, double y) {
    const zelm::LevelGeometry finest = raster.Geometry(raster.FinestLevel());
    if (!(x >= 0 && y >= 0 && x < finest.samples && y < finest.lines)) return std::nullopt;
    return Pixel{static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y)};
}

}  // namespace

std::string OwnSetOf(std::string_view name) { return std::string(kOwn) + LayerIdOf(name); }

std::optional<std::string> NameOfOwnSet(std::string_view set) {
    if (!set.starts_with(kOwn)) return std::nullopt;
    return NameOfLayerId(set.substr(kOwn.size()));
}

bool IsMercatorSet(std::string_view set, std::string_view name) {
    if (set == kMercatorSet) return true;
    if (set == OwnSetOf(name)) return false;
    throw Refusal(404, Quoted(set) + " is no set of tiles of this raster");
}

Resampling ResamplingOf(const Request& request) {
    const auto text = request.Value("resampling").value_or("bilinear");
    if (text == "nearest") return Resampling::Nearest;
    if (text == "bilinear") return Resampling::Bilinear;
    if (text == "cubic") return Resampling::Cubic;
    throw Refusal(400, "resampling: " + Quoted(text) + " is none of nearest, bilinear, cubic");
}

std::uint32_t SideOfTile(const ServedRaster& raster, const MapTile& tile) {
    return tile.isMercator ? Mercator::kTileSide : raster.Header().tileSize;
}

Answer MapTileAnswer(const Request& request, const Service& service, ServedRaster& raster,
                     const MapTile& tile, const MapLook& look) {
    if (tile.isMercator) CheckMercatorTile(tile);
    CheckHasPixels(raster);
    const Validators validators{
        raster.ETagWithCompanions(std::string("m") + zmcrender::EndingOf(look.format)),
        std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const Picture picture = tile.isMercator
                                ? MercatorTile(service, raster, tile, look, request.deadline)
                                : OwnTile(service, raster, tile, look, request.deadline);
    request.deadline.Check();
    Answer answer = CodedAnswer(picture, look.format, look.quality);
    SetValidators(answer, validators);
    return answer;
}

std::optional<Pixel> PixelOfTile(ServedRaster& raster, const MapTile& tile, std::uint32_t i,
                                 std::uint32_t j, const Deadline& deadline) {
    if (!tile.isMercator) {
        const TilePlace place = FindTile(raster, tile.matrix, tile.column, tile.row);
        const double scale = std::ldexp(1.0, static_cast<int>(place.level - raster.FinestLevel()));
        return PixelAt(raster, (place.window.x + i + 0.5) * scale,
                       (place.window.y + j + 0.5) * scale);
    }
    CheckMercatorTile(tile);
    CheckHasPixels(raster);
    const PlaneExtent extent = Mercator::ExtentOfTile(tile.matrix, tile.column, tile.row);
    const double cell = Mercator::CellOf(tile.matrix);
    double x = extent.west + (i + 0.5) * cell, y = extent.north - (j + 0.5) * cell;
    raster.Borrow(deadline)->InMercator().ToPixels(1, &x, &y);
    return PixelAt(raster, x, y);
}

}  // namespace zmcserve
