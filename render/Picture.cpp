#include "render/Picture.h"

#include <cstring>
#include <utility>

namespace zmcrender {
namespace {

unsigned char Narrowed(std::uint16_t value) {
    return static_cast<unsigned char>((value * 255u + 32767u) / 65535u);
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

}  // namespace zmcrender
