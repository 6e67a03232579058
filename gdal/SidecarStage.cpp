#include "gdal/SidecarStage.h"

#include <memory>
#include <string_view>
#include <utility>

#include "files/FileSource.h"
#include "gdal/Sidecar.h"
#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/file/SideFile.h"
#include "platform/FileSystem.h"
#include "platform/Rights.h"

namespace zmcgdal {
namespace {

using platform::FileLock;
using zelm::files::ByteSource;
using zelm::files::FileSource;
using zelm::files::OpenMode;
using zmchost::SideFile;

constexpr const char* kLockEnding = ".lock";
const std::string kKind = "zmcside";
// Of a file that is to become the lock.
const std::string kLockKind = "zmclock";
// Of a pyramid that has none; GDAL reads it as one that says nothing.
constexpr std::string_view kNothing = "<PAMDataset />\n";

std::string BaseFor(const std::string& name, std::uint64_t number, std::uint64_t end) {
    return platform::JoinPath(
        platform::FolderOf(name),
        SideFile::Prefix(name, kKind) + std::to_string(number) + '-' + std::to_string(end));
}

bool IsFile(const std::string& path) { return platform::StatusOf(path).isRegular; }

[[noreturn]] void Fail(const std::string& name, const std::string& reason) {
    throw zmchost::Error(name, "keep its metadata in " + name + kSidecarEnding, reason);
}

void Remove(const std::string& name, const std::string& path) {
    if (platform::StatusOf(path).exists && !platform::RemoveEntry(path))
        Fail(name, platform::LastErrorText());
}

void Rename(const std::string& name, const std::string& from, const std::string& to) {
    if (!platform::RenameFile(from, to)) Fail(name, platform::LastErrorText());
}

bool SaysNothing(const std::string& sidecar) {
    const auto source = FileSource::Open(zmchost::WideFileName(sidecar), OpenMode::Read);
    std::string text(kNothing.size(), '\0');
    return source && source->Size() == text.size() &&
           source->ReadAt(0, text.data(), text.size()) == text.size() && text == kNothing;
}

// As long as the staged sidecar is there, the staged mask is there too.
void SettleMask(const std::string& name, const std::string& base) {
    if (!IsFile(base + kMaskEnding)) return Remove(name, name + kMaskEnding);
    const std::string second = base + ".second";
    Remove(name, second);
    const bool linked = platform::LinkFile(base + kMaskEnding, second);
    Rename(name, linked ? second : base + kMaskEnding, name + kMaskEnding);
}

void SettleFiles(const std::string& name, const std::string& base) {
    SettleMask(name, base);
    if (SaysNothing(base + kSidecarEnding)) {
        Remove(name, name + kSidecarEnding);
        Remove(name, base + kSidecarEnding);
    } else {
        Rename(name, base + kSidecarEnding, name + kSidecarEnding);
    }
    Remove(name, base + kMaskEnding);
    platform::SyncFolder(platform::FolderOf(name));
}

// Somebody else who met them may have done it.
void SettleBase(const std::string& name, const std::string& base) {
    if (IsFile(base + kSidecarEnding)) SettleFiles(name, base);
    Remove(name, base + kLockEnding);
}

// The staged base of the file that the name leads to; empty if it is no pyramid.
std::string BaseOfFile(const std::string& name) {
    try {
        const auto source = FileSource::Open(zmchost::WideFileName(name), OpenMode::Read);
        if (!source) return "";
        const auto header = zmchost::PyramidHeader::Read(*source, name);
        return BaseFor(name, source->Identify().number, header.tileDataEnd);
    } catch (const zmchost::Error&) {
        return "";
    }
}

// What is left of builds that were ended before their file had its name.
void RemoveLeftOver(const std::string& name) {
    const std::string folder = platform::FolderOf(name);
    const std::string prefix = SideFile::Prefix(name, kKind);
    for (const std::string& entry : platform::ListFolder(folder)) {
        if (!entry.starts_with(prefix)) continue;
        const std::string end = entry.substr(prefix.size());
        const std::string base = prefix + end.substr(0, end.find('.'));
        FileLock lock;
        const FileLock::Result taken = lock.Take(platform::JoinPath(folder, base + kLockEnding));
        if (taken == FileLock::Result::Taken || taken == FileLock::Result::Missing)
            platform::RemoveEntry(platform::JoinPath(folder, entry));
    }
}

// What replaces a companion has its rights, and what replaces none those of the old pyramid.
void TakeRights(const std::string& name, const char* ending, const std::string& path) {
    const std::string before = IsFile(name + ending) ? name + ending : name;
    if (IsFile(before) && !platform::CopyRights(before, path))
        Fail(name, platform::LastErrorText());
}

}  // namespace

std::string SidecarBase(const std::string& name, const ByteSource& source,
                        const zmchost::PyramidHeader& header) {
    std::string staged = BaseFor(name, source.Identify().number, header.tileDataEnd);
    return IsFile(staged + kSidecarEnding) ? staged : name;
}

void SettleSidecar(const std::string& name, const ByteSource& source,
                   const zmchost::PyramidHeader& header) {
    const std::string base = SidecarBase(name, source, header);
    if (base != name) SettleBase(name, base);
}

SidecarStage::SidecarStage(std::string targetName) : target(std::move(targetName)) {
    const std::string present = BaseOfFile(target);
    if (!present.empty()) SettleBase(target, present);
    RemoveLeftOver(target);
    SideFile::RemoveStale(target, kLockKind);
}

SidecarStage::~SidecarStage() {
    if (base.empty()) return;
    try {
        // A build may fail behind the step that counts.
        if (platform::StatusOf(target).number == number)
            SettleBase(target, base);
        else
            for (const char* const ending : {kSidecarEnding, kMaskEnding, kLockEnding})
                platform::RemoveEntry(base + ending);
    } catch (...) {
        // Staged companions are found by whoever opens the file.
    }
}

std::string SidecarStage::Begin(const std::string& finished) {
    const auto source = FileSource::Open(zmchost::WideFileName(finished), OpenMode::Read);
    if (!source) Fail(target, platform::LastErrorText());
    number = source->Identify().number;
    base = BaseFor(target, number, zmchost::PyramidHeader::Read(*source, finished).tileDataEnd);
    Lock();
    return base;
}

// By the time that the lock has its name it is held.
void SidecarStage::Lock() {
    const std::string made = SideFile::MakeTemporary(target, kLockKind, lock);
    if (made.empty()) Fail(target, platform::LastErrorText());
    if (platform::RenameFile(made, base + kLockEnding)) return;
    const std::string reason = platform::LastErrorText();
    platform::RemoveEntry(made);
    Fail(target, reason);
}

void SidecarStage::Complete() {
    const std::string sidecar = base + kSidecarEnding;
    int error = 0;
    if (!IsFile(sidecar)) {
        const auto none =
            FileSource::Open(zmchost::WideFileName(sidecar), OpenMode::Create, &error);
        if (!none || none->WriteAt(0, kNothing.data(), kNothing.size(), &error) != kNothing.size())
            Fail(target, platform::ErrorText(error));
    }
    for (const char* const ending : {kSidecarEnding, kMaskEnding}) {
        if (!IsFile(base + ending)) continue;
        TakeRights(target, ending, base + ending);
        if (!platform::SyncFile(base + ending)) Fail(target, platform::LastErrorText());
    }
}

std::string SidecarStage::Written(const char* ending) const {
    const std::string path = base + ending;
    return IsFile(path) && !SaysNothing(path) ? path : "";
}

void SidecarStage::Settle() {
    SettleBase(target, base);
    base.clear();
}

}  // namespace zmcgdal
