// Mercator: where a raster lies in the plane of Web Mercator (EPSG:3857), and the other way round.
//
// Pixels are those of the finest level that the file has, (0, 0) being the upper left corner of the
// first; the plane is in metres, east and north. Making one settles how systems of coordinates are
// transformed, which takes milliseconds, so that readers keep theirs. Used by one thread at a time,
// not always by the same.
//
// Of a raster in degrees the meridian counts that is nearest to its middle, so that one that lies
// on both sides of 180 degrees, or counts from 0 to 360, is found on either side.
#ifndef ZMC_SERVE_MERCATOR_H
#define ZMC_SERVE_MERCATOR_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

#include "host/raster/RasterSource.h"

class OGRCoordinateTransformation;

namespace zmcserve {

class ServedRaster;
struct Georeference;

// A part of the plane, in metres.
struct PlaneExtent {
    double west = 0, south = 0, east = 0, north = 0;
};

class Mercator {
public:
    static constexpr double kEdge = 20037508.342789244;  // of the square that tiles divide
    static constexpr std::uint32_t kTileSide = 256;
    static constexpr std::uint32_t kMostZoom = 24;
    // Metres that a pixel of a tile is wide.
    static double CellOf(std::uint32_t zoom);
    static PlaneExtent ExtentOfTile(std::uint32_t zoom, std::uint64_t column, std::uint64_t row);

    // Of a raster of that size, which is not 0. Throws Refusal (404) for one that has no place in
    // the plane, and says why.
    Mercator(const Georeference& place, double width, double height);
    ~Mercator();
    Mercator(const Mercator&) = delete;
    Mercator& operator=(const Mercator&) = delete;

    // In place. Where there is no counterpart both are infinite.
    void ToPixels(std::size_t count, double* x, double* y) const;
    void ToPlane(std::size_t count, double* x, double* y) const;

    // What no pixel lies beyond, in the square: all of its width where the raster goes over its
    // edge, all of it where part of the raster has no place.
    const PlaneExtent& Bounds() const { return bounds; }
    // The first zoom whose pixels are no larger than those of the raster.
    std::uint32_t Zoom() const;

    // A place of the raster, and how many metres a pixel is wide there: the root of its area.
    struct Spot {
        double column = 0, line = 0;
        double x = 0, y = 0;
        double side = 0;
    };
    // Spread over the raster, its edges included; those that have a place.
    const std::vector<Spot>& Spots() const { return spots; }

private:
    struct Grid;

    void TakeSystem(const Georeference& place);
    void LookAround(double width, double height);
    void TakeBounds(const Grid& grid);

    std::array<double, 6> toSystem{};  // from pixels
    std::array<double, 6> toPixels{};
    double circle = 0;  // of a system of angles, in its unit; 0: it is none
    double middle = 0;  // of the raster, in x of its system
    std::unique_ptr<OGRCoordinateTransformation> fromPlane, intoPlane;
    PlaneExtent bounds;
    std::vector<Spot> spots;
};

// What of a raster is shown by a part of the plane in so many pixels.
struct PlaneSource {
    std::uint32_t level = 0;
    zmchost::Window window;  // of the level
    double shrinking = 1;  // pixels of the level that stand beside each other in one of the target
};

// The coarsest level that is still as fine as the target, so that a target costs about the same
// whatever it shows; a coarser one where more than `mostPixels` of it would be touched. Nothing
// where the raster lies elsewhere.
std::optional<PlaneSource> SourceOf(const ServedRaster& raster, const Mercator& plane,
                                    const PlaneExtent& extent, std::uint32_t side,
                                    std::uint64_t mostPixels);

}  // namespace zmcserve

#endif
