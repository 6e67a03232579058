// Codec: pictures as files of a format, and the names of the formats.
//
// Any number of threads may code at once; each keeps the codecs' working state until it ends.
#ifndef ZMC_RENDER_CODEC_H
#define ZMC_RENDER_CODEC_H

#include <optional>
#include <string_view>
#include <vector>

#include "render/Picture.h"

namespace zmcrender {

enum class PictureFormat { Jpeg, Png, WebP };
inline constexpr PictureFormat kPictureFormats[] = {PictureFormat::Jpeg, PictureFormat::Png,
                                                    PictureFormat::WebP};

inline constexpr int kDefaultQuality = 85;

// Of "jpg", "jpeg", "png" or "webp", in any case of letters.
std::optional<PictureFormat> PictureFormatOfName(std::string_view name);
// As the ending of a file: "jpg", "png" or "webp".
const char* EndingOf(PictureFormat format);
// "image/jpeg" and the like.
const char* MediaType(PictureFormat format);
// Pixels that a format takes in either direction: 65,535 of JPEG, 16,383 of WebP, 2^31 - 1 of PNG.
std::uint32_t LongestSide(PictureFormat format);

// The file. `quality` is 1 to 100, cut to that:
//   Jpeg  8 bits; alpha is laid over white. Chroma is halved in both directions below 90
//   Png   8 or 16 bits as the picture has them, without loss; the quality chooses nothing
//   WebP  8 bits; without loss at 100
// Throws std::invalid_argument for a picture that is empty, too large for the format or has not
// the bytes that its size tells, std::runtime_error in the codec's own words, and std::bad_alloc.
std::vector<unsigned char> Encode(const Picture& picture, PictureFormat format,
                                  int quality = kDefaultQuality);

}  // namespace zmcrender

#endif
