// Where a raster lies on earth, and which of its values mean "no data", as the driver tells it.
#ifndef ZMC_DESCRIBE_PLACE_H
#define ZMC_DESCRIBE_PLACE_H

#include <gdal_priv.h>

#include <string>

#include "describe/JsonNumbers.h"

namespace zmcdescribe {

// WKT 2 of 2019, on one line; empty where the system has no such text.
std::string WktOf(const OGRSpatialReference& system);

// An object with "crs" (an object with "name", "authority" such as "EPSG:32633", or null, and
// "wkt", which is WKT 2), "geoTransform" (six numbers, as GDAL has them: x and y of the upper left
// corner are the first and the fourth) and "noData" (for each band its value, or null). What there
// is not is null, all three without a dataset.
Json DescribePlace(GDALDataset* dataset);

}  // namespace zmcdescribe

#endif
