// Screen: what a screen shows of a raster, and where.
//
// The arithmetic is that of the viewer (web/viewer/src/camera.ts), so that a picture which is made
// here lies, to the pixel, where the viewer draws the same: the viewer's tests hold the two
// together. Plain values; no file is touched.
#ifndef ZMC_SERVE_SCREEN_H
#define ZMC_SERVE_SCREEN_H

#include <cstdint>
#include <optional>

#include "host/raster/RasterSource.h"
#include "render/PictureSize.h"
#include "serve/ServedRaster.h"

namespace zmcserve {

// What is in the middle of a screen, in pixels of level 0, and how many pixels of the screen each
// has.
struct View {
    double x = 0;
    double y = 0;
    double zoom = 1;
};

inline constexpr double kMostZoom = 128;

// All of width x height pixels of level 0, with a little room around them.
View WholeIn(const zmcrender::PictureSize& screen, double width, double height);

// A rectangle of the screen, in its pixels from the upper left corner.
struct Place {
    double left = 0;
    double top = 0;
    double width = 0;
    double height = 0;
};

// The part of a raster that is on a screen, and where it is laid there. It is the window of the
// level whose pixels are nearest in size to those of the screen, as the viewer draws it, one to
// one: whoever lays it over the place takes the nearest pixel. Of a raster that is seen from
// farther away than its coarsest level it is a window of level 0, in a picture with the pixels of
// the screen.
struct Shown {
    std::optional<std::uint32_t> level;
    zmchost::Window window;
    zmcrender::PictureSize picture;
    Place place;
};

// Nothing where no pixel of the screen shows the raster, which has pixels.
std::optional<Shown> ShownOn(const zmcrender::PictureSize& screen, const View& view,
                             const ServedRaster& raster);

}  // namespace zmcserve

#endif
