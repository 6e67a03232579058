#include "platform/FileLock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace platform {
namespace {

// The file may have been removed, and another one made, while its lock was waited for.
bool StillBears(int descriptor, const std::string& path) {
    struct stat ours {};
    struct stat named {};
    return ::fstat(descriptor, &ours) == 0 && ::stat(path.c_str(), &named) == 0 &&
           ours.st_ino == named.st_ino && ours.st_dev == named.st_dev;
}

int LockNow(int descriptor) {
    int result;
    do {
        result = ::flock(descriptor, LOCK_EX | LOCK_NB);
    } while (result != 0 && errno == EINTR);
    return result;
}

}  // namespace

FileLock::Result FileLock::Take(const std::string& path) {
    Release();
    do {
        descriptor = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    } while (descriptor < 0 && errno == EINTR);
    if (descriptor < 0) return errno == ENOENT ? Result::Missing : Result::Failed;
    Result result = Result::Taken;
    if (LockNow(descriptor) != 0)
        result = errno == EWOULDBLOCK ? Result::Held : Result::Failed;
    else if (!StillBears(descriptor, path))
        result = Result::Missing;
    const int kept = errno;
    if (result != Result::Taken) Release();
    errno = kept;
    return result;
}

void FileLock::Release() {
    if (descriptor >= 0) ::close(descriptor);
    descriptor = -1;
}

}  // namespace platform
