#include "serve/Parameters.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <numeric>
#include <string>

#include "host/base/Error.h"
#include "serve/Answer.h"

namespace zmcserve {
namespace {

Refusal Wrong(std::string_view key, std::string_view text, const std::string& what) {
    return Refusal(400, std::string(key) + ": " + Quoted(text) + " " + what);
}

std::uint32_t Part(std::string_view text, std::string_view all) {
    const auto number = WholeNumber(text, 0xffffffffu);
    if (!number) throw Wrong("window", all, "is not four whole numbers x,y,width,height");
    return static_cast<std::uint32_t>(*number);
}

}  // namespace

zmcrender::Style StyleOf(const Request& request, std::initializer_list<std::string_view> others) {
    zmcrender::Style style;
    for (const auto& [key, value] : request.query) {
        if (std::find(others.begin(), others.end(), key) != others.end()) continue;
        if (!zmcrender::Style::IsKey(key))
            throw Refusal(400, Quoted(key) + " is no parameter of this address");
        style.Set(key, *request.Value(key));
    }
    return style;
}

int QualityOf(const Request& request) {
    const auto quality = request.Count("quality", 100);
    if (quality == 0u) throw Refusal(400, "quality: it is a number from 1 to 100");
    return quality ? static_cast<int>(*quality) : zmcrender::kDefaultQuality;
}

zmchost::Window WindowOf(const Request& request, std::uint32_t width, std::uint32_t height) {
    const auto text = request.Value("window");
    if (!text) return {0, 0, width, height};
    const auto parts = Split(*text, ',');
    if (parts.size() != 4)
        throw Wrong("window", *text, "is not four whole numbers x,y,width,height");
    const zmchost::Window window{Part(parts[0], *text), Part(parts[1], *text),
                                 Part(parts[2], *text), Part(parts[3], *text)};
    if (window.width == 0 || window.height == 0) throw Wrong("window", *text, "is empty");
    if (window.Right() > width || window.Bottom() > height)
        throw Wrong("window", *text,
                    "does not lie in " + std::to_string(width) + " x " + std::to_string(height) +
                        " pixels");
    return window;
}

std::vector<std::uint32_t> BandsOf(const Request& request, std::uint32_t bands) {
    std::vector<std::uint32_t> list;
    const auto text = request.Value("bands");
    if (!text) {
        list.resize(bands);
        std::iota(list.begin(), list.end(), 0u);
        return list;
    }
    for (const std::string_view part : Split(*text, ',')) {
        const auto band = WholeNumber(part, bands);
        if (!band || *band == 0)
            throw Wrong("bands", *text,
                        "are no bands from 1 to " + std::to_string(bands) + " with commas between");
        list.push_back(static_cast<std::uint32_t>(*band - 1));
    }
    return list;
}

void CheckHasPixels(const ServedRaster& raster) {
    if (raster.Levels() == 0) throw Refusal(404, "the raster has no pixels");
}

std::uint32_t LevelOf(const Request& request, const ServedRaster& raster) {
    const auto given = request.Count("level", 0xffffffffu);
    CheckHasPixels(raster);
    const std::uint64_t level = given ? *given : raster.FinestLevel();
    if (level < raster.FinestLevel() || level > raster.CoarsestLevel())
        throw Refusal(404, "there is no such level: they are " +
                               std::to_string(raster.FinestLevel()) + " to " +
                               std::to_string(raster.CoarsestLevel()));
    return static_cast<std::uint32_t>(level);
}

std::vector<double> RealsOf(std::string_view key, std::string_view text, std::size_t count) {
    std::vector<double> numbers;
    for (const std::string_view part : Split(text, ',')) {
        double number = 0;
        const auto [end, error] = std::from_chars(part.data(), part.data() + part.size(), number);
        if (error != std::errc() || end != part.data() + part.size() || !std::isfinite(number))
            throw Wrong(key, text, "is no list of numbers");
        numbers.push_back(number);
    }
    if (numbers.size() != count)
        throw Wrong(key, text, "are not " + std::to_string(count) + " numbers");
    return numbers;
}

void CheckWindow(const Service& service, std::uint64_t pixels, std::uint64_t pixelBytes) {
    const std::uint64_t most = service.limits.window;
    if (pixelBytes == 0 || pixels <= most / pixelBytes) return;
    throw Refusal(400, "its samples would take more than " + std::to_string(most) +
                           " bytes, which is the limit");
}

}  // namespace zmcserve
