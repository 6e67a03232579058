// FileLock: a mark on a file that one holder in all processes can have; others that ask for it see
// that it is taken. It hinders no reading or writing.
//
// It goes when the object does, and when its process ends in whatever way, and it stays with the
// file when that is renamed. Only regular files are locked, and no link is followed to one: what
// stands under a name that others may give away is a pipe, a device or somebody else's file as
// easily. Paths are narrow UTF-8. Nothing throws. On file systems without locks nobody has one;
// whether processes on several machines see each other's locks is the file system's affair.
#ifndef ZMC_PLATFORM_FILELOCK_H
#define ZMC_PLATFORM_FILELOCK_H

#include <cstddef>
#include <cstdint>
#include <string>

#include "platform/FileSystem.h"

namespace platform {

class FileLock {
public:
    enum class Result {
        Taken,
        Held,     // somebody has it
        Missing,  // there is no such file, or was none by the time that the lock was had
        NoLocks,  // the file system knows none; LastErrorText tells so
        Failed,   // LastErrorText tells why
    };
    enum class Kind {
        Alone,
        Shared,  // any number of these at once, and none of the other kind: for those who look
    };

    FileLock() = default;
    ~FileLock() { Release(); }
    FileLock(const FileLock&) = delete;
    FileLock& operator=(const FileLock&) = delete;

    // Does not wait. What the object held before is released first.
    Result Take(const std::string& path, Kind kind = Kind::Alone);
    void Release();

    // The file that is held, whatever has taken its name since. Without one it does not exist, and
    // has no bytes.
    FileStatus Status() const noexcept;
    // Bytes read: fewer at the end of the file, or where it cannot be read.
    std::size_t ReadAt(std::uint64_t offset, void* buffer, std::size_t size) const noexcept;

private:
    int descriptor = -1;
};

}  // namespace platform

#endif
