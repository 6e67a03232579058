// How a build is cut into parts, for plans that stay and for those of one command.
#ifndef ZMC_TOOLS_PLANMAKING_H
#define ZMC_TOOLS_PLANMAKING_H

#include <cstdint>
#include <string>

#include "gdal/GdalRasterSource.h"
#include "host/build/BuildFile.h"
#include "tools/PyramidPlan.h"

namespace zmctools {

// Pixels of level 0.
struct PartSize {
    std::uint32_t width = 0;
    std::uint32_t height = 0;
};

// "8192" or "65536x2048". Throws UsageError.
PartSize ParsePartSize(const std::string& text);

// Squares; of a source that is stored by lines as many pixels in whole lines, since a part of a
// line costs as much as all of it.
PartSize UsualPartSize(GDALDataset& source);

// Whole lines, for that many processes on one machine: some parts for each, so that none waits long
// for the last.
PartSize PartSizeFor(const zelm::RasterProps& props, std::uint32_t processes);

// Of a target in a store: about so many bytes of level 0, in parts that fill long ranges of the
// file, whole lines or, in the ordering Morton, squares of a power of two tiles.
PartSize StorePartSize(const zelm::RasterProps& props, std::uint32_t bands,
                       std::uint64_t leastRange);

// Lays the file out and makes a plan of it, all but its path; nothing is written of that.
PyramidPlan MakePlan(const BuildWords& words, GDALDataset& dataset,
                     zmcgdal::GdalRasterSource& pixels, const zmchost::BuildOptions& options,
                     zmchost::BuildFile& file, const PartSize& size);

}  // namespace zmctools

#endif
