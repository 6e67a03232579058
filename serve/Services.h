// The services, one function for each source that has some: the one list of them.
#ifndef ZMC_SERVE_SERVICES_H
#define ZMC_SERVE_SERVICES_H

#include <vector>

#include "serve/Router.h"

namespace zmcserve {

std::vector<Route> FileRoutes();  // the files themselves

inline constexpr std::vector<Route> (*kServices[])() = {FileRoutes};

}  // namespace zmcserve

#endif
