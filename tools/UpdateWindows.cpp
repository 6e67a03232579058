#include "tools/UpdateWindows.h"

#include <ogr_spatialref.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <iterator>
#include <limits>
#include <memory>
#include <optional>
#include <string_view>
#include <unordered_map>

#include "gdal/Mosaic.h"
#include "tools/Arguments.h"
#include "tools/GdalWorld.h"
#include "tools/Message.h"
#include "tools/SceneNames.h"

namespace zmctools {
namespace {

constexpr const char* kOption = "--changed";
// Points along an edge, so that one that becomes a curve is followed.
constexpr int kEdgePoints = 21;

bool LooksLikeWindow(const std::string& text) {
    return text.empty() ||
           (text.find_first_not_of("0123456789,+-. ") == text.npos && text.find(',') != text.npos);
}

struct GeoTransform {
    double terms[6];
    std::size_t Size() const { return std::size(terms); }
};

GeoTransform TransformOf(GDALDataset& dataset, const std::string& name) {
    GeoTransform transform{};
    if (dataset.GetGeoTransform(transform.terms) != CE_None)
        throw Failure(name, "it has no georeference to find its place by");
    return transform;
}

// From coordinates of one raster to those of the other; null where they are the same.
using Transformation = std::unique_ptr<OGRCoordinateTransformation>;
Transformation BetweenSystems(GDALDataset& from, GDALDataset& to, const std::string& name) {
    const OGRSpatialReference* const a = from.GetSpatialRef();
    const OGRSpatialReference* const b = to.GetSpatialRef();
    if (!a || !b || a->IsSame(b)) return nullptr;
    Transformation made(OGRCreateCoordinateTransformation(a, b));
    if (!made)
        throw Failure(name, "its coordinates cannot be carried over to those of the source: " +
                                TakeGdalError(name));
    return made;
}

class Bounds {
public:
    void Take(double x, double y) {
        left = std::min(left, x);
        right = std::max(right, x);
        top = std::min(top, y);
        bottom = std::max(bottom, y);
    }
    bool IsFinite() const {
        return std::isfinite(left) && std::isfinite(right) && std::isfinite(top) &&
               std::isfinite(bottom);
    }
    // With the pixels that it touches and one more around it, within a raster; false if there are
    // none.
    bool Cover(int width, int height, zmchost::Window& window) const {
        const auto low = [](double edge, int extent) {
            return std::clamp(std::floor(edge) - 1, 0.0, static_cast<double>(extent));
        };
        const auto high = [](double edge, int extent) {
            return std::clamp(std::ceil(edge) + 1, 0.0, static_cast<double>(extent));
        };
        if (right <= 0 || bottom <= 0 || left >= width || top >= height) return false;
        window.x = static_cast<std::uint32_t>(low(left, width));
        window.y = static_cast<std::uint32_t>(low(top, height));
        window.width = static_cast<std::uint32_t>(high(right, width)) - window.x;
        window.height = static_cast<std::uint32_t>(high(bottom, height)) - window.y;
        return !window.IsEmpty();
    }

private:
    double left = std::numeric_limits<double>::infinity();
    double right = -std::numeric_limits<double>::infinity();
    double top = std::numeric_limits<double>::infinity();
    double bottom = -std::numeric_limits<double>::infinity();
};

zmchost::Window WindowOfScene(const std::string& name, GDALDataset& source,
                              const std::string& sourceName) {
    const DatasetPtr scene = OpenDataset(name);
    GeoTransform outward = TransformOf(*scene, name);
    GeoTransform inverse = TransformOf(source, sourceName);
    GeoTransform inward{};
    if (!GDALInvGeoTransform(inverse.terms, inward.terms))
        throw Failure(sourceName, "its georeference leads nowhere");
    const Transformation between = BetweenSystems(*scene, source, name);
    const int width = scene->GetRasterXSize(), height = scene->GetRasterYSize();
    Bounds bounds;
    const auto take = [&](double column, double line) {
        double x = 0, y = 0;
        GDALApplyGeoTransform(outward.terms, column, line, &x, &y);
        if (between && !between->Transform(1, &x, &y))
            throw Failure(name, "its coordinates cannot be carried over to those of the source");
        double sourceX = 0, sourceY = 0;
        GDALApplyGeoTransform(inward.terms, x, y, &sourceX, &sourceY);
        bounds.Take(sourceX, sourceY);
    };
    for (int i = 0; i < kEdgePoints; ++i) {
        const double share = static_cast<double>(i) / (kEdgePoints - 1);
        take(share * width, 0);
        take(share * width, height);
        take(0, share * height);
        take(width, share * height);
    }
    zmchost::Window window;
    if (!bounds.IsFinite() ||
        !bounds.Cover(source.GetRasterXSize(), source.GetRasterYSize(), window))
        throw Failure(name, "it does not lie in the source");
    return window;
}

// The scenes of a mosaic by their names, none of another raster.
using ScenesByName = std::unordered_map<std::string_view, const zmcgdal::MosaicScene*>;

ScenesByName ScenesOf(const GDALDataset& source) {
    ScenesByName scenes;
    if (const auto* const mosaic = dynamic_cast<const zmcgdal::Mosaic*>(&source))
        for (const zmcgdal::MosaicScene& scene : mosaic->Layout().scenes)
            scenes.emplace(scene.name, &scene);
    return scenes;
}

zmchost::Window WindowOfKnown(const zmcgdal::MosaicScene& scene, GDALDataset& source) {
    Bounds bounds;
    bounds.Take(scene.place.x, scene.place.y);
    bounds.Take(static_cast<double>(scene.place.Right()),
                static_cast<double>(scene.place.Bottom()));
    zmchost::Window window;
    bounds.Cover(source.GetRasterXSize(), source.GetRasterYSize(), window);
    return window;
}

}  // namespace

std::vector<zmchost::Window> ChangedWindows(const std::vector<std::string>& texts,
                                            GDALDataset& source, const std::string& sourceName) {
    std::optional<ScenesByName> scenes;
    std::vector<zmchost::Window> windows;
    for (const std::string& text : texts) {
        if (text.empty()) throw UsageError(kOption, "\"\" is not X,Y,WIDTH,HEIGHT");
        if (LooksLikeWindow(text)) {
            windows.push_back(ParseWindow(text, static_cast<std::uint32_t>(source.GetRasterXSize()),
                                          static_cast<std::uint32_t>(source.GetRasterYSize()),
                                          kOption));
            continue;
        }
        if (!scenes) scenes = ScenesOf(source);
        const auto known = scenes->find(Absolute(text));
        windows.push_back(known == scenes->end() ? WindowOfScene(text, source, sourceName)
                                                 : WindowOfKnown(*known->second, source));
    }
    return windows;
}

bool LieAlike(GDALDataset& a, GDALDataset& b) {
    if (a.GetRasterXSize() != b.GetRasterXSize() || a.GetRasterYSize() != b.GetRasterYSize())
        return false;
    GeoTransform first{}, second{};
    const bool has = a.GetGeoTransform(first.terms) == CE_None;
    if (has != (b.GetGeoTransform(second.terms) == CE_None)) return false;
    return !has || std::equal(first.terms, first.terms + first.Size(), second.terms);
}

}  // namespace zmctools
