// The checks of a pyramid file, one by one, each with the list of what is wrong.
//
// Every check reads what it needs anew and changes nothing. A problem is a text for people, with
// the band (from 1), the level (from 0) and the place of the first difference. A file whose
// contents cannot be read at all throws. Memory stays some 100 MiB whatever the raster's size, and
// some 350 MiB where a tile, or a pixel, has many bands.
#ifndef ZMC_TOOLS_VERIFICATION_H
#define ZMC_TOOLS_VERIFICATION_H

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "host/file/PyramidFileInfo.h"
#include "host/raster/Raster.h"
#include "host/reduce/Reduction.h"
#include "tools/RasterView.h"

namespace zmctools {

struct CheckResult {
    std::string check;
    std::string skipped;  // why it was not made; empty if it was
    std::vector<std::string> problems;
};

struct CheckManner {
    bool quiet = false;         // without a bar
    std::uint32_t threads = 0;  // 0: as many as the machine has processors
};

// Header against the module's reading of it, and the file's length.
CheckResult CheckStructure(const zmchost::PyramidFileInfo& info, const zmchost::Raster& raster);
CheckResult CheckCompleteness(const zmchost::PyramidFileInfo& info);
// The metadata document is well-formed, and its records are of bands and levels that there are.
CheckResult CheckDocuments(const zmchost::PyramidFileInfo& info, const zmchost::Raster& raster);
// Stored statistics and histograms against those of level 0, as exact as a file keeps them.
CheckResult CheckStatistics(zmchost::Raster& raster, const CheckManner& manner);
// Every coarser level against what the method makes of the level below it; `weights` may be null.
CheckResult CheckLevels(zmchost::Raster& raster, zmchost::Resampling method,
                        zmchost::SampleWeights* weights, const CheckManner& manner);
// Level 0 against bands of another raster.
CheckResult CheckSource(zmchost::Raster& raster, RasterView& source,
                        const std::vector<std::uint32_t>& sourceBands, bool quiet);

}  // namespace zmctools

#endif
