#include "render/SampleBlock.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "core/PixelVocabulary.h"

namespace zmcrender {
namespace {

using zmchost::Window;

constexpr std::uint64_t kMostSampled = std::uint64_t{1}
                                       << 20;  // pixels of a level that is read whole
constexpr std::uint32_t kWindowsAcross = 8;
constexpr std::uint32_t kWindowSide = 128;

// The window with the pixels around it that the level has.
Window Around(const Window& window, std::uint32_t halo, std::uint32_t width, std::uint32_t height) {
    const std::uint32_t left = std::min(halo, window.x), top = std::min(halo, window.y);
    const auto right =
        static_cast<std::uint32_t>(std::min<std::uint64_t>(halo, width - window.Right()));
    const auto bottom =
        static_cast<std::uint32_t>(std::min<std::uint64_t>(halo, height - window.Bottom()));
    return {window.x - left, window.y - top, window.width + left + right,
            window.height + top + bottom};
}

// Pixels of `window` with `halo` more on each side, out of those of `known`, which has some of
// them.
std::vector<unsigned char> Repeated(const std::vector<unsigned char>& pixels, const Window& known,
                                    const Window& window, std::uint32_t halo,
                                    std::size_t pixelBytes) {
    const std::size_t width = window.width + std::size_t{2} * halo;
    const std::size_t height = window.height + std::size_t{2} * halo;
    std::vector<unsigned char> all(width * height * pixelBytes);
    const auto nearest = [halo](std::size_t at, std::uint32_t start, std::uint32_t knownStart,
                                std::uint32_t extent) {
        const auto place = static_cast<std::int64_t>(at) + start - halo - knownStart;
        return static_cast<std::size_t>(std::clamp<std::int64_t>(place, 0, extent - 1));
    };
    unsigned char* to = all.data();
    for (std::size_t y = 0; y < height; ++y) {
        const std::size_t line = nearest(y, window.y, known.y, known.height) * known.width;
        for (std::size_t x = 0; x < width; ++x, to += pixelBytes)
            std::memcpy(to,
                        &pixels[(line + nearest(x, window.x, known.x, known.width)) * pixelBytes],
                        pixelBytes);
    }
    return all;
}

}  // namespace

Samples SampleBlock::Read(PixelSource& source, std::uint32_t level, const Window& window,
                          std::span<const std::uint32_t> bands, std::uint32_t halo) {
    const Window known = Around(window, halo, source.Width(level), source.Height(level));
    const std::size_t pixelBytes = bands.size() * zelm::PixelSize(source.PixelType());
    pixels.resize(known.Pixels() * pixelBytes);
    source.Read(level, known, bands, pixels.data());
    mask.clear();
    if (source.HasMask()) {
        mask.resize(known.Pixels());
        source.ReadMask(level, known, mask.data());
    }
    if (known.width != window.width + 2 * halo || known.height != window.height + 2 * halo) {
        pixels = Repeated(pixels, known, window, halo, pixelBytes);
        if (!mask.empty()) mask = Repeated(mask, known, window, halo, 1);
    }
    return {.data = pixels.data(),
            .width = window.width,
            .height = window.height,
            .halo = halo,
            .level = level,
            .shown = mask.empty() ? nullptr : mask.data()};
}

PixelLine LineOf(const Samples& samples, std::size_t bands, std::size_t sampleBytes,
                 std::uint32_t y) {
    const std::size_t width = samples.width + std::size_t{2} * samples.halo;
    const std::size_t height = samples.height + std::size_t{2} * samples.halo;
    PixelLine line;
    line.pixelBytes = samples.planar ? sampleBytes : bands * sampleBytes;
    line.bandBytes = samples.planar ? width * height * sampleBytes : sampleBytes;
    line.lineBytes = width * line.pixelBytes;
    line.at = static_cast<const unsigned char*>(samples.data) +
              (std::size_t{y} + samples.halo) * line.lineBytes + samples.halo * line.pixelBytes;
    line.count = samples.width;
    line.pixelSide = static_cast<double>(std::uint64_t{1} << (samples.level & 63u));
    return line;
}

const unsigned char* ShownOf(const Samples& samples, std::uint32_t y) {
    const std::size_t width = samples.width + std::size_t{2} * samples.halo;
    return samples.shown ? samples.shown + (std::size_t{y} + samples.halo) * width + samples.halo
                         : nullptr;
}

SampledWindows WindowsToSample(const PixelSource& source) {
    SampledWindows sampled;
    std::uint32_t width = 0, height = 0;
    for (std::uint32_t level = source.MinLevel(); level <= source.MaxLevel(); ++level) {
        if (source.Width(level) == 0 || source.Height(level) == 0) break;
        sampled.level = level;
        width = source.Width(level);
        height = source.Height(level);
        if (std::uint64_t{width} * height <= kMostSampled) break;
    }
    if (width == 0 || height == 0) return sampled;
    if (std::uint64_t{width} * height <= kMostSampled) {
        sampled.windows.push_back({0, 0, width, height});
        return sampled;
    }
    const std::uint32_t wide = std::min(width, kWindowSide), high = std::min(height, kWindowSide);
    const auto start = [](std::uint32_t room, std::uint32_t i) {
        return static_cast<std::uint32_t>(std::uint64_t{room} * i / (kWindowsAcross - 1));
    };
    for (std::uint32_t row = 0; row < kWindowsAcross; ++row)
        for (std::uint32_t column = 0; column < kWindowsAcross; ++column)
            sampled.windows.push_back(
                {start(width - wide, column), start(height - high, row), wide, high});
    return sampled;
}

}  // namespace zmcrender
