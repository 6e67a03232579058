// Picture: pixels as a screen or a picture file has them.
//
// Lines from the top without gaps, each pixel its channels side by side: grey; grey and alpha; red,
// green, blue; or these and alpha. Alpha is straight: colours are not multiplied by it, 0 is
// transparent. A channel has 8 bits, or 16 in the byte order of the processor. A plain value.
#ifndef ZMC_RENDER_PICTURE_H
#define ZMC_RENDER_PICTURE_H

#include <cstddef>
#include <cstdint>
#include <vector>

namespace zmcrender {

struct Picture {
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    std::uint32_t channels = 0;  // 1 to 4
    std::uint32_t depth = 8;     // 8 or 16
    std::vector<unsigned char> bytes;

    bool HasAlpha() const { return channels == 2 || channels == 4; }
    std::size_t LineBytes() const { return std::size_t{width} * channels * (depth / 8); }
};

// The same with 8 bits a channel, floor(255 v / 65535 + 0.5); as it is if it has them.
Picture WithEightBits(Picture picture);
// The same with 16 bits, 257 v; as it is if it has them.
Picture WithSixteenBits(Picture picture);
// The same with red, green and blue, whether it had them or was grey.
Picture WithColours(Picture picture);
// The same in grey, as bright as red, green and blue are together to the eye: (299 r + 587 g +
// 114 b) / 1000, rounded; as it is if it is grey.
Picture InGrey(Picture picture);
// The same in black, below half the brightness, and white, with 8 bits.
Picture InBlackAndWhite(Picture picture);
// The same mirrored from left to right if that is wanted, and then turned clockwise by so many
// quarters of a full turn.
Picture Turned(Picture picture, bool mirrored, unsigned quarters);

}  // namespace zmcrender

#endif
