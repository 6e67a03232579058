#include "render/Look.h"

#include <algorithm>
#include <cmath>

#include "render/Nearest.h"

namespace zmcrender {
namespace {

void MarkNumbers(const std::vector<double>& values, std::uint8_t* alpha) {
    for (std::size_t i = 0; i < values.size(); ++i) alpha[i] = std::isnan(values[i]) ? 0 : 255;
}

class BandsLook final : public Look {
public:
    explicit BandsLook(std::vector<PlacedChannel> shown) : bands(std::move(shown)) {}
    std::uint32_t Channels() const override { return static_cast<std::uint32_t>(bands.size()); }
    bool HasSixteenBits() const override { return true; }
    bool MayHide() const override {
        return std::all_of(bands.begin(), bands.end(),
                           [](const auto& band) { return band.channel->MayMiss(); });
    }
    bool IsCopy() const override {
        for (std::size_t i = 0; i < bands.size(); ++i)
            if (bands[i].place != i || !bands[i].channel->IsPlain()) return false;
        return true;
    }
    void Paint(const PixelLine& line, std::uint8_t* colours, std::uint8_t* alpha) const override {
        PaintAs(line, colours, alpha);
    }
    void Paint(const PixelLine& line, std::uint16_t* colours, std::uint8_t* alpha) const override {
        PaintAs(line, colours, alpha);
    }

private:
    std::vector<PlacedChannel> bands;

    template <class Level>
    void PaintAs(const PixelLine& line, Level* colours, std::uint8_t* alpha) const {
        for (std::size_t i = 0; i < bands.size(); ++i)
            bands[i].channel->Levels(line.Band(bands[i].place), colours + i, bands.size());
        if (!alpha) return;
        std::fill_n(alpha, line.count, std::uint8_t{0});
        for (const auto& [place, channel] : bands) channel->MarkPresent(line.Band(place), alpha);
    }
};

class MappedLook final : public Look {
public:
    MappedLook(LookPtr levels, const Colormap& colours) : grey(std::move(levels)), map(colours) {}
    std::uint32_t Channels() const override { return 3; }
    bool MayHide() const override { return grey->MayHide(); }
    using Look::Paint;
    void Paint(const PixelLine& line, std::uint8_t* colours, std::uint8_t* alpha) const override {
        std::vector<std::uint8_t> levels(line.count);
        grey->Paint(line, levels.data(), alpha);
        for (const std::uint8_t level : levels)
            colours = std::copy(map[level].begin(), map[level].end(), colours);
    }

private:
    LookPtr grey;
    Colormap map;
};

class PaletteLook final : public Look {
public:
    PaletteLook(PlacedChannel indices, PaletteColours entries)
        : band(std::move(indices)), palette(std::move(entries)) {}
    std::uint32_t Channels() const override { return 3; }
    bool MayHide() const override { return true; }
    using Look::Paint;
    void Paint(const PixelLine& line, std::uint8_t* colours, std::uint8_t* alpha) const override {
        std::vector<double> values(line.count);
        band.channel->Values(line.Band(band.place), values.data());
        for (std::size_t i = 0; i < values.size(); ++i) {
            const auto colour = ColourOf(values[i]);
            colours = std::copy_n(colour.begin(), 3, colours);
            alpha[i] = colour[3];
        }
    }

private:
    PlacedChannel band;
    PaletteColours palette;

    // Transparent of what is no index.
    std::array<unsigned char, 4> ColourOf(double value) const {
        const auto count = static_cast<double>(palette.size());
        if (!(value >= 0) || value >= count || value != std::trunc(value)) return {};
        return palette[static_cast<std::size_t>(value)];
    }
};

class ExpressionLook final : public Look {
public:
    ExpressionLook(std::vector<PlacedChannel> shown, Expression parsed, const Range& range,
                   std::shared_ptr<const Tone> curve)
        : bands(std::move(shown)),
          expression(std::move(parsed)),
          ramp(range),
          tone(std::move(curve)) {}
    std::uint32_t Channels() const override { return 1; }
    bool HasSixteenBits() const override { return true; }
    bool MayHide() const override { return true; }
    void Paint(const PixelLine& line, std::uint8_t* colours, std::uint8_t* alpha) const override {
        PaintAs(line, colours, alpha);
    }
    void Paint(const PixelLine& line, std::uint16_t* colours, std::uint8_t* alpha) const override {
        PaintAs(line, colours, alpha);
    }

private:
    std::vector<PlacedChannel> bands;
    Expression expression;
    RealRamp ramp;
    std::shared_ptr<const Tone> tone;

    template <class Level>
    void PaintAs(const PixelLine& line, Level* colours, std::uint8_t* alpha) const {
        std::vector<double> values(line.count);
        EvaluateLine(expression, bands, line, values.data());
        LevelsOf(values.data(), values.size(), ramp, *tone, colours);
        if (alpha) MarkNumbers(values, alpha);
    }
};

class HillshadeLook final : public Look {
public:
    HillshadeLook(PlacedChannel band, const Light& light, double factor, LookPtr lit)
        : heights(std::move(band)), lighting(light), zFactor(factor), colours(std::move(lit)) {}
    std::uint32_t Channels() const override { return colours ? 3 : 1; }
    bool MayHide() const override { return heights.channel->MayMiss(); }
    using Look::Paint;
    void Paint(const PixelLine& line, std::uint8_t* picture, std::uint8_t* alpha) const override {
        const std::vector<double> light = LightOn(line);
        if (colours)
            PaintLit(line, light, picture);
        else
            for (std::size_t i = 0; i < light.size(); ++i)
                picture[i] = Nearest<std::uint8_t>(255 * light[i]);
        if (!alpha) return;
        std::fill_n(alpha, line.count, std::uint8_t{0});
        heights.channel->MarkPresent(line.Band(heights.place), alpha);
    }

private:
    PlacedChannel heights;
    Lighting lighting;
    double zFactor;
    LookPtr colours;

    // 0 where there is no height.
    std::vector<double> LightOn(const PixelLine& line) const {
        std::vector<double> lines[3];
        for (int i = 0; i < 3; ++i) {
            const PixelLine around = line.Around(1, i - 1);
            lines[i].resize(around.count);
            heights.channel->Values(around.Band(heights.place), lines[i].data());
        }
        std::vector<double> light(line.count);
        for (std::size_t i = 0; i < light.size(); ++i)
            if (!std::isnan(lines[1][i + 1]))
                light[i] =
                    lighting(HornSlope(lines[0].data(), lines[1].data(), lines[2].data(), i + 1),
                             zFactor / line.pixelSide);
        return light;
    }

    void PaintLit(const PixelLine& line, const std::vector<double>& light,
                  std::uint8_t* picture) const {
        std::vector<std::uint8_t> unused(line.count);
        colours->Paint(line, picture, colours->MayHide() ? unused.data() : nullptr);
        for (std::size_t i = 0; i < 3 * light.size(); ++i)
            picture[i] = Nearest<std::uint8_t>(picture[i] * LitShare(light[i / 3]));
    }
    static double LitShare(double light) { return kShade + (1 - kShade) * light; }
    // What is left of a colour that no light falls on.
    static constexpr double kShade = 0.3;
};

}  // namespace

void Look::Paint(const PixelLine&, std::uint16_t*, std::uint8_t*) const {}

LookPtr MakeBandsLook(std::vector<PlacedChannel> bands) {
    return std::make_unique<BandsLook>(std::move(bands));
}

LookPtr MakeMappedLook(LookPtr grey, const Colormap& map) {
    return std::make_unique<MappedLook>(std::move(grey), map);
}

LookPtr MakePaletteLook(PlacedChannel band, PaletteColours palette) {
    return std::make_unique<PaletteLook>(std::move(band), std::move(palette));
}

LookPtr MakeExpressionLook(std::vector<PlacedChannel> bands, Expression expression,
                           const Range& range, std::shared_ptr<const Tone> tone) {
    return std::make_unique<ExpressionLook>(std::move(bands), std::move(expression), range,
                                            std::move(tone));
}

LookPtr MakeHillshadeLook(PlacedChannel heights, const Light& light, double zFactor,
                          LookPtr colours) {
    return std::make_unique<HillshadeLook>(std::move(heights), light, zFactor, std::move(colours));
}

void EvaluateLine(const Expression& expression, const std::vector<PlacedChannel>& bands,
                  const PixelLine& line, double* values) {
    std::vector<double> samples(bands.size() * Expression::kAtOnce);
    std::vector<const double*> places;
    for (std::size_t i = 0; i < bands.size(); ++i)
        places.push_back(&samples[i * Expression::kAtOnce]);
    for (std::uint32_t done = 0; done < line.count;) {
        const auto count = std::min<std::uint32_t>(line.count - done, Expression::kAtOnce);
        for (std::size_t i = 0; i < bands.size(); ++i) {
            SampleLine part = line.Band(bands[i].place);
            part.at += done * part.stride;
            part.count = count;
            bands[i].channel->Values(part, &samples[i * Expression::kAtOnce]);
        }
        expression.Evaluate(places, count, values + done);
        done += count;
    }
    for (std::uint32_t i = 0; i < line.count; ++i)
        if (std::isinf(values[i])) values[i] = std::nan("");
}

}  // namespace zmcrender
