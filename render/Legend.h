// Legend: a bar of a renderer's colours with the values at its ends, below a picture.
#ifndef ZMC_RENDER_LEGEND_H
#define ZMC_RENDER_LEGEND_H

#include "render/Renderer.h"

namespace zmcrender {

// The picture with a white strip below it: the bar, and under its ends the bounds. As it is where
// the renderer has no legend. Throws std::bad_alloc.
Picture WithLegend(Picture picture, const Renderer& renderer);

}  // namespace zmcrender

#endif
