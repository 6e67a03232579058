// What a screen shows of a raster, as one picture, at /view/NAME: the viewer has it on the screen
// before it can draw samples itself.
#include <algorithm>
#include <charconv>
#include <cmath>

#include "serve/Conditions.h"
#include "serve/Names.h"
#include "serve/Parameters.h"
#include "serve/PictureAnswer.h"
#include "serve/Screen.h"
#include "serve/Service.h"
#include "serve/Services.h"

namespace zmcserve {
namespace {

zmcrender::PictureSize ScreenOf(const Request& request, const Service& service) {
    const auto text = request.Value("screen");
    if (!text) throw Refusal(400, "screen: it is missing: the pixels that the screen has, w,h");
    const auto sides = RealsOf("screen", *text, 2);
    const auto fits = [&](double side) {
        return side >= 1 && side <= service.limits.side && side == std::trunc(side);
    };
    if (!fits(sides[0]) || !fits(sides[1]))
        throw Refusal(400, "screen: its sides are whole numbers from 1 to " +
                               std::to_string(service.limits.side));
    if (sides[0] * sides[1] > static_cast<double>(service.limits.pixels))
        throw Refusal(
            400, "screen: it has more than " + std::to_string(service.limits.pixels) + " pixels");
    return {static_cast<std::uint32_t>(sides[0]), static_cast<std::uint32_t>(sides[1])};
}

// The whole raster where no other view is told.
View ViewOf(const Request& request, const zmcrender::PictureSize& screen,
            const ServedRaster& raster) {
    const auto at = request.Value("at"), zoom = request.Value("zoom");
    if (!at && !zoom) return WholeIn(screen, raster.Header().width, raster.Header().height);
    if (!at || !zoom) throw Refusal(400, "at and zoom: one without the other is no view");
    const auto middle = RealsOf("at", *at, 2);
    const double factor = RealsOf("zoom", *zoom, 1)[0];
    constexpr double kLeastZoom = 1e-9;
    if (!(factor >= kLeastZoom && factor <= kMostZoom))
        throw Refusal(400, "zoom: it is a number above 0, and 128 at most");
    return {middle[0], middle[1], factor};
}

// In a format that keeps what the picture has: transparent pixels, and the few colours of a
// palette.
zmcrender::PictureFormat FormatOf(const zmcrender::Picture& picture,
                                  const zmcrender::Renderer& renderer) {
    if (renderer.Bounds().empty()) return zmcrender::PictureFormat::Png;
    return picture.HasAlpha() ? zmcrender::PictureFormat::WebP : zmcrender::PictureFormat::Jpeg;
}

std::string TextOf(const Place& place) {
    std::string text;
    for (const double number : {place.left, place.top, place.width, place.height}) {
        char digits[32];
        const auto end = std::to_chars(digits, digits + sizeof digits, number).ptr;
        text.append(text.empty() ? "" : ",").append(digits, end);
    }
    return text;
}

Answer HandleView(const Request& request, Service& service) {
    const ServedRasterPtr raster = service.catalog.Raster(NameOfRest(request));
    const Validators validators{raster->ETagWithCompanions("v"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const zmcrender::Style style = StyleOf(request, {"quality", "screen", "at", "zoom"});
    const int quality = QualityOf(request);
    CheckHasPixels(*raster);
    const auto screen = ScreenOf(request, service);
    const auto shown = ShownOn(screen, ViewOf(request, screen, *raster), *raster);
    if (!shown) throw Refusal(404, "the screen shows nothing of the raster");
    const zmcrender::Picture picture =
        shown->level
            ? RenderLevelWindow(service, *raster, style, *shown->level, shown->window,
                                request.deadline)
            : RenderPart(service, *raster, style, shown->window, shown->picture, request.deadline);
    const auto renderer = raster->RendererFor(style, *raster->Borrow(request.deadline));
    Answer answer = CodedAnswer(picture, FormatOf(picture, *renderer), quality);
    answer.Set("X-Picture-Place", TextOf(shown->place));
    SetValidators(answer, validators);
    return answer;
}

}  // namespace

std::vector<Route> ViewRoutes() {
    return {{"view",
             HandleView,
             nullptr,
             {{"view", "/view/{+name}{?screen,at,zoom,quality}",
               "what a screen of screen=w,h pixels shows of the raster: all of it, or at=x,y, in "
               "pixels of the finest level, in its middle and zoom=z pixels of the screen for "
               "each. X-Picture-Place tells left, top, width and height on the screen. Style in "
               "the query"}}}};
}

}  // namespace zmcserve
