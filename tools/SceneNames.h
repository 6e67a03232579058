// SceneNames: the names of many rasters where the command line has one word for them.
//
//     @FILE              a text file, one name a line; blank lines and those with # in front are
//                        passed over, and names are looked up from the folder of the file
//     FOLDER/*.tif       what lies in the folder and fits, * for any bytes and ? for one, sorted
//
// A raster that has such a name itself is that raster, and a folder alone is what GDAL takes it
// for.
#ifndef ZMC_TOOLS_SCENENAMES_H
#define ZMC_TOOLS_SCENENAMES_H

#include <optional>
#include <string>
#include <vector>

namespace zmctools {

// Nothing where the word names one raster. Names are absolute, but for those that GDAL knows and
// no file system. Throws Failure for a list that cannot be read, is too long or names nothing.
std::optional<std::vector<std::string>> SceneNames(const std::string& source);

// The path from the root, without "." and ".."; as it is where there is no current folder.
std::string Absolute(const std::string& path);

// The word itself, absolute where it leads to a list or a folder.
std::string FromAnywhere(const std::string& source);

}  // namespace zmctools

#endif
