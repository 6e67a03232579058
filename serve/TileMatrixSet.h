// TileMatrixSet: grids of tiles as the OGC's standards tell them: the raster's own, and that of Web
// Mercator.
//
// A set has matrices from the coarsest, "0", to the finest, each of which divides the plane of one
// system of coordinates into tiles, rows counting from the top. Plain values.
#ifndef ZMC_SERVE_TILEMATRIXSET_H
#define ZMC_SERVE_TILEMATRIXSET_H

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "describe/JsonNumbers.h"
#include "serve/Mercator.h"
#include "serve/ServedRaster.h"

namespace zmcserve {

struct GridSystem {
    // "urn:ogc:def:crs:EPSG::32633"; the text of one that has no name among the OGC's, which is
    // WKT.
    std::string name;
    std::string uri;          // the same as documents of JSON have it; empty: it has no name
    std::string projJson;     // of one without a name
    bool northFirst = false;  // coordinates stand as north, east
    double metres = 1;        // a unit, on the equator
};

struct TileMatrix {
    std::string id;
    double cell = 0;                     // side of a pixel in units of the system
    double scale = 0;                    // the denominator, with pixels of 0.28 mm
    std::uint32_t side = 0;              // of a tile, in pixels
    std::uint32_t across = 0, down = 0;  // tiles
};

// Tiles with a part of the raster: all between these, themselves included.
struct TileLimits {
    std::string matrix;
    std::uint32_t firstRow = 0, lastRow = 0, firstColumn = 0, lastColumn = 0;
};

struct TileMatrixSet {
    std::string id;
    std::string title;
    std::string uri;       // of the OGC's register; empty: it has none
    std::string scaleSet;  // "GoogleMapsCompatible" or empty
    GridSystem system;
    std::array<double, 2> corner{};  // the upper left one: east, north
    std::vector<TileMatrix> matrices;
};

// The raster's own: tiles of the file, levels that halve its size, in its own system where pixels
// are upright squares there. Of any other raster coordinates are pixels: (0, 0) is the upper left
// corner, north is up. Throws zmchost::Error.
TileMatrixSet OwnGrid(ServedRaster& raster);
std::vector<TileLimits> OwnLimits(const TileMatrixSet& grid);

const TileMatrixSet& WebMercatorQuad();
// Down to the zoom that shows all of its pixels.
std::vector<TileLimits> MercatorLimits(const Mercator& plane);

// A pair of coordinates in the order of the system.
std::array<double, 2> Ordered(const GridSystem& system, double east, double north);
// Lower left and upper right, ordered: of a raster whose finest level has that size, in its own
// grid, and of a part of the plane.
using Corners = std::array<std::array<double, 2>, 2>;
Corners CornersOf(const TileMatrixSet& grid, double width, double height);
Corners CornersOf(const PlaneExtent& extent);

// As the standard of tile matrix sets, 2.0, has them in JSON.
zmcdescribe::Json DescribeSystem(const GridSystem& system);
zmcdescribe::Json DescribeSet(const TileMatrixSet& set);
zmcdescribe::Json DescribeLimits(const std::vector<TileLimits>& limits);

}  // namespace zmcserve

#endif
