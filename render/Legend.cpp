#include "render/Legend.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <string>
#include <string_view>

namespace zmcrender {
namespace {

constexpr std::uint32_t kGlyphWidth = 5, kGlyphHeight = 7;

// Lines of five pixels each, from the top; the highest of five bits is the leftmost.
struct Glyph {
    char character;
    unsigned char lines[kGlyphHeight];
};
constexpr Glyph kGlyphs[] = {
    {'0', {0x0e, 0x11, 0x13, 0x15, 0x19, 0x11, 0x0e}},
    {'1', {0x04, 0x0c, 0x04, 0x04, 0x04, 0x04, 0x0e}},
    {'2', {0x0e, 0x11, 0x01, 0x02, 0x04, 0x08, 0x1f}},
    {'3', {0x1f, 0x02, 0x04, 0x02, 0x01, 0x11, 0x0e}},
    {'4', {0x02, 0x06, 0x0a, 0x12, 0x1f, 0x02, 0x02}},
    {'5', {0x1f, 0x10, 0x1e, 0x01, 0x01, 0x11, 0x0e}},
    {'6', {0x06, 0x08, 0x10, 0x1e, 0x11, 0x11, 0x0e}},
    {'7', {0x1f, 0x01, 0x02, 0x04, 0x08, 0x08, 0x08}},
    {'8', {0x0e, 0x11, 0x11, 0x0e, 0x11, 0x11, 0x0e}},
    {'9', {0x0e, 0x11, 0x11, 0x0f, 0x01, 0x02, 0x0c}},
    {'-', {0x00, 0x00, 0x00, 0x1f, 0x00, 0x00, 0x00}},
    {'+', {0x00, 0x04, 0x04, 0x1f, 0x04, 0x04, 0x00}},
    {'.', {0x00, 0x00, 0x00, 0x00, 0x00, 0x0c, 0x0c}},
    {'e', {0x00, 0x00, 0x0e, 0x11, 0x1f, 0x10, 0x0e}},
};

// Sizes of the strip in pixels.
struct Layout {
    std::uint32_t scale;   // of the font
    std::uint32_t margin;  // around the bar and the texts
    std::uint32_t bar;     // height of the bar

    explicit Layout(std::uint32_t width)
        : scale(width < 240    ? 1
                : width < 2000 ? 2
                               : width / 1000),
          margin(4 * scale),
          bar(8 * scale) {}
    std::uint32_t Height() const { return 3 * margin + bar + kGlyphHeight * scale; }
};

void Set(Picture& picture, std::uint32_t x, std::uint32_t y, const unsigned char* colour) {
    if (x < picture.width && y < picture.height)
        std::memcpy(&picture.bytes[(std::size_t{y} * picture.width + x) * 3], colour, 3);
}

void DrawGlyph(Picture& strip, const Glyph& glyph, std::uint32_t x, std::uint32_t y,
               std::uint32_t scale) {
    static constexpr unsigned char kInk[] = {32, 32, 32};
    for (std::uint32_t row = 0; row < kGlyphHeight * scale; ++row)
        for (std::uint32_t column = 0; column < kGlyphWidth * scale; ++column)
            if (((glyph.lines[row / scale] >> (kGlyphWidth - 1 - column / scale)) & 1) != 0)
                Set(strip, x + column, y + row, kInk);
}

std::uint32_t TextWidth(std::string_view text, std::uint32_t scale) {
    return static_cast<std::uint32_t>(text.size()) * (kGlyphWidth + 1) * scale - scale;
}

void DrawText(Picture& strip, std::string_view text, std::uint32_t x, std::uint32_t y,
              std::uint32_t scale) {
    for (const char c : text) {
        const auto glyph =
            std::find_if(std::begin(kGlyphs), std::end(kGlyphs),
                         [c](const Glyph& candidate) { return candidate.character == c; });
        if (glyph != std::end(kGlyphs)) DrawGlyph(strip, *glyph, x, y, scale);
        x += (kGlyphWidth + 1) * scale;
    }
}

// Whole numbers as they are; others with digits enough to tell the bounds apart.
std::string TextOf(const Number& number, const Range& range) {
    if (number.whole && number.magnitude < 1000000000) return number.Text();
    const double width = std::fabs(range.maximum.real - range.minimum.real);
    const double size = std::max(std::fabs(range.maximum.real), std::fabs(range.minimum.real));
    const int digits =
        width > 0 ? std::clamp(static_cast<int>(std::log10(size / width)) + 4, 4, 12) : 6;
    char text[40];
    static_cast<void>(std::snprintf(text, sizeof text, "%.*g", digits, number.real));
    std::replace(text, text + std::strlen(text), ',', '.');  // of another locale
    return text;
}

void DrawBar(Picture& strip, const Renderer& renderer, const Layout& layout) {
    const auto colours = renderer.LegendColours();
    const std::uint32_t width =
        strip.width > 2 * layout.margin ? strip.width - 2 * layout.margin : 1;
    for (std::uint32_t x = 0; x < width; ++x) {
        const std::size_t entry = width == 1 ? 0 : std::uint64_t{x} * 255 / (width - 1);
        for (std::uint32_t y = 0; y < layout.bar; ++y)
            Set(strip, layout.margin + x, layout.margin + y, colours[entry].data());
    }
}

Picture MadeStrip(std::uint32_t width, const Renderer& renderer) {
    const Layout layout(width);
    Picture strip{width, layout.Height(), 3, 8, {}};
    strip.bytes.assign(strip.LineBytes() * strip.height, 255);
    DrawBar(strip, renderer, layout);
    const Range& bounds = renderer.Bounds()[0];
    const std::uint32_t below = 2 * layout.margin + layout.bar;
    const std::string high = TextOf(bounds.maximum, bounds);
    DrawText(strip, TextOf(bounds.minimum, bounds), layout.margin, below, layout.scale);
    const std::uint32_t taken = TextWidth(high, layout.scale) + layout.margin;
    DrawText(strip, high, width > taken ? width - taken : 0, below, layout.scale);
    return strip;
}

Picture WithOpaqueAlpha(const Picture& picture) {
    Picture made = picture;
    ++made.channels;
    made.bytes.assign(made.LineBytes() * made.height, 255);
    for (std::size_t i = 0; i * 3 < picture.bytes.size(); ++i)
        std::memcpy(&made.bytes[4 * i], &picture.bytes[3 * i], 3);
    return made;
}

}  // namespace

Picture WithLegend(Picture picture, const Renderer& renderer) {
    if (renderer.LegendColours().empty()) return picture;
    Picture whole = WithColours(std::move(picture));
    Picture strip = MadeStrip(whole.width, renderer);
    if (whole.HasAlpha()) strip = WithOpaqueAlpha(strip);
    if (whole.depth == 16) strip = WithSixteenBits(std::move(strip));
    whole.bytes.insert(whole.bytes.end(), strip.bytes.begin(), strip.bytes.end());
    whole.height += strip.height;
    return whole;
}

}  // namespace zmcrender
