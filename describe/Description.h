// Description: what a pyramid file tells of itself, as the documents of `zmcraster info --json` and
// of the server.
//
// Bands count from 1, levels from 0, the finest. Numbers stand as JsonNumbers.h tells.
#ifndef ZMC_DESCRIBE_DESCRIPTION_H
#define ZMC_DESCRIBE_DESCRIPTION_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <limits>
#include <span>
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

// Tells the counts of a histogram's bins, in whatever form; they are good during the call.
using TellCounts = std::function<void(Json& histogram, std::span<const std::uint64_t> counts)>;
// As the list "counts".
void TellAllCounts(Json& histogram, std::span<const std::uint64_t> counts);
Json DescribeHistograms(const zmchost::Raster& raster, const TellCounts& tell = TellAllCounts);

inline constexpr std::size_t kAllColors = std::numeric_limits<std::size_t>::max();
// Of each palette the first `most` colours; unless all are asked for, "count" tells how many there
// are.
Json DescribePalettes(const zmchost::Raster& raster, std::size_t most = kAllColors);

// Fills all three into a document.
void AddRecords(const zmchost::Raster& raster, Json& document);

// How many counts and colours that is: a file of a few kilobytes may repeat one palette for
// thousands of bands, so whoever answers strangers asks first. Throws zmchost::Error.
std::uint64_t RecordValues(const zmchost::Raster& raster);

}  // namespace zmcdescribe

#endif
