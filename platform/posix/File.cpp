#include "platform/File.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <limits>
#include <new>
#include <string_view>

#include "platform/TextConversion.h"
#include "platform/posix/Descriptor.h"
#include "platform/posix/FileParts.h"
#include "platform/posix/Uninterrupted.h"

namespace platform {
namespace {

static_assert(sizeof(off_t) == 8, "files beyond 4 GiB need 64-bit offsets");

constexpr std::uint64_t kMaxOffset = std::numeric_limits<off_t>::max();
// One system call moves at most this much; larger transfers are cut by the loops below.
constexpr std::size_t kMaxCall = std::size_t{1} << 30;

void Tell(int* error, int number) {
    if (error) *error = number;
}

// True for an answer of the system that is no failure; the reason for one that is.
bool Told(int* error, int answer) {
    Tell(error, answer < 0 ? errno : 0);
    return answer >= 0;
}

// The zero-terminated UTF-8 form of a name; null for no name, or if memory ran out.
std::unique_ptr<char[]> NarrowName(const char16_t* name) {
    if (!name) return nullptr;
    const std::size_t units = std::u16string_view(name).size();
    const std::size_t bytes = Utf16ToUtf8(name, units, nullptr, 0);
    if (bytes == kConversionFailed) return nullptr;
    std::unique_ptr<char[]> narrow(new (std::nothrow) char[bytes + 1]);
    if (!narrow) return nullptr;
    Utf16ToUtf8(name, units, narrow.get(), bytes);
    narrow[bytes] = '\0';
    return narrow;
}

// Non-blocking, because opening a pipe would otherwise wait for its other end.
int OpenFlags(File::Mode mode) {
    const int common = O_NONBLOCK | O_NOCTTY;
    switch (mode) {
        case File::Mode::Create:
            return common | O_RDWR | O_CREAT;
        case File::Mode::Update:
            return common | O_RDWR;
        default:
            return common | O_RDONLY;
    }
}

// 0, or the reason why the descriptor is of no use.
int Prepare(int descriptor, File::Mode mode) {
    struct stat status;
    if (fstat(descriptor, &status) != 0) return errno;
    if (S_ISDIR(status.st_mode)) return EISDIR;
    if (!S_ISREG(status.st_mode)) return EINVAL;
    // Emptied only once it is known to be a regular file.
    if (mode != File::Mode::Create) return 0;
    return Uninterrupted([&] { return ftruncate(descriptor, 0); }) == 0 ? 0 : errno;
}

// Repeats `call(offset, done, size)` until all is moved, or it fails, or it moves nothing.
template <class Call>
std::size_t Transfer(std::uint64_t offset, std::size_t size, int* error, Call&& call) {
    Tell(error, 0);
    std::size_t done = 0;
    while (done < size) {
        const ssize_t moved =
            call(static_cast<off_t>(offset + done), done, std::min(size - done, kMaxCall));
        if (moved < 0 && errno == EINTR) continue;
        if (moved < 0) Tell(error, errno);
        if (moved <= 0) break;
        done += static_cast<std::size_t>(moved);
    }
    return done;
}

bool InRange(std::uint64_t offset, std::size_t size) {
    return offset <= kMaxOffset && size <= kMaxOffset - offset;
}

std::int64_t Nanoseconds(const struct timespec& time) {
    return std::int64_t{time.tv_sec} * 1'000'000'000 + time.tv_nsec;
}

}  // namespace

FileIdentity IdentityFrom(const struct stat& status) {
    FileIdentity identity;
    identity.device = status.st_dev;
    identity.number = status.st_ino;
    identity.size = static_cast<std::uint64_t>(status.st_size);
    identity.modified = Nanoseconds(status.st_mtim);
    identity.changed = Nanoseconds(status.st_ctim);
    return identity;
}

std::unique_ptr<File> TakeForReading(int descriptor, int* error) {
    return File::Take(descriptor, File::Mode::Read, error);
}

std::unique_ptr<File> File::Open(const char16_t* name, Mode mode, int* error) {
    Tell(error, name ? ENOMEM : EINVAL);
    const std::unique_ptr<char[]> narrow = NarrowName(name);
    if (!narrow) return nullptr;
    return Take(OpenForData(narrow.get(), OpenFlags(mode)), mode, error);
}

std::unique_ptr<File> File::Take(int descriptor, Mode mode, int* error) {
    if (!Told(error, descriptor)) return nullptr;
    std::unique_ptr<File> file(new (std::nothrow) File(descriptor));
    if (!file) {
        Tell(error, ENOMEM);
        close(descriptor);
        return nullptr;
    }
    const int failure = Prepare(descriptor, mode);
    Tell(error, failure);
    if (failure != 0) file.reset();
    return file;
}

File::~File() { close(descriptor); }

// Beyond what offsets can tell there is no file: to read there is to read at its end.
std::size_t File::ReadAt(std::uint64_t offset, void* buffer, std::size_t size, int* error) {
    if (!InRange(offset, size)) size = 0;
    char* const bytes = static_cast<char*>(buffer);
    return Transfer(offset, size, error, [&](off_t at, std::size_t done, std::size_t count) {
        return pread(descriptor, bytes + done, count, at);
    });
}

std::size_t File::WriteAt(std::uint64_t offset, const void* buffer, std::size_t size, int* error) {
    if (!InRange(offset, size)) {
        Tell(error, EFBIG);
        return 0;
    }
    const char* const bytes = static_cast<const char*>(buffer);
    return Transfer(offset, size, error, [&](off_t at, std::size_t done, std::size_t count) {
        return pwrite(descriptor, bytes + done, count, at);
    });
}

std::uint64_t File::Size() const {
    std::uint64_t size = 0;
    return TellSize(size) ? size : kUnknownSize;
}

bool File::TellSize(std::uint64_t& size, int* error) const {
    struct stat status;
    if (!Told(error, fstat(descriptor, &status))) return false;
    size = static_cast<std::uint64_t>(status.st_size);
    return true;
}

bool File::TellIdentity(FileIdentity& identity) const {
    struct stat status;
    if (fstat(descriptor, &status) != 0) return false;
    identity = IdentityFrom(status);
    return true;
}

int File::Duplicate() const { return ::fcntl(descriptor, F_DUPFD_CLOEXEC, kFirstDataDescriptor); }

bool File::Truncate(std::uint64_t size, int* error) {
    Tell(error, EFBIG);
    return size <= kMaxOffset && Told(error, Uninterrupted([&] {
                                          return ftruncate(descriptor, static_cast<off_t>(size));
                                      }));
}

bool File::Sync(int* error) {
    return Told(error, Uninterrupted([&] { return fsync(descriptor); }));
}

bool TellIdentity(const char16_t* name, FileIdentity& identity) {
    const std::unique_ptr<char[]> narrow = NarrowName(name);
    struct stat status;
    if (!narrow || stat(narrow.get(), &status) != 0) return false;
    identity = IdentityFrom(status);
    return true;
}

bool RemoveFile(const char16_t* name, int* error) {
    Tell(error, name ? ENOMEM : EINVAL);
    const std::unique_ptr<char[]> narrow = NarrowName(name);
    return narrow && Told(error, std::remove(narrow.get()));
}

}  // namespace platform
