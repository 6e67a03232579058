// CopySidecar: what a pyramid file has no place for and its sidecar keeps.
#ifndef ZMC_GDAL_SIDECAR_H
#define ZMC_GDAL_SIDECAR_H

#include <cpl_string.h>
#include <gdal_priv.h>

namespace zmcgdal {

class Dataset;

// Takes georeference, control points, no-data values, descriptions, units, scale and offset,
// category names, attribute tables, colour interpretation, every metadata domain and a mask of the
// whole dataset from `source`. Statistics are not taken: the file has its own.
CPLErr CopySidecar(GDALDataset& source, Dataset& target, bool strict);

// The items of a metadata domain that are no statistics.
CPLStringList WithoutStatistics(CSLConstList items);

}  // namespace zmcgdal

#endif
