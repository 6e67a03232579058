// WmtsCapabilities: what a WMTS 1.0.0 tells of its layers and sets of tiles, as XML.
#ifndef ZMC_SERVE_WMTSCAPABILITIES_H
#define ZMC_SERVE_WMTSCAPABILITIES_H

#include <string>
#include <vector>

#include "serve/Layer.h"

namespace zmcserve {

inline constexpr const char* kWmtsVersion = "1.0.0";
inline constexpr const char* kWmtsStyle = "default";
inline constexpr const char* kInfoFormats[] = {"application/json", "text/plain"};

// `look` is what addresses of tiles get as their query: LookQueryOf.
std::string WmtsCapabilities(const std::string& baseUrl, const std::vector<Layer>& layers,
                             const std::string& look);

}  // namespace zmcserve

#endif
