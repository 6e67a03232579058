#include "serve/Layer.h"

#include "host/base/Error.h"
#include "serve/LayerId.h"
#include "serve/Parameters.h"
#include "serve/Tile.h"

namespace zmcserve {
namespace {

void TakePlane(ServedRaster& raster, const Deadline& deadline, Layer& layer) try {
    const auto reader = raster.Borrow(deadline);
    const Mercator& plane = reader->InMercator();
    layer.plane = plane.Bounds();
    layer.mercatorLimits = MercatorLimits(plane);
} catch (const Refusal&) {
    layer.plane.reset();
}

std::optional<Layer> LayerIfAny(Service& service, const std::string& name,
                                const Deadline& deadline) try {
    return LayerOf(*service.catalog.Raster(name), deadline);
} catch (const Refusal& refusal) {
    if (refusal.Status() == 503) throw;
    return std::nullopt;
} catch (const zmchost::Error&) {
    return std::nullopt;
}

}  // namespace

Layer LayerOf(ServedRaster& raster, const Deadline& deadline) {
    CheckHasPixels(raster);
    const zelm::LevelGeometry finest = raster.Geometry(raster.FinestLevel());
    Layer layer;
    layer.name = raster.Name();
    layer.id = LayerIdOf(layer.name);
    layer.own = OwnGrid(raster);
    layer.ownLimits = OwnLimits(layer.own);
    layer.corners = CornersOf(layer.own, finest.samples, finest.lines);
    TakePlane(raster, deadline, layer);
    layer.degrees = BoundsInDegrees(raster);
    return layer;
}

std::vector<Layer> LayersOf(Service& service, const std::vector<std::string>& names,
                            const Deadline& deadline) {
    std::vector<Layer> layers;
    for (const std::string& name : names) {
        deadline.Check();
        if (auto layer = LayerIfAny(service, name, deadline)) layers.push_back(std::move(*layer));
    }
    return layers;
}

std::string LookQueryOf(const Request& request) {
    std::string query;
    for (const auto& [key, value] : request.query) {
        if (!zmcrender::Style::IsKey(key) && key != "quality" && key != "resampling") continue;
        query += query.empty() ? '?' : '&';
        query += key + '=' + PercentEncoded(value);
    }
    return query;
}

}  // namespace zmcserve
