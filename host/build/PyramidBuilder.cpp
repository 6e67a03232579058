#include "host/build/PyramidBuilder.h"

#include "host/build/BuildRun.h"

namespace zmchost {

void PyramidBuilder::Check(RasterSource& source, const std::string& target,
                           const BuildOptions& options) const {
    const BuildRun run(module, source, target, options);
}

void PyramidBuilder::LayOut(RasterSource& source, BuildFile& file, const std::string& target,
                            const BuildOptions& options) const {
    BuildRun(module, source, target, options).LayOut(file);
}

BuildReport PyramidBuilder::Complete(RasterSource& source, BuildFile& file,
                                     const std::string& target, const BuildOptions& options) const {
    return BuildRun(module, source, target, options).Complete(file);
}

BuildReport PyramidBuilder::Build(RasterSource& source, const std::string& target,
                                  const BuildOptions& options) const {
    BuildRun run(module, source, target, options);
    return run.Run();
}

}  // namespace zmchost
