// Look: what a style makes of lines of samples: colours, and which pixels are there.
//
// Does not change once it is made; any number of threads may paint with one.
#ifndef ZMC_RENDER_LOOK_H
#define ZMC_RENDER_LOOK_H

#include <array>
#include <memory>
#include <vector>

#include "render/Channel.h"
#include "render/Colormaps.h"
#include "render/Expression.h"
#include "render/Hillshade.h"

namespace zmcrender {

using ChannelPtr = std::unique_ptr<const Channel>;
using PaletteColours = std::vector<std::array<unsigned char, 4>>;

class Look {
public:
    virtual ~Look() = default;
    // Of the colours that are painted: 1 or 3.
    virtual std::uint32_t Channels() const = 0;
    // Whether it paints 16 bits of its own, and not 257 times what has 8.
    virtual bool HasSixteenBits() const { return false; }
    // Whether a pixel can be transparent.
    virtual bool MayHide() const = 0;
    // Whether pixels of these bytes side by side are painted as they are.
    virtual bool IsCopy() const { return false; }
    // Paints a line of line.count pixels. `alpha` is null where MayHide is false; else it gets 0 of
    // what is transparent, and 255, or the alpha of a palette, of the rest.
    virtual void Paint(const PixelLine& line, std::uint8_t* colours, std::uint8_t* alpha) const = 0;
    // Only where HasSixteenBits.
    virtual void Paint(const PixelLine& line, std::uint16_t* colours, std::uint8_t* alpha) const;
};

using LookPtr = std::unique_ptr<const Look>;

// A band by its place among those that are read.
struct PlacedChannel {
    std::size_t place = 0;
    ChannelPtr channel;
};

// One band as grey or three as colours, made for levels of a width.
LookPtr MakeBandsLook(std::vector<PlacedChannel> bands);
// The colours of the levels of a look of one channel.
LookPtr MakeMappedLook(LookPtr grey, const Colormap& map);
LookPtr MakePaletteLook(PlacedChannel band, PaletteColours palette);
// `bands` are those of the expression, in their order.
LookPtr MakeExpressionLook(std::vector<PlacedChannel> bands, Expression expression,
                           const Range& range, std::shared_ptr<const Tone> tone);
// Light on heights, or on the colours of `colours`, which may be null. `zFactor` is in heights over
// pixels of level 0.
LookPtr MakeHillshadeLook(PlacedChannel heights, const Light& light, double zFactor,
                          LookPtr colours);

// Values of an expression for a line; NaN of what is missing.
void EvaluateLine(const Expression& expression, const std::vector<PlacedChannel>& bands,
                  const PixelLine& line, double* values);

}  // namespace zmcrender

#endif
