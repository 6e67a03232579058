// Where a pyramid lies on earth, and which of its values mean "no data": what stands beside or
// inside of the file and is read as the driver reads it.
#ifndef ZMC_TOOLS_PLACE_H
#define ZMC_TOOLS_PLACE_H

#include <string>

#include "tools/JsonNumbers.h"

namespace zmctools {

// An object with "crs" (an object with "name", "authority" such as "EPSG:32633", or null, and
// "wkt", which is WKT 2), "geoTransform" (six numbers, as GDAL has them: x and y of the upper left
// corner are the first and the fourth) and "noData" (for each band its value, or null). What there
// is not is null. A pyramid that the driver does not show has none of the three. Warns of what GDAL
// does not understand beside the file.
Json PlaceOf(const std::string& file);

// Prints what there is of it, a line for each of the three.
void PrintPlace(const Json& place);

}  // namespace zmctools

#endif
