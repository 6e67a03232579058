// Codecs: what Codec.cpp hands a picture to, one function for each library.
//
// Pictures are not empty, have the bytes that their size tells and no side longer than the format
// takes. Throw as Encode does.
#ifndef ZMC_RENDER_CODECS_H
#define ZMC_RENDER_CODECS_H

#include <vector>

#include "render/Picture.h"

namespace zmcrender {

// 8 bits, 1 or 3 channels.
std::vector<unsigned char> EncodeJpeg(const Picture& picture, int quality);
// Any picture.
std::vector<unsigned char> EncodePng(const Picture& picture);
// 8 bits, 3 or 4 channels.
std::vector<unsigned char> EncodeWebP(const Picture& picture, int quality);

}  // namespace zmcrender

#endif
