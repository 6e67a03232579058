// SourceState: what the files of a raster are at a moment, as one short text.
#ifndef ZMC_TOOLS_SOURCESTATE_H
#define ZMC_TOOLS_SOURCESTATE_H

#include <gdal_priv.h>

#include <cstdint>
#include <string>

namespace zmctools {

// The same as long as no file that GDAL tells of the raster has another name, size or time of its
// last write, on whatever machine and below whatever folder. What is in no file (a database, a
// service) tells its name alone.
std::string SourceState(GDALDataset& dataset);

// The same of one file, and which file it is; empty if there is none.
std::string FileState(const std::string& path);

// A number as such texts and plans have it.
std::string HexText(std::uint64_t number);

}  // namespace zmctools

#endif
