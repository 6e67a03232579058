#include "render/Codec.h"

#include <algorithm>
#include <stdexcept>
#include <string>

#include "render/Codecs.h"

namespace zmcrender {
namespace {

struct Format {
    PictureFormat format;
    const char* name;
    const char* ending;
    const char* mediaType;
    std::uint32_t longestSide;
};

constexpr Format kFormats[] = {{PictureFormat::Jpeg, "JPEG", "jpg", "image/jpeg", 65535},
                               {PictureFormat::Png, "PNG", "png", "image/png", 2147483647},
                               {PictureFormat::WebP, "WebP", "webp", "image/webp", 16383}};

const Format& Of(PictureFormat format) { return kFormats[static_cast<std::size_t>(format)]; }

void Check(const Picture& picture, const Format& format) {
    if (picture.width == 0 || picture.height == 0)
        throw std::invalid_argument("the picture is empty");
    if (std::max(picture.width, picture.height) > format.longestSide)
        throw std::invalid_argument(std::string(format.name) + " takes no more than " +
                                    std::to_string(format.longestSide) + " pixels a side");
    if (picture.channels < 1 || picture.channels > 4 ||
        (picture.depth != 8 && picture.depth != 16) ||
        picture.bytes.size() / picture.LineBytes() != picture.height ||
        picture.bytes.size() % picture.LineBytes() != 0)
        throw std::invalid_argument("the picture has not the bytes that its size tells");
}

// c a + white (1 - a), without alpha.
Picture OverWhite(const Picture& picture) {
    if (!picture.HasAlpha()) return picture;
    Picture opaque = picture;
    const std::uint32_t colours = --opaque.channels;
    opaque.bytes.resize(opaque.LineBytes() * opaque.height);
    unsigned char* to = opaque.bytes.data();
    for (const unsigned char* from = picture.bytes.data();
         to != opaque.bytes.data() + opaque.bytes.size(); from += picture.channels) {
        const unsigned alpha = from[colours];
        for (std::uint32_t part = 0; part < colours; ++part)
            *to++ =
                static_cast<unsigned char>((from[part] * alpha + 255 * (255 - alpha) + 127) / 255);
    }
    return opaque;
}

}  // namespace

std::optional<PictureFormat> PictureFormatOfName(std::string_view name) {
    std::string word(name);
    for (char& c : word)
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    if (word == "jpeg") return PictureFormat::Jpeg;
    for (const Format& each : kFormats)
        if (word == each.ending) return each.format;
    return std::nullopt;
}

const char* EndingOf(PictureFormat format) { return Of(format).ending; }

const char* MediaType(PictureFormat format) { return Of(format).mediaType; }

std::uint32_t LongestSide(PictureFormat format) { return Of(format).longestSide; }

std::vector<unsigned char> Encode(const Picture& picture, PictureFormat format, int quality) {
    Check(picture, Of(format));
    const int kept = std::clamp(quality, 1, 100);
    if (format == PictureFormat::Png) return EncodePng(picture);
    if (format == PictureFormat::WebP) return EncodeWebP(WithColours(WithEightBits(picture)), kept);
    if (picture.depth == 8 && !picture.HasAlpha()) return EncodeJpeg(picture, kept);
    return EncodeJpeg(OverWhite(WithEightBits(picture)), kept);
}

}  // namespace zmcrender
