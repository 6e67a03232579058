// Names of rasters in paths.
#ifndef ZMC_SERVE_NAMES_H
#define ZMC_SERVE_NAMES_H

#include <string>
#include <string_view>

#include "serve/Answer.h"
#include "serve/Request.h"

namespace zmcserve {

// The segments [first, end) of the path as one name.
inline std::string NameOfSegments(const Request& request, std::size_t first, std::size_t end) {
    std::string name;
    for (std::size_t i = first; i < end && i < request.segments.size(); ++i) {
        if (i != first) name += '/';
        name += request.segments[i];
    }
    return name;
}

// All behind the first, which is the service's.
inline std::string NameOfRest(const Request& request) {
    return NameOfSegments(request, 1, request.segments.size());
}

// "0/1.jpg" has the stem "0/1" and the ending "jpg"; without a dot the ending is empty.
inline std::pair<std::string_view, std::string_view> StemAndEnding(std::string_view name) {
    const std::size_t dot = name.rfind('.');
    if (dot == name.npos) return {name, {}};
    return {name.substr(0, dot), name.substr(dot + 1)};
}

}  // namespace zmcserve

#endif
