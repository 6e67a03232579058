#include "host/journal/MetadataJournal.h"

#include <algorithm>
#include <chrono>
#include <memory>
#include <string_view>
#include <thread>

#include "files/FileSource.h"
#include "format/DocumentLimits.h"
#include "host/base/Checksum.h"
#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/file/MetadataDocument.h"
#include "host/file/SideFile.h"
#include "host/journal/UpdateJournal.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

using Outcome = Recovery::Outcome;
using platform::FileLock;
using zelm::files::FileSource;
using zelm::files::OpenMode;

const std::string kKind = "zmcmeta";
constexpr char kMark = zelm::kUnfinishedDocument;
const char* const kKeep = "keep a copy of its metadata document";

// The raster file, opened once: what is said of it and what is done to it is of one file, whatever
// takes its name meanwhile.
class Target {
public:
    Target(std::string name, OpenMode mode) : file(std::move(name)) {
        int error = 0;
        source = FileSource::Open(WideFileName(file), mode, &error);
        if (!source) throw Error(file, "look at it", platform::ErrorText(error));
        header = PyramidHeader::Read(*source, file);
    }

    const std::string& Name() const { return file; }
    const PyramidHeader& Header() const { return header; }
    FileSource& Source() const { return *source; }
    std::string Document() const { return ReadMetadataText(*source, file, header); }
    bool IsSameAs(const Target& other) const {
        return source->Identify().SameThing(other.source->Identify());
    }

    // Whether a copy of that status is by somebody whose word counts.
    bool Trusts(const platform::FileStatus& copy) const {
        const platform::FileStatus named = platform::StatusOf(file);
        return named.number == source->Identify().number && platform::MaySpeakFor(copy, named);
    }

    // The record of it as it is now, without the text.
    JournalRecord Describe() const {
        JournalRecord record;
        record.offset = header.tileDataEnd;
        record.fileSize = header.fileSize;
        record.fileNumber = source->Identify().number;
        record.frontSize = header.tileDataStart;
        std::string front(static_cast<std::size_t>(header.tileDataStart), '\0');
        front.resize(source->ReadAt(0, front.data(), front.size()));
        record.frontSum = Checksum(front);
        record.systemRun = platform::SystemRun();
        return record;
    }

private:
    std::string file;
    std::shared_ptr<FileSource> source;
    PyramidHeader header;
};

bool RemoveCopy(const std::string& path) {
    return platform::RemoveEntry(path) && platform::SyncFolder(platform::FolderOf(path));
}

// What a left-over copy says and what there is to do about it. The caller holds its lock.
class LeftOver {
public:
    LeftOver(const Target& raster, const JournalRecord& kept) : now(raster), record(kept) {}

    // Why the copy is not one of this file; empty if it is.
    std::string Mismatch() const {
        const JournalRecord found = now.Describe();
        const bool same = found.offset == record.offset && found.fileNumber == record.fileNumber &&
                          found.frontSize == record.frontSize && found.frontSum == record.frontSum;
        if (!same) return "it is a copy of another file of that name";
        if (found.fileSize < std::min(record.offset, record.fileSize))
            return "the file has lost tiles since";
        return "";
    }

    // Puts the old document back if that is called for, and removes the copy. Throws Error, one of
    // another file being no copy of this one.
    Outcome Settle(const std::string& copy) {
        if (const std::string why = Mismatch(); !why.empty()) Fail(why);
        const Outcome outcome = IsWhole() ? Outcome::Complete : Outcome::Restored;
        if (outcome == Outcome::Restored) PutBack();
        int error = 0;
        if (!now.Source().Sync(&error)) Fail(platform::ErrorText(error));
        if (!RemoveCopy(copy)) Fail(platform::LastErrorText());
        return outcome;
    }

private:
    // Whether the document in the file can be believed. What the system has seen without a break is
    // as the store left it: whole, or refused by parsers. After a break the disk may hold any
    // mixture, and only the old text is beyond doubt.
    bool IsWhole() const {
        std::string text = now.Document();
        const bool unbroken =
            !record.systemRun.empty() && record.systemRun == platform::SystemRun();
        if (text.empty() || !unbroken)
            return text.starts_with(record.text) &&
                   text.find_first_not_of('\n', record.text.size()) == text.npos &&
                   text.empty() == record.text.empty();
        return JudgeMetadataText(text).empty();
    }

    // The order of steps is that of a store: mark, rest, first byte.
    void PutBack() const {
        const Target target(now.Name(), OpenMode::Update);
        if (!target.IsSameAs(now)) Fail("another file has taken its name");
        FileSource& source = target.Source();
        int error = 0;
        std::uint64_t size = 0;
        if (!source.TellSize(size, &error)) Fail(platform::ErrorText(error));
        const auto write = [&](std::uint64_t at, std::string_view bytes) {
            if (source.WriteAt(at, bytes.data(), bytes.size(), &error) != bytes.size())
                Fail(platform::ErrorText(error));
        };
        const std::string_view text = record.text;
        if (!text.empty()) write(record.offset, std::string_view(&kMark, 1));
        const std::uint64_t end = GotTiles(source) ? record.offset : record.fileSize;
        if (size > end && !source.Truncate(end, &error)) Fail(platform::ErrorText(error));
        if (text.empty()) return;
        write(record.offset + 1, text.substr(1));
        write(record.offset, text.substr(0, 1));
    }

    // Whether a file that ended within its tiles has, or may have, got some since.
    bool GotTiles(FileSource& source) const {
        constexpr std::uint64_t kMost = std::uint64_t{256} << 20;
        if (record.fileSize >= record.offset) return false;
        if (record.offset - record.fileSize > kMost) return true;
        std::string piece(1 << 20, '\0');
        for (std::uint64_t at = record.fileSize; at < record.offset; at += piece.size()) {
            const auto size =
                static_cast<std::size_t>(std::min<std::uint64_t>(piece.size(), record.offset - at));
            if (source.ReadAt(at, piece.data(), size) != size) return true;
            if (piece.find_first_not_of('\0') < size) return true;
        }
        return false;
    }

    [[noreturn]] void Fail(const std::string& reason) const {
        throw Error(now.Name(), "put its metadata document back", reason);
    }

    const Target& now;
    const JournalRecord& record;
};

// A copy whose lock is held: its record, or why it is not used.
struct Copy {
    std::optional<JournalRecord> record;
    std::string unused;
};

// Nothing of it is read before it is known whose it is and how long it may be. Throws Error.
Copy ReadCopy(const FileLock& lock, const Target& target) {
    const platform::FileStatus status = lock.Status();
    if (!target.Trusts(status)) return {{}, "it belongs to a user who does not own the file"};
    if (status.size > JournalRecord::kMaxBytes) return {{}, "it is longer than any copy"};
    std::string bytes(JournalRecord::kHeadBytes, '\0');
    bytes.resize(lock.ReadAt(0, bytes.data(), bytes.size()));
    if (JournalRecord::SizeFrom(bytes) != status.size) return {{}, "it is torn"};
    bytes.resize(static_cast<std::size_t>(status.size));
    if (lock.ReadAt(0, bytes.data(), bytes.size()) != bytes.size())
        throw Error(target.Name(), "read the copy", platform::LastErrorText());
    auto record = JournalRecord::Decode(std::move(bytes));
    if (!record) return {{}, "it is torn"};
    std::string unused = LeftOver(target, *record).Mismatch();
    return {std::move(record), std::move(unused)};
}

std::string Subject(const std::string& copy) {
    return "the copy of its metadata document, " + copy + ", ";
}

// Who stores keeps the lock of a copy, and who looks has it for a moment. Does not wait for those
// who store.
FileLock::Result TakeCopy(FileLock& lock, const std::string& copy, FileLock::Kind kind) {
    constexpr int kTries = 100;
    constexpr std::chrono::milliseconds kMoment(10);
    FileLock::Result taken = lock.Take(copy, kind);
    for (int i = 0; taken == FileLock::Result::Held && i < kTries; ++i) {
        if (lock.Take(copy, FileLock::Kind::Shared) == FileLock::Result::Held) break;
        lock.Release();
        std::this_thread::sleep_for(kMoment);
        taken = lock.Take(copy, kind);
    }
    return taken;
}

// Takes the lock of a file's copy, and lets `settle(target, copy, record)` answer for one that is
// of use.
template <class Settle>
Recovery WithCopy(const std::string& file, FileLock::Kind kind, Settle&& settle) {
    const std::string copy = MetadataJournal::PathFor(file);
    FileLock lock;
    switch (TakeCopy(lock, copy, kind)) {
        case FileLock::Result::Missing:
            return {};
        case FileLock::Result::Held:
            return {Outcome::UnderWay, ""};
        case FileLock::Result::NoLocks:
        case FileLock::Result::Failed:
            return {Outcome::Failed,
                    Subject(copy) + "cannot be opened: " + platform::LastErrorText()};
        case FileLock::Result::Taken:
            break;
    }
    try {
        const Target target(platform::ResolveLinks(file), OpenMode::Read);
        const Copy found = ReadCopy(lock, target);
        if (!found.unused.empty())
            return {Outcome::Unusable, Subject(copy) + "is not used: " + found.unused};
        return settle(target, copy, *found.record);
    } catch (const Error& error) {
        return {Outcome::Failed,
                "a store into it did not end, and what it left cannot be put in order: " +
                    error.Reason()};
    }
}

Recovery RecoverStore(const std::string& file) {
    return WithCopy(
        file, FileLock::Kind::Alone,
        [](const Target& target, const std::string& copy, const JournalRecord& record) -> Recovery {
            const Outcome outcome = LeftOver(target, record).Settle(copy);
            if (outcome == Outcome::Restored)
                return {outcome,
                        "a store into it did not end; its metadata document is again "
                        "the one of before"};
            return {outcome,
                    "a store into it did not end in good order; its metadata document "
                    "is whole"};
        });
}

Recovery LookForStore(const std::string& file) {
    return WithCopy(file, FileLock::Kind::Shared, [](const auto&...) -> Recovery {
        return {Outcome::Pending,
                "a store into it did not end; zmcraster recover puts its metadata document in "
                "order"};
    });
}

}  // namespace

std::string MetadataJournal::PathFor(const std::string& file) {
    const std::string target = platform::ResolveLinks(file);
    return platform::JoinPath(platform::FolderOf(target), SideFile::Stem(target) + '.' + kKind);
}

Recovery RecoverMetadata(const std::string& file) {
    // An update goes first: it brings the document of the file with it.
    Recovery update = RecoverUpdate(file);
    if (update.outcome != Outcome::Nothing && update.outcome != Outcome::Complete) return update;
    Recovery stored = RecoverStore(file);
    return stored.outcome == Outcome::Nothing ? update : stored;
}

Recovery LookForCopy(const std::string& file) {
    Recovery update = LookForUpdate(file);
    return update.outcome == Outcome::Nothing ? LookForStore(file) : update;
}

void DiscardMetadata(const std::string& file) {
    const auto refuse = [&](const std::string& why) {
        throw Error(file, "discard its metadata document", why);
    };
    const bool hadUpdate = DiscardUpdate(file);
    const std::string name = platform::ResolveLinks(file);
    const std::string copy = MetadataJournal::PathFor(file);
    FileLock lock;
    const FileLock::Result taken = TakeCopy(lock, copy, FileLock::Kind::Alone);
    if (taken == FileLock::Result::Held) refuse("another process is storing into the file");
    if (taken == FileLock::Result::NoLocks || taken == FileLock::Result::Failed)
        refuse(platform::LastErrorText());
    const bool hasCopy = taken == FileLock::Result::Taken;
    const Target target(name, OpenMode::Read);
    if (hasCopy && ReadCopy(lock, target).unused.empty())
        refuse("there is a copy of it, which can be put back");
    const bool damaged = !JudgeMetadata(target.Source(), name, target.Header()).empty();
    if (!damaged && !hasCopy && !hadUpdate) refuse("it is not damaged");
    if (damaged) {
        const Target changed(name, OpenMode::Update);
        if (!changed.IsSameAs(target)) refuse("another file has taken its name");
        int error = 0;
        if (!changed.Source().Truncate(changed.Header().tileDataEnd, &error) ||
            !changed.Source().Sync(&error))
            refuse(platform::ErrorText(error));
    }
    if (hasCopy && !RemoveCopy(copy)) refuse(platform::LastErrorText());
}

MetadataJournal::MetadataJournal(const std::string& fileName)
    : given(fileName), file(platform::ResolveLinks(fileName)) {
    const Recovery before = RecoverMetadata(file);
    if (before.outcome == Outcome::UnderWay)
        throw Error(given, kKeep, "another process is storing into the file");
    if (before.outcome == Outcome::Unusable || before.outcome == Outcome::Failed)
        throw Error(given, kKeep, before.text);
    const Target target(file, OpenMode::Read);
    record = target.Describe();
    record.text = target.Document();
    if (!record.text.empty())
        if (const std::string wrong = JudgeMetadataText(record.text); !wrong.empty())
            throw Error(given, kKeep, wrong);
    Write(record.Encode());
}

void MetadataJournal::Write(const std::string& bytes) {
    SideFile::RemoveStale(file, kKind);
    const std::string path = SideFile::MakeTemporary(file, kKind, lock);
    const auto fail = [&](const std::string& reason) {
        if (!path.empty()) platform::RemoveEntry(path);
        throw Error(given, kKeep, reason);
    };
    if (path.empty()) fail(platform::LastErrorText());
    if (!lock.Status().exists) fail("it cannot be locked");
    int error = 0;
    const auto source = FileSource::Open(WideFileName(path), OpenMode::Update, &error);
    if (!source || source->WriteAt(0, bytes.data(), bytes.size(), &error) != bytes.size() ||
        !source->Sync(&error))
        fail(platform::ErrorText(error));
    const std::string copy = PathFor(file);
    if (!platform::RenameToNewName(path, copy))
        fail(platform::StatusOf(copy).exists ? "another process is storing into the file"
                                             : platform::LastErrorText());
    if (!platform::SyncFolder(platform::FolderOf(copy))) {
        const std::string reason = platform::LastErrorText();
        platform::RemoveEntry(copy);
        throw Error(given, kKeep, reason);
    }
}

void MetadataJournal::Finish() {
    const auto fail = [&](const std::string& reason) {
        throw Error(given, "store into its metadata document", reason);
    };
    if (!platform::SyncFile(file)) fail(platform::LastErrorText());
    if (const std::string wrong = JudgeMetadata(file, PyramidHeader::Read(file)); !wrong.empty())
        fail(wrong);
    if (!RemoveCopy(PathFor(file))) fail(platform::LastErrorText());
    finished = true;
}

MetadataJournal::~MetadataJournal() {
    if (finished) return;
    try {
        LeftOver(Target(file, OpenMode::Read), record).Settle(PathFor(file));
    } catch (...) {
        // The copy stays; the next to open the file meets it.
    }
}

}  // namespace zmchost
