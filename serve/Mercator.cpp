#include "serve/Mercator.h"

#include <gdal.h>
#include <ogr_spatialref.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <string>

#include "gdal/ErrorCatcher.h"
#include "serve/Answer.h"
#include "serve/ServedRaster.h"

namespace zmcserve {
namespace {

constexpr double kNowhere = std::numeric_limits<double>::infinity();
constexpr std::size_t kSpots = 21;    // along each side of a raster
constexpr std::size_t kSamples = 17;  // along each side of a target
// Of a level: a target that is finer by less than this is as fine.
constexpr double kSameScale = 0.01;

Refusal Homeless(const std::string& why) {
    return Refusal(404, "the raster has no place in Web Mercator: " + why);
}

bool IsSomewhere(double x, double y) { return std::isfinite(x) && std::isfinite(y); }

// The value in the middle of the order.
double Median(std::vector<double>& values) {
    const auto half = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), half, values.end());
    return *half;
}

void Transform(OGRCoordinateTransformation& how, std::size_t count, double* x, double* y) {
    const zmcgdal::ErrorCatcher quiet(CE_Failure);
    std::vector<int> done(count, 1);
    how.Transform(static_cast<int>(count), x, y, nullptr, done.data());
    for (std::size_t i = 0; i < count; ++i)
        if (!done[i] || !IsSomewhere(x[i], y[i])) x[i] = y[i] = kNowhere;
}

struct Box {
    double left = kNowhere, top = kNowhere, right = -kNowhere, bottom = -kNowhere;

    void Add(double x, double y) {
        left = std::min(left, x), right = std::max(right, x);
        top = std::min(top, y), bottom = std::max(bottom, y);
    }
    // By what may lie between the places that were added.
    void Grow() {
        const double across = (right - left) / 32, down = (bottom - top) / 32;
        left -= across, right += across, top -= down, bottom += down;
    }
};

bool Holds(const PlaneExtent& extent, const Mercator::Spot& spot) {
    return spot.x >= extent.west && spot.x <= extent.east && spot.y >= extent.south &&
           spot.y <= extent.north;
}

// Metres that a pixel is wide where the extent shows the raster, or else next to it.
double SideIn(const Mercator& plane, const PlaneExtent& extent) {
    std::vector<double> sides;
    const double x = (extent.west + extent.east) / 2, y = (extent.south + extent.north) / 2;
    double nearest = kNowhere, sideThere = 0;
    for (const Mercator::Spot& spot : plane.Spots()) {
        if (Holds(extent, spot)) sides.push_back(spot.side);
        const double distance = std::hypot(spot.x - x, spot.y - y);
        if (distance < nearest) nearest = distance, sideThere = spot.side;
    }
    return sides.empty() ? sideThere : Median(sides);
}

// Pixels of the raster that an extent shows, and perhaps some more.
std::optional<Box> Shown(const Mercator& plane, const PlaneExtent& extent) {
    std::vector<double> x, y;
    for (std::size_t row = 0; row < kSamples; ++row)
        for (std::size_t column = 0; column < kSamples; ++column) {
            const auto part = [](std::size_t i) { return static_cast<double>(i) / (kSamples - 1); };
            x.push_back(extent.west + (extent.east - extent.west) * part(column));
            y.push_back(extent.north + (extent.south - extent.north) * part(row));
        }
    plane.ToPixels(x.size(), x.data(), y.data());
    Box box;
    for (std::size_t i = 0; i < x.size(); ++i)
        if (IsSomewhere(x[i], y[i])) box.Add(x[i], y[i]);
    for (const Mercator::Spot& spot : plane.Spots())
        if (Holds(extent, spot)) box.Add(spot.column, spot.line);
    if (box.left > box.right) return std::nullopt;
    box.Grow();
    return box;
}

// The part of a level that a box of pixels of the finest touches, with `margin` pixels around.
std::optional<zmchost::Window> WindowIn(const zelm::LevelGeometry& level, const Box& box,
                                        double scale, double margin) {
    const auto clip = [](double at, std::uint32_t extent) {
        return static_cast<std::uint32_t>(std::clamp(at, 0.0, static_cast<double>(extent)));
    };
    const std::uint32_t left = clip(std::floor(box.left / scale - margin), level.samples);
    const std::uint32_t right = clip(std::ceil(box.right / scale + margin), level.samples);
    const std::uint32_t top = clip(std::floor(box.top / scale - margin), level.lines);
    const std::uint32_t bottom = clip(std::ceil(box.bottom / scale + margin), level.lines);
    if (left >= right || top >= bottom) return std::nullopt;
    return zmchost::Window{left, top, right - left, bottom - top};
}

}  // namespace

double Mercator::CellOf(std::uint32_t zoom) {
    return std::ldexp(2 * kEdge / kTileSide, -static_cast<int>(zoom));
}

PlaneExtent Mercator::ExtentOfTile(std::uint32_t zoom, std::uint64_t column, std::uint64_t row) {
    const double side = CellOf(zoom) * kTileSide;
    const auto x = static_cast<double>(column), y = static_cast<double>(row);
    return {x * side - kEdge, kEdge - (y + 1) * side, (x + 1) * side - kEdge, kEdge - y * side};
}

Mercator::Mercator(const Georeference& place, double width, double height) {
    if (!place.transform) throw Homeless("it is not georeferenced");
    toSystem = *place.transform;
    const bool isFinite = std::all_of(toSystem.begin(), toSystem.end(),
                                      [](double number) { return std::isfinite(number); });
    if (!isFinite || !GDALInvGeoTransform(toSystem.data(), toPixels.data()))
        throw Homeless("its georeference cannot be inverted");
    double x = width / 2, y = height / 2;
    Apply(toSystem, x, y);
    middle = x;
    TakeSystem(place);
    LookAround(width, height);
}

Mercator::~Mercator() = default;

void Mercator::TakeSystem(const Georeference& place) {
    if (place.wkt.empty()) throw Homeless("it has no system of coordinates");
    const zmcgdal::ErrorCatcher quiet(CE_Failure);
    OGRSpatialReference own, plane;
    if (own.SetFromUserInput(place.wkt.c_str()) != OGRERR_NONE)
        throw Homeless("its system of coordinates is not understood");
    if (own.IsCompound()) own.StripVertical();
    plane.importFromEPSG(3857);
    own.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
    plane.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
    if (own.IsGeographic()) circle = 2 * M_PI / own.GetAngularUnits();
    fromPlane.reset(OGRCreateCoordinateTransformation(&plane, &own));
    intoPlane.reset(OGRCreateCoordinateTransformation(&own, &plane));
    if (!fromPlane || !intoPlane)
        throw Homeless("there is no way into it from its system of coordinates");
}

void Mercator::ToPixels(std::size_t count, double* x, double* y) const {
    Transform(*fromPlane, count, x, y);
    for (std::size_t i = 0; i < count; ++i) {
        if (!IsSomewhere(x[i], y[i])) continue;
        if (circle > 0) x[i] += circle * std::round((middle - x[i]) / circle);
        Apply(toPixels, x[i], y[i]);
    }
}

void Mercator::ToPlane(std::size_t count, double* x, double* y) const {
    for (std::size_t i = 0; i < count; ++i) Apply(toSystem, x[i], y[i]);
    Transform(*intoPlane, count, x, y);
}

// Places all over the raster, and those a pixel to the right of and below each.
struct Mercator::Grid {
    std::vector<double> x, y;

    static std::size_t Count() { return kSpots * kSpots; }
    static bool IsEdge(std::size_t i) {
        const std::size_t row = i / kSpots, column = i % kSpots;
        return row == 0 || column == 0 || row == kSpots - 1 || column == kSpots - 1;
    }
    // Whether two neighbours lie so far from each other that the edge of the square is between.
    bool IsTorn() const {
        for (std::size_t i = 1; i < Count(); ++i)
            if (i % kSpots != 0 && std::fabs(x[i] - x[i - 1]) > kEdge) return true;
        for (std::size_t i = kSpots; i < Count(); ++i)
            if (std::fabs(x[i] - x[i - kSpots]) > kEdge) return true;
        return false;
    }
    double SideAt(std::size_t i) const {
        const std::size_t right = i + Count(), below = i + 2 * Count();
        return std::sqrt(std::fabs((x[right] - x[i]) * (y[below] - y[i]) -
                                   (x[below] - x[i]) * (y[right] - y[i])));
    }
};

void Mercator::LookAround(double width, double height) {
    Grid grid;
    std::vector<Spot> all;
    for (std::size_t i = 0; i < Grid::Count(); ++i) {
        Spot spot;
        const std::size_t row = i / kSpots, column = i % kSpots;
        spot.column = width * static_cast<double>(column) / (kSpots - 1);
        spot.line = height * static_cast<double>(row) / (kSpots - 1);
        all.push_back(spot);
    }
    for (const auto& [right, below] : {std::pair(0, 0), std::pair(1, 0), std::pair(0, 1)})
        for (const Spot& spot : all) {
            grid.x.push_back(spot.column + right);
            grid.y.push_back(spot.line + below);
        }
    ToPlane(grid.x.size(), grid.x.data(), grid.y.data());
    for (std::size_t i = 0; i < all.size(); ++i) {
        Spot& spot = all[i];
        spot.x = grid.x[i], spot.y = grid.y[i], spot.side = grid.SideAt(i);
        if (IsSomewhere(spot.x, spot.y) && spot.side > 0 && std::isfinite(spot.side))
            spots.push_back(spot);
    }
    if (spots.empty()) throw Homeless("none of its pixels has one");
    TakeBounds(grid);
    if (bounds.west >= bounds.east || bounds.south >= bounds.north)
        throw Homeless("it lies beyond the edges");
}

void Mercator::TakeBounds(const Grid& grid) {
    bounds = {kNowhere, kNowhere, -kNowhere, -kNowhere};
    for (std::size_t i = 0; i < Grid::Count(); ++i) {
        if (!IsSomewhere(grid.x[i], grid.y[i])) {
            bounds = {-kEdge, -kEdge, kEdge, kEdge};
            return;
        }
        bounds.west = std::min(bounds.west, grid.x[i]);
        bounds.east = std::max(bounds.east, grid.x[i]);
        bounds.south = std::min(bounds.south, grid.y[i]);
        bounds.north = std::max(bounds.north, grid.y[i]);
    }
    // Edges may be bent between the places that were looked at.
    const double across = (bounds.east - bounds.west) / 64;
    const double down = (bounds.north - bounds.south) / 64;
    const auto clip = [](double at) { return std::clamp(at, -kEdge, kEdge); };
    bounds = {clip(bounds.west - across), clip(bounds.south - down), clip(bounds.east + across),
              clip(bounds.north + down)};
    if (grid.IsTorn()) bounds.west = -kEdge, bounds.east = kEdge;
}

std::uint32_t Mercator::Zoom() const {
    std::vector<double> sides;
    for (const Spot& spot : spots) sides.push_back(spot.side);
    const double zoom = std::ceil(std::log2(CellOf(0) / Median(sides)) - kSameScale);
    return static_cast<std::uint32_t>(std::clamp<double>(zoom, 0, kMostZoom));
}

std::optional<PlaneSource> SourceOf(const ServedRaster& raster, const Mercator& plane,
                                    const PlaneExtent& extent, std::uint32_t side,
                                    std::uint64_t mostPixels) {
    const auto box = Shown(plane, extent);
    if (!box) return std::nullopt;
    const double pixels = (extent.east - extent.west) / side / SideIn(plane, extent);
    const double above = std::floor(std::log2(pixels) + kSameScale);
    const std::uint32_t finest = raster.FinestLevel(), most = raster.CoarsestLevel() - finest;
    for (auto coarser = static_cast<std::uint32_t>(std::clamp<double>(above, 0, most));;
         ++coarser) {
        const double scale = std::ldexp(1.0, static_cast<int>(coarser));
        PlaneSource source{finest + coarser, {}, pixels / scale};
        const double margin = 3 * std::max(source.shrinking, 1.0);
        const auto window = WindowIn(raster.Geometry(source.level), *box, scale, margin);
        if (!window) return std::nullopt;
        source.window = *window;
        if (window->Pixels() <= mostPixels || coarser == most) return source;
    }
}

}  // namespace zmcserve
