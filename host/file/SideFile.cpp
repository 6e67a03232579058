#include "host/file/SideFile.h"

#include <charconv>
#include <cstdint>
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

// The process of a temporary name; 0 for a name that is not one of ours.
std::uint64_t ProcessOf(std::string_view name, std::string_view prefix) {
    if (!name.starts_with(prefix) || !name.ends_with(kSuffix)) return 0;
    name.remove_prefix(prefix.size());
    std::uint64_t process = 0;
    const char* const end = name.data() + name.size();
    const auto parsed = std::from_chars(name.data(), end, process);
    const bool ours = parsed.ec == std::errc() && parsed.ptr != end && *parsed.ptr == '-';
    return ours ? process : 0;
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

void SideFile::RemoveStale(const std::string& file, const std::string& kind) {
    const std::string folder = platform::FolderOf(file);
    const std::string prefix = Prefix(file, kind);
    for (const std::string& name : platform::ListFolder(folder)) {
        const std::uint64_t process = ProcessOf(name, prefix);
        if (process != 0 && !platform::ProcessAlive(process))
            platform::RemoveEntry(platform::JoinPath(folder, name));
    }
}

}  // namespace zmchost
