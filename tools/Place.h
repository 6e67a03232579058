// Where a pyramid lies on earth, and which of its values mean "no data": what stands beside or
// inside of the file and is read as the driver reads it.
#ifndef ZMC_TOOLS_PLACE_H
#define ZMC_TOOLS_PLACE_H

#include <string>

#include "describe/JsonNumbers.h"

namespace zmctools {

using zmcdescribe::Json;

// As describe/Place.h tells it; a pyramid that the driver does not show has none of it. Warns of
// what GDAL does not understand beside the file.
Json PlaceOf(const std::string& file);

// Prints what there is of it, a line for each of the three.
void PrintPlace(const Json& place);

}  // namespace zmctools

#endif
