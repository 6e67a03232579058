#include <algorithm>
#include <cmath>

#include "core/PixelVocabulary.h"
#include "host/base/Error.h"
#include "render/Renderer.h"
#include "render/Resampler.h"
#include "render/SampleBlock.h"

namespace zmcrender {
namespace {

using zmchost::Window;

constexpr std::uint64_t kStripBytes = std::uint64_t{32} << 20;
constexpr std::uint64_t kLongestLine = std::uint64_t{256} << 20;

double Scale(std::uint32_t level) { return std::ldexp(1.0, static_cast<int>(level)); }

// The window in pixels of a level, which has none of what a half pixel was cut off at its edges.
Area OnLevel(const Window& window, std::uint32_t level, const Window& whole) {
    const double scale = Scale(level);
    Area area;
    area.x = std::min(window.x / scale, whole.width - 1.0);
    area.y = std::min(window.y / scale, whole.height - 1.0);
    const auto right =
        std::min(static_cast<double>(window.Right()) / scale, double{1} * whole.width);
    const auto bottom =
        std::min(static_cast<double>(window.Bottom()) / scale, double{1} * whole.height);
    area.width = std::max(right - area.x, 1 / scale);
    area.height = std::max(bottom - area.y, 1 / scale);
    return area;
}

// Whole pixels that an area touches, and one more on each side where it grows. An area beyond the
// edge touches the pixels at the edge.
Window Touched(const Area& area, const Window& whole, std::uint32_t width, std::uint32_t height) {
    const auto span = [](double start, double extent, std::uint32_t target, std::uint32_t size) {
        const double more = extent < target ? 1 : 0;
        const double from = std::clamp(std::floor(start) - more, 0.0, size - 1.0);
        const double to = std::min(std::ceil(start + extent) + more, static_cast<double>(size));
        return std::pair(static_cast<std::uint32_t>(from),
                         static_cast<std::uint32_t>(std::max(to - from, 1.0)));
    };
    const auto [x, across] = span(area.x, area.width, width, whole.width);
    const auto [y, down] = span(area.y, area.height, height, whole.height);
    return {x, y, across, down};
}

bool IsSame(const Area& area, const Window& window, std::uint32_t width, std::uint32_t height) {
    return window.width == width && window.height == height && area.x == window.x &&
           area.y == window.y && area.width == width && area.height == height;
}

// What is held of a line: its samples, and some bytes for each pixel of levels on their way.
std::uint64_t LineBytes(const Renderer& renderer, const PixelSource& source, const Window& window) {
    constexpr std::uint64_t kLevels = 16;
    const std::uint64_t samples = renderer.Bands().size() * zelm::PixelSize(source.PixelType());
    return window.width * (samples + kLevels);
}

void CheckLine(const Renderer& renderer, const PixelSource& source, const Window& window) {
    if (LineBytes(renderer, source, window) > kLongestLine)
        throw zmchost::Error(source.Name(), "make a picture of so wide a window",
                             "a line of it takes more than " + std::to_string(kLongestLine >> 20) +
                                 " MiB, and there is no level that is coarse enough");
}

// Lines of a window that are read at once: to the end of a row of tiles where that fits.
std::uint32_t StripLines(const Window& window, std::uint32_t y, std::uint64_t lineBytes,
                         std::uint32_t tileSide) {
    const std::uint64_t most = std::max<std::uint64_t>(kStripBytes / lineBytes, 1);
    const std::uint64_t side = std::max<std::uint32_t>(tileSide, 1);
    std::uint64_t end = std::uint64_t{y} + most;
    if (end / side * side > y) end = end / side * side;
    return static_cast<std::uint32_t>(std::min(end, window.Bottom()) - y);
}

// Takes strips of a window, from its top.
template <class Take>
void EachStrip(const Renderer& renderer, PixelSource& source, std::uint32_t level,
               const Window& window, Take&& take) {
    const std::uint64_t lineBytes = LineBytes(renderer, source, window);
    SampleBlock block;
    for (std::uint64_t y = window.y; y < window.Bottom();) {
        Window strip = window;
        strip.y = static_cast<std::uint32_t>(y);
        strip.height = StripLines(window, strip.y, lineBytes, source.TileSide());
        take(renderer.Render(block.Read(source, level, strip, renderer.Bands(), renderer.Halo())));
        y = strip.Bottom();
    }
}

// An area of a level in width x height pixels.
Picture RenderArea(const Renderer& renderer, PixelSource& source, std::uint32_t level,
                   const Area& area, std::uint32_t width, std::uint32_t height) {
    const Window whole{0, 0, source.Width(level), source.Height(level)};
    const Window touched = Touched(area, whole, width, height);
    CheckLine(renderer, source, touched);
    if (IsSame(area, touched, width, height) &&
        LineBytes(renderer, source, touched) * height <= kStripBytes) {
        SampleBlock block;
        return renderer.Render(
            block.Read(source, level, touched, renderer.Bands(), renderer.Halo()));
    }
    const Area inside{area.x - touched.x, area.y - touched.y, area.width, area.height};
    Resampler resampler(touched.width, touched.height, renderer.Colours(),
                        renderer.Settings().depth, inside, width, height);
    EachStrip(renderer, source, level, touched,
              [&](const Picture& strip) { resampler.Add(strip); });
    return resampler.Finish(false);
}

// The coarsest level that has pixels.
std::uint32_t CoarsestOf(const PixelSource& source) {
    std::uint32_t found = source.MinLevel();
    while (found < source.MaxLevel() && source.Width(found + 1) != 0 &&
           source.Height(found + 1) != 0)
        ++found;
    return found;
}

}  // namespace

Window WholeOf(const PixelSource& source) {
    const std::uint32_t level = source.MinLevel();
    return WholeOfLevel(level, source.Width(level), source.Height(level));
}

Window WholeOfLevel(std::uint32_t level, std::uint32_t width, std::uint32_t height) {
    const auto whole = [level](std::uint32_t extent) {
        return static_cast<std::uint32_t>(
            std::min<std::uint64_t>(std::uint64_t{extent} << (level & 31u), 0xffffffffu));
    };
    return {0, 0, whole(width), whole(height)};
}

std::uint32_t LevelFor(const PixelSource& source, const Window& window, std::uint32_t width,
                       std::uint32_t height) {
    std::uint32_t found = source.MinLevel();
    for (std::uint32_t level = found; level <= source.MaxLevel(); ++level) {
        if (source.Width(level) == 0 || source.Height(level) == 0) break;
        const double scale = Scale(level);
        if (window.width / scale < width || window.height / scale < height) break;
        found = level;
    }
    return found;
}

Picture RenderWindow(const Renderer& renderer, PixelSource& source, const Window& window,
                     std::uint32_t width, std::uint32_t height) {
    const std::uint32_t level = LevelFor(source, window, width, height);
    const Window whole{0, 0, source.Width(level), source.Height(level)};
    return RenderArea(renderer, source, level, OnLevel(window, level, whole), width, height);
}

Picture RenderInScale(const Renderer& renderer, PixelSource& source, std::uint32_t level,
                      const Window& window) {
    const std::uint32_t own = std::clamp(level, source.MinLevel(), CoarsestOf(source));
    const double step = std::ldexp(1.0, static_cast<int>(level) - static_cast<int>(own));
    const Area area{window.x * step, window.y * step, window.width * step, window.height * step};
    return RenderArea(renderer, source, own, area, window.width, window.height);
}

}  // namespace zmcrender
