#include "serve/TileMatrixSet.h"

#include <cpl_conv.h>
#include <ogr_spatialref.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <optional>

#include "gdal/ErrorCatcher.h"
#include "serve/MapTile.h"
#include "serve/Request.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;

constexpr double kPixel = 0.00028;  // metres, of the OGC's screen
// A degree, of the radius that clients reckon with whatever the ellipsoid.
constexpr double kRadius = 6378137;
// By how much columns and lines may differ in length and still be told by one number: part of a
// pixel over the whole raster.
constexpr double kMostDrift = 0.125;
// What has no system of its own is in pixels.
constexpr const char* kPixelSystem =
    "LOCAL_CS[\"Pixels of the raster\",UNIT[\"pixel\",1],AXIS[\"Easting\",EAST],"
    "AXIS[\"Northing\",NORTH]]";

using Text = std::unique_ptr<char, decltype(&CPLFree)>;

std::string HeldText(const Text& text) { return text ? text.get() : ""; }

std::string WktOf(const OGRSpatialReference& system) {
    char* text = nullptr;
    system.exportToWkt(&text);
    return HeldText(Text(text, &CPLFree));
}

std::string ProjJsonOf(const OGRSpatialReference& system) {
    char* text = nullptr;
    system.exportToPROJJSON(&text, nullptr);
    return HeldText(Text(text, &CPLFree));
}

GridSystem Named(const std::string& code) {
    GridSystem system;
    system.name = "urn:ogc:def:crs:EPSG::" + code;
    system.uri = "http://www.opengis.net/def/crs/EPSG/0/" + code;
    return system;
}

GridSystem SystemOf(const OGRSpatialReference& own) {
    const char* const authority = own.GetAuthorityName(nullptr);
    const char* const told = own.GetAuthorityCode(nullptr);
    const auto code = WholeNumber(told ? told : "", 0x7fffffff);
    GridSystem system{WktOf(own), "", ProjJsonOf(own), false, 1};
    OGRSpatialReference registered;
    if (authority && code && std::string_view(authority) == "EPSG" &&
        registered.importFromEPSG(static_cast<int>(*code)) == OGRERR_NONE) {
        system = Named(std::to_string(*code));
        system.northFirst =
            registered.EPSGTreatsAsLatLong() || registered.EPSGTreatsAsNorthingEasting();
    }
    system.metres = own.IsGeographic() ? own.GetAngularUnits() * kRadius : own.GetLinearUnits();
    return system;
}

// Nothing for a text that is none.
std::optional<GridSystem> SystemOfText(const std::string& wkt) {
    const zmcgdal::ErrorCatcher quiet(CE_Failure);
    OGRSpatialReference own;
    if (wkt.empty() || own.SetFromUserInput(wkt.c_str()) != OGRERR_NONE) return std::nullopt;
    if (own.IsCompound()) own.StripVertical();
    own.DemoteTo2D(nullptr);
    GridSystem system = SystemOf(own);
    if (system.name.empty()) system.name = wkt;
    if (!(system.metres > 0) || !std::isfinite(system.metres)) return std::nullopt;
    return system;
}

bool IsUprightSquare(const std::array<double, 6>& t, double longer) {
    return std::all_of(t.begin(), t.end(), [](double number) { return std::isfinite(number); }) &&
           t[2] == 0 && t[4] == 0 && t[1] > 0 && t[5] < 0 &&
           std::fabs(t[1] + t[5]) * longer <= kMostDrift * t[1];
}

// Where the pixels of the finest level lie, and how large they are.
void TakePlace(ServedRaster& raster, TileMatrixSet& set, double& cell) {
    const Georeference& place = raster.Place();
    const zelm::LevelGeometry finest = raster.Geometry(raster.FinestLevel());
    if (place.transform &&
        IsUprightSquare(*place.transform, std::max(finest.samples, finest.lines)))
        if (auto system = SystemOfText(place.wkt)) {
            set.system = std::move(*system);
            set.corner = {(*place.transform)[0], (*place.transform)[3]};
            cell = (*place.transform)[1];
            return;
        }
    const zmcgdal::ErrorCatcher quiet(CE_Failure);
    OGRSpatialReference pixels;
    pixels.SetFromUserInput(kPixelSystem);
    set.system = {kPixelSystem, "", ProjJsonOf(pixels), false, 1};
    cell = 1;
}

TileMatrixSet MakeMercator() {
    TileMatrixSet set;
    set.id = kMercatorSet;
    set.title = "Web Mercator";
    set.uri = "http://www.opengis.net/def/tilematrixset/OGC/1.0/WebMercatorQuad";
    set.scaleSet = "GoogleMapsCompatible";
    set.system = Named("3857");
    set.corner = {-Mercator::kEdge, Mercator::kEdge};
    for (std::uint32_t zoom = 0; zoom <= Mercator::kMostZoom; ++zoom) {
        const double cell = Mercator::CellOf(zoom);
        const std::uint32_t tiles = std::uint32_t{1} << zoom;
        set.matrices.push_back(
            {std::to_string(zoom), cell, cell / kPixel, Mercator::kTileSide, tiles, tiles});
    }
    return set;
}

}  // namespace

TileMatrixSet OwnGrid(ServedRaster& raster) {
    TileMatrixSet set;
    set.id = OwnSetOf(raster.Name());
    set.title = "The own grid of " + raster.Name();
    double cell = 1;
    TakePlace(raster, set, cell);
    for (std::uint32_t zoom = 0; zoom < raster.Levels(); ++zoom) {
        const std::uint32_t level = *raster.LevelOfZoom(zoom);
        const zelm::LevelGeometry geometry = raster.Geometry(level);
        const double side = std::ldexp(cell, static_cast<int>(level - raster.FinestLevel()));
        set.matrices.push_back({std::to_string(zoom), side, side * set.system.metres / kPixel,
                                geometry.tileSize, geometry.tilesAcross, geometry.tilesDown});
    }
    return set;
}

std::vector<TileLimits> OwnLimits(const TileMatrixSet& grid) {
    std::vector<TileLimits> limits;
    for (const TileMatrix& matrix : grid.matrices)
        limits.push_back({matrix.id, 0, matrix.down - 1, 0, matrix.across - 1});
    return limits;
}

const TileMatrixSet& WebMercatorQuad() {
    static const TileMatrixSet set = MakeMercator();
    return set;
}

std::vector<TileLimits> MercatorLimits(const Mercator& plane) {
    std::vector<TileLimits> limits;
    const PlaneExtent& bounds = plane.Bounds();
    for (std::uint32_t zoom = 0; zoom <= plane.Zoom(); ++zoom) {
        const double side = Mercator::CellOf(zoom) * Mercator::kTileSide;
        const double last = std::ldexp(1.0, static_cast<int>(zoom)) - 1;
        const auto tile = [&](double metres) {
            return static_cast<std::uint32_t>(std::clamp(std::floor(metres / side), 0.0, last));
        };
        limits.push_back({std::to_string(zoom), tile(Mercator::kEdge - bounds.north),
                          tile(Mercator::kEdge - bounds.south), tile(bounds.west + Mercator::kEdge),
                          tile(bounds.east + Mercator::kEdge)});
    }
    return limits;
}

std::array<double, 2> Ordered(const GridSystem& system, double east, double north) {
    if (system.northFirst) return {north, east};
    return {east, north};
}

Corners CornersOf(const PlaneExtent& extent) {
    return {std::array{extent.west, extent.south}, std::array{extent.east, extent.north}};
}

Corners CornersOf(const TileMatrixSet& grid, double width, double height) {
    const double cell = grid.matrices.empty() ? 0 : grid.matrices.back().cell;
    const auto [west, north] = grid.corner;
    return {Ordered(grid.system, west, north - height * cell),
            Ordered(grid.system, west + width * cell, north)};
}

Json DescribeSystem(const GridSystem& system) {
    if (!system.uri.empty()) return system.uri;
    Json document = Json::parse(system.projJson, nullptr, false);
    if (document.is_discarded()) document = nullptr;
    return Json::object({{"wkt", std::move(document)}});
}

Json DescribeSet(const TileMatrixSet& set) {
    Json document = {{"id", set.id}, {"title", set.title}};
    if (!set.uri.empty()) document["uri"] = set.uri;
    document["crs"] = DescribeSystem(set.system);
    if (!set.scaleSet.empty())
        document["wellKnownScaleSet"] = "http://www.opengis.net/def/wkss/OGC/1.0/" + set.scaleSet;
    Json matrices = Json::array();
    for (const TileMatrix& matrix : set.matrices)
        matrices.push_back({{"id", matrix.id},
                            {"scaleDenominator", matrix.scale},
                            {"cellSize", matrix.cell},
                            {"cornerOfOrigin", "topLeft"},
                            {"pointOfOrigin", Ordered(set.system, set.corner[0], set.corner[1])},
                            {"tileWidth", matrix.side},
                            {"tileHeight", matrix.side},
                            {"matrixWidth", matrix.across},
                            {"matrixHeight", matrix.down}});
    document["tileMatrices"] = std::move(matrices);
    return document;
}

Json DescribeLimits(const std::vector<TileLimits>& limits) {
    Json list = Json::array();
    for (const TileLimits& limit : limits)
        list.push_back({{"tileMatrix", limit.matrix},
                        {"minTileRow", limit.firstRow},
                        {"maxTileRow", limit.lastRow},
                        {"minTileCol", limit.firstColumn},
                        {"maxTileCol", limit.lastColumn}});
    return list;
}

}  // namespace zmcserve
