// FileState: what a file is at a moment, as one short text.
#ifndef ZMC_GDAL_FILESTATE_H
#define ZMC_GDAL_FILESTATE_H

#include <string>

namespace zmcgdal {

// Size and time of the last write: the same as long as nobody writes to the file, on whatever
// machine. Names of GDAL's virtual file systems are taken too. Empty if there is no such file.
std::string FileState(const std::string& path);

}  // namespace zmcgdal

#endif
