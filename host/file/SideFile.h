// SideFile: names of the files that this library puts beside a file of a user's.
//
// A temporary file of NAME is called ".NAME.KIND-PROCESS-RANDOM.tmp", so that whoever comes next
// can tell the leavings of a dead process. Names longer than a file system takes are cut. Paths are
// those of the file itself, links resolved.
#ifndef ZMC_HOST_FILE_SIDEFILE_H
#define ZMC_HOST_FILE_SIDEFILE_H

#include <string>

namespace zmchost {

class SideFile {
public:
    // "NAME" cut so that some 50 bytes more make a name: between two characters, and then with a
    // number of the whole name behind it.
    static std::string Stem(const std::string& file);

    // A new name for a temporary file of that kind.
    static std::string TemporaryPath(const std::string& file, const std::string& kind);
    // Removes the temporary files of that kind that processes which are gone have left.
    static void RemoveStale(const std::string& file, const std::string& kind);
};

}  // namespace zmchost

#endif
