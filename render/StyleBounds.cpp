#include "render/StyleBounds.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <vector>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "render/Hillshade.h"
#include "render/Nearest.h"
#include "render/SampleBlock.h"

namespace zmcrender {
namespace {

using Kind = Stretch::Kind;

Range Plain(const Style& style) {
    return {Number(0), Number(style.stretch.kind == Kind::None && style.depth == 16 ? 65535 : 255)};
}

// 0 to 1 where there is nothing to go by.
Range Unit() { return {Number(0), Number(1)}; }

std::optional<Range> FromHistogram(const RasterFacts& facts, const Stretch& stretch,
                                   std::uint32_t band) {
    const auto& histogram = facts.bands[band].histogram;
    if (!histogram) return std::nullopt;
    const auto low = PercentileOf(*histogram, stretch.low, facts.pixelType);
    const auto high = PercentileOf(*histogram, stretch.high, facts.pixelType);
    if (!low || !high) return std::nullopt;
    return Range{*low, *high};
}

Range AroundMean(double mean, double deviation, double times) {
    return {Number(mean - times * deviation), Number(mean + times * deviation)};
}

std::optional<Range> FromRecords(const RasterFacts& facts, const Stretch& stretch,
                                 std::uint32_t index) {
    const BandFacts& band = facts.bands[index];
    if (stretch.kind == Kind::Deviations)
        return band.mean && band.deviation
                   ? std::optional(AroundMean(*band.mean, *band.deviation, stretch.deviations))
                   : std::nullopt;
    if (const auto range = FromHistogram(facts, stretch, index)) return range;
    if (stretch.kind == Kind::Auto && band.minimum && band.maximum)
        return Range{*band.minimum, *band.maximum};
    return std::nullopt;
}

// `values` are in any order, and are put into another.
Range FromValues(std::vector<double>& values, const Stretch& stretch) {
    if (values.empty()) return Unit();
    if (stretch.kind == Kind::Deviations) {
        double mean = 0, squares = 0;
        const auto count = static_cast<double>(values.size());
        for (const double value : values) mean += value / count;
        for (const double value : values) squares += (value - mean) * (value - mean) / count;
        return AroundMean(mean, std::sqrt(squares), stretch.deviations);
    }
    const double low = stretch.kind == Kind::Auto ? 0 : stretch.low;
    const double high = stretch.kind == Kind::Auto ? 100 : stretch.high;
    const auto at = [&](double percent) {
        const auto place =
            Nearest<std::ptrdiff_t>(percent / 100 * static_cast<double>(values.size() - 1));
        std::nth_element(values.begin(), values.begin() + place, values.end());
        return Number(values[static_cast<std::size_t>(place)]);
    };
    const Number lower = at(low);
    return {lower, at(high)};
}

void HideValues(const unsigned char* shown, std::vector<double>& values) {
    if (!shown) return;
    for (std::size_t i = 0; i < values.size(); ++i)
        if (shown[i] == 0) values[i] = std::numeric_limits<double>::quiet_NaN();
}

Range ExtremesOf(const Channel& channel, PixelSource& source, std::uint32_t band) {
    std::optional<Range> range;
    VisitSamples(source, {&band, 1}, 0, [&](const Samples& samples) {
        for (std::uint32_t y = 0; y < samples.height; ++y)
            channel.Widen(LineOf(samples, 1, zelm::PixelSize(source.PixelType()), y).Band(0),
                          ShownOf(samples, y), range);
    });
    return range.value_or(Unit());
}

}  // namespace

std::optional<Number> NoDataOf(const RasterFacts& facts, const Style& style, std::uint32_t band) {
    switch (style.noData.kind) {
        case NoDataChoice::Kind::None:
            return std::nullopt;
        case NoDataChoice::Kind::Value:
            return style.noData.value;
        case NoDataChoice::Kind::OfRaster:
            break;
    }
    return facts.bands[band].noData;
}

std::unique_ptr<const Channel> ValuesChannel(const RasterFacts& facts, const Style& style,
                                             std::uint32_t band) {
    ChannelSettings settings;
    settings.pixelType = facts.pixelType;
    settings.noData = NoDataOf(facts, style, band);
    settings.part = style.complex;
    return MakeChannel(settings);
}

void VisitSamples(PixelSource& source, std::span<const std::uint32_t> bands, std::uint32_t halo,
                  const std::function<void(const Samples& samples)>& take) {
    const SampledWindows sampled = WindowsToSample(source);
    SampleBlock block;
    for (const zmchost::Window& window : sampled.windows)
        take(block.Read(source, sampled.level, window, bands, halo));
}

Range BoundsOfValues(const Style& style, PixelSource& source, std::span<const std::uint32_t> bands,
                     const LineValues& tell) {
    if (style.stretch.kind == Kind::None) return Plain(style);
    std::vector<double> all, line;
    VisitSamples(source, bands, 0, [&](const Samples& samples) {
        line.resize(samples.width);
        for (std::uint32_t y = 0; y < samples.height; ++y) {
            tell(LineOf(samples, bands.size(), zelm::PixelSize(source.PixelType()), y),
                 line.data());
            HideValues(ShownOf(samples, y), line);
            std::copy_if(line.begin(), line.end(), std::back_inserter(all),
                         [](double value) { return !std::isnan(value); });
        }
    });
    return FromValues(all, style.stretch);
}

Range BoundsOfBand(const RasterFacts& facts, const Style& style, PixelSource& source,
                   std::uint32_t band, std::size_t shown) {
    const Kind kind = style.stretch.kind;
    // Colours of bytes are meant for a screen; each stretched by itself would have another tint.
    const bool isColour = shown > 1 && facts.pixelType == zelm::PixelTypeCode::Byte;
    if (kind == Kind::None || (kind == Kind::Auto && isColour)) return Plain(style);
    if (const auto range = FromRecords(facts, style.stretch, band)) return *range;
    const auto channel = ValuesChannel(facts, style, band);
    // Exact, where 64-bit integers are more than doubles.
    if (kind == Kind::Auto) return ExtremesOf(*channel, source, band);
    return BoundsOfValues(style, source, {&band, 1}, [&](const PixelLine& line, double* values) {
        channel->Values(line.Band(0), values);
    });
}

double SuitingZFactor(const Channel& heights, PixelSource& source, std::uint32_t band) {
    double squares = 0, count = 0;
    std::vector<double> lines[3];
    VisitSamples(source, {&band, 1}, 1, [&](const Samples& samples) {
        for (std::uint32_t y = 0; y < samples.height; ++y) {
            const PixelLine line = LineOf(samples, 1, zelm::PixelSize(source.PixelType()), y);
            for (int i = 0; i < 3; ++i) {
                const PixelLine around = line.Around(1, i - 1);
                lines[i].resize(around.count);
                heights.Values(around.Band(0), lines[i].data());
            }
            const unsigned char* const shown = ShownOf(samples, y);
            for (std::size_t i = 0; i < samples.width; ++i) {
                if (std::isnan(lines[1][i + 1]) || (shown && shown[i] == 0)) continue;
                const Slope slope =
                    HornSlope(lines[0].data(), lines[1].data(), lines[2].data(), i + 1);
                squares += (slope.right * slope.right + slope.up * slope.up) /
                           (line.pixelSide * line.pixelSide);
                ++count;
            }
        }
    });
    const double mean = count == 0 ? 0 : std::sqrt(squares / count);
    return mean > 0 && std::isfinite(mean) ? kSuitingSlope / mean : 1;
}

}  // namespace zmcrender
