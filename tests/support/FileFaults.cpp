// The replacements stand before the C library's functions in the order of look-up and hand every
// call on to them. They allocate nothing and keep errno where they succeed, because they may be met
// anywhere, load time and failing memory included.
#undef _FORTIFY_SOURCE  // whose inline forms of these functions could not be defined again
#include "tests/support/FileFaults.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "tests/support/DiskRecorder.h"

namespace zmctest {
namespace {

struct Orders {
    char folder[PATH_MAX];
    std::size_t folderLength;
    unsigned calls;
    std::size_t n;
    bool fromThenOn;
    FileFaultAction action;
    int error;
    char countFile[PATH_MAX];
};

// Plain data: calls come before any constructor has run.
Orders orders;
std::atomic<bool> armed;
std::atomic<std::size_t> count;
std::atomic<std::size_t> failed;
std::atomic<unsigned> failedKinds;

bool BelowFolder(const char* path) {
    return path && std::strncmp(path, orders.folder, orders.folderLength) == 0 &&
           (path[orders.folderLength] == '/' || path[orders.folderLength] == '\0');
}

bool BelowFolder(int descriptor) {
    char link[32];
    std::snprintf(link, sizeof link, "/proc/self/fd/%d", descriptor);
    char path[PATH_MAX];
    const ssize_t length = readlink(link, path, sizeof path - 1);
    if (length < 0) return false;
    path[length] = '\0';
    return BelowFolder(path);
}

// Whether this call is one that fails.
template <class Place>
bool ShallFail(FileCall kind, Place place) {
    if (!armed.load() || (orders.calls & kind) == 0) return false;
    const int kept = errno;
    const bool below = BelowFolder(place);
    errno = kept;
    if (!below) return false;
    const std::size_t number = ++count;
    const bool fail =
        orders.n != 0 && (orders.fromThenOn ? number >= orders.n : number == orders.n);
    if (fail) {
        ++failed;
        failedKinds |= kind;
    }
    return fail;
}

[[noreturn]] void EndProcess() {
    kill(getpid(), SIGKILL);
    for (;;) pause();
}

template <class Function>
Function Next(const char* name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

// A call that moves nothing: true if it fails, with errno set.
template <class Place>
bool CallFails(FileCall kind, Place place) {
    if (!ShallFail(kind, place)) return false;
    if (orders.action == FileFaultAction::Kill || orders.action == FileFaultAction::KillPartway)
        EndProcess();
    if (orders.action != FileFaultAction::Error) return false;
    errno = orders.error;
    return true;
}

// What has changed, or reached the disk, by a call that did not fail.
void Note(FileCall kind) {
    if ((kind & (kChangingCall | kOpenCall | kCloseCall)) != 0) recorder::Changed();
}
int Noted(FileCall kind, int result, const char*) {
    if (result >= 0) Note(kind);
    return result;
}
int Noted(FileCall kind, int result, int descriptor) {
    if (result >= 0 && kind == kSyncCall) recorder::Flushed(descriptor);
    if (result >= 0) Note(kind);
    return result;
}

// A transfer of `size` bytes by `move(size)`.
template <class Move>
ssize_t Transfer(FileCall kind, int descriptor, std::size_t size, Move move) {
    if (!ShallFail(kind, descriptor)) {
        const ssize_t moved = move(size);
        if (moved > 0) Note(kind);
        return moved;
    }
    const std::size_t half = size > 1 ? size / 2 : size;
    switch (orders.action) {
        case FileFaultAction::Short:
            return move(half);
        case FileFaultAction::Nothing:
            return 0;
        case FileFaultAction::KillPartway:
            move(size / 2);
            EndProcess();
        case FileFaultAction::Kill:
            EndProcess();
        case FileFaultAction::Error:
            break;
    }
    errno = orders.error;
    return -1;
}

void Arm(const FileFault& fault) {
    armed = false;
    std::snprintf(orders.folder, sizeof orders.folder, "%s", fault.folder.c_str());
    orders.folderLength = std::strlen(orders.folder);
    orders.calls = fault.calls;
    orders.n = fault.n;
    orders.fromThenOn = fault.fromThenOn;
    orders.action = fault.action;
    orders.error = fault.error;
    count = failed = 0;
    failedKinds = 0;
    armed = true;
}

constexpr const char* kOrderName = "ZMC_FILE_FAULTS";
constexpr const char* kCountName = "ZMC_FILE_FAULTS_COUNT";

// Takes the order of the environment, in a process that was started with this library preloaded.
[[gnu::constructor]] void TakeOrder() {
    const char* const text = std::getenv(kOrderName);
    if (!text) return;
    FileFault fault;
    int action = 0, forGood = 0, folder = 0;
    if (std::sscanf(text, "%u %zu %d %d %d %n", &fault.calls, &fault.n, &forGood, &action,
                    &fault.error, &folder) < 5)
        return;
    fault.fromThenOn = forGood != 0;
    fault.action = static_cast<FileFaultAction>(action);
    fault.folder = text + folder;
    if (const char* const file = std::getenv(kCountName))
        std::snprintf(orders.countFile, sizeof orders.countFile, "%s", file);
    Arm(fault);
}

[[gnu::destructor]] void LeaveCount() {
    armed = false;
    if (orders.countFile[0] == '\0') return;
    if (std::FILE* const file = std::fopen(orders.countFile, "w")) {
        std::fprintf(file, "%zu\n", count.load());
        std::fclose(file);
    }
}

}  // namespace

FileFaults::FileFaults(const FileFault& fault) { Arm(fault); }
FileFaults::~FileFaults() { Disarm(); }
void FileFaults::Disarm() { armed = false; }
std::size_t FileFaults::Count() const { return count; }
std::size_t FileFaults::Failed() const { return failed; }
unsigned FileFaults::FailedKinds() const { return failedKinds; }

std::vector<std::string> FileFaults::ForChild(const FileFault& fault,
                                              const std::string& countFile) {
    Dl_info self{};
    dladdr(reinterpret_cast<const void*>(&Arm), &self);
    std::vector<std::string> environment = {
        "LD_PRELOAD=" + std::string(self.dli_fname ? self.dli_fname : ""),
        std::string(kOrderName) + '=' + std::to_string(fault.calls) + ' ' +
            std::to_string(fault.n) + ' ' + std::to_string(fault.fromThenOn ? 1 : 0) + ' ' +
            std::to_string(static_cast<int>(fault.action)) + ' ' + std::to_string(fault.error) +
            ' ' + fault.folder};
    if (!countFile.empty()) environment.push_back(std::string(kCountName) + '=' + countFile);
    return environment;
}

}  // namespace zmctest

using zmctest::CallFails;
using zmctest::FileCall;
using zmctest::Next;
using zmctest::Noted;
using zmctest::Transfer;

// The C library has most functions under several names: with and without 64, and fortified.
#define ZMC_EXPORT extern "C" __attribute__((visibility("default")))

#define ZMC_OPEN(name)                                                                       \
    ZMC_EXPORT int name(const char* path, int flags, ...) {                                  \
        va_list rest;                                                                        \
        va_start(rest, flags);                                                               \
        const mode_t mode = (flags & (O_CREAT | O_TMPFILE)) ? va_arg(rest, mode_t) : 0;      \
        va_end(rest);                                                                        \
        if (CallFails(zmctest::kOpenCall, path)) return -1;                                  \
        static const auto next = Next<int (*)(const char*, int, ...)>(#name);                \
        return Noted(zmctest::kOpenCall, next(zmctest::recorder::Opened(path), flags, mode), \
                     path);                                                                  \
    }
ZMC_OPEN(open)
ZMC_OPEN(open64)

#define ZMC_OPEN_AT(name)                                                               \
    ZMC_EXPORT int name(int folder, const char* path, int flags, ...) {                 \
        va_list rest;                                                                   \
        va_start(rest, flags);                                                          \
        const mode_t mode = (flags & (O_CREAT | O_TMPFILE)) ? va_arg(rest, mode_t) : 0; \
        va_end(rest);                                                                   \
        if (CallFails(zmctest::kOpenCall, path)) return -1;                             \
        static const auto next = Next<int (*)(int, const char*, int, ...)>(#name);      \
        return Noted(zmctest::kOpenCall, next(folder, path, flags, mode), path);        \
    }
ZMC_OPEN_AT(openat)
ZMC_OPEN_AT(openat64)

#define ZMC_FORTIFIED_OPEN(name)                                                              \
    ZMC_EXPORT int name(const char* path, int flags) {                                        \
        if (CallFails(zmctest::kOpenCall, path)) return -1;                                   \
        static const auto next = Next<int (*)(const char*, int)>(#name);                      \
        return Noted(zmctest::kOpenCall, next(zmctest::recorder::Opened(path), flags), path); \
    }
ZMC_FORTIFIED_OPEN(__open_2)
ZMC_FORTIFIED_OPEN(__open64_2)

#define ZMC_FOPEN(name)                                                                 \
    ZMC_EXPORT std::FILE* name(const char* path, const char* mode) {                    \
        if (CallFails(zmctest::kOpenCall, path)) return nullptr;                        \
        static const auto next = Next<std::FILE* (*)(const char*, const char*)>(#name); \
        std::FILE* const stream = next(path, mode);                                     \
        if (stream) zmctest::Note(zmctest::kOpenCall);                                  \
        return stream;                                                                  \
    }
ZMC_FOPEN(fopen)
ZMC_FOPEN(fopen64)

ZMC_EXPORT ssize_t read(int file, void* buffer, size_t size) {
    static const auto next = Next<ssize_t (*)(int, void*, size_t)>("read");
    return Transfer(zmctest::kReadCall, file, size,
                    [&](size_t part) { return next(file, buffer, part); });
}

ZMC_EXPORT ssize_t __read_chk(int file, void* buffer, size_t size, size_t room) {
    static const auto next = Next<ssize_t (*)(int, void*, size_t, size_t)>("__read_chk");
    return Transfer(zmctest::kReadCall, file, size,
                    [&](size_t part) { return next(file, buffer, part, room); });
}

#define ZMC_PREAD(name)                                                                 \
    ZMC_EXPORT ssize_t name(int file, void* buffer, size_t size, off_t offset) {        \
        static const auto next = Next<ssize_t (*)(int, void*, size_t, off_t)>(#name);   \
        return Transfer(zmctest::kReadCall, file, size,                                 \
                        [&](size_t part) { return next(file, buffer, part, offset); }); \
    }
ZMC_PREAD(pread)
ZMC_PREAD(pread64)

#define ZMC_FORTIFIED_PREAD(name)                                                             \
    ZMC_EXPORT ssize_t name(int file, void* buffer, size_t size, off_t offset, size_t room) { \
        static const auto next = Next<ssize_t (*)(int, void*, size_t, off_t, size_t)>(#name); \
        return Transfer(zmctest::kReadCall, file, size,                                       \
                        [&](size_t part) { return next(file, buffer, part, offset, room); }); \
    }
ZMC_FORTIFIED_PREAD(__pread_chk)
ZMC_FORTIFIED_PREAD(__pread64_chk)

ZMC_EXPORT ssize_t write(int file, const void* buffer, size_t size) {
    static const auto next = Next<ssize_t (*)(int, const void*, size_t)>("write");
    return Transfer(zmctest::kWriteCall, file, size,
                    [&](size_t part) { return next(file, buffer, part); });
}

// A part of several pieces is a part of the first.
ZMC_EXPORT ssize_t writev(int file, const iovec* pieces, int number) {
    static const auto next = Next<ssize_t (*)(int, const iovec*, int)>("writev");
    static const auto one = Next<ssize_t (*)(int, const void*, size_t)>("write");
    size_t size = 0;
    for (int i = 0; i < number; ++i) size += pieces[i].iov_len;
    return Transfer(zmctest::kWriteCall, file, size, [&](size_t part) {
        if (part == size) return next(file, pieces, number);
        return one(file, pieces[0].iov_base, std::min(part, pieces[0].iov_len));
    });
}

#define ZMC_PWRITE(name)                                                                    \
    ZMC_EXPORT ssize_t name(int file, const void* buffer, size_t size, off_t offset) {      \
        static const auto next = Next<ssize_t (*)(int, const void*, size_t, off_t)>(#name); \
        return Transfer(zmctest::kWriteCall, file, size,                                    \
                        [&](size_t part) { return next(file, buffer, part, offset); });     \
    }
ZMC_PWRITE(pwrite)
ZMC_PWRITE(pwrite64)

// Calls that move nothing, by the descriptor or the path that they begin with.
#define ZMC_CALL(kind, name, place, parameters, arguments, promise) \
    ZMC_EXPORT int name parameters promise {                        \
        if (CallFails(zmctest::kind, place)) return -1;             \
        static const auto next = Next<int(*) parameters>(#name);    \
        return Noted(zmctest::kind, next arguments, place);         \
    }
ZMC_CALL(kResizeCall, ftruncate, file, (int file, off_t size), (file, size), noexcept)
ZMC_CALL(kResizeCall, ftruncate64, file, (int file, off64_t size), (file, size), noexcept)
ZMC_CALL(kResizeCall, truncate, path, (const char* path, off_t size), (path, size), noexcept)
ZMC_CALL(kResizeCall, truncate64, path, (const char* path, off64_t size), (path, size), noexcept)
ZMC_CALL(kResizeCall, fallocate, file, (int file, int mode, off_t at, off_t size),
         (file, mode, at, size), )
ZMC_CALL(kResizeCall, fallocate64, file, (int file, int mode, off64_t at, off64_t size),
         (file, mode, at, size), )
ZMC_CALL(kSyncCall, fsync, file, (int file), (file), )
ZMC_CALL(kSyncCall, fdatasync, file, (int file), (file), )
ZMC_CALL(kRenameCall, rename, to, (const char* from, const char* to), (from, to), noexcept)
ZMC_CALL(kRenameCall, renameat2, to,
         (int fromFolder, const char* from, int toFolder, const char* to, unsigned flags),
         (fromFolder, from, toFolder, to, flags), noexcept)
ZMC_CALL(kRenameCall, link, to, (const char* from, const char* to), (from, to), noexcept)
ZMC_CALL(kRemoveCall, unlink, path, (const char* path), (path), noexcept)
ZMC_CALL(kRemoveCall, remove, path, (const char* path), (path), noexcept)
ZMC_CALL(kLockCall, flock, file, (int file, int operation), (file, operation), noexcept)
ZMC_CALL(kStatusCall, fstat, file, (int file, struct stat* status), (file, status), noexcept)
ZMC_CALL(kStatusCall, fstat64, file, (int file, struct stat64* status), (file, status), noexcept)

// A descriptor is gone after close, failed or not.
ZMC_EXPORT int close(int file) {
    static const auto next = Next<int (*)(int)>("close");
    const bool fails = CallFails(zmctest::kCloseCall, file);
    const int error = errno;
    const int result = Noted(zmctest::kCloseCall, next(file), file);
    if (!fails) return result;
    errno = error;
    return -1;
}

ZMC_EXPORT int fclose(std::FILE* stream) {
    static const auto next = Next<int (*)(std::FILE*)>("fclose");
    const bool fails = CallFails(zmctest::kCloseCall, fileno(stream));
    const int error = errno;
    const int result = next(stream);
    if (result == 0) zmctest::Note(zmctest::kCloseCall);
    if (!fails) return result;
    errno = error;
    return EOF;
}
