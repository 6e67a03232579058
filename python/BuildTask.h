// BuildTask: a pyramid made of a source, with what is told of it beside or in it.
#ifndef ZMC_PYTHON_BUILDTASK_H
#define ZMC_PYTHON_BUILDTASK_H

#include <gdal_priv.h>

#include <string>

#include "host/build/PyramidBuilder.h"
#include "host/raster/RasterSource.h"

namespace zmcpython {

struct BuildTask {
    std::string target;
    zmchost::BuildOptions options;
    std::string noData;  // in GDAL's words, as options.noData has it; empty: that of the source
    bool embed = false;  // what a sidecar would tell stands in the file
};

// `facts` is a dataset of all bands of the source; its pixels are not read. Throws as
// zmchost::PyramidBuilder does, with the target as it was. The progress of the options is told on
// threads of the build. Any thread, one at a time with the same source or facts.
zmchost::BuildReport Build(const BuildTask& task, zmchost::RasterSource& pixels,
                           GDALDataset& facts);

}  // namespace zmcpython

#endif
