#include "host/file/SideFile.h"

#include <algorithm>
#include <cerrno>
#include <string_view>

#include "host/base/Checksum.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

constexpr std::string_view kSuffix = ".tmp";
// Names of files have 255 bytes at most; process and random number take up to 40 of them.
constexpr std::size_t kMaxStem = 200;

std::size_t Digits(std::string_view text) {
    return std::min(text.find_first_not_of("0123456789"), text.size());
}

bool IsTemporary(std::string_view name, std::string_view prefix) {
    if (!name.starts_with(prefix)) return false;
    name.remove_prefix(prefix.size());
    const std::size_t process = Digits(name);
    if (process == 0 || !name.substr(process).starts_with('-')) return false;
    name.remove_prefix(process + 1);
    const std::size_t random = Digits(name);
    return random != 0 && name.substr(random) == kSuffix;
}

}  // namespace

std::string SideFile::Stem(const std::string& file) {
    std::string name = platform::NameOf(file);
    if (name.size() <= kMaxStem) return name;
    const std::string number = '~' + std::to_string(Checksum(name));
    name.resize(kMaxStem - number.size());
    while (!name.empty() && (name.back() & 0xC0) == 0x80) name.pop_back();
    if (!name.empty()) name.pop_back();
    return name + number;
}

std::string SideFile::Prefix(const std::string& file, const std::string& kind) {
    return '.' + Stem(file) + '.' + kind + '-';
}

std::string SideFile::TemporaryPath(const std::string& file, const std::string& kind) {
    return platform::JoinPath(platform::FolderOf(file),
                              Prefix(file, kind) + std::to_string(platform::CurrentProcess()) +
                                  '-' + std::to_string(platform::RandomNumber()) +
                                  std::string(kSuffix));
}

std::string SideFile::MakeTemporary(const std::string& file, const std::string& kind,
                                    platform::FileLock& lock) {
    using Result = platform::FileLock::Result;
    constexpr int kTries = 100;
    for (int i = 0; i < kTries; ++i) {
        std::string path = TemporaryPath(file, kind);
        if (!platform::CreateNewFile(path)) return "";
        const Result taken = lock.Take(path);
        if (taken == Result::Taken || taken == Result::NoLocks) return path;
        // Else somebody who clears up met it before it was locked.
        const int error = errno;
        platform::RemoveEntry(path);
        errno = error;
        if (taken == Result::Failed) return "";
    }
    return "";
}

void SideFile::RemoveStale(const std::string& file, const std::string& kind, const Spare& spare) {
    using Result = platform::FileLock::Result;
    const std::string folder = platform::FolderOf(file);
    const std::string prefix = Prefix(file, kind);
    for (const std::string& name : platform::ListFolder(folder)) {
        if (!IsTemporary(name, prefix)) continue;
        const std::string path = platform::JoinPath(folder, name);
        platform::FileLock lock;
        if (lock.Take(path) == Result::Taken && !(spare && spare(name)))
            platform::RemoveEntry(path);
    }
}

}  // namespace zmchost
