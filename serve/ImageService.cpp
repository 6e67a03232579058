// The IIIF Image API 3 at level 2, below /iiif/IDENTIFIER: info.json, and pictures of any region in
// any size at {region}/{size}/{rotation}/{quality}.{format}.
//
// An identifier is the name of a raster, percent-encoded, or a name with the keys of a style behind
// a "?", encoded likewise: clients put parts behind an identifier and know nothing of queries. A
// style in the query itself does as well, and stands in the identifier of what is answered.
#include <algorithm>

#include "describe/JsonNumbers.h"
#include "render/Codec.h"
#include "serve/Conditions.h"
#include "serve/Documents.h"
#include "serve/ImageParameters.h"
#include "serve/Names.h"
#include "serve/Negotiation.h"
#include "serve/Parameters.h"
#include "serve/PictureAnswer.h"
#include "serve/Service.h"
#include "serve/Services.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;
using zmchost::Window;

constexpr const char* kContext = "http://iiif.io/api/image/3/context.json";
constexpr const char* kProtocol = "http://iiif.io/api/image";
constexpr const char* kProfile = "http://iiif.io/api/image/3/level2.json";
constexpr const char* kInfo = "info.json";

// What an identifier stands for.
struct Image {
    std::string name;
    ServedRasterPtr raster;
    zmcrender::Style style;
    int quality = zmcrender::kDefaultQuality;
    std::string base;  // its address
};

ServedRasterPtr RasterIfThere(Service& service, std::string_view name) try {
    return service.catalog.Raster(name);
} catch (const Refusal& refusal) {
    if (refusal.Status() != 404) throw;
    return nullptr;
}

// Whether the name itself has the "?" is for the files to tell.
void FindImage(Service& service, const std::string& identifier, Request& styled, Image& image) {
    const std::size_t question = identifier.rfind('?');
    if (question != identifier.npos) image.raster = RasterIfThere(service, identifier);
    image.name = image.raster ? identifier : identifier.substr(0, question);
    if (image.raster) return;
    image.raster = service.catalog.Raster(image.name);
    if (question == identifier.npos) return;
    const Request inner = Request::Parse(Method::Get, "/" + identifier.substr(question));
    styled.query.insert(styled.query.end(), inner.query.begin(), inner.query.end());
}

// The name with what makes it look as it does.
std::string IdentifierOf(const Image& image) {
    std::string query;
    const auto add = [&query](const std::string& key, const std::string& value) {
        if (value.empty()) return;
        query.append(query.empty() ? "?" : "&").append(key);
        query.append(1, '=').append(PercentEncoded(value));
    };
    for (const char* const key : zmcrender::Style::Keys()) add(key, image.style.Value(key));
    if (image.quality != zmcrender::kDefaultQuality) add("quality", std::to_string(image.quality));
    return image.name + query;
}

Image ImageOf(const Request& request, Service& service, std::size_t end) {
    Image image;
    Request styled = request;
    FindImage(service, NameOfSegments(request, 1, end), styled, image);
    CheckHasPixels(*image.raster);
    image.style = StyleOf(styled, {"quality"});
    image.quality = QualityOf(styled);
    image.base = request.baseUrl + "/iiif/" + PercentEncoded(IdentifierOf(image));
    return image;
}

ImageLimits ImageLimitsOf(const Service& service) {
    return {service.limits.side, service.limits.pixels};
}

// --- info.json ---

// Scales from the finest to the one of which a single tile shows all.
std::vector<std::uint32_t> ScalesOf(const Window& whole, std::uint32_t tileSide) {
    std::vector<std::uint32_t> scales{0};
    while (zmcrender::ExtentInScale(std::max(whole.width, whole.height), scales.back()) > tileSide)
        scales.push_back(scales.back() + 1);
    return scales;
}

Json SizesOf(const Window& whole, const std::vector<std::uint32_t>& scales,
             const ImageLimits& limits) {
    Json sizes = Json::array();
    for (auto scale = scales.rbegin(); scale != scales.rend(); ++scale) {
        const std::uint64_t width = zmcrender::ExtentInScale(whole.width, *scale);
        const std::uint64_t height = zmcrender::ExtentInScale(whole.height, *scale);
        if (std::max(width, height) <= limits.side && width * height <= limits.area)
            sizes.push_back({{"width", width}, {"height", height}});
    }
    return sizes;
}

Json InfoOf(const Image& image, const Service& service) {
    const Window whole = image.raster->Whole();
    const ImageLimits limits = ImageLimitsOf(service);
    const std::uint32_t side = TileSideOf(service, *image.raster);
    const auto scales = ScalesOf(whole, side);
    Json factors = Json::array();
    for (const std::uint32_t scale : scales) factors.push_back(std::uint64_t{1} << scale);
    return {{"@context", kContext},
            {"id", image.base},
            {"type", "ImageService3"},
            {"protocol", kProtocol},
            {"profile", "level2"},
            {"width", whole.width},
            {"height", whole.height},
            {"maxWidth", limits.side},
            {"maxHeight", limits.side},
            {"maxArea", limits.area},
            {"sizes", SizesOf(whole, scales, limits)},
            {"tiles", Json::array({{{"width", side}, {"scaleFactors", factors}}})},
            {"extraQualities", {"color", "gray", "bitonal"}},
            {"extraFormats", {"webp"}},
            {"extraFeatures",
             {"canonicalLinkHeader", "mirroring", "profileLinkHeader", "sizeUpscaling"}}};
}

Answer InfoAnswer(const Request& request, Service& service) {
    const Image image = ImageOf(request, service, request.segments.size() - 1);
    const bool linked = Names(request.Header("Accept").value_or(""), "application/ld+json");
    const Validators validators{image.raster->ETag(VariantOf(image.base) + (linked ? "l" : "")),
                                std::nullopt};
    auto known = AnswerOfConditions(request, validators);
    Answer answer = known ? std::move(*known) : JsonAnswer(InfoOf(image, service));
    answer.Set("Vary", "Accept");
    if (known) return answer;
    if (linked)
        answer.type = "application/ld+json;profile=\"" + std::string(kContext) + '"';
    else
        answer.Set("Link", '<' + std::string(kContext) +
                               ">;rel=\"http://www.w3.org/ns/json-ld#context\";"
                               "type=\"application/ld+json\"");
    SetValidators(answer, validators);
    return answer;
}

Answer ToInfo(const Request& request, Service& service) {
    // A slash behind the identifier is none of it.
    const bool ends = request.segments.size() > 2 && request.segments.back().empty();
    const Image image = ImageOf(request, service, request.segments.size() - (ends ? 1 : 0));
    Answer answer = TextAnswer(303, "it is described at info.json");
    answer.Set("Location", image.base + '/' + kInfo);
    return answer;
}

// --- pictures ---

struct Wanted {
    Window region;
    zmcrender::PictureSize size;
    Rotation rotation;
    ImageFile file;
};

Wanted WantedOf(const Request& request, const Window& whole, const ImageLimits& limits) {
    const auto part = request.segments.end() - 4;
    Wanted wanted;
    wanted.region = RegionOf(part[0], whole);
    wanted.size = ImageSizeOf(part[1], wanted.region, limits);
    wanted.rotation = RotationOf(part[2]);
    wanted.file = ImageFileOf(part[3]);
    const std::uint32_t most = zmcrender::LongestSide(wanted.file.format);
    if (wanted.size.width > most || wanted.size.height > most)
        throw Refusal(400, "size: pictures of this format have at most " + std::to_string(most) +
                               " pixels a side");
    return wanted;
}

// Whether a part of an extent, in so many pixels, is one of the pixels of a scale.
bool IsOfScale(std::uint32_t start, std::uint32_t extent, std::uint32_t whole, std::uint32_t size,
               std::uint32_t scale) {
    const std::uint64_t step = std::uint64_t{1} << scale;
    const bool ends = extent % step == 0 || extent == whole - start;
    return start % step == 0 && ends && size == zmcrender::ExtentInScale(extent, scale);
}

// The scale in which a region has just so many pixels, as tiles have; none where it lies otherwise.
std::optional<std::uint32_t> ScaleOf(const Wanted& wanted, const Window& whole) {
    const auto& [region, size, rotation, file] = wanted;
    for (std::uint32_t scale = 0; scale <= 32; ++scale)
        if (IsOfScale(region.x, region.width, whole.width, size.width, scale) &&
            IsOfScale(region.y, region.height, whole.height, size.height, scale))
            return scale;
    return std::nullopt;
}

zmcrender::Picture RegionPicture(const Request& request, const Service& service, const Image& image,
                                 const Wanted& wanted) {
    const auto& [region, size, rotation, file] = wanted;
    const auto scale = ScaleOf(wanted, image.raster->Whole());
    if (!scale)
        return RenderPart(service, *image.raster, image.style, region, size, request.deadline);
    const Window window{region.x >> *scale, region.y >> *scale, size.width, size.height};
    return RenderScaleWindow(service, *image.raster, image.style, *scale, window, request.deadline);
}

zmcrender::Picture InQuality(zmcrender::Picture picture, ImageQuality quality) {
    switch (quality) {
        case ImageQuality::Colour:
            return WithColours(std::move(picture));
        case ImageQuality::Grey:
            return InGrey(std::move(picture));
        case ImageQuality::Bitonal:
            return InBlackAndWhite(std::move(picture));
        case ImageQuality::Default:
            break;
    }
    return picture;
}

std::string CanonicalOf(const Image& image, const Wanted& wanted, const ImageLimits& limits,
                        bool isColour) {
    const auto& [region, size, rotation, file] = wanted;
    const bool usual = file.quality == (isColour ? ImageQuality::Colour : ImageQuality::Grey);
    const auto quality = usual ? ImageQuality::Default : file.quality;
    std::string part;
    if (region == image.raster->Whole())
        part = "full";
    else
        for (const std::uint32_t number : {region.x, region.y, region.width, region.height})
            part.append(part.empty() ? "" : ",").append(std::to_string(number));
    return image.base + '/' + part + '/' + CanonicalSize(size, region, limits) + '/' +
           rotation.Text() + '/' + kImageQualities[static_cast<std::size_t>(quality)] + '.' +
           std::string(file.ending);
}

Answer ImageAnswer(const Request& request, Service& service) {
    const Image image = ImageOf(request, service, request.segments.size() - 4);
    const ImageLimits limits = ImageLimitsOf(service);
    const Wanted wanted = WantedOf(request, image.raster->Whole(), limits);
    const Validators validators{image.raster->ETagWithCompanions("p"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    zmcrender::Picture picture = RegionPicture(request, service, image, wanted);
    const bool isColour = picture.channels >= 3;
    picture = Turned(InQuality(std::move(picture), wanted.file.quality), wanted.rotation.mirrored,
                     wanted.rotation.quarters);
    Answer answer = CodedAnswer(picture, wanted.file.format, image.quality);
    answer.Set("Link", '<' + std::string(kProfile) + ">;rel=\"profile\", <" +
                           CanonicalOf(image, wanted, limits, isColour) + ">;rel=\"canonical\"");
    SetValidators(answer, validators);
    return answer;
}

Answer HandleImage(const Request& request, Service& service) {
    const std::size_t count = request.segments.size();
    if (count < 2 || (count == 2 && request.segments[1].empty()))
        throw Refusal(404, "the address of an image is /iiif/NAME");
    if (count > 2 && request.segments.back() == kInfo) return InfoAnswer(request, service);
    return count < 6 ? ToInfo(request, service) : ImageAnswer(request, service);
}

}  // namespace

std::vector<Route> ImageRoutes() {
    return {{"iiif",
             HandleImage,
             nullptr,
             {{"iiif", "/iiif/{name}/info.json",
               "the raster as an image of the IIIF Image API 3, level 2"},
              {"iiif-image", "/iiif/{name}/{region}/{size}/{rotation}/{quality}.{format}",
               "a picture of a region as jpg, png or webp. Style in the query, or behind a \"?\" "
               "in the name"}}}};
}

}  // namespace zmcserve
