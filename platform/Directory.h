// Directories and paths by narrow name.
//
// Names are bytes as the system takes them. Nothing throws; any thread may call.
#ifndef ZMC_PLATFORM_DIRECTORY_H
#define ZMC_PLATFORM_DIRECTORY_H

namespace platform {

// What stands between the components of a path.
extern const char kPathSeparator[];

// True if a file or directory of that name exists; a null name does not exist.
bool PathExists(const char* name);

// Makes one directory; false if it is there already, or its parent is not, or it is not allowed.
bool MakeDirectory(const char* name);

// Tests for the directory, makes it once if it is missing, and tests again.
inline bool EnsureDirectory(const char* testedName, const char* madeName) {
    if (PathExists(testedName)) return true;
    MakeDirectory(madeName);
    return PathExists(testedName);
}

}  // namespace platform

#endif
