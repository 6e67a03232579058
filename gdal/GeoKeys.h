// GeoKeys: the bytes by which a GeoTIFF tells its coordinate system.
//
// What GDAL makes of them takes a millisecond, most of it in a database. Files with the same bytes
// are in the same system, and are told apart by them in a fiftieth of that.
#ifndef ZMC_GDAL_GEOKEYS_H
#define ZMC_GDAL_GEOKEYS_H

#include <optional>
#include <string>

namespace zmcgdal {

// The three tags of the first directory, one behind the other, each with its number and size.
// Nothing for what is no TIFF, or an unusual one.
std::optional<std::string> GeoKeysOf(const std::string& path);

}  // namespace zmcgdal

#endif
