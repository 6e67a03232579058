#include "host/build/BuildFile.h"

#include <string_view>

#include "files/FileSource.h"
#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/build/PartFolder.h"
#include "host/file/PyramidHeader.h"
#include "host/file/PyramidRecords.h"
#include "host/file/SideFile.h"
#include "host/journal/MetadataJournal.h"
#include "host/journal/UpdateJournal.h"
#include "platform/FileSystem.h"
#include "platform/Rights.h"

namespace zmchost {
namespace {

using zelm::files::FileSource;
using zelm::files::OpenMode;

const std::string kBuildKind = "zmcbuild";
const std::string kPlanKind = "zmcplan";

bool IsCompanionEnding(const std::string& ending) {
    return ending == BuildFile::kPlanEnding || ending == BuildFile::kNewPlanEnding ||
           ending == BuildFile::kPartsEnding;
}

// Companions of temporary files that are gone; what belongs to a file that is there is its affair.
void RemoveOrphans(const std::string& target, const std::string& kind) {
    constexpr std::string_view kMiddle = ".tmp.";
    const std::string folder = platform::FolderOf(target);
    const std::string prefix = SideFile::Prefix(target, kind);
    for (const std::string& name : platform::ListFolder(folder)) {
        const std::size_t middle = name.rfind(kMiddle);
        if (!name.starts_with(prefix) || middle == name.npos) continue;
        const std::string owner = name.substr(0, middle + kMiddle.size() - 1);
        if (!IsCompanionEnding(name.substr(owner.size()))) continue;
        if (platform::StatusOf(platform::JoinPath(folder, owner)).exists) continue;
        const std::string path = platform::JoinPath(folder, name);
        if (!platform::RemoveEntry(path)) PartFolder(path, 0).Remove();
    }
}

std::string BytesText(std::uint64_t size) { return std::to_string(size) + " bytes"; }

}  // namespace

BuildFile::BuildFile(const std::string& targetName, bool mayOverwrite, Kind kind)
    : given(targetName),
      overwrite(mayOverwrite),
      target(platform::ResolveLinks(targetName)),
      outline(kind == Kind::Outline) {
    CheckTarget();
    SideFile::RemoveStale(target, kBuildKind);
    RemoveOrphans(target, kBuildKind);
    path = SideFile::MakeTemporary(target, kind == Kind::Build ? kBuildKind : kPlanKind, lock);
    // What is to replace a file is nobody else's business until it has the rights of that one.
    if (!path.empty() && (!platform::StatusOf(target).exists || platform::MakePrivate(path)))
        return;
    const std::string reason = platform::LastErrorText();
    if (!path.empty()) platform::RemoveEntry(path);
    throw Error(given, "build a file in the folder " + platform::FolderOf(target), reason);
}

BuildFile::BuildFile(const std::string& targetName, bool mayOverwrite, const std::string& planned)
    : given(targetName),
      overwrite(mayOverwrite),
      target(platform::ResolveLinks(targetName)),
      path(planned),
      kept(true) {
    using Result = platform::FileLock::Result;
    CheckTarget();
    const Result taken = lock.Take(path);
    if (taken == Result::Held) throw Error(given, "finish it", "somebody else does so already");
    if (taken != Result::Taken && taken != Result::NoLocks)
        throw Error(given, "finish it", platform::LastErrorText());
    int error = 0;
    const auto file = FileSource::Open(WideFileName(path), OpenMode::Update, &error);
    if (!file) throw Error(given, "finish it", platform::ErrorText(error));
    const std::uint64_t end = PyramidHeader::Read(*file, given).tileDataEnd;
    if (file->Size() > end && !file->Truncate(end, &error))
        throw Error(given, "finish it", platform::ErrorText(error));
}

BuildFile::~BuildFile() {
    if (!kept && !path.empty()) platform::RemoveEntry(path);
}

std::string BuildFile::PlannedPath(const std::string& target, const std::string& name) {
    return platform::JoinPath(platform::FolderOf(platform::ResolveLinks(target)), name);
}

void BuildFile::RemoveAbandoned(const std::string& targetName, const SideFile::Spare& spare) {
    const std::string target = platform::ResolveLinks(targetName);
    SideFile::RemoveStale(target, kPlanKind, spare);
    RemoveOrphans(target, kPlanKind);
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
    if (outline) return;
    const auto space = platform::FreeSpace(platform::FolderOf(path));
    if (space && *space < size)
        throw Error(given, "build it",
                    "it needs " + BytesText(size) + " of disk space, and " + BytesText(*space) +
                        " are free");
}

void BuildFile::Reserve(std::uint64_t size) const {
    if (!outline && !platform::ReserveSpace(path, size))
        throw Error(given, "take " + BytesText(size) + " of disk space", platform::LastErrorText());
}

void BuildFile::Flush() const {
    if (!platform::ReleaseReserve(path) || (durable && !platform::SyncFile(path)))
        throw Error(given, "write it to the disk", platform::LastErrorText());
}

void BuildFile::Commit() {
    CheckTarget();
    if (platform::StatusOf(target).exists && !platform::CopyRights(target, path))
        throw Error(given, "give it the rights of the file before", platform::LastErrorText());
    if (!platform::RenameFile(path, target))
        throw Error(given, "give the finished file its name", platform::LastErrorText());
    kept = true;
    lock.Release();
    // What may be left of a store into the old file, or of an update of it, has no file any more,
    // nor have its records.
    platform::RemoveEntry(MetadataJournal::PathFor(target));
    platform::RemoveEntry(UpdateJournal::PathFor(target));
    platform::RemoveEntry(PyramidRecords::PathFor(target));
    if (durable && !platform::SyncFolder(platform::FolderOf(target)))
        throw Error(given, "write its name to the disk", platform::LastErrorText());
}

}  // namespace zmchost
