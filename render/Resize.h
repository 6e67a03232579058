// Resize: pictures in another size: the average of the area that a pixel covers where they shrink,
// between the four nearest centres where they grow, in each direction by itself.
//
// Colours are weighed by their alpha, so that what is transparent lends none. Threads as they like.
#ifndef ZMC_RENDER_RESIZE_H
#define ZMC_RENDER_RESIZE_H

#include <cstdint>

#include "render/Picture.h"

namespace zmcrender {

// The part of a picture that is shown, in its pixels: edges may lie between them.
struct Area {
    double x = 0;
    double y = 0;
    double width = 0;
    double height = 0;
};

// The area, which lies in the picture and is not empty, in width x height pixels, neither of them
// 0. Channels and depth stay. Throws std::bad_alloc.
Picture Resize(const Picture& picture, const Area& area, std::uint32_t width, std::uint32_t height);
Picture Resize(const Picture& picture, std::uint32_t width, std::uint32_t height);

}  // namespace zmcrender

#endif
