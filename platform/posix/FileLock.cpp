#include "platform/FileLock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "platform/posix/Descriptor.h"
#include "platform/posix/Uninterrupted.h"

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
    return Uninterrupted([&] { return ::flock(descriptor, LOCK_EX | LOCK_NB); });
}

}  // namespace

FileLock::Result FileLock::Take(const std::string& path) {
    Release();
    descriptor = OpenForData(path.c_str(), O_RDONLY | O_NONBLOCK);
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
