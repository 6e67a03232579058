// The services, one function for each source that has some: the one list of them.
#ifndef ZMC_SERVE_SERVICES_H
#define ZMC_SERVE_SERVICES_H

#include <vector>

#include "serve/Router.h"

namespace zmcserve {

std::vector<Route> FileRoutes();      // the files themselves
std::vector<Route> TileRoutes();      // tiles in the raster's own grid
std::vector<Route> OgcRoutes();       // OGC API - Tiles
std::vector<Route> WmtsRoutes();      // WMTS
std::vector<Route> PictureRoutes();   // previews
std::vector<Route> ViewRoutes();      // what a screen shows
std::vector<Route> ValueRoutes();     // points, profiles, windows of samples
std::vector<Route> RecordRoutes();    // what a file tells: info, statistics, histograms
std::vector<Route> ServerRoutes();    // the server itself: api, health, metrics
std::vector<Route> PageRoutes();      // the viewer
std::vector<Route> DeepZoomRoutes();  // Deep Zoom: DZI
std::vector<Route> ImageRoutes();     // the IIIF Image API

// clang-format off
inline constexpr std::vector<Route> (*kServices[])() = {
    FileRoutes,
    TileRoutes,
    OgcRoutes,
    WmtsRoutes,
    PictureRoutes,
    ViewRoutes,
    ValueRoutes,
    RecordRoutes,
    ServerRoutes,
    PageRoutes,
    DeepZoomRoutes,
    ImageRoutes,
};
// clang-format on

// What no route has: the viewer's files, which may lie anywhere below the root.
Answer AnswerOfPage(const Request& request, Service& service);

}  // namespace zmcserve

#endif
