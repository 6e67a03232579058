#include "host/build/PyramidBuilder.h"

#include "host/build/PyramidBuild.h"

namespace zmchost {

BuildReport PyramidBuilder::Build(RasterSource& source, const std::string& target,
                                  const BuildOptions& options) const {
    PyramidBuild build(module, source, target, options);
    return build.Run();
}

}  // namespace zmchost
