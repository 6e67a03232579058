// Warp: a picture of a part of a raster as a picture of a part of the plane of Web Mercator, by
// GDAL's warper.
#ifndef ZMC_SERVE_WARP_H
#define ZMC_SERVE_WARP_H

#include <cstdint>
#include <string_view>

#include "render/Picture.h"
#include "serve/Mercator.h"

namespace zmcserve {

enum class Resampling { Nearest, Bilinear, Cubic };

// The extent in side x side pixels, transparent where the raster does not lie. `picture` shows
// source.window. Colours are weighed by their alpha. Throws std::bad_alloc, and std::runtime_error
// in GDAL's words.
zmcrender::Picture WarpToPlane(const zmcrender::Picture& picture, const ServedRaster& raster,
                               const PlaneSource& source, const Mercator& plane,
                               const PlaneExtent& extent, std::uint32_t side,
                               Resampling resampling);

}  // namespace zmcserve

#endif
