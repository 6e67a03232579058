#include "gdal/FileState.h"

#include <cpl_vsi.h>

#include "files/FileSource.h"
#include "host/base/Error.h"
#include "host/base/Text.h"

namespace zmcgdal {
namespace {

using zelm::files::FileSource;
using zelm::files::Identity;

// Of a file that the system knows; unknown otherwise, as of those of GDAL's virtual file systems.
Identity FileIdentity(const std::string& path) {
    try {
        return FileSource::IdentifyName(zmchost::WideFileName(path));
    } catch (const zmchost::Error&) {
        return {};
    }
}

}  // namespace

// The file's number and its last change of any kind differ from machine to machine, or with a copy.
std::string FileState(const std::string& path) {
    const Identity identity = FileIdentity(path);
    if (identity.known)
        return std::to_string(identity.size) + '@' + std::to_string(identity.modified);
    VSIStatBufL status;
    if (VSIStatExL(path.c_str(), &status, VSI_STAT_EXISTS_FLAG | VSI_STAT_SIZE_FLAG) != 0)
        return "";
    return std::to_string(status.st_size) + '@' + std::to_string(status.st_mtime);
}

}  // namespace zmcgdal
