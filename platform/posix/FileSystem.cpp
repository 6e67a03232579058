#include "platform/FileSystem.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <system_error>

#include "platform/Random.h"
#include "platform/posix/Descriptor.h"
#include "platform/posix/StatusFrom.h"
#include "platform/posix/Uninterrupted.h"

namespace platform {
namespace {

class Descriptor {
public:
    Descriptor(const std::string& path, int flags) : value(OpenForData(path.c_str(), flags)) {}
    ~Descriptor() {
        const int kept = errno;
        if (value >= 0) ::close(value);
        errno = kept;
    }
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;
    explicit operator bool() const { return value >= 0; }

    const int value;
};

bool Sync(const std::string& path, int flags) {
    const Descriptor file(path, flags);
    return file && Uninterrupted([&] { return ::fsync(file.value); }) == 0;
}

}  // namespace

std::string ErrorText(int error) { return std::generic_category().message(error); }

std::string LastErrorText() { return ErrorText(errno); }

FileStatus StatusOf(const std::string& path) noexcept {
    struct stat info {};
    if (::stat(path.c_str(), &info) != 0) return FileStatus();
    FileStatus status = StatusFrom(info);
    status.readOnly = status.readOnly || ::access(path.c_str(), W_OK) != 0;
    return status;
}

bool MaySpeakFor(const FileStatus& note, const FileStatus& file) noexcept {
    return note.owner == file.owner || note.owner == 0 || note.owner == ::geteuid();
}

std::string FolderOf(const std::string& path) {
    const std::size_t slash = path.find_last_of('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

std::string NameOf(const std::string& path) {
    const std::size_t slash = path.find_last_of('/');
    return slash == std::string::npos ? path : path.substr(slash + 1);
}

std::string JoinPath(const std::string& folder, const std::string& name) {
    if (folder == ".") return name;
    return folder.ends_with('/') ? folder + name : folder + '/' + name;
}

std::string ResolveLinks(const std::string& path) {
    constexpr int kMostLinks = 40;
    std::string current = path;
    for (int i = 0; i < kMostLinks; ++i) {
        char target[PATH_MAX];
        const ssize_t length = ::readlink(current.c_str(), target, sizeof target);
        if (length < 0) return current;
        const std::string next(target, static_cast<std::size_t>(length));
        current = next.starts_with('/') ? next : JoinPath(FolderOf(current), next);
    }
    return path;
}

std::vector<std::string> ListFolder(const std::string& folder) {
    std::vector<std::string> names;
    const std::unique_ptr<DIR, int (*)(DIR*)> stream(::opendir(folder.c_str()), ::closedir);
    if (!stream) return names;
    // NOLINTNEXTLINE(concurrency-mt-unsafe): the stream is this call's own.
    while (const dirent* entry = ::readdir(stream.get())) names.emplace_back(entry->d_name);
    return names;
}

bool CreateNewFile(const std::string& path) noexcept {
    return static_cast<bool>(Descriptor(path, O_WRONLY | O_CREAT | O_EXCL));
}

bool RenameFile(const std::string& from, const std::string& to) noexcept {
    return ::rename(from.c_str(), to.c_str()) == 0;
}

bool RenameToNewName(const std::string& from, const std::string& to) noexcept {
#if defined(RENAME_NOREPLACE)
    if (::renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0)
        return true;
    if (errno != EINVAL && errno != ENOSYS) return false;
#endif
    // A file system without that service: a second name, and away with the first.
    return ::link(from.c_str(), to.c_str()) == 0 && ::unlink(from.c_str()) == 0;
}

bool LinkFile(const std::string& file, const std::string& name) noexcept {
    return ::link(file.c_str(), name.c_str()) == 0;
}

bool RemoveEntry(const std::string& path) noexcept { return ::unlink(path.c_str()) == 0; }

bool RemoveFolder(const std::string& path) noexcept { return ::rmdir(path.c_str()) == 0; }

bool SyncFile(const std::string& path) noexcept { return Sync(path, O_RDONLY); }

bool SyncFolder(const std::string& folder) noexcept { return Sync(folder, O_RDONLY | O_DIRECTORY); }

void BeginSync(const std::string& path) noexcept {
#if defined(__linux__)
    const Descriptor file(path, O_RDONLY);
    if (file) ::sync_file_range(file.value, 0, 0, SYNC_FILE_RANGE_WRITE);
#else
    static_cast<void>(path);
#endif
}

std::optional<std::uint64_t> FreeSpace(const std::string& folder) noexcept {
    struct statvfs info {};
    if (::statvfs(folder.c_str(), &info) != 0) return std::nullopt;
    const std::uint64_t blocks = ::geteuid() == 0 ? info.f_bfree : info.f_bavail;
    return blocks * info.f_frsize;
}

bool ReserveSpace(const std::string& path, std::uint64_t size) noexcept {
    const Descriptor file(path, O_WRONLY);
    if (!file) return false;
#if defined(__linux__)
    const auto reserve = [&] {
        return ::fallocate(file.value, FALLOC_FL_KEEP_SIZE, 0, static_cast<off_t>(size));
    };
    if (Uninterrupted(reserve) == 0) return true;
    return errno != ENOSPC && errno != EDQUOT && errno != EFBIG;
#else
    static_cast<void>(size);
    return true;
#endif
}

void DropRange(const std::string& path, std::uint64_t offset, std::uint64_t size) noexcept {
    const Descriptor file(path, O_WRONLY);
    if (!file || size == 0) return;
#if defined(__linux__)
    static_cast<void>(Uninterrupted([&] {
        return ::fallocate(file.value, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE,
                           static_cast<off_t>(offset), static_cast<off_t>(size));
    }));
#else
    static_cast<void>(offset);
#endif
}

bool ReleaseReserve(const std::string& path) noexcept {
    const Descriptor file(path, O_WRONLY);
    struct stat info {};
    return file && ::fstat(file.value, &info) == 0 &&
           Uninterrupted([&] { return ::ftruncate(file.value, info.st_size); }) == 0;
}

std::string SystemRun() {
    char text[64];
    const Descriptor file("/proc/sys/kernel/random/boot_id", O_RDONLY);
    const ssize_t length = file ? ::read(file.value, text, sizeof text) : 0;
    std::string run(text, length > 0 ? static_cast<std::size_t>(length) : 0);
    while (run.ends_with('\n')) run.pop_back();
    return run;
}

std::uint64_t CurrentProcess() noexcept { return static_cast<std::uint64_t>(::getpid()); }

std::uint64_t RandomNumber() noexcept {
    std::uint64_t number = 0;
    if (RandomBytes(&number, sizeof number)) return number;
    // unreachable: only where the system has no random numbers; time and count differ then
    static std::atomic<std::uint64_t> calls{0};
    const auto now = std::chrono::system_clock::now().time_since_epoch().count();
    return (CurrentProcess() << 40) ^ (++calls << 32) ^ static_cast<std::uint64_t>(now);
}

}  // namespace platform
