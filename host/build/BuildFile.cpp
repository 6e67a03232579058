#include "host/build/BuildFile.h"

#include "host/base/Error.h"
#include "host/file/SideFile.h"
#include "host/journal/MetadataJournal.h"
#include "platform/FileSystem.h"
#include "platform/Rights.h"

namespace zmchost {
namespace {

const std::string kKind = "zmcbuild";

std::string Bytes(std::uint64_t size) { return std::to_string(size) + " bytes"; }

}  // namespace

BuildFile::BuildFile(const std::string& targetName, bool mayOverwrite)
    : given(targetName), overwrite(mayOverwrite), target(platform::ResolveLinks(targetName)) {
    CheckTarget();
    SideFile::RemoveStale(target, kKind);
    path = SideFile::MakeTemporary(target, kKind, lock);
    // What is to replace a file is nobody else's business until it has the rights of that one.
    if (!path.empty() && (!platform::StatusOf(target).exists || platform::MakePrivate(path)))
        return;
    const std::string reason = platform::LastErrorText();
    if (!path.empty()) platform::RemoveEntry(path);
    throw Error(given, "build a file in the folder " + platform::FolderOf(target), reason);
}

BuildFile::~BuildFile() {
    if (!committed && !path.empty()) platform::RemoveEntry(path);
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
    if (platform::StatusOf(target).exists && !platform::CopyRights(target, path))
        throw Error(given, "give it the rights of the file before", platform::LastErrorText());
    if (!platform::RenameFile(path, target))
        throw Error(given, "give the finished file its name", platform::LastErrorText());
    committed = true;
    lock.Release();
    // What may be left of a store into the old file has no file any more.
    platform::RemoveEntry(MetadataJournal::PathFor(target));
    if (!platform::SyncFolder(platform::FolderOf(target)))
        throw Error(given, "write its name to the disk", platform::LastErrorText());
}

}  // namespace zmchost
