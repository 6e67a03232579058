#include "render/Resampler.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>
#include <utility>

#include "render/Nearest.h"

namespace zmcrender {
namespace {

// The parts of pixels between two places.
Taps Covered(std::uint32_t size, double from, double to) {
    Taps taps;
    const double limit = size - 1;
    taps.first = static_cast<std::uint32_t>(std::clamp(std::floor(from), 0.0, limit));
    const auto last = static_cast<std::uint32_t>(
        std::clamp(std::ceil(to) - 1, static_cast<double>(taps.first), limit));
    double sum = 0;
    for (std::uint32_t i = taps.first; i <= last; ++i) {
        const double part = std::min(to, i + 1.0) - std::max(from, static_cast<double>(i));
        taps.weights.push_back(static_cast<float>(std::max(part, 0.0)));
        sum += taps.weights.back();
    }
    if (sum <= 0) taps.weights.assign(1, 1.0f), sum = 1;
    for (float& weight : taps.weights) weight = static_cast<float>(weight / sum);
    return taps;
}

// The two pixels between whose centres a place lies.
Taps Between(std::uint32_t size, double place) {
    const double at = std::clamp(place - 0.5, 0.0, static_cast<double>(size - 1));
    Taps taps;
    taps.first = static_cast<std::uint32_t>(at);
    const auto share = static_cast<float>(at - taps.first);
    taps.weights = {1 - share};
    if (share > 0) taps.weights.push_back(share);
    return taps;
}

}  // namespace

std::vector<Taps> TapsOf(std::uint32_t size, double start, double extent, std::uint32_t target) {
    std::vector<Taps> all;
    all.reserve(target);
    const double step = extent / target;
    for (std::uint32_t i = 0; i < target; ++i)
        all.push_back(step >= 1 ? Covered(size, start + i * step, start + (i + 1) * step)
                                : Between(size, start + (i + 0.5) * step));
    return all;
}

Resampler::Resampler(std::uint32_t width0, std::uint32_t height0, std::uint32_t colourCount,
                     std::uint32_t bits, const Area& area, std::uint32_t width,
                     std::uint32_t height)
    : colours(colourCount),
      depth(bits),
      sourceWidth(width0),
      across(TapsOf(width0, area.x, area.width, width)),
      down(TapsOf(height0, area.y, area.height, height)),
      target{width, height, colourCount + 1, bits, {}},
      wide(std::size_t{width0} * Channels()),
      line(std::size_t{width} * Channels()),
      before(line.size()),
      sum(line.size()) {
    target.bytes.resize(target.LineBytes() * height);
}

void Resampler::Add(const Picture& lines) {
    for (std::uint32_t y = 0; y < lines.height && made < target.height; ++y) {
        Widen(lines, y);
        std::swap(line, before);
        Narrow();
        MakeLines();
        ++taken;
    }
}

void Resampler::Widen(const Picture& lines, std::uint32_t y) {
    const bool hasAlpha = lines.HasAlpha();
    const auto fill = [&](const auto* from) {
        using Level = std::remove_cvref_t<decltype(*from)>;
        constexpr auto most = static_cast<float>(std::numeric_limits<Level>::max());
        float* to = wide.data();
        for (std::uint32_t x = 0; x < sourceWidth; ++x, from += lines.channels) {
            const float alpha = hasAlpha ? static_cast<float>(from[colours]) / most : 1;
            for (std::uint32_t part = 0; part < colours; ++part)
                *to++ = static_cast<float>(from[part]) * alpha;
            *to++ = alpha;
        }
    };
    const unsigned char* const start = &lines.bytes[y * lines.LineBytes()];
    if (depth == 8)
        fill(start);
    else
        fill(reinterpret_cast<const std::uint16_t*>(start));
}

void Resampler::Narrow() {
    const std::size_t channels = Channels();
    float* to = line.data();
    for (const Taps& taps : across) {
        std::fill_n(to, channels, 0.0f);
        const float* from = &wide[taps.first * channels];
        for (const float weight : taps.weights)
            for (std::size_t part = 0; part < channels; ++part) to[part] += weight * *from++;
        to += channels;
    }
}

// Lines of the target to which the one that has come belongs.
void Resampler::MakeLines() {
    while (made < target.height && down[made].first <= taken) {
        const Taps& taps = down[made];
        // Growing, the first of two lines has been taken before, and may belong to many.
        const bool grows = taps.Last() == taken && taps.weights.size() == 2 && taps.first < taken;
        if (grows) {
            std::fill(sum.begin(), sum.end(), 0.0f);
            Accumulate(before, taps.weights[0]);
            Accumulate(line, taps.weights[1]);
        } else {
            if (taps.first == taken) std::fill(sum.begin(), sum.end(), 0.0f);
            Accumulate(line, taps.weights[taken - taps.first]);
        }
        if (taps.Last() != taken) return;
        Emit();
    }
}

void Resampler::Accumulate(const std::vector<float>& part, float weight) {
    for (std::size_t i = 0; i < sum.size(); ++i) sum[i] += weight * part[i];
}

template <class Level>
void Resampler::EmitAs(Level* levels) {
    constexpr auto most = static_cast<float>(std::numeric_limits<Level>::max());
    const auto level = [most](float value) { return Nearest<Level>(std::min(value, most)); };
    for (const float* from = sum.data(); from != sum.data() + sum.size();) {
        const float alpha = from[colours];
        // Sums of weights that come to 1 but for their rounding.
        const bool full = alpha > 1 - 1e-5f;
        for (std::uint32_t part = 0; part < colours; ++part, ++from)
            *levels++ = alpha <= 0 ? Level{0} : level(full ? *from : *from / alpha);
        ++from;
        const Level opacity = full ? std::numeric_limits<Level>::max() : level(alpha * most);
        opaque &= opacity == std::numeric_limits<Level>::max();
        *levels++ = opacity;
    }
}

void Resampler::Emit() {
    unsigned char* const to = &target.bytes[made++ * target.LineBytes()];
    if (depth == 8)
        EmitAs(to);
    else
        EmitAs(reinterpret_cast<std::uint16_t*>(to));
}

Picture Resampler::Finish(bool keepAlpha) {
    if (keepAlpha || !opaque) return std::move(target);
    const std::size_t level = depth / 8, kept = colours * level, pixel = Channels() * level;
    const std::size_t count = target.bytes.size() / pixel;
    for (std::size_t i = 1; i < count; ++i)
        std::memmove(&target.bytes[i * kept], &target.bytes[i * pixel], kept);
    target.bytes.resize(count * kept);
    target.channels = colours;
    return std::move(target);
}

Picture Resize(const Picture& picture, const Area& area, std::uint32_t width,
               std::uint32_t height) {
    const std::uint32_t colours = picture.channels - (picture.HasAlpha() ? 1 : 0);
    Resampler resampler(picture.width, picture.height, colours, picture.depth, area, width, height);
    resampler.Add(picture);
    return resampler.Finish(picture.HasAlpha());
}

Picture Resize(const Picture& picture, std::uint32_t width, std::uint32_t height) {
    if (picture.width == width && picture.height == height) return picture;
    return Resize(picture,
                  {0, 0, static_cast<double>(picture.width), static_cast<double>(picture.height)},
                  width, height);
}

}  // namespace zmcrender
