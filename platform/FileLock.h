// FileLock: a mark on a file that one holder in all processes can have; others that ask for it see
// that it is taken. It hinders no reading or writing.
//
// It goes when the object does, and when its process ends in whatever way, and it stays with the
// file when that is renamed. Paths are narrow UTF-8. Nothing throws. Of file systems without locks
// every asker fails.
#ifndef ZMC_PLATFORM_FILELOCK_H
#define ZMC_PLATFORM_FILELOCK_H

#include <string>

namespace platform {

class FileLock {
public:
    enum class Result {
        Taken,
        Held,     // somebody has it
        Missing,  // there is no such file, or was none by the time that the lock was had
        Failed,   // LastErrorText tells why
    };

    FileLock() = default;
    ~FileLock() { Release(); }
    FileLock(const FileLock&) = delete;
    FileLock& operator=(const FileLock&) = delete;

    // Does not wait. What the object held before is released first.
    Result Take(const std::string& path);
    void Release();

private:
    int descriptor = -1;
};

}  // namespace platform

#endif
