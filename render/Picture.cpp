#include "render/Picture.h"

#include <cstring>
#include <utility>

namespace zmcrender {
namespace {

unsigned char Narrowed(std::uint16_t value) {
    return static_cast<unsigned char>((value * 255u + 32767u) / 65535u);
}

template <class Level>
void ToGrey(Picture& picture, std::size_t count) {
    const std::size_t channels = picture.channels, kept = channels - 2;
    const unsigned char* from = picture.bytes.data();
    unsigned char* to = picture.bytes.data();
    for (std::size_t i = 0; i < count; ++i, from += channels * sizeof(Level)) {
        Level pixel[4] = {};
        std::memcpy(pixel, from, channels * sizeof(Level));
        pixel[0] = static_cast<Level>((299u * pixel[0] + 587u * pixel[1] + 114u * pixel[2] + 500u) /
                                      1000u);
        pixel[1] = pixel[3];
        std::memcpy(to, pixel, kept * sizeof(Level));
        to += kept * sizeof(Level);
    }
}

}  // namespace

Picture WithEightBits(Picture picture) {
    if (picture.depth == 8) return picture;
    const std::size_t count = picture.bytes.size() / 2;
    for (std::size_t i = 0; i < count; ++i) {
        std::uint16_t value = 0;
        std::memcpy(&value, &picture.bytes[2 * i], sizeof value);
        picture.bytes[i] = Narrowed(value);
    }
    picture.bytes.resize(count);
    picture.depth = 8;
    return picture;
}

Picture WithSixteenBits(Picture picture) {
    if (picture.depth == 16) return picture;
    const std::vector<unsigned char> narrow = std::move(picture.bytes);
    picture.bytes.resize(2 * narrow.size());
    for (std::size_t i = 0; i < narrow.size(); ++i)
        picture.bytes[2 * i] = picture.bytes[2 * i + 1] = narrow[i];
    picture.depth = 16;
    return picture;
}

Picture WithColours(Picture picture) {
    if (picture.channels >= 3) return picture;
    const std::size_t size = picture.depth / 8, alpha = picture.HasAlpha() ? size : 0;
    const std::vector<unsigned char> grey = std::move(picture.bytes);
    picture.channels += 2;
    picture.bytes.resize(grey.size() / (size + alpha) * (3 * size + alpha));
    unsigned char* to = picture.bytes.data();
    for (std::size_t from = 0; from < grey.size(); from += size + alpha) {
        for (int part = 0; part < 3; ++part, to += size) std::memcpy(to, &grey[from], size);
        if (alpha != 0) std::memcpy(to, &grey[from + size], size);
        to += alpha;
    }
    return picture;
}

Picture InGrey(Picture picture) {
    if (picture.channels < 3) return picture;
    const std::size_t level = picture.depth / 8;
    const std::size_t count = std::size_t{picture.width} * picture.height;
    if (level == 1)
        ToGrey<std::uint8_t>(picture, count);
    else
        ToGrey<std::uint16_t>(picture, count);
    picture.channels -= 2;
    picture.bytes.resize(count * picture.channels * level);
    return picture;
}

Picture InBlackAndWhite(Picture picture) {
    picture = WithEightBits(InGrey(std::move(picture)));
    for (std::size_t i = 0; i < picture.bytes.size(); i += picture.channels)
        picture.bytes[i] = picture.bytes[i] < 128 ? 0 : 255;
    return picture;
}

Picture Turned(Picture picture, bool mirrored, unsigned quarters) {
    if (!mirrored && quarters % 4 == 0) return picture;
    const bool lies = quarters % 2 == 1;
    const std::size_t width = picture.width, height = picture.height;
    const std::size_t pixel = std::size_t{picture.channels} * (picture.depth / 8);
    std::vector<unsigned char> turned(picture.bytes.size());
    const auto placeOf = [&](std::size_t x, std::size_t y) {
        if (mirrored) x = width - 1 - x;
        switch (quarters % 4) {
            case 1:
                return x * height + height - 1 - y;
            case 2:
                return (height - 1 - y) * width + width - 1 - x;
            case 3:
                return (width - 1 - x) * height + y;
            default:
                return y * width + x;
        }
    };
    const unsigned char* from = picture.bytes.data();
    for (std::size_t y = 0; y < height; ++y)
        for (std::size_t x = 0; x < width; ++x, from += pixel)
            std::memcpy(&turned[placeOf(x, y) * pixel], from, pixel);
    picture.bytes = std::move(turned);
    if (lies) std::swap(picture.width, picture.height);
    return picture;
}

}  // namespace zmcrender
