// PictureSize: the shape of a picture of a window.
#ifndef ZMC_RENDER_PICTURESIZE_H
#define ZMC_RENDER_PICTURESIZE_H

#include <algorithm>
#include <cstdint>

#include "host/raster/RasterSource.h"

namespace zmcrender {

struct PictureSize {
    std::uint32_t width = 0;
    std::uint32_t height = 0;
};

// `longer` pixels on the longer side, and as many on the other as the shape of the window, which is
// not empty, asks for.
inline PictureSize SizeOfPicture(const zmchost::Window& window, std::uint32_t longer) {
    const bool wide = window.width >= window.height;
    const std::uint64_t side = wide ? window.width : window.height;
    const std::uint64_t other = wide ? window.height : window.width;
    const auto shorter =
        static_cast<std::uint32_t>(std::max<std::uint64_t>((other * longer + side / 2) / side, 1));
    return wide ? PictureSize{longer, shorter} : PictureSize{shorter, longer};
}

}  // namespace zmcrender

#endif
