// Style: how samples become a picture, as plain values with a text form.
//
// A style is told by pairs of a key and a value, the same in a query string and on the command
// line. No key is needed; what is not given is as below.
//
//     key         value
//     bands       1 to 4 bands, counted from 1: "2" grey, "2,4" grey and alpha, "3,2,1" colours,
//                 "1,2,3,4" colours and alpha. Default: what the raster says of its bands
//                 (RasterFacts.h)
//     stretch     "auto" (default): three bands of Byte as they are; a single one and other types
//                     from 2 to 98 per cent of the archived histogram, else between the archived
//                     minimum and maximum, else between those of a coarse level
//                 "MIN,MAX", or one such pair for each band of `bands`: "0,100;0,200;5,50"
//                 "pLOW,HIGH": per cents of the archived histogram: "p2,98"
//                 "sN": mean - N to mean + N standard deviations: "s2.5"
//                 "none": 0 to 255, or to 65535 in pictures of 16 bits
//     gamma       0.01 to 100, default 1: t becomes t^(1/gamma)
//     colormap    a name of colormaps.txt, "-NAME" for it reversed, or "palette" for the file's own
//                 (default of a single band of integers that has one, where no stretch is given).
//                 For one band
//     nodata      "auto" (default): the no-data values of the raster are transparent; "none": they
//                 are not; a number: it is, in all bands, in place of the raster's
//     expression  arithmetic of bands: "(b4-b3)/(b4+b3)" (Expression.h). It takes the place of
//     bands complex     "magnitude" (default), "real", "imaginary" or "phase" (radians, -pi to pi)
//     hillshade   "1" or "true": one band as lit heights (Hillshade.h), floor(255 t + 0.5) with t
//                 for the light; "0" or "false" (default). With a colormap the heights' colours
//                 are multiplied by 0.3 + 0.7 t
//     azimuth     where the light comes from, degrees clockwise from the top; default 315
//     altitude    of the light above the horizon, 0 to 90 degrees; default 45
//     zfactor     by which heights are multiplied before they are compared with the width of a
//                 pixel of level 0, above 0; default "auto", which suits the heights (Hillshade.h)
//     depth       8 (default) or 16 bits a channel. Formats other than PNG have 8
//
// The formula. For a sample v of a band with the bounds minimum and maximum:
//     t = clamp((v - minimum) / (maximum - minimum), 0, 1), then t^(1/gamma)
//     byte = floor(255 t + 0.5); in 16 bits floor(65535 t + 0.5)
// A maximum equal to the minimum makes 1 of v >= maximum and 0 of any other; a minimum above the
// maximum inverts. A colour map gives its entry floor(255 t + 0.5), whatever the depth. The palette
// of a file gives the colour of the index v, whatever the stretch; an index without one is
// transparent. An alpha band is not stretched unless a pair is given for it: the whole range of an
// integer type, from 0 on, or 0 to 1 in reals, makes 0 to 1.
//
// Missing are samples that are not finite (either part of a complex one) or have the no-data value.
// A pixel is transparent where all of its colour samples are missing, or where a mask hides it; in
// others a missing sample counts as t = 0. An expression is missing where one of its bands is, or
// where it is not finite.
//
// Plain values; any number of threads may use one style.
#ifndef ZMC_RENDER_STYLE_H
#define ZMC_RENDER_STYLE_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "render/Number.h"

namespace zmcrender {

// Why a style is refused, in one line without a full stop: "stretch: \"2,\" is no pair of numbers".
// What stands in it of a value is cut and has no control characters.
class StyleError : public std::runtime_error {
public:
    StyleError(const std::string& keyName, const std::string& reasonText)
        : std::runtime_error(keyName + ": " + reasonText), key(keyName), reason(reasonText) {}

    const std::string& Key() const { return key; }
    const std::string& Reason() const { return reason; }

private:
    std::string key;
    std::string reason;
};

// Bounds of what t is counted from and to.
struct Range {
    Number minimum;
    Number maximum;
    friend bool operator==(const Range&, const Range&) = default;
};

struct Stretch {
    enum class Kind { Auto, Ranges, Percent, Deviations, None };
    Kind kind = Kind::Auto;
    std::vector<Range> ranges;  // of Ranges: one, or one for each band
    double low = 2;             // of Percent
    double high = 98;
    double deviations = 2;  // of Deviations
    friend bool operator==(const Stretch&, const Stretch&) = default;
};

enum class ComplexPart { Magnitude, Real, Imaginary, Phase };

struct NoDataChoice {
    enum class Kind { OfRaster, None, Value };
    Kind kind = Kind::OfRaster;
    Number value;  // of Value
    friend bool operator==(const NoDataChoice&, const NoDataChoice&) = default;
};

struct Light {
    double azimuth = 315;
    double altitude = 45;
    std::optional<double> zFactor;  // empty: one that suits the heights
    friend bool operator==(const Light&, const Light&) = default;
};

struct Style {
    // Bytes of a value; longer ones are refused.
    static constexpr std::size_t kLongestValue = 1024;

    std::vector<std::uint32_t> bands;  // counted from 1; empty: what the raster says
    Stretch stretch;
    double gamma = 1;
    std::string colormap;  // empty: none, or the palette of the file
    NoDataChoice noData;
    std::string expression;  // empty: none
    ComplexPart complex = ComplexPart::Magnitude;
    bool hillshade = false;
    Light light;
    std::uint32_t depth = 8;

    // The keys, in the order of the table.
    static std::span<const char* const> Keys();
    static bool IsKey(std::string_view key);
    // Takes one pair. Throws StyleError, with the style as it was, for a key that there is not and
    // for every value that is not understood. Whether the raster has such bands, and what does not
    // go together, shows when a Renderer is made.
    void Set(std::string_view key, std::string_view value);
    // The value of a key in its one form, which Set makes the same of; empty of what is as if not
    // given.
    std::string Value(std::string_view key) const;
    // All that is not as if not given, "key=value" with "&" between, in the order of the table and
    // without any escapes: styles that mean the same have the same text.
    std::string Text() const;

    friend bool operator==(const Style&, const Style&) = default;
};

}  // namespace zmcrender

#endif
