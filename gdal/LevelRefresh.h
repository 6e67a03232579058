// RefreshLevels: makes stored levels anew from the level below each, by the reducers of the
// builder.
//
// A tile of the coarser level is made from the window of the finer one that its kernel reaches, so
// the memory taken is that of two tiles' side whatever the raster's size, and the result is what
// the builder would have made.
#ifndef ZMC_GDAL_LEVELREFRESH_H
#define ZMC_GDAL_LEVELREFRESH_H

#include <gdal_priv.h>

#include <vector>

#include "gdal/Dataset.h"

namespace zmcgdal {

// `factors` are those of GDAL: 2 is the level after the finest. Powers of two beyond the last level
// are passed over with a warning, if another factor means a level. Reports to GDAL and fails,
// having changed no level, for a method or a factor that the file has no room for, for a dataset
// that is not open for update, and where pixels that wait to be written cannot be; a cancelled or
// failed run leaves some levels renewed.
CPLErr RefreshLevels(Dataset& dataset, const char* resampling, const std::vector<int>& factors,
                     GDALProgressFunc progress, void* progressData);

}  // namespace zmcgdal

#endif
