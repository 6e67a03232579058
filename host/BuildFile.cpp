#include "host/BuildFile.h"

#include <charconv>
#include <string_view>

#include "host/Error.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

constexpr std::string_view kInfix = ".zmcbuild-";
constexpr std::string_view kSuffix = ".tmp";
// Names of files have 255 bytes at most; process and random number take up to 40 of them.
constexpr std::size_t kMaxStem = 200;

// What all temporary names of a target begin with. A long name is cut, between two characters.
std::string Prefix(const std::string& target) {
    std::string name = platform::NameOf(target);
    if (name.size() > kMaxStem) {
        name.resize(kMaxStem);
        while (!name.empty() && (name.back() & 0xC0) == 0x80) name.pop_back();
        if (!name.empty()) name.pop_back();
    }
    return '.' + name + std::string(kInfix);
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

std::string Bytes(std::uint64_t size) { return std::to_string(size) + " bytes"; }

}  // namespace

BuildFile::BuildFile(const std::string& targetName, bool mayOverwrite)
    : given(targetName), overwrite(mayOverwrite), target(platform::ResolveLinks(targetName)) {
    CheckTarget();
    RemoveStale();
    const std::string folder = platform::FolderOf(target);
    path = platform::JoinPath(folder, Prefix(target) + std::to_string(platform::CurrentProcess()) +
                                          '-' + std::to_string(platform::RandomNumber()) +
                                          std::string(kSuffix));
    if (!platform::CreateNewFile(path))
        throw Error(given, "build a file in the folder " + folder, platform::LastErrorText());
}

BuildFile::~BuildFile() {
    if (!committed) platform::RemoveEntry(path);
}

void BuildFile::CheckTarget() const {
    if (platform::NameOf(target).empty()) throw Error(given, "build it", "it names no file");
    const platform::FileStatus status = platform::StatusOf(target);
    if (!status.exists) return;
    if (status.isFolder) throw Error(given, "replace it", "it is a folder");
    if (!status.isRegular) throw Error(given, "replace it", "it is not a regular file");
    if (!overwrite) throw Error(given, "build it", "the file exists already");
    if (status.readOnly) throw Error(given, "replace it", "the file is read-only");
}

void BuildFile::RemoveStale() const {
    const std::string folder = platform::FolderOf(target);
    const std::string prefix = Prefix(target);
    for (const std::string& name : platform::ListFolder(folder)) {
        const std::uint64_t process = ProcessOf(name, prefix);
        if (process != 0 && !platform::ProcessAlive(process))
            platform::RemoveEntry(platform::JoinPath(folder, name));
    }
}

void BuildFile::CheckSpace(std::uint64_t size) const {
    const auto space = platform::FreeSpace(platform::FolderOf(path));
    if (space && *space < size)
        throw Error(
            given, "build it",
            "it needs " + Bytes(size) + " of disk space, and " + Bytes(*space) + " are free");
}

void BuildFile::Reserve(std::uint64_t size) const {
    if (!platform::ReserveSpace(path, size))
        throw Error(given, "take " + Bytes(size) + " of disk space", platform::LastErrorText());
}

void BuildFile::Flush() const {
    if (!platform::ReleaseReserve(path) || !platform::SyncFile(path))
        throw Error(given, "write it to the disk", platform::LastErrorText());
}

void BuildFile::Commit() {
    CheckTarget();
    if (!platform::RenameFile(path, target))
        throw Error(given, "give the finished file its name", platform::LastErrorText());
    committed = true;
    if (!platform::SyncFolder(platform::FolderOf(target)))
        throw Error(given, "write its name to the disk", platform::LastErrorText());
}

}  // namespace zmchost
