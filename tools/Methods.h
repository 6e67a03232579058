// The methods of reduction as the command line names them.
#ifndef ZMC_TOOLS_METHODS_H
#define ZMC_TOOLS_METHODS_H

#include <cstdint>
#include <string>
#include <vector>

#include "host/reduce/Reduction.h"

namespace zmctools {

inline std::vector<std::string> MethodNames() {
    std::vector<std::string> names;
    for (std::uint32_t method = 0; method < zmchost::kResamplings; ++method)
        names.emplace_back(zmchost::ResamplingName(static_cast<zmchost::Resampling>(method)));
    return names;
}

}  // namespace zmctools

#endif
