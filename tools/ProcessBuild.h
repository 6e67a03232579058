// BuildInProcesses: a build by several processes of this program, which go with it.
#ifndef ZMC_TOOLS_PROCESSBUILD_H
#define ZMC_TOOLS_PROCESSBUILD_H

#include <cstdint>

#include "gdal/GdalRasterSource.h"
#include "tools/BuildWords.h"

namespace zmctools {

// Does what PyramidBuilder::Build does, with a bar where that is wanted. Each process has its share
// of the memory in the options, but no less than parts need as a rule, and as many threads as they
// say, 1 without a word. Throws Interruption too.
zmchost::BuildReport BuildInProcesses(const BuildWords& words, GDALDataset& dataset,
                                      zmcgdal::GdalRasterSource& pixels,
                                      const zmchost::BuildOptions& options, std::uint32_t processes,
                                      bool showsBar);

}  // namespace zmctools

#endif
