// GDAL in this program: started in the right order, its errors as exceptions.
#ifndef ZMC_TOOLS_GDALWORLD_H
#define ZMC_TOOLS_GDALWORLD_H

#include <gdal_priv.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace zmctools {

struct CloseDataset {
    void operator()(GDALDataset* dataset) const { GDALClose(dataset); }
};
using DatasetPtr = std::unique_ptr<GDALDataset, CloseDataset>;

// Initialises Xerces-C++, then registers our driver, then GDAL's. Rasters in memory, which GDAL
// opens by an address in their name, can then be made but no longer be opened by name: a name comes
// from the command line or out of a file.
void StartGdal();

// Opens a raster for reading. Throws Failure with GDAL's reason.
DatasetPtr OpenDataset(const std::string& name, const std::vector<std::string>& options = {});

// Lets GDAL keep as many blocks of a source as strips of so many pixels need that are read one
// below the other: memory that is touched for the first time costs more than blocks that come
// again. The usual bound stays where blocks may not be those that the source tells of (masks, and
// what is put together of other files), and where the environment tells a bound.
void KeepBlocksForStrips(GDALDataset& source, std::uint64_t width);

// Names the file that warnings are about from now on.
void SetSubject(const std::string& file);

// What GDAL reported as a failure since the last call, without the name of `file` at its front;
// empty if nothing. Warnings are said at once.
std::string TakeGdalError(const std::string& file);

}  // namespace zmctools

#endif
