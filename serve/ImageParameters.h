// ImageParameters: what the parts of an address of the IIIF Image API 3 ask for.
//
//     region    full | square | x,y,w,h | pct:x,y,w,h
//     size      [^]max | [^]w, | [^],h | [^]w,h | [^]!w,h | [^]pct:n
//     rotation  [!]n
//     file      quality.format
//
// Plain functions from a text to a value. All throw Refusal: 400 for what is malformed or out of
// range, in words that name the part, 501 for what the standard knows and this server does not.
#ifndef ZMC_SERVE_IMAGEPARAMETERS_H
#define ZMC_SERVE_IMAGEPARAMETERS_H

#include <cstdint>
#include <string>
#include <string_view>

#include "host/raster/RasterSource.h"
#include "render/Codec.h"
#include "render/PictureSize.h"

namespace zmcserve {

// What no picture goes beyond: pixels of either side, and of all.
struct ImageLimits {
    std::uint32_t side = 0;
    std::uint64_t area = 0;
};

// The part that is shown, in pixels of the whole, which is not empty: cut to it.
zmchost::Window RegionOf(std::string_view text, const zmchost::Window& whole);

// The size in which a region is shown, before it is turned.
zmcrender::PictureSize ImageSizeOf(std::string_view text, const zmchost::Window& region,
                                   const ImageLimits& limits);

// Its one form in links: "max", "w,h", and with "^" where the region grows.
std::string CanonicalSize(const zmcrender::PictureSize& size, const zmchost::Window& region,
                          const ImageLimits& limits);

struct Rotation {
    bool mirrored = false;  // before it is turned
    unsigned quarters = 0;  // clockwise, 0 to 3
    std::string Text() const;
};
Rotation RotationOf(std::string_view text);

enum class ImageQuality { Default, Colour, Grey, Bitonal };
inline constexpr const char* kImageQualities[] = {"default", "color", "gray", "bitonal"};

struct ImageFile {
    ImageQuality quality = ImageQuality::Default;
    zmcrender::PictureFormat format = zmcrender::PictureFormat::Jpeg;
    std::string_view ending;  // in the text
};
ImageFile ImageFileOf(std::string_view text);

}  // namespace zmcserve

#endif
