// Binds a handle that is destroyed at the end of the process, after the engine's own destructors:
// the engine is loaded later, so its destructors run earlier.
#include <cstdio>

#include "coordsys/BindCoordSys.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"

namespace {

std::unique_ptr<zelm::CoordSys> lateHandle;

}  // namespace

int main(int, char** argv) {
    zelm::Environment().GetSetting(zelm::EnvironmentKeys::kBinDirectory) = argv[1];
    lateHandle = zelm::BindCoordSys(4326);
    std::puts(lateHandle ? "bound" : "not bound");
    return 0;
}
