#include "platform/Rights.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cerrno>
#include <string_view>
#include <vector>

#include "platform/posix/Descriptor.h"
#include "platform/posix/Uninterrupted.h"

namespace platform {
namespace {

constexpr char kAccessList[] = "system.posix_acl_access";

// A file of ours, and no other that was put under its name.
class OwnFile {
public:
    explicit OwnFile(const std::string& path)
        : descriptor(OpenForData(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOFOLLOW)) {}
    ~OwnFile() {
        const int kept = errno;
        if (descriptor >= 0) ::close(descriptor);
        errno = kept;
    }
    OwnFile(const OwnFile&) = delete;
    OwnFile& operator=(const OwnFile&) = delete;

    bool IsGood() const {
        struct stat info {};
        if (descriptor < 0 || ::fstat(descriptor, &info) != 0) return false;
        if (S_ISREG(info.st_mode) && info.st_nlink == 1) return true;
        errno = EPERM;
        return false;
    }

    const int descriptor;
};

// Those by which the system vouches for what a program may do or what a file holds.
bool IsVoucher(std::string_view name) {
    return name.starts_with("security.") && name != "security.selinux";
}

std::vector<std::string> AttributesOf(const std::string& path) {
    const ssize_t size = ::listxattr(path.c_str(), nullptr, 0);
    if (size <= 0) return {};
    std::string list(static_cast<std::size_t>(size), '\0');
    const ssize_t got = ::listxattr(path.c_str(), list.data(), list.size());
    std::vector<std::string> names;
    for (std::size_t at = 0; got > 0 && at < static_cast<std::size_t>(got);) {
        names.emplace_back(list.c_str() + at);
        at += names.back().size() + 1;
    }
    return names;
}

// False for one that there is, and that this process may not give or the file system does not know.
bool CopyAttribute(const std::string& from, const std::string& name, int to) {
    const ssize_t size = ::getxattr(from.c_str(), name.c_str(), nullptr, 0);
    if (size < 0) return errno == ENODATA || errno == ENOTSUP;
    std::string value(static_cast<std::size_t>(size), '\0');
    const ssize_t got = ::getxattr(from.c_str(), name.c_str(), value.data(), value.size());
    return got >= 0 &&
           ::fsetxattr(to, name.c_str(), value.data(), static_cast<std::size_t>(got), 0) == 0;
}

// An attribute that cannot be given is left out.
void CopyAttributes(const std::string& from, int to) {
    for (const std::string& name : AttributesOf(from))
        if (!IsVoucher(name) && name != kAccessList) CopyAttribute(from, name, to);
}

// An access list speaks of the group of the file, and goes where that is the same. False if the
// mode may not give the group what it gives there: beside a list it tells the mask of the list in
// place of the group's rights.
bool CopyAccessList(const std::string& from, int to, bool sameGroup) {
    // What the folder gave to the new file.
    ::fremovexattr(to, kAccessList);
    return sameGroup && CopyAttribute(from, kAccessList, to);
}

// The mode of a file whose owner and group may have become others.
mode_t ModeFor(const struct stat& from, bool sameOwner, bool sameGroup) {
    mode_t mode = from.st_mode & 07777;
    if (!sameOwner || !sameGroup) mode &= 0777;
    if (!sameGroup) mode &= ~mode_t{070} | ((mode & 07) << 3);
    return mode;
}

}  // namespace

bool MakePrivate(const std::string& path) noexcept {
    const OwnFile file(path);
    return file.IsGood() && ::fchmod(file.descriptor, S_IRUSR | S_IWUSR) == 0;
}

bool CopyRights(const std::string& from, const std::string& to) noexcept try {
    struct stat source {};
    if (::stat(from.c_str(), &source) != 0) return false;
    const OwnFile file(to);
    if (!file.IsGood()) return false;
    // The group alone may be allowed where the owner is not.
    if (::fchown(file.descriptor, source.st_uid, source.st_gid) != 0)
        static_cast<void>(::fchown(file.descriptor, static_cast<uid_t>(-1), source.st_gid) == 0);
    struct stat now {};
    if (::fstat(file.descriptor, &now) != 0) return false;
    const bool sameOwner = now.st_uid == source.st_uid;
    const bool sameGroup = now.st_gid == source.st_gid;
    CopyAttributes(from, file.descriptor);
    const bool groupKeepsRights = CopyAccessList(from, file.descriptor, sameGroup);
    return ::fchmod(file.descriptor, ModeFor(source, sameOwner, groupKeepsRights)) == 0;
} catch (...) {
    errno = ENOMEM;
    return false;
}

}  // namespace platform
