#include "platform/FileLock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "platform/posix/Descriptor.h"
#include "platform/posix/StatusFrom.h"
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

int LockNow(int descriptor, FileLock::Kind kind) {
    const int wanted = kind == FileLock::Kind::Shared ? LOCK_SH : LOCK_EX;
    return Uninterrupted([&] { return ::flock(descriptor, wanted | LOCK_NB); });
}

FileLock::Result ResultOf(int error) {
    if (error == EWOULDBLOCK) return FileLock::Result::Held;
    const bool unknown = error == ENOLCK || error == EOPNOTSUPP || error == ENOTSUP;
    return unknown ? FileLock::Result::NoLocks : FileLock::Result::Failed;
}

// For writing where that is allowed, since some file systems lock nothing else for one alone.
int OpenToLock(const char* path, FileLock::Kind kind) {
    constexpr int kFlags = O_NONBLOCK | O_NOCTTY | O_NOFOLLOW;
    if (kind == FileLock::Kind::Alone) {
        const int opened = OpenForData(path, O_RDWR | kFlags);
        if (opened >= 0 || (errno != EACCES && errno != EROFS && errno != EPERM)) return opened;
    }
    return OpenForData(path, O_RDONLY | kFlags);
}

}  // namespace

FileLock::Result FileLock::Take(const std::string& path, Kind kind) {
    Release();
    descriptor = OpenToLock(path.c_str(), kind);
    if (descriptor < 0) return errno == ENOENT ? Result::Missing : Result::Failed;
    Result result = Result::Taken;
    if (const FileStatus status = Status(); status.exists && !status.isRegular) {
        errno = status.isFolder ? EISDIR : EINVAL;
        result = Result::Failed;
    } else if (LockNow(descriptor, kind) != 0) {
        result = ResultOf(errno);
    } else if (!StillBears(descriptor, path)) {
        result = Result::Missing;
    }
    const int kept = errno;
    if (result != Result::Taken) Release();
    errno = kept;
    return result;
}

void FileLock::Release() {
    if (descriptor >= 0) ::close(descriptor);
    descriptor = -1;
}

FileStatus FileLock::Status() const noexcept {
    struct stat info {};
    return descriptor >= 0 && ::fstat(descriptor, &info) == 0 ? StatusFrom(info) : FileStatus();
}

std::size_t FileLock::ReadAt(std::uint64_t offset, void* buffer, std::size_t size) const noexcept {
    std::size_t done = 0;
    while (done < size) {
        const ssize_t got = ::pread(descriptor, static_cast<char*>(buffer) + done, size - done,
                                    static_cast<off_t>(offset + done));
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) break;
        done += static_cast<std::size_t>(got);
    }
    return done;
}

}  // namespace platform
