// Pictures of any part of a raster, at /preview/NAME.FORMAT.
#include <algorithm>

#include "render/Codec.h"
#include "render/PictureSize.h"
#include "serve/Conditions.h"
#include "serve/Names.h"
#include "serve/Parameters.h"
#include "serve/PictureAnswer.h"
#include "serve/Service.h"
#include "serve/Services.h"

namespace zmcserve {
namespace {

constexpr std::uint32_t kUsualSize = 1024;

std::uint32_t LongerSide(const Request& request, const Service& service,
                         const zmchost::Window& window, zmcrender::PictureFormat format) {
    const std::uint32_t most = std::min(service.limits.side, zmcrender::LongestSide(format));
    const auto size = request.Count("size", most);
    if (size == 0u) throw Refusal(400, "size: a picture has a pixel at least");
    return size ? static_cast<std::uint32_t>(*size)
                : std::min({kUsualSize, std::max(window.width, window.height), most});
}

bool WantsLegend(const Request& request) {
    const auto text = request.Value("legend").value_or("0");
    if (text != "1" && text != "true" && text != "0" && text != "false")
        throw Refusal(400, "legend: " + Quoted(text) + " is none of 1, true, 0, false");
    return text == "1" || text == "true";
}

Answer HandlePreview(const Request& request, Service& service) {
    const std::string last = NameOfRest(request);
    const auto [name, ending] = StemAndEnding(last);
    const auto format = zmcrender::PictureFormatOfName(ending);
    if (!format) throw Refusal(404, "the formats of previews are jpg, png and webp");
    const ServedRasterPtr raster = service.catalog.Raster(name);
    const Validators validators{raster->ETagWithCompanions("p"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const zmcrender::Style style = StyleOf(request, {"quality", "size", "window", "legend"});
    const int quality = QualityOf(request);
    const bool legend = WantsLegend(request);
    CheckHasPixels(*raster);
    const zmchost::Window whole = raster->Whole();
    const zmchost::Window window = WindowOf(request, whole.width, whole.height);
    const auto shape =
        zmcrender::SizeOfPicture(window, LongerSide(request, service, window, *format));
    if (std::uint64_t{shape.width} * shape.height > service.limits.pixels)
        throw Refusal(400, "size: the picture would have more than " +
                               std::to_string(service.limits.pixels) + " pixels");
    Answer answer =
        CodedAnswer(RenderPart(service, *raster, style, window, shape, request.deadline, legend),
                    *format, quality);
    SetValidators(answer, validators);
    return answer;
}

}  // namespace

std::vector<Route> PictureRoutes() {
    return {{"preview",
             HandlePreview,
             nullptr,
             {{"preview", "/preview/{+name}.{format}{?size,window,legend,quality}",
               "a picture as jpg, png or webp of the raster, or of window=x,y,w,h in pixels of the "
               "finest level. Style in the query"}}}};
}

}  // namespace zmcserve
