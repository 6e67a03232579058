// Service: what every handler is given beside the request: the rasters, the limits, the counters.
//
// Any number of threads may use one.
#ifndef ZMC_SERVE_SERVICE_H
#define ZMC_SERVE_SERVICE_H

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "serve/Catalog.h"
#include "serve/Metrics.h"
#include "serve/Router.h"

namespace zmcserve {

// What one request may take.
struct ServiceLimits {
    // Pixels of a picture that is made, and of its longer side.
    std::uint64_t pixels = std::uint64_t{16} << 20;
    std::uint32_t side = 8192;
    // Bytes of samples that an answer holds, and that are read for it at once.
    std::uint64_t window = std::uint64_t{64} << 20;
    // Bytes that are compressed for an answer; larger ones are sent as they are.
    std::uint64_t compressed = std::uint64_t{8} << 20;
    // Until an answer has to be there.
    std::chrono::milliseconds time{30000};
};

struct Service {
    Service(const std::vector<std::string>& named, bool followLinks, zmchost::ModulePtr module,
            const ServiceLimits& allowed = {})
        : limits(allowed), catalog(named, followLinks, std::move(module)), router(AllRoutes()) {}

    const ServiceLimits limits;
    Catalog catalog;
    Metrics metrics;
    const Router router;

    Answer Handle(const Request& request) { return router.Handle(request, *this); }
};

}  // namespace zmcserve

#endif
