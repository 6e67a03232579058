// Which pixels of a raster have changed, as the command line tells it.
#ifndef ZMC_TOOLS_UPDATEWINDOWS_H
#define ZMC_TOOLS_UPDATEWINDOWS_H

#include <gdal_priv.h>

#include <string>
#include <vector>

#include "host/raster/RasterSource.h"

namespace zmctools {

// Each text is "X,Y,WIDTH,HEIGHT" inside the source, or names a raster that lies in it: then the
// window around its corners and edges, carried over by the georeference of both, and one pixel more
// on each side; what is outside of the source is left out. Where a scene
// of a mosaic lies the survey knows. Throws UsageError for a window that does not fit, and Failure
// for a raster that cannot be opened, has no georeference or lies elsewhere.
std::vector<zmchost::Window> ChangedWindows(const std::vector<std::string>& texts,
                                            GDALDataset& source, const std::string& sourceName);

// Whether two rasters have the same size and georeference, or none.
bool LieAlike(GDALDataset& a, GDALDataset& b);

}  // namespace zmctools

#endif
