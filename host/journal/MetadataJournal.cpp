#include "host/journal/MetadataJournal.h"

#include <algorithm>
#include <memory>
#include <string_view>

#include "format/DocumentLimits.h"
#include "host/base/Checksum.h"
#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/file/MetadataDocument.h"
#include "host/file/SideFile.h"
#include "platform/File.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

using Outcome = Recovery::Outcome;
using platform::File;
using platform::FileLock;

const std::string kKind = "zmcmeta";
constexpr char kMark = zelm::kUnfinishedDocument;
const char* const kKeep = "keep a copy of its metadata document";

std::unique_ptr<File> OpenFile(const std::string& path, File::Mode mode) {
    return File::Open(WideFileName(path).wide, mode);
}

// Some bytes of a file; fewer, or none, where it does not have them or cannot be read.
std::string ReadPart(const std::string& path, std::uint64_t size) {
    const auto stream = OpenFile(path, File::Mode::Read);
    if (!stream) return "";
    std::string bytes(static_cast<std::size_t>(std::min(size, stream->Size())), '\0');
    bytes.resize(stream->ReadAt(0, bytes.data(), bytes.size()));
    return bytes;
}

// The record of a file as it is now.
JournalRecord Describe(const std::string& file, const PyramidHeader& header) {
    const platform::FileStatus status = platform::StatusOf(file);
    if (!status.exists) throw Error(file, "look at it", platform::LastErrorText());
    JournalRecord record;
    record.offset = header.tileDataEnd;
    record.fileSize = status.size;
    record.fileNumber = status.number;
    record.frontSize = header.tileDataStart;
    record.frontSum = Checksum(ReadPart(file, header.tileDataStart));
    record.systemRun = platform::SystemRun();
    return record;
}

bool RemoveCopy(const std::string& path) {
    return platform::RemoveEntry(path) && platform::SyncFolder(platform::FolderOf(path));
}

// What a left-over copy says and what there is to do about it. The caller holds its lock.
class LeftOver {
public:
    LeftOver(const std::string& rasterFile, const JournalRecord& kept)
        : file(rasterFile), record(kept) {}

    // Why the copy is not one of this file; empty if it is.
    std::string Mismatch() const {
        const JournalRecord now = Describe(file, PyramidHeader::Read(file));
        const bool same = now.offset == record.offset && now.fileNumber == record.fileNumber &&
                          now.frontSize == record.frontSize && now.frontSum == record.frontSum;
        if (!same) return "it is a copy of another file of that name";
        if (now.fileSize < std::min(record.offset, record.fileSize))
            return "the file has lost tiles since";
        return "";
    }

    // Puts the old document back if that is called for, and removes the copy. Throws Error.
    Outcome Settle(const std::string& copy) {
        const Outcome outcome = IsWhole() ? Outcome::Complete : Outcome::Restored;
        if (outcome == Outcome::Restored) PutBack();
        if (!platform::SyncFile(file)) Fail();
        if (!RemoveCopy(copy)) Fail();
        return outcome;
    }

private:
    // Whether the document in the file can be believed. What the system has seen without a break is
    // as the store left it: whole, or refused by parsers. After a break the disk may hold any
    // mixture, and only the old text is beyond doubt.
    bool IsWhole() const {
        const PyramidHeader header = PyramidHeader::Read(file);
        std::string text = ReadMetadataText(file, header);
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
        const auto stream = OpenFile(file, File::Mode::Update);
        std::uint64_t size = 0;
        if (!stream || !stream->TellSize(size)) Fail();
        const auto write = [&](std::uint64_t at, std::string_view bytes) {
            if (stream->WriteAt(at, bytes.data(), bytes.size()) != bytes.size()) Fail();
        };
        const std::string_view text = record.text;
        if (!text.empty()) write(record.offset, std::string_view(&kMark, 1));
        const std::uint64_t end = GotTiles(*stream) ? record.offset : record.fileSize;
        if (size > end && !stream->Truncate(end)) Fail();
        if (text.empty()) return;
        write(record.offset + 1, text.substr(1));
        write(record.offset, text.substr(0, 1));
    }

    // Whether a file that ended within its tiles has, or may have, got some since.
    bool GotTiles(File& stream) const {
        constexpr std::uint64_t kMost = std::uint64_t{256} << 20;
        if (record.fileSize >= record.offset) return false;
        if (record.offset - record.fileSize > kMost) return true;
        std::string piece(1 << 20, '\0');
        for (std::uint64_t at = record.fileSize; at < record.offset; at += piece.size()) {
            const auto size =
                static_cast<std::size_t>(std::min<std::uint64_t>(piece.size(), record.offset - at));
            if (stream.ReadAt(at, piece.data(), size) != size) return true;
            if (piece.find_first_not_of('\0') < size) return true;
        }
        return false;
    }

    [[noreturn]] void Fail() const {
        throw Error(file, "put its metadata document back", platform::LastErrorText());
    }

    const std::string& file;
    const JournalRecord& record;
};

// The lock is held. Throws Error.
Recovery Recover(const std::string& file, const std::string& copy) {
    const std::string subject = "the copy of its metadata document, " + copy + ", ";
    const auto size = platform::StatusOf(copy).size;
    const std::string bytes = ReadPart(copy, size);
    if (bytes.size() != size)
        return {Outcome::Failed, subject + "cannot be read: " + platform::LastErrorText()};
    const auto record = JournalRecord::Decode(bytes);
    if (!record) return {Outcome::Unusable, subject + "is not used: it is torn"};
    LeftOver leftOver(file, *record);
    if (const std::string why = leftOver.Mismatch(); !why.empty())
        return {Outcome::Unusable, subject + "is not used: " + why};
    const Outcome outcome = leftOver.Settle(copy);
    return {outcome, outcome == Outcome::Restored
                         ? "a store into it did not end; its metadata document is again the one "
                           "of before"
                         : "a store into it did not end in good order; its metadata document is "
                           "whole"};
}

}  // namespace

std::string MetadataJournal::PathFor(const std::string& file) {
    const std::string target = platform::ResolveLinks(file);
    return platform::JoinPath(platform::FolderOf(target), SideFile::Stem(target) + '.' + kKind);
}

Recovery RecoverMetadata(const std::string& file) {
    const std::string copy = MetadataJournal::PathFor(file);
    FileLock lock;
    switch (lock.Take(copy)) {
        case FileLock::Result::Missing:
            return {};
        case FileLock::Result::Held:
            return {Outcome::UnderWay, ""};
        case FileLock::Result::Failed:
            return {Outcome::Failed, "the copy of its metadata document, " + copy +
                                         ", cannot be opened: " + platform::LastErrorText()};
        case FileLock::Result::Taken:
            break;
    }
    try {
        return Recover(platform::ResolveLinks(file), copy);
    } catch (const Error& error) {
        return {Outcome::Failed,
                "a store into it did not end, and what it left cannot be put in order: " +
                    error.Reason()};
    }
}

void DiscardMetadata(const std::string& file) {
    const auto refuse = [&](const std::string& why) {
        throw Error(file, "discard its metadata document", why);
    };
    const std::string target = platform::ResolveLinks(file);
    const std::string copy = MetadataJournal::PathFor(file);
    FileLock lock;
    const FileLock::Result taken = lock.Take(copy);
    if (taken == FileLock::Result::Held) refuse("another process is storing into the file");
    if (taken == FileLock::Result::Failed) refuse(platform::LastErrorText());
    const bool hasCopy = taken == FileLock::Result::Taken;
    const PyramidHeader header = PyramidHeader::Read(target);
    if (hasCopy) {
        const auto record = JournalRecord::Decode(ReadPart(copy, platform::StatusOf(copy).size));
        if (record && LeftOver(target, *record).Mismatch().empty())
            refuse("there is a copy of it, which can be put back");
    }
    const bool damaged = !JudgeMetadata(target, header).empty();
    if (!damaged && !hasCopy) refuse("it is not damaged");
    if (damaged) {
        const auto stream = OpenFile(target, File::Mode::Update);
        if (!stream || !stream->Truncate(header.tileDataEnd) || !stream->Sync())
            refuse(platform::LastErrorText());
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
    const PyramidHeader header = PyramidHeader::Read(file);
    record = Describe(file, header);
    record.text = ReadMetadataText(file, header);
    if (!record.text.empty())
        if (const std::string wrong = JudgeMetadataText(record.text); !wrong.empty())
            throw Error(given, kKeep, wrong);
    Write(record.Encode());
}

void MetadataJournal::Write(const std::string& bytes) {
    SideFile::RemoveStale(file, kKind);
    const std::string path = SideFile::TemporaryPath(file, kKind);
    const auto fail = [&](const std::string& reason) {
        platform::RemoveEntry(path);
        throw Error(given, kKeep, reason);
    };
    if (!platform::CreateNewFile(path)) fail(platform::LastErrorText());
    {
        const auto stream = OpenFile(path, File::Mode::Update);
        if (!stream || stream->WriteAt(0, bytes.data(), bytes.size()) != bytes.size() ||
            !stream->Sync())
            fail(platform::LastErrorText());
    }
    if (lock.Take(path) != FileLock::Result::Taken) fail("it cannot be locked");
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
        LeftOver(file, record).Settle(PathFor(file));
    } catch (...) {
        // The copy stays; the next to open the file meets it.
    }
}

}  // namespace zmchost
