#include "host/file/SideFile.h"

#include <algorithm>
#include <string_view>

#include "host/base/Checksum.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

constexpr std::string_view kSuffix = ".tmp";
// Names of files have 255 bytes at most; process and random number take up to 40 of them.
constexpr std::size_t kMaxStem = 200;

std::string Prefix(const std::string& file, const std::string& kind) {
    return '.' + SideFile::Stem(file) + '.' + kind + '-';
}

std::size_t Digits(std::string_view text) {
    return std::min(text.find_first_not_of("0123456789"), text.size());
}

// The temporary name at the start of a name, which may be one of a companion; empty if none is.
std::string TemporaryIn(std::string_view name, std::string_view prefix) {
    if (!name.starts_with(prefix)) return "";
    std::size_t end = prefix.size();
    const std::size_t process = Digits(name.substr(end));
    end += process;
    if (process == 0 || !name.substr(end).starts_with('-')) return "";
    const std::size_t random = Digits(name.substr(++end));
    end += random;
    if (random == 0 || !name.substr(end).starts_with(kSuffix)) return "";
    end += kSuffix.size();
    return end == name.size() || name[end] == '.' ? std::string(name.substr(0, end)) : "";
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
        if (taken == Result::Taken || taken == Result::Failed) return path;
        // Somebody who clears up met it before it was locked.
        platform::RemoveEntry(path);
    }
    return "";
}

void SideFile::RemoveStale(const std::string& file, const std::string& kind) {
    using Result = platform::FileLock::Result;
    const std::string folder = platform::FolderOf(file);
    const std::string prefix = Prefix(file, kind);
    for (const std::string& name : platform::ListFolder(folder)) {
        const std::string temporary = TemporaryIn(name, prefix);
        if (temporary.empty()) continue;
        platform::FileLock lock;
        const Result taken = lock.Take(platform::JoinPath(folder, temporary));
        if (taken == Result::Taken || (taken == Result::Missing && name != temporary))
            platform::RemoveEntry(platform::JoinPath(folder, name));
    }
}

}  // namespace zmchost
