#include "platform/Beneath.h"

#include <dirent.h>
#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <optional>
#include <utility>

#include "platform/posix/Descriptor.h"
#include "platform/posix/FileParts.h"

namespace platform {
namespace {

// A descriptor that is closed at the end of its scope.
class Held {
public:
    explicit Held(int opened) : number(opened) {}
    ~Held() {
        const int kept = errno;
        if (number >= 0) ::close(number);
        errno = kept;
    }
    Held(const Held&) = delete;
    Held& operator=(const Held&) = delete;
    int Number() const { return number; }
    void Take(int opened) { ::close(std::exchange(number, opened)); }
    int Release() { return std::exchange(number, -1); }

private:
    int number;
};

int OpenFolder(const std::string& folder) {
    return Uninterrupted([&] { return ::open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC); });
}

// Part by part, no link followed: for systems without openat2.
int OpenByParts(int folder, const std::string& name, int flags) {
    Held at(::fcntl(folder, F_DUPFD_CLOEXEC, kFirstDataDescriptor));
    std::size_t begin = 0;
    while (at.Number() >= 0) {
        const std::size_t end = name.find('/', begin);
        const std::string part = name.substr(begin, end - begin);
        const bool last = end == name.npos;
        const int how = last ? flags : O_PATH | O_DIRECTORY;
        const int next = Uninterrupted(
            [&] { return ::openat(at.Number(), part.c_str(), how | O_NOFOLLOW | O_CLOEXEC); });
        if (last || next < 0) return next;
        at.Take(next);
        begin = end + 1;
    }
    return -1;
}

int OpenWithin(int folder, const std::string& name, int flags) {
    struct open_how how = {};
    how.flags = static_cast<unsigned long long>(flags) | O_CLOEXEC;
    how.resolve = RESOLVE_BENEATH | RESOLVE_NO_MAGICLINKS;
    // EAGAIN: something was renamed meanwhile, and whether the path stayed below is not known.
    for (int tries = 0; tries < 16; ++tries) {
        const int opened = Uninterrupted([&] {
            return static_cast<int>(::syscall(SYS_openat2, folder, name.c_str(), &how, sizeof how));
        });
        if (opened >= 0 || errno != EAGAIN) return opened;
    }
    return -1;
}

// -1 with errno on failure.
int OpenBelow(const std::string& folder, const std::string& name, Links links, int flags) {
    const Held root(OpenFolder(folder));
    if (root.Number() < 0) return -1;
    if (links == Links::Followed)
        return Uninterrupted(
            [&] { return ::openat(root.Number(), name.c_str(), flags | O_CLOEXEC); });
    const int opened = OpenWithin(root.Number(), name, flags);
    if (opened >= 0 || (errno != ENOSYS && errno != EPERM)) return opened;
    return OpenByParts(root.Number(), name, flags);
}

// By one call where no link can lead out, of what is asked for with each request: whether it is
// there. Nothing where that takes a look at each part of the path.
std::optional<bool> TellAtOnce(const std::string& folder, const std::string& name, Links links,
                               struct stat& status) {
    if (links == Links::Within && name.find('/') != name.npos) return std::nullopt;
    const std::string path = folder + '/' + name;
    const int failed =
        links == Links::Followed ? ::stat(path.c_str(), &status) : ::lstat(path.c_str(), &status);
    // Together they may be longer than the system takes at once.
    if (failed != 0 && errno == ENAMETOOLONG) return std::nullopt;
    if (failed == 0 && S_ISLNK(status.st_mode)) return std::nullopt;
    return failed == 0;
}

bool Describe(int folder, const char* name, FolderEntry& entry, Links links,
              const std::string& root, const std::string& below) {
    struct stat status;
    if (::fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW) != 0) return false;
    if (S_ISLNK(status.st_mode)) {
        const std::string path = below.empty() ? name : below + '/' + name;
        const Held target(OpenBelow(root, path, links, O_PATH));
        if (target.Number() < 0 || ::fstat(target.Number(), &status) != 0) return false;
    }
    entry = {name, S_ISDIR(status.st_mode), S_ISREG(status.st_mode)};
    return true;
}

bool IsItselfOrAbove(const std::string& name) { return name == "." || name == ".."; }

struct CloseFolder {
    void operator()(DIR* folder) const { ::closedir(folder); }
};

}  // namespace

std::unique_ptr<File> OpenBeneath(const std::string& folder, const std::string& name, Links links,
                                  int* error) {
    const int flags = O_RDONLY | O_NONBLOCK | O_NOCTTY;
    return TakeForReading(AwayFromStreams(OpenBelow(folder, name, links, flags)), error);
}

bool TellIdentityBeneath(const std::string& folder, const std::string& name, Links links,
                         FileIdentity& identity, int* error) {
    struct stat status;
    std::optional<bool> told = TellAtOnce(folder, name, links, status);
    if (!told) {
        const Held opened(OpenBelow(folder, name, links, O_PATH));
        told = opened.Number() >= 0 && ::fstat(opened.Number(), &status) == 0;
    }
    if (error) *error = *told ? 0 : errno;
    if (*told) identity = IdentityFrom(status);
    return *told;
}

std::vector<FolderEntry> ListBeneath(const std::string& folder, const std::string& name,
                                     Links links, std::size_t most, bool& complete, int* error) {
    std::vector<FolderEntry> entries;
    complete = true;
    const int flags = O_RDONLY | O_DIRECTORY | O_CLOEXEC;
    Held opened(name.empty() ? Uninterrupted([&] { return ::open(folder.c_str(), flags); })
                             : OpenBelow(folder, name, links, flags));
    const std::unique_ptr<DIR, CloseFolder> listing(
        opened.Number() < 0 ? nullptr : ::fdopendir(opened.Number()));
    if (error) *error = listing ? 0 : errno;
    if (!listing) return entries;
    const int number = opened.Release();  // the listing's now
    // NOLINTNEXTLINE(concurrency-mt-unsafe): nobody else has the listing.
    while (const dirent* const found = ::readdir(listing.get())) {
        FolderEntry entry;
        if (IsItselfOrAbove(found->d_name)) continue;
        if (!(complete = entries.size() < most)) break;
        if (Describe(number, found->d_name, entry, links, folder, name))
            entries.push_back(std::move(entry));
    }
    return entries;
}

bool IsRefusedLink(int error) { return error == EXDEV || error == ELOOP; }

bool IsNothingThere(int error) {
    return error == ENOENT || error == ENOTDIR || error == ENAMETOOLONG || error == EINVAL ||
           error == EISDIR;
}

}  // namespace platform
