#include "serve/ImageParameters.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <optional>

#include "serve/Answer.h"
#include "serve/Names.h"
#include "serve/Request.h"

namespace zmcserve {
namespace {

using zmchost::Window;
using zmcrender::PictureSize;

constexpr std::string_view kPercent = "pct:";

Refusal Misread(const char* part, std::string_view text, const std::string& what) {
    return Refusal(400, std::string(part) + ": " + Quoted(text) + " " + what);
}

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

// Digits, which may have a point and more digits behind them: no sign, exponent, infinity or NaN.
std::optional<double> Decimal(std::string_view text) {
    const std::size_t point = std::min(text.find('.'), text.size());
    const std::string_view whole = text.substr(0, point);
    const std::string_view rest = point == text.size() ? "0" : text.substr(point + 1);
    if (whole.empty() || rest.empty() || !std::all_of(whole.begin(), whole.end(), IsDigit) ||
        !std::all_of(rest.begin(), rest.end(), IsDigit))
        return std::nullopt;
    double number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || !std::isfinite(number)) return std::nullopt;
    return number;
}

// --- regions ---

Window Square(const Window& whole) {
    const std::uint32_t side = std::min(whole.width, whole.height);
    return {(whole.width - side) / 2, (whole.height - side) / 2, side, side};
}

struct Span {
    std::uint32_t start = 0;
    std::uint32_t extent = 0;
};

Span CutTo(std::uint64_t start, std::uint64_t extent, std::uint32_t whole) {
    if (start >= whole) return {};
    return {static_cast<std::uint32_t>(start),
            static_cast<std::uint32_t>(std::min<std::uint64_t>(extent, whole - start))};
}

// What is more than nothing is a pixel at least.
Span CutToPercent(double start, double extent, std::uint32_t whole) {
    const double from = std::round(start / 100 * whole);
    const double size = extent > 0 ? std::max(std::round(extent / 100 * whole), 1.0) : 0;
    if (from >= whole) return {};
    return CutTo(static_cast<std::uint64_t>(from),
                 static_cast<std::uint64_t>(std::min(size, double{1} * whole)), whole);
}

Window WindowOfPixels(std::string_view text, const Window& whole) {
    const auto parts = Split(text, ',');
    std::array<std::uint64_t, 4> numbers{};
    for (std::size_t i = 0; i < 4; ++i) {
        const auto number =
            parts.size() == 4 ? WholeNumber(parts[i], ~std::uint64_t{0}) : std::nullopt;
        if (!number)
            throw Misread("region", text,
                          "is none of full, square, x,y,w,h of whole numbers and pct:x,y,w,h");
        numbers[i] = *number;
    }
    const Span x = CutTo(numbers[0], numbers[2], whole.width);
    const Span y = CutTo(numbers[1], numbers[3], whole.height);
    return {x.start, y.start, x.extent, y.extent};
}

Window WindowOfPercents(std::string_view text, const Window& whole) {
    const auto parts = Split(text, ',');
    if (parts.size() != 4) throw Misread("region", text, "is not four numbers");
    std::array<double, 4> numbers{};
    for (std::size_t i = 0; i < 4; ++i) {
        const auto number = Decimal(parts[i]);
        if (!number) throw Misread("region", text, "is not four per cents");
        numbers[i] = *number;
    }
    const Span x = CutToPercent(numbers[0], numbers[2], whole.width);
    const Span y = CutToPercent(numbers[1], numbers[3], whole.height);
    return {x.start, y.start, x.extent, y.extent};
}

// --- sizes ---

std::uint32_t Share(std::uint32_t extent, std::uint32_t other, std::uint32_t otherNow) {
    return static_cast<std::uint32_t>(std::min<std::uint64_t>(
        (std::uint64_t{extent} * otherNow + other / 2) / other, 0xffffffffu));
}

// The shape of a region, as large as a box has room for. No side of it is less than a pixel,
// however long the other one is.
PictureSize Fit(const Window& region, std::uint32_t width, std::uint32_t height) {
    if (std::uint64_t{width} * region.height <= std::uint64_t{height} * region.width)
        return {width, std::max(Share(region.height, region.width, width), 1u)};
    return {std::max(Share(region.width, region.height, height), 1u), height};
}

// The same within the limits.
PictureSize FitWithin(const Window& region, std::uint32_t width, std::uint32_t height,
                      const ImageLimits& limits) {
    const PictureSize size =
        Fit(region, std::min(width, limits.side), std::min(height, limits.side));
    const std::uint64_t area = std::uint64_t{size.width} * size.height;
    if (area <= limits.area) return size;
    const double scale = std::sqrt(static_cast<double>(limits.area) / static_cast<double>(area));
    const auto scaled = [scale](std::uint32_t extent) {
        return std::max(static_cast<std::uint32_t>(extent * scale), 1u);
    };
    return Fit(region, scaled(size.width), scaled(size.height));
}

PictureSize Largest(const Window& region, const ImageLimits& limits, bool mayGrow) {
    return mayGrow ? FitWithin(region, limits.side, limits.side, limits)
                   : FitWithin(region, region.width, region.height, limits);
}

bool Grows(const PictureSize& size, const Window& region) {
    return size.width > region.width || size.height > region.height;
}

PictureSize SizeOfPercent(std::string_view text, const Window& region, bool mayGrow) {
    const auto percent = Decimal(text);
    if (!percent) throw Misread("size", text, "is no number of per cents");
    if (*percent > 100 && !mayGrow)
        throw Misread("size", text, "per cent is more than the region has: ^pct: enlarges");
    const auto scaled = [&](std::uint32_t extent) {
        return static_cast<std::uint32_t>(
            std::min(std::round(extent * (*percent / 100)), double{0xffffffffu}));
    };
    return {scaled(region.width), scaled(region.height)};
}

// "w,", ",h" and "w,h": what is not told is 0.
PictureSize PixelPair(std::string_view text) {
    const auto parts = Split(text, ',');
    PictureSize pair;
    const auto take = [&](std::string_view part, std::uint32_t& extent) {
        if (part.empty()) return;
        const auto number = WholeNumber(part, 0xffffffffu);
        if (!number || *number == 0) throw Misread("size", text, "is no size in pixels");
        extent = static_cast<std::uint32_t>(*number);
    };
    if (parts.size() != 2 || (parts[0].empty() && parts[1].empty()))
        throw Misread("size", text, "is none of max, w, ,h w,h !w,h and pct:n");
    take(parts[0], pair.width);
    take(parts[1], pair.height);
    return pair;
}

PictureSize SizeWithin(std::string_view text, const Window& region, const ImageLimits& limits,
                       bool mayGrow) {
    const PictureSize box = PixelPair(text);
    if (box.width == 0 || box.height == 0)
        throw Misread("size", text, "has one number where there have to be two");
    if (mayGrow) return FitWithin(region, box.width, box.height, limits);
    return FitWithin(region, std::min(box.width, region.width), std::min(box.height, region.height),
                     limits);
}

PictureSize SizeOfPair(std::string_view text, const Window& region) {
    PictureSize size = PixelPair(text);
    if (size.width == 0) size.width = std::max(Share(region.width, region.height, size.height), 1u);
    if (size.height == 0)
        size.height = std::max(Share(region.height, region.width, size.width), 1u);
    return size;
}

PictureSize UnboundedSize(std::string_view text, const Window& region, const ImageLimits& limits,
                          bool mayGrow) {
    if (text == "max") return Largest(region, limits, mayGrow);
    if (text.starts_with(kPercent))
        return SizeOfPercent(text.substr(kPercent.size()), region, mayGrow);
    if (text.substr(0, 1) == "!") return SizeWithin(text.substr(1), region, limits, mayGrow);
    return SizeOfPair(text, region);
}

// --- files ---

// What the standard knows beside what is made here.
constexpr std::string_view kOtherFormats[] = {"tif", "gif", "jp2", "pdf"};

}  // namespace

Window RegionOf(std::string_view text, const Window& whole) {
    if (text == "full") return whole;
    if (text == "square") return Square(whole);
    const Window region = text.starts_with(kPercent)
                              ? WindowOfPercents(text.substr(kPercent.size()), whole)
                              : WindowOfPixels(text, whole);
    if (region.width == 0 || region.height == 0)
        throw Misread("region", text, "has no part of the picture");
    return region;
}

PictureSize ImageSizeOf(std::string_view text, const Window& region, const ImageLimits& limits) {
    const bool mayGrow = text.substr(0, 1) == "^";
    const PictureSize size =
        UnboundedSize(mayGrow ? text.substr(1) : text, region, limits, mayGrow);
    if (size.width == 0 || size.height == 0)
        throw Misread("size", text, "has not a pixel in each direction");
    if (!mayGrow && Grows(size, region))
        throw Misread("size", text, "is larger than the region: ^ in front enlarges");
    if (size.width > limits.side || size.height > limits.side ||
        std::uint64_t{size.width} * size.height > limits.area)
        throw Misread("size", text,
                      "is larger than pictures may be: " + std::to_string(limits.side) +
                          " pixels a side, " + std::to_string(limits.area) + " in all");
    return size;
}

std::string CanonicalSize(const PictureSize& size, const Window& region,
                          const ImageLimits& limits) {
    const bool grows = Grows(size, region);
    const PictureSize most = Largest(region, limits, grows);
    std::string text = grows ? "^" : "";
    if (size.width == most.width && size.height == most.height) return text.append("max");
    return text.append(std::to_string(size.width))
        .append(1, ',')
        .append(std::to_string(size.height));
}

std::string Rotation::Text() const {
    return std::string(mirrored ? "!" : "").append(std::to_string(90 * quarters));
}

Rotation RotationOf(std::string_view text) {
    Rotation rotation;
    rotation.mirrored = text.substr(0, 1) == "!";
    const auto degrees = Decimal(text.substr(rotation.mirrored ? 1 : 0));
    if (!degrees || *degrees > 360)
        throw Misread("rotation", text, "is no number of degrees from 0 to 360, or ! and one");
    if (std::fmod(*degrees, 90) != 0)
        throw Refusal(501, "rotation: pictures are turned by 0, 90, 180 and 270 degrees alone");
    rotation.quarters = static_cast<unsigned>(*degrees / 90) % 4;
    return rotation;
}

ImageFile ImageFileOf(std::string_view text) {
    const auto [quality, ending] = StemAndEnding(text);
    const auto at = std::find(std::begin(kImageQualities), std::end(kImageQualities), quality);
    if (at == std::end(kImageQualities))
        throw Misread("quality", text, "is none of default, color, gray and bitonal with a format");
    if (std::find(std::begin(kOtherFormats), std::end(kOtherFormats), ending) !=
        std::end(kOtherFormats))
        throw Refusal(501, "format: pictures are made as jpg, png and webp alone");
    const auto format = zmcrender::PictureFormatOfName(ending);
    if (!format) throw Misread("format", text, "ends with none of jpg, png and webp");
    return {static_cast<ImageQuality>(at - std::begin(kImageQualities)), *format, ending};
}

}  // namespace zmcserve
