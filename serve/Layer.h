// Layer: a raster as the services of the OGC's standards tell of it: its identifier, and the sets
// of tiles that show it.
#ifndef ZMC_SERVE_LAYER_H
#define ZMC_SERVE_LAYER_H

#include <array>
#include <optional>
#include <string>
#include <vector>

#include "serve/Request.h"
#include "serve/Service.h"
#include "serve/TileMatrixSet.h"

namespace zmcserve {

struct Layer {
    std::string name;
    std::string id;
    TileMatrixSet own;
    std::vector<TileLimits> ownLimits;
    Corners corners{};                 // in the system of its own grid
    std::optional<PlaneExtent> plane;  // in Web Mercator; none: it has no place there
    std::vector<TileLimits> mercatorLimits;
    std::optional<std::array<double, 4>> degrees;  // as BoundsInDegrees
};

// Throws Refusal (404) for a raster without pixels, and what reading it throws.
Layer LayerOf(ServedRaster& raster, const Deadline& deadline);
// Those of the names; what is damaged, or has no pixels, is left out. Throws Refusal (503) where it
// takes too long.
std::vector<Layer> LayersOf(Service& service, const std::vector<std::string>& names,
                            const Deadline& deadline);

// Parameters of tiles that a document's own address has, for the addresses that it tells: "" or
// "?stretch=p2%2C98".
std::string LookQueryOf(const Request& request);

}  // namespace zmcserve

#endif
