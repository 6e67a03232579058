// Samples as they are: of a point, along a line, of a window.
#include <algorithm>
#include <cmath>
#include <numeric>

#include "describe/JsonNumbers.h"
#include "serve/Conditions.h"
#include "serve/Documents.h"
#include "serve/Names.h"
#include "serve/Parameters.h"
#include "serve/Service.h"
#include "serve/Services.h"
#include "serve/Tile.h"
#include "serve/Values.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;

constexpr std::uint64_t kMostSamples = 8192;  // along a line
constexpr std::uint64_t kMostValues = std::uint64_t{1} << 18;

std::uint32_t PixelOf(const Request& request, std::string_view key, std::uint32_t extent) {
    const auto at = request.Count(key, 0xffffffffu);
    if (!at) throw Refusal(400, std::string(key) + ": it is missing");
    if (*at >= extent)
        throw Refusal(400, std::string(key) + ": the level has the pixels 0 to " +
                               std::to_string(extent - 1));
    return static_cast<std::uint32_t>(*at);
}

// Aligned for every type.
std::vector<unsigned char> Room(const ServedRaster& raster, std::size_t samples) {
    return std::vector<unsigned char>(samples * raster.SampleBytes());
}

void CheckValues(std::uint64_t count) {
    if (count > kMostValues)
        throw Refusal(400, "that are more than " + std::to_string(kMostValues) +
                               " values; name fewer bands or samples");
}

Answer HandlePoint(const Request& request, Service& service) {
    request.AllowKeys({"x", "y", "level", "bands"});
    const ServedRasterPtr raster = service.catalog.Raster(NameOfRest(request));
    const Validators validators{raster->ETagWithCompanions("v"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const std::uint32_t level = LevelOf(request, *raster);
    const zelm::LevelGeometry geometry = raster->Geometry(level);
    const std::uint32_t x = PixelOf(request, "x", geometry.samples);
    const std::uint32_t y = PixelOf(request, "y", geometry.lines);
    const auto bands = BandsOf(request, raster->Header().bandCount);
    CheckValues(bands.size());
    Answer answer = JsonAnswer(DescribePixel(*raster, level, x, y, bands, request.deadline));
    SetValidators(answer, validators);
    return answer;
}

// --- along a line ---

struct Line {
    double x0 = 0, y0 = 0, x1 = 0, y1 = 0;

    double Length() const { return std::hypot(x1 - x0, y1 - y0); }
};

Line LineOf(const Request& request, const zelm::LevelGeometry& geometry) {
    const auto text = request.Value("line");
    if (!text) throw Refusal(400, "line: it is missing");
    const auto numbers = RealsOf("line", *text, 4);
    const Line line{numbers[0], numbers[1], numbers[2], numbers[3]};
    const auto inside = [](double at, std::uint32_t extent) { return at >= 0 && at <= extent; };
    if (!inside(line.x0, geometry.samples) || !inside(line.x1, geometry.samples) ||
        !inside(line.y0, geometry.lines) || !inside(line.y1, geometry.lines))
        throw Refusal(400, "line: it does not lie in " + std::to_string(geometry.samples) + " x " +
                               std::to_string(geometry.lines) + " pixels");
    return line;
}

std::uint64_t SamplesOf(const Request& request, const Line& line) {
    const auto given = request.Count("samples", kMostSamples);
    if (given && *given < 2) throw Refusal(400, "samples: a line has two ends");
    if (given) return *given;
    return std::clamp<std::uint64_t>(static_cast<std::uint64_t>(std::ceil(line.Length())) + 1, 2,
                                     kMostSamples / 8);
}

std::uint32_t PixelAt(double at, std::uint32_t extent) {
    return std::min(static_cast<std::uint32_t>(at), extent - 1);
}

Answer HandleProfile(const Request& request, Service& service) {
    request.AllowKeys({"line", "samples", "level", "bands"});
    const ServedRasterPtr raster = service.catalog.Raster(NameOfRest(request));
    const Validators validators{raster->ETag("v"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const std::uint32_t level = LevelOf(request, *raster);
    const zelm::LevelGeometry geometry = raster->Geometry(level);
    const Line line = LineOf(request, geometry);
    const std::uint64_t count = SamplesOf(request, line);
    const auto bands = BandsOf(request, raster->Header().bandCount);
    CheckValues(count * bands.size());
    const auto reader = raster->Borrow(request.deadline);
    const std::size_t pixelBytes = bands.size() * raster->SampleBytes();
    auto samples = Room(*raster, bands.size() * count);
    Json distances = Json::array();
    for (std::uint64_t i = 0; i < count; ++i) {
        const double part = static_cast<double>(i) / static_cast<double>(count - 1);
        const zmchost::Window pixel{PixelAt(line.x0 + (line.x1 - line.x0) * part, geometry.samples),
                                    PixelAt(line.y0 + (line.y1 - line.y0) * part, geometry.lines),
                                    1, 1};
        reader->Pixels().Read(level, pixel, bands, samples.data() + i * pixelBytes);
        distances.push_back(line.Length() * part);
    }
    raster->File().CheckUnchanged();
    Json values = Json::array();
    for (std::uint64_t i = 0; i < count; ++i)
        values.push_back(
            ValuesOf(raster->Header().pixelType, samples.data() + i * pixelBytes, bands.size()));
    Answer answer = JsonAnswer({{"level", level},
                                {"line", {line.x0, line.y0, line.x1, line.y1}},
                                {"bands", NumbersOf(bands)},
                                {"distances", std::move(distances)},
                                {"values", std::move(values)}});
    SetValidators(answer, validators);
    return answer;
}

// --- of a window ---

Answer HandleWindow(const Request& request, Service& service) {
    request.AllowKeys({"window", "level", "bands"});
    const std::string last = NameOfRest(request);
    const auto [name, ending] = StemAndEnding(last);
    const auto format = SampleFormatOfName(ending);
    if (!format) throw Refusal(404, "the formats of windows are raw and npy");
    const ServedRasterPtr raster = service.catalog.Raster(name);
    const Validators validators{raster->ETag("s"), std::nullopt};
    if (auto answer = AnswerOfConditions(request, validators)) return std::move(*answer);
    const std::uint32_t level = LevelOf(request, *raster);
    const zelm::LevelGeometry geometry = raster->Geometry(level);
    const zmchost::Window window = WindowOf(request, geometry.samples, geometry.lines);
    const auto bands = BandsOf(request, raster->Header().bandCount);
    Answer answer = ReadSamples(service, *raster, level, window, bands, *format, request.deadline);
    SetValidators(answer, validators);
    return answer;
}

}  // namespace

std::vector<Route> ValueRoutes() {
    return {{"point",
             HandlePoint,
             nullptr,
             {{"point", "/point/{+name}{?x,y,level,bands}",
               "the values of a pixel, exact: integers of 64 bits as texts"}}},
            {"profile",
             HandleProfile,
             nullptr,
             {{"profile", "/profile/{+name}{?line,samples,level,bands}",
               "the values along line=x0,y0,x1,y1 in pixels of the level"}}},
            {"window",
             HandleWindow,
             nullptr,
             {{"window", "/window/{+name}.{format}{?window,level,bands}",
               "samples of window=x,y,w,h in pixels of the level, as raw or npy"}}}};
}

}  // namespace zmcserve
