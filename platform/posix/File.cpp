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
#include "platform/posix/Uninterrupted.h"

namespace platform {
namespace {

static_assert(sizeof(off_t) == 8, "files beyond 4 GiB need 64-bit offsets");

constexpr std::uint64_t kMaxOffset = std::numeric_limits<off_t>::max();
// One system call moves at most this much; larger transfers are cut by the loops below.
constexpr std::size_t kMaxCall = std::size_t{1} << 30;

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
    const int common = O_CLOEXEC | O_NONBLOCK | O_NOCTTY;
    switch (mode) {
        case File::Mode::Create:
            return common | O_RDWR | O_CREAT;
        case File::Mode::Update:
            return common | O_RDWR;
        default:
            return common | O_RDONLY;
    }
}

bool IsRegular(int descriptor) {
    struct stat status;
    return fstat(descriptor, &status) == 0 && S_ISREG(status.st_mode);
}

// Emptied only once it is known to be a regular file.
bool Prepare(int descriptor, File::Mode mode) {
    return IsRegular(descriptor) && (mode != File::Mode::Create ||
                                     Uninterrupted([&] { return ftruncate(descriptor, 0); }) == 0);
}

// Repeats `call(offset, done, size)` until all is moved, or it fails, or it moves nothing.
template <class Call>
std::size_t Transfer(std::uint64_t offset, std::size_t size, Call&& call) {
    if (offset > kMaxOffset || size > kMaxOffset - offset) return 0;
    std::size_t done = 0;
    while (done < size) {
        const ssize_t moved =
            call(static_cast<off_t>(offset + done), done, std::min(size - done, kMaxCall));
        if (moved < 0 && errno == EINTR) continue;
        if (moved <= 0) break;
        done += static_cast<std::size_t>(moved);
    }
    return done;
}

}  // namespace

std::unique_ptr<File> File::Open(const char16_t* name, Mode mode) {
    const std::unique_ptr<char[]> narrow = NarrowName(name);
    if (!narrow) return nullptr;
    const int descriptor = Uninterrupted([&] { return open(narrow.get(), OpenFlags(mode), 0666); });
    if (descriptor < 0) return nullptr;
    std::unique_ptr<File> file;
    if (Prepare(descriptor, mode)) file.reset(new (std::nothrow) File(descriptor));
    if (!file) close(descriptor);
    return file;
}

File::~File() { close(descriptor); }

std::size_t File::ReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    char* const bytes = static_cast<char*>(buffer);
    return Transfer(offset, size, [&](off_t at, std::size_t done, std::size_t count) {
        return pread(descriptor, bytes + done, count, at);
    });
}

std::size_t File::WriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
    const char* const bytes = static_cast<const char*>(buffer);
    return Transfer(offset, size, [&](off_t at, std::size_t done, std::size_t count) {
        return pwrite(descriptor, bytes + done, count, at);
    });
}

std::uint64_t File::Size() const {
    std::uint64_t size = 0;
    return TellSize(size) ? size : kUnknownSize;
}

bool File::TellSize(std::uint64_t& size) const {
    struct stat status;
    if (fstat(descriptor, &status) != 0) return false;
    size = static_cast<std::uint64_t>(status.st_size);
    return true;
}

bool File::Truncate(std::uint64_t size) {
    return size <= kMaxOffset &&
           Uninterrupted([&] { return ftruncate(descriptor, static_cast<off_t>(size)); }) == 0;
}

bool File::Sync() {
    return Uninterrupted([&] { return fsync(descriptor); }) == 0;
}

bool RemoveFile(const char16_t* name) {
    const std::unique_ptr<char[]> narrow = NarrowName(name);
    return narrow && std::remove(narrow.get()) == 0;
}

}  // namespace platform
