#include "host/PyramidBuilder.h"

#include "host/PyramidBuild.h"

namespace zmchost {

BuildReport PyramidBuilder::Build(RasterSource& source, const std::string& target,
                                  const BuildOptions& options) const {
    PyramidBuild build(module, source, target, options);
    return build.Run();
}

}  // namespace zmchost
