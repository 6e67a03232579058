#include "serve/Screen.h"

#include <algorithm>
#include <cmath>

namespace zmcserve {
namespace {

// As in the language of the viewer: a half goes up, also below 0.
double Rounded(double value) { return std::floor(value + 0.5); }

// Along one axis.
struct Span {
    std::uint32_t from = 0;  // in pixels of the level that is read
    std::uint32_t count = 0;
    std::uint32_t pixels = 0;  // of the picture
    double start = 0;          // on the screen
    double extent = 0;
};

struct Axis {
    double screen = 0;  // its pixels
    double start = 0;   // of the raster, on the screen
    double zoom = 1;    // pixels of the screen for each of the raster
    double shown = 0;   // pixels of the raster that the level shows
    std::uint32_t whole = 0;
};

// Whole pixels of a level, of which the first and the last may reach beyond the screen, or as many
// as the screen has. A pixel of the screen shows what its middle lies on.
std::optional<Span> SpanOf(const Axis& axis, bool oneToOne) {
    const double first = std::max(axis.start, 0.0);
    const double end = std::min(std::ceil(axis.start + axis.shown * axis.zoom - 0.5), axis.screen);
    if (!(first < end)) return std::nullopt;
    const double from = (first - axis.start) / axis.zoom, to = (end - axis.start) / axis.zoom;
    const double most = axis.whole;
    Span span;
    span.from = static_cast<std::uint32_t>(
        std::clamp(oneToOne ? std::floor(from) : Rounded(from), 0.0, most - 1));
    const double behind = std::clamp(oneToOne ? std::ceil(to) : Rounded(to), span.from + 1.0, most);
    span.count = static_cast<std::uint32_t>(behind) - span.from;
    span.pixels = oneToOne ? span.count : static_cast<std::uint32_t>(end - first);
    span.start = oneToOne ? axis.start + span.from * axis.zoom : first;
    span.extent = oneToOne ? span.count * axis.zoom : end - first;
    return span;
}

// The level whose pixels are nearest in size to those of the screen.
std::uint32_t LevelOfView(const ServedRaster& raster, double zoom) {
    return static_cast<std::uint32_t>(std::clamp(Rounded(-std::log2(zoom)),
                                                 static_cast<double>(raster.FinestLevel()),
                                                 static_cast<double>(raster.CoarsestLevel())));
}

}  // namespace

View WholeIn(const zmcrender::PictureSize& screen, double width, double height) {
    constexpr double kShare = 0.94;
    const double zoom = std::min(screen.width / width, screen.height / height) * kShare;
    return {width / 2, height / 2, std::min(zoom, kMostZoom)};
}

std::optional<Shown> ShownOn(const zmcrender::PictureSize& screen, const View& view,
                             const ServedRaster& raster) {
    constexpr double kNear = 0.7;  // half an octave, which the nearest level is away at most
    const std::uint32_t level = LevelOfView(raster, view.zoom);
    const zelm::LevelGeometry geometry = raster.Geometry(level);
    const zmchost::Window whole = raster.Whole();
    const double scale = std::ldexp(1.0, static_cast<int>(level));
    const bool oneToOne = view.zoom * scale >= kNear;
    const auto axis = [&](double side, double middle, std::uint32_t ofLevel, std::uint32_t ofAll) {
        const double start = Rounded(side / 2 - middle * view.zoom);
        return oneToOne ? Axis{side, start, view.zoom * scale, double{1} * ofLevel, ofLevel}
                        : Axis{side, start, view.zoom, scale * ofLevel, ofAll};
    };
    const auto across = SpanOf(axis(screen.width, view.x, geometry.samples, whole.width), oneToOne);
    const auto down = SpanOf(axis(screen.height, view.y, geometry.lines, whole.height), oneToOne);
    if (!across || !down) return std::nullopt;
    return Shown{oneToOne ? std::optional(level) : std::nullopt,
                 {across->from, down->from, across->count, down->count},
                 {across->pixels, down->pixels},
                 {across->start, down->start, across->extent, down->extent}};
}

}  // namespace zmcserve
