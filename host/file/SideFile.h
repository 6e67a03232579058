// SideFile: names of the files that this library puts beside a file of a user's.
//
// A temporary file of NAME is called ".NAME.KIND-PROCESS-RANDOM.tmp". Who makes one holds its
// lock for as long as it is wanted, so that whoever comes next can tell what is left over: a number
// of a process means nothing in another container or on another machine. Names longer than a file
// system takes are cut. Paths are those of the file itself, links resolved.
#ifndef ZMC_HOST_FILE_SIDEFILE_H
#define ZMC_HOST_FILE_SIDEFILE_H

#include <functional>
#include <string>

#include "platform/FileLock.h"

namespace zmchost {

class SideFile {
public:
    // "NAME" cut so that some 50 bytes more make a name: between two characters, and then with a
    // number of the whole name behind it.
    static std::string Stem(const std::string& file);

    // What the names of files of that kind begin with: ".NAME.KIND-", NAME cut.
    static std::string Prefix(const std::string& file, const std::string& kind);

    // A new name for a temporary file of that kind.
    static std::string TemporaryPath(const std::string& file, const std::string& kind);
    // Makes an empty temporary file of that kind and takes its lock, which has no file where the
    // file system knows no locks: nobody can take such a file for stale. The path; empty, with
    // LastErrorText, if that cannot be done.
    static std::string MakeTemporary(const std::string& file, const std::string& kind,
                                     platform::FileLock& lock);
    // Whether a file of that name, whose lock is held by then, is to stay nevertheless.
    using Spare = std::function<bool(const std::string& name)>;
    // Removes the temporary files of that kind whose lock nobody holds.
    static void RemoveStale(const std::string& file, const std::string& kind,
                            const Spare& spare = {});
};

}  // namespace zmchost

#endif
