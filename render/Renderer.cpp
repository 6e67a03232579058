#include "render/Renderer.h"

#include <algorithm>
#include <cstring>
#include <limits>
#include <stdexcept>
#include <utility>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "render/Colormaps.h"
#include "render/Expression.h"
#include "render/Hillshade.h"
#include "render/Look.h"
#include "render/SampleBlock.h"
#include "render/StyleBounds.h"
#include "render/StyleText.h"

namespace zmcrender {
namespace {

// Of an alpha band for which no pair is given.
Range OpaqueRange(std::uint32_t pixelType) {
    Range range{Number(0), Number(1)};
    zelm::VisitElementType(pixelType, [&]<class T>(std::type_identity<T>) {
        if constexpr (std::is_integral_v<T>) range.maximum = Number(std::numeric_limits<T>::max());
    });
    return range;
}

void CheckBand(const RasterFacts& facts, const char* key, std::uint32_t number) {
    const auto count = facts.bands.size();
    if (number == 0 || number > count)
        throw StyleError(key, "there is no band " + std::to_string(number) + "; the raster has " +
                                  std::to_string(count));
}

}  // namespace

// What a style comes to for a raster. The steps of making one are in the order in which they stand.
class Renderer::Plan {
public:
    Plan(const RasterFacts& facts, const Style& settings, PixelSource& source)
        : style(settings),
          pixelType(facts.pixelType),
          sampleBytes(zelm::PixelSize(facts.pixelType)),
          tone(std::make_shared<const Tone>(settings.gamma)) {
        if (!style.expression.empty()) {
            UseExpression(facts, source);
        } else {
            ChooseBands(facts);
            if (style.hillshade)
                UseHillshade(facts, source);
            else if (ShowsPalette(facts))
                UsePalette(facts);
            else
                UseBands(facts, source);
        }
        if (alphaBand) UseAlpha();
    }

    std::uint32_t Colours() const { return look->Channels(); }
    bool IsCopy(const Samples& samples) const {
        return samples.halo == 0 && CopiesLines(samples) && !MayHide(samples);
    }
    template <class Level>
    Picture Render(const Samples& samples) const;
    Picture Render(const Samples& samples) const {
        if (style.depth == 16)
            return look->HasSixteenBits() ? Render<std::uint16_t>(samples)
                                          : WithSixteenBits(Render<std::uint8_t>(samples));
        return Render<std::uint8_t>(samples);
    }

    Style style;
    std::uint32_t pixelType;
    std::vector<std::uint32_t> bands;
    std::vector<Range> bounds;
    std::vector<std::array<unsigned char, 3>> legend;

private:
    std::size_t sampleBytes;
    std::shared_ptr<const Tone> tone;
    LookPtr look;
    std::vector<std::uint32_t> colourBands;  // from 0
    std::optional<std::uint32_t> alphaBand;
    PlacedChannel alpha;  // without a channel where there is none

    bool HasMap() const { return !style.colormap.empty() && style.colormap != "palette"; }
    Colormap Map() const { return *FindColormap(HasMap() ? style.colormap : "grey"); }

    // Where a band stands among those that are read.
    std::size_t PlaceOf(std::uint32_t band) {
        const auto found = std::find(bands.begin(), bands.end(), band);
        const auto place = static_cast<std::size_t>(found - bands.begin());
        if (found == bands.end()) bands.push_back(band);
        return place;
    }

    void ChooseBands(const RasterFacts& facts) {
        std::vector<std::uint32_t> numbers = style.bands;
        if (numbers.empty())
            numbers = style.hillshade || !style.colormap.empty() ? std::vector<std::uint32_t>{1}
                                                                 : UsualBands(facts);
        for (const std::uint32_t number : numbers) CheckBand(facts, "bands", number);
        if (numbers.size() % 2 == 0) {
            alphaBand = numbers.back() - 1;
            numbers.pop_back();
        }
        for (const std::uint32_t number : numbers) colourBands.push_back(number - 1);
        if (colourBands.size() == 1) return;
        if (!style.colormap.empty()) throw StyleError("colormap", "it is for one band, not three");
        if (style.hillshade) throw StyleError("hillshade", "it is for one band, not three");
    }

    bool ShowsPalette(const RasterFacts& facts) const {
        const std::uint32_t band = colourBands[0];
        const bool wanted = style.colormap == "palette";
        if (wanted && facts.bands[band].palette.empty())
            throw StyleError("colormap", "the band has no palette");
        return wanted ||
               (style.colormap.empty() && colourBands.size() == 1 &&
                style.stretch.kind == Stretch::Kind::Auto && HasUsualPalette(facts, band));
    }

    void SettleBounds(const RasterFacts& facts, PixelSource& source) {
        const auto& given = style.stretch.ranges;
        const std::size_t shown = colourBands.size();
        const bool withAlpha = alphaBand && given.size() == shown + 1;
        if (style.stretch.kind != Stretch::Kind::Ranges) {
            for (const std::uint32_t band : colourBands)
                bounds.push_back(BoundsOfBand(facts, style, source, band, shown));
        } else if (given.size() == 1) {
            bounds.assign(shown, given[0]);
        } else if (given.size() == shown || withAlpha) {
            bounds.assign(given.begin(), given.begin() + static_cast<std::ptrdiff_t>(shown));
        } else {
            throw StyleError("stretch", "it needs one pair, or as many as there are bands");
        }
    }

    ChannelSettings Settings(const RasterFacts& facts, std::uint32_t band) const {
        ChannelSettings settings;
        settings.pixelType = pixelType;
        settings.noData = NoDataOf(facts, style, band);
        settings.part = style.complex;
        settings.depth = HasMap() ? 8 : style.depth;
        return settings;
    }

    LookPtr MakeBands(const RasterFacts& facts) {
        std::vector<PlacedChannel> channels;
        for (std::size_t i = 0; i < colourBands.size(); ++i) {
            ChannelSettings settings = Settings(facts, colourBands[i]);
            settings.range = bounds[i];
            settings.tone = tone;
            channels.push_back({PlaceOf(colourBands[i]), MakeChannel(settings)});
        }
        return MakeBandsLook(std::move(channels));
    }

    void TakeMap() {
        if (HasMap()) look = MakeMappedLook(std::move(look), Map());
        MakeLegend();
    }

    void MakeLegend() {
        const Colormap map = Map();
        for (int i = 0; i < 256; ++i) {
            std::uint8_t level = 0;
            tone->Level(i / 255.0, level);
            legend.push_back(map[level]);
        }
    }

    void UseBands(const RasterFacts& facts, PixelSource& source) {
        SettleBounds(facts, source);
        look = MakeBands(facts);
        if (colourBands.size() == 1) TakeMap();
    }

    PlacedChannel Values(const RasterFacts& facts, std::uint32_t band) {
        return {PlaceOf(band), ValuesChannel(facts, style, band)};
    }

    void UsePalette(const RasterFacts& facts) {
        const std::uint32_t band = colourBands[0];
        look = MakePaletteLook(Values(facts, band), facts.bands[band].palette);
    }

    void UseHillshade(const RasterFacts& facts, PixelSource& source) {
        if (style.colormap == "palette") throw StyleError("hillshade", "it is not for a palette");
        LookPtr colours;
        if (HasMap()) {
            UseBands(facts, source);
            colours = std::move(look);
        }
        PlacedChannel heights = Values(facts, colourBands[0]);
        const double factor = style.light.zFactor
                                  ? *style.light.zFactor
                                  : SuitingZFactor(*heights.channel, source, colourBands[0]);
        look = MakeHillshadeLook(std::move(heights), style.light, factor, std::move(colours));
    }

    void UseExpression(const RasterFacts& facts, PixelSource& source) {
        Expression expression = Expression::Parse(style.expression);
        if (!style.bands.empty()) throw StyleError("expression", "it takes the place of bands");
        if (style.hillshade) throw StyleError("expression", "it does not go with hillshade");
        if (style.colormap == "palette") throw StyleError("expression", "it has no palette");
        std::vector<PlacedChannel> channels;
        for (const std::uint32_t number : expression.Bands()) {
            CheckBand(facts, "expression", number);
            channels.push_back(Values(facts, number - 1));
        }
        bounds.push_back(ExpressionBounds(expression, channels, source));
        look = MakeExpressionLook(std::move(channels), std::move(expression), bounds[0], tone);
        TakeMap();
    }

    Range ExpressionBounds(const Expression& expression, const std::vector<PlacedChannel>& channels,
                           PixelSource& source) const {
        if (style.stretch.kind == Stretch::Kind::Ranges) {
            if (style.stretch.ranges.size() != 1)
                throw StyleError("stretch", "an expression has one pair");
            return style.stretch.ranges[0];
        }
        return BoundsOfValues(style, source, bands, [&](const PixelLine& line, double* values) {
            EvaluateLine(expression, channels, line, values);
        });
    }

    void UseAlpha() {
        const auto& given = style.stretch.ranges;
        ChannelSettings settings;
        settings.pixelType = pixelType;
        settings.range =
            given.size() == colourBands.size() + 1 ? given.back() : OpaqueRange(pixelType);
        settings.tone = std::make_shared<const Tone>(1.0);
        settings.depth = look->HasSixteenBits() ? style.depth : 8;
        alpha = {PlaceOf(*alphaBand), MakeChannel(settings)};
    }

    bool CopiesLines(const Samples& samples) const {
        return look->IsCopy() && (!samples.planar || bands.size() == 1) &&
               bands.size() == look->Channels() && style.depth == 8;
    }

    bool MayHide(const Samples& samples) const {
        return samples.shown || alpha.channel || look->MayHide();
    }

    template <class Level>
    void PaintAlpha(const PixelLine& line, const unsigned char* shown,
                    const std::vector<std::uint8_t>& present, Level* opacity) const {
        constexpr Level opaque = std::numeric_limits<Level>::max();
        constexpr Level unit = opaque / 255;
        if (alpha.channel) alpha.channel->Levels(line.Band(alpha.place), opacity, 1);
        if (!alpha.channel)
            for (std::size_t i = 0; i < line.count; ++i)
                opacity[i] = static_cast<Level>(present[i] * unit);
        else
            for (std::size_t i = 0; i < line.count; ++i) {
                const std::uint64_t level = opacity[i];
                opacity[i] = static_cast<Level>(level * present[i] * unit / opaque);
            }
        if (!shown) return;
        for (std::size_t i = 0; i < line.count; ++i)
            if (shown[i] == 0) opacity[i] = 0;
    }
};

namespace {

Picture MadePicture(const Samples& samples, std::uint32_t channels, std::size_t levelBytes) {
    Picture picture{
        samples.width, samples.height, channels, static_cast<std::uint32_t>(8 * levelBytes), {}};
    picture.bytes.resize(picture.LineBytes() * picture.height);
    return picture;
}

// Alpha behind the colours of each pixel; the picture as it is where all is opaque.
template <class Level>
Picture WithAlpha(Picture picture, const std::vector<Level>& opacity) {
    constexpr Level opaque = std::numeric_limits<Level>::max();
    if (std::all_of(opacity.begin(), opacity.end(), [](Level a) { return a == opaque; }))
        return picture;
    const std::size_t colours = picture.channels * sizeof(Level);
    const std::vector<unsigned char> without = std::move(picture.bytes);
    ++picture.channels;
    picture.bytes.resize(without.size() + opacity.size() * sizeof(Level));
    unsigned char* to = picture.bytes.data();
    const unsigned char* from = without.data();
    for (const Level alpha : opacity) {
        std::memcpy(to, from, colours);
        std::memcpy(to + colours, &alpha, sizeof alpha);
        from += colours;
        to += colours + sizeof alpha;
    }
    return picture;
}

}  // namespace

template <class Level>
Picture Renderer::Plan::Render(const Samples& samples) const {
    Picture picture = MadePicture(samples, look->Channels(), sizeof(Level));
    const bool hides = MayHide(samples);
    const bool copies = CopiesLines(samples);
    std::vector<Level> opacity(hides ? std::size_t{samples.width} * samples.height : 0);
    std::vector<std::uint8_t> present(hides ? samples.width : 0, std::uint8_t{255});
    for (std::uint32_t y = 0; y < samples.height; ++y) {
        const PixelLine line = LineOf(samples, bands.size(), sampleBytes, y);
        unsigned char* const colours = &picture.bytes[y * picture.LineBytes()];
        if (copies)
            std::memcpy(colours, line.at, picture.LineBytes());
        else
            look->Paint(line, reinterpret_cast<Level*>(colours),
                        look->MayHide() ? present.data() : nullptr);
        if (hides)
            PaintAlpha(line, ShownOf(samples, y), present,
                       &opacity[std::size_t{y} * samples.width]);
    }
    return hides ? WithAlpha(std::move(picture), opacity) : picture;
}

Renderer::Renderer(const RasterFacts& facts, const Style& style, PixelSource& source) {
    if (zelm::CheckedPixelType(facts.pixelType) == 0 || facts.bands.empty())
        throw StyleError("bands", "the raster has no samples that can be shown");
    plan = std::make_unique<const Plan>(facts, style, source);
}

Renderer::~Renderer() = default;
Renderer::Renderer(Renderer&&) noexcept = default;
Renderer& Renderer::operator=(Renderer&&) noexcept = default;

std::span<const std::uint32_t> Renderer::Bands() const { return plan->bands; }
std::uint32_t Renderer::PixelType() const { return plan->pixelType; }
std::uint32_t Renderer::Colours() const { return plan->Colours(); }
std::uint32_t Renderer::Halo() const { return plan->style.hillshade ? 1 : 0; }
std::span<const Range> Renderer::Bounds() const { return plan->bounds; }
std::span<const std::array<unsigned char, 3>> Renderer::LegendColours() const {
    return plan->legend;
}
const Style& Renderer::Settings() const { return plan->style; }

bool Renderer::IsCopy(const Samples& samples) const { return plan->IsCopy(samples); }

Picture Renderer::Render(const Samples& samples) const {
    if (samples.width == 0 || samples.height == 0)
        return {samples.width, samples.height, 1, plan->style.depth, {}};
    return plan->Render(samples);
}

}  // namespace zmcrender
