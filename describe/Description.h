// Description: what a pyramid file tells of itself, as the documents of `zmcraster info --json` and
// of the server.
//
// Bands count from 1, levels from 0, the finest. Numbers stand as JsonNumbers.h tells.
#ifndef ZMC_DESCRIBE_DESCRIPTION_H
#define ZMC_DESCRIBE_DESCRIPTION_H

#include <string>

#include "describe/JsonNumbers.h"
#include "host/file/PyramidFileInfo.h"
#include "host/raster/Raster.h"

namespace zmcdescribe {

// Number of the form of all documents.
inline constexpr int kSchema = 1;

// Header and levels; the lists "statistics", "histograms" and "palettes" are empty.
Json DescribeLayout(const std::string& name, const zmchost::PyramidFileInfo& info);

// The lists of an open raster, whose document is in order (Raster::DocumentFault). Throw
// zmchost::Error.
Json DescribeStatistics(const zmchost::Raster& raster);
Json DescribeHistograms(const zmchost::Raster& raster);
Json DescribePalettes(const zmchost::Raster& raster);
// Fills all three into a document.
void AddRecords(const zmchost::Raster& raster, Json& document);

}  // namespace zmcdescribe

#endif
