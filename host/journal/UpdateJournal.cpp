#include "host/journal/UpdateJournal.h"

#include <algorithm>
#include <optional>
#include <span>
#include <string_view>

#include "format/DocumentLimits.h"
#include "host/base/Checksum.h"
#include "host/base/Error.h"
#include "host/base/FixedNumbers.h"
#include "host/base/PackedNumbers.h"
#include "host/base/Text.h"
#include "host/file/PyramidRecords.h"
#include "host/file/SideFile.h"
#include "platform/FileSystem.h"
#include "platform/Rights.h"

namespace zmchost {
namespace {

using Outcome = Recovery::Outcome;
using platform::FileLock;
using zelm::files::FileSource;
using zelm::files::OpenMode;

const std::string kUpdateKind = "zmcupdate";
const char* const kUpdateIt = "update it";
constexpr std::string_view kUpdateMagic = "ZMCUPDT1";
// Where the index begins, its Checksum, and the magic.
constexpr std::uint64_t kUpdateTail = 24;
constexpr std::uint64_t kMaxUpdateIndex = std::uint64_t{256} << 20;
constexpr std::size_t kCopyBytes = std::size_t{1} << 20;
constexpr char kUpdateMark = zelm::kUnfinishedDocument;

// What a journal tells: of which file it is, and what is to stand where.
struct UpdateChanges {
    std::uint64_t fileNumber = 0;
    std::uint64_t frontSize = 0;  // of what stands in front of the tiles
    std::uint64_t frontSum = 0;
    std::uint64_t document = 0;  // where it stands
    std::uint64_t newSize = 0;
    std::uint64_t endings = 0;  // a bit for each companion that there is to be
    struct Piece : StagedSource::Piece {
        std::uint64_t sum = 0;
    };
    std::vector<Piece> pieces;
    std::string base;  // the name that companions stand by until they get theirs

    std::string Encode() const;
    static std::optional<UpdateChanges> Decode(std::string_view bytes, std::uint64_t end);
};

std::string UpdateChanges::Encode() const {
    NumberPacker packer;
    for (const std::uint64_t number : {fileNumber, frontSize, frontSum, document, newSize, endings,
                                       std::uint64_t{pieces.size()}})
        packer.Put(number);
    for (const Piece& piece : pieces)
        for (const std::uint64_t number : {piece.offset, piece.size, piece.place, piece.sum})
            packer.Put(number);
    packer.PutText(base);
    return packer.Bytes();
}

// Pieces lie in front of the index, behind the header of the file and within it.
std::optional<UpdateChanges> UpdateChanges::Decode(std::string_view bytes, std::uint64_t end) {
    NumberUnpacker numbers(bytes);
    UpdateChanges changes;
    for (std::uint64_t* number : {&changes.fileNumber, &changes.frontSize, &changes.frontSum,
                                  &changes.document, &changes.newSize, &changes.endings})
        *number = numbers.Take();
    const std::uint64_t count = numbers.Take();
    if (changes.newSize < changes.document ||
        changes.newSize - changes.document > zelm::kMaxDocumentBytes || count > bytes.size())
        return std::nullopt;
    for (std::uint64_t i = 0; i < count && numbers.Good(); ++i) {
        Piece piece;
        for (std::uint64_t* number : {&piece.offset, &piece.size, &piece.place, &piece.sum})
            *number = numbers.Take();
        if (piece.place > end || piece.size > end - piece.place ||
            piece.offset < changes.frontSize || piece.offset > changes.newSize ||
            piece.size > changes.newSize - piece.offset)
            return std::nullopt;
        changes.pieces.push_back(piece);
    }
    changes.base = numbers.Rest();
    const bool plain = platform::NameOf(changes.base) == changes.base &&
                       changes.base.starts_with('.') &&
                       changes.base.find('\0') == changes.base.npos;
    return numbers.Good() && plain ? std::optional(std::move(changes)) : std::nullopt;
}

// Lets `take(offset within, bytes)` have all of a range; what is read short is thrown.
template <class Take>
void ReadByPieces(zelm::files::ByteSource& source, const std::string& name, std::uint64_t offset,
                  std::uint64_t size, Take&& take) {
    std::string bytes;
    for (std::uint64_t done = 0; done < size; done += bytes.size()) {
        bytes.resize(static_cast<std::size_t>(std::min<std::uint64_t>(kCopyBytes, size - done)));
        int error = 0;
        if (source.ReadAt(offset + done, bytes.data(), bytes.size(), &error) != bytes.size())
            throw Error(name, kUpdateIt, error != 0 ? platform::ErrorText(error) : "it was cut");
        take(done, std::string_view(bytes));
    }
}

std::uint64_t SumOfRange(zelm::files::ByteSource& source, const std::string& name,
                         std::uint64_t offset, std::uint64_t size) {
    std::uint64_t sum = size;
    ReadByPieces(source, name, offset, size, [&](std::uint64_t, std::string_view bytes) {
        sum = PixelChecksum(sum, std::as_bytes(std::span(bytes)));
    });
    return sum;
}

// Of a pyramid, so that a journal is known to be of it.
std::uint64_t FrontSumOf(zelm::files::ByteSource& source, const std::string& name,
                         std::uint64_t size) {
    return SumOfRange(source, name, 0, size);
}

// A journal, sealed, with the file that it is of.
class Redo {
public:
    Redo(std::string pyramid, OpenMode mode) : name(std::move(pyramid)) {
        int error = 0;
        journal =
            FileSource::Open(WideFileName(UpdateJournal::PathFor(name)), OpenMode::Read, &error);
        if (!journal) throw Error(name, kUpdateIt, platform::ErrorText(error));
        file = FileSource::Open(WideFileName(name), mode, &error);
        if (!file) throw Error(name, kUpdateIt, platform::ErrorText(error));
    }

    // Why the journal is of no use; empty if it is.
    std::string Fault() {
        const platform::FileStatus note = platform::StatusOf(UpdateJournal::PathFor(name));
        const platform::FileStatus named = platform::StatusOf(name);
        if (!platform::MaySpeakFor(note, named) || note.number != journal->Identify().number)
            return "it belongs to somebody else";
        const std::uint64_t size = journal->Size();
        if (size == FileSource::kUnknownSize || size < kUpdateTail) return "it is torn";
        std::string tail(kUpdateTail, '\0');
        tail.resize(journal->ReadAt(size - kUpdateTail, tail.data(), tail.size()));
        if (tail.size() != kUpdateTail || !tail.ends_with(kUpdateMagic)) return "it is torn";
        const std::uint64_t end = FixedNumberAt(tail, 0);
        if (end > size - kUpdateTail || size - kUpdateTail - end > kMaxUpdateIndex)
            return "it is torn";
        std::string index(static_cast<std::size_t>(size - kUpdateTail - end), '\0');
        index.resize(journal->ReadAt(end, index.data(), index.size()));
        if (Checksum(index) != FixedNumberAt(tail, 8)) return "it is torn";
        auto read = UpdateChanges::Decode(index, end);
        if (!read) return "it is torn";
        changes = std::move(*read);
        for (const UpdateChanges::Piece& piece : changes.pieces)
            if (SumOfRange(*journal, name, piece.place, piece.size) != piece.sum)
                return "it is torn";
        return Mismatch();
    }

    void Apply() {
        const std::uint64_t document = changes.document;
        std::uint64_t size = 0;
        int error = 0;
        if (!file->TellSize(size, &error)) Fail(platform::ErrorText(error));
        if (size > document) Write(document, std::string_view(&kUpdateMark, 1));
        std::optional<char> first;
        for (const UpdateChanges::Piece& piece : changes.pieces)
            ReadByPieces(*journal, name, piece.place, piece.size,
                         [&](std::uint64_t done, std::string_view bytes) {
                             const std::uint64_t at = piece.offset + done;
                             if (at != document) return Write(at, bytes);
                             first = bytes.front();
                             Write(at, std::string_view(&kUpdateMark, 1));
                             Write(at + 1, bytes.substr(1));
                         });
        if (!file->Truncate(changes.newSize, &error)) Fail(platform::ErrorText(error));
        if (first) {
            Sync();
            Write(document, std::string_view(&*first, 1));
        }
        // Behind this nothing counts as a write any more, so that records can be stamped.
        platform::ReleaseReserve(name);
        Sync();
    }

    void SettleCompanions() const {
        const std::string folder = platform::FolderOf(name);
        const std::string from = platform::JoinPath(folder, changes.base);
        for (std::size_t i = 0; i < UpdateJournal::kEndings.size(); ++i) {
            const std::string& ending = UpdateJournal::kEndings[i];
            const bool isRecords = ending == PyramidRecords::kEnding;
            const std::string to = isRecords ? PyramidRecords::PathFor(name) : name + ending;
            const bool made = platform::StatusOf(from + ending).exists;
            if (made && isRecords) PyramidRecords::Stamp(from + ending, name);
            bool done = true;
            if (made)
                done = platform::RenameFile(from + ending, to);
            else if ((changes.endings >> i & 1u) == 0 && platform::StatusOf(to).exists)
                done = platform::RemoveEntry(to);
            if (!done) Fail(platform::LastErrorText());
        }
        if (!platform::RemoveEntry(UpdateJournal::PathFor(name)) || !platform::SyncFolder(folder))
            Fail(platform::LastErrorText());
    }

private:
    std::string Mismatch() {
        const PyramidHeader header = PyramidHeader::Read(*file, name);
        const bool same = changes.fileNumber == file->Identify().number &&
                          changes.document == header.tileDataEnd &&
                          changes.frontSize == header.tileDataStart &&
                          changes.frontSum == FrontSumOf(*file, name, header.tileDataStart);
        if (!same) return "it is of another file of that name";
        return header.fileSize < changes.document ? "the file has lost tiles since" : "";
    }

    [[noreturn]] void Fail(const std::string& reason) const {
        throw Error(name, kUpdateIt, reason);
    }
    void Write(std::uint64_t offset, std::string_view bytes) {
        int error = 0;
        if (file->WriteAt(offset, bytes.data(), bytes.size(), &error) != bytes.size())
            Fail(platform::ErrorText(error));
    }
    void Sync() {
        int error = 0;
        if (!file->Sync(&error)) Fail(platform::ErrorText(error));
    }

    std::string name;
    std::shared_ptr<FileSource> journal;
    std::shared_ptr<FileSource> file;
    UpdateChanges changes;
};

// Where there are no locks nobody can be seen to update.
bool TakeFileLock(FileLock& lock, const std::string& file) {
    return lock.Take(file) != FileLock::Result::Held;
}

std::string JournalSubject(const std::string& file) {
    return "the journal of an update, " + UpdateJournal::PathFor(file) + ", ";
}

// What updates that were ended before their journal counted have left.
void RemoveAbandonedUpdates(const std::string& file) {
    SideFile::RemoveStale(file, kUpdateKind);
    const std::string folder = platform::FolderOf(file);
    const std::string prefix = SideFile::Prefix(file, kUpdateKind);
    for (const std::string& entry : platform::ListFolder(folder))
        for (const std::string& ending : UpdateJournal::kEndings) {
            if (!entry.starts_with(prefix) || !entry.ends_with(".tmp" + ending)) continue;
            const std::string owner = entry.substr(0, entry.size() - ending.size());
            if (!platform::StatusOf(platform::JoinPath(folder, owner)).exists)
                platform::RemoveEntry(platform::JoinPath(folder, entry));
        }
}

template <class Settle>
Recovery WithJournal(const std::string& given, OpenMode mode, Settle&& settle) {
    const std::string file = platform::ResolveLinks(given);
    const platform::FileStatus status = platform::StatusOf(UpdateJournal::PathFor(file));
    if (!status.exists) return {};
    FileLock lock;
    if (!TakeFileLock(lock, file)) return {Outcome::UnderWay, ""};
    // Whoever was at it may have come to the end meanwhile.
    if (!platform::StatusOf(UpdateJournal::PathFor(file)).exists) return {};
    if (!status.isRegular)
        return {Outcome::Unusable, JournalSubject(file) + "is not used: it is no regular file"};
    try {
        Redo redo(file, mode);
        if (const std::string fault = redo.Fault(); !fault.empty())
            return {Outcome::Unusable, JournalSubject(file) + "is not used: " + fault};
        return settle(redo);
    } catch (const Error& error) {
        return {Outcome::Failed,
                "an update of it did not end, and cannot be finished: " + error.Reason()};
    }
}

}  // namespace

const std::vector<std::string> UpdateJournal::kEndings = {".msk", ".aux.xml",
                                                          PyramidRecords::kEnding};

std::string UpdateJournal::PathFor(const std::string& file) {
    const std::string target = platform::ResolveLinks(file);
    return platform::JoinPath(platform::FolderOf(target),
                              SideFile::Stem(target) + '.' + kUpdateKind);
}

UpdateJournal::UpdateJournal(const std::string& fileName)
    : given(fileName), file(platform::ResolveLinks(fileName)) {
    const auto refuse = [&](const std::string& why) { throw Error(given, kUpdateIt, why); };
    const Recovery before = RecoverMetadata(file);
    if (before.outcome == Outcome::UnderWay) refuse("another process is writing into it");
    if (before.outcome == Outcome::Unusable || before.outcome == Outcome::Failed)
        refuse(before.text);
    const platform::FileStatus status = platform::StatusOf(file);
    if (!status.exists) refuse("there is no such file");
    if (!status.isRegular) refuse("it is not a regular file");
    const std::string folder = platform::ResolveLinks(platform::FolderOf(given));
    if (platform::ResolveLinks(platform::JoinPath(folder, platform::NameOf(given))) !=
        platform::JoinPath(folder, platform::NameOf(given)))
        refuse("it is a link; name the file that it leads to");
    if (status.readOnly) refuse("the file is read-only");
    if (!TakeFileLock(fileLock, file)) refuse("another process is updating it");
    int error = 0;
    base = FileSource::Open(WideFileName(file), OpenMode::Read, &error);
    if (!base) throw Error(given, kUpdateIt, platform::ErrorText(error));
    header = PyramidHeader::Read(*base, given);
    if (header.BytesMissing() != 0)
        refuse("it is incomplete, " + std::to_string(header.BytesMissing()) + " bytes are missing");
    opened = base->Identify();
    RemoveAbandonedUpdates(file);
    path = SideFile::MakeTemporary(file, kUpdateKind, lock);
    if (path.empty()) refuse(platform::LastErrorText());
    journal = FileSource::Open(WideFileName(path), OpenMode::Update, &error);
    if (!journal) {
        platform::RemoveEntry(path);
        refuse(platform::ErrorText(error));
    }
    // What is written into the file is nobody else's business before.
    platform::MakePrivate(path);
    staged = std::make_shared<StagedSource>(base, journal);
    staged->Truncate(header.tileDataEnd);
}

UpdateJournal::~UpdateJournal() {
    if (sealed) return;
    for (const std::string& ending : kEndings)
        if (platform::StatusOf(Staged(ending)).exists) platform::RemoveEntry(Staged(ending));
    platform::RemoveEntry(path);
}

// The journal whole, on the disk and under its name; from that step on it counts.
void UpdateJournal::Seal() {
    const auto fail = [&](const std::string& why) { throw Error(given, kUpdateIt, why); };
    UpdateChanges changes;
    changes.fileNumber = opened.number;
    changes.frontSize = header.tileDataStart;
    changes.frontSum = FrontSumOf(*base, given, header.tileDataStart);
    changes.document = header.tileDataEnd;
    changes.newSize = staged->Size();
    changes.base = platform::NameOf(path);
    // A document is one piece, without what was written and then written over.
    std::string document(static_cast<std::size_t>(changes.newSize - changes.document), '\0');
    if (staged->ReadAt(changes.document, document.data(), document.size()) != document.size())
        fail("what was gathered for it cannot be read");
    staged->Truncate(changes.document);
    if (!document.empty() &&
        staged->WriteAt(changes.document, document.data(), document.size()) != document.size())
        fail("what was gathered for it cannot be written");
    for (const StagedSource::Piece& piece : staged->Pieces())
        changes.pieces.push_back({piece, SumOfRange(*journal, given, piece.place, piece.size)});
    for (std::size_t i = 0; i < kEndings.size(); ++i) {
        const std::string companion = Staged(kEndings[i]);
        if (!platform::StatusOf(companion).exists) continue;
        changes.endings |= std::uint64_t{1} << i;
        const std::string before = file + kEndings[i];
        const std::string& like = platform::StatusOf(before).exists ? before : file;
        if (!platform::CopyRights(like, companion) || !platform::SyncFile(companion))
            fail(platform::LastErrorText());
    }
    const std::uint64_t end = staged->AsideSize();
    const std::string index = changes.Encode();
    const std::string tail =
        index + FixedNumber(end) + FixedNumber(Checksum(index)) + std::string(kUpdateMagic);
    int error = 0;
    if (journal->WriteAt(end, tail.data(), tail.size(), &error) != tail.size() ||
        !journal->Sync(&error))
        fail(platform::ErrorText(error));
    if (!base->NameStillMeansThis() || !base->Identify().SameContent(opened))
        fail("somebody else has written to it meanwhile");
    // What has its journal under its name should not fail for want of room. Reserving counts as a
    // write, so it comes behind the look.
    if (changes.newSize > opened.size && !platform::ReserveSpace(file, changes.newSize))
        fail(platform::LastErrorText());
    if (!platform::RenameToNewName(path, PathFor(file))) fail(platform::LastErrorText());
    sealed = true;
}

void UpdateJournal::Commit() {
    Seal();
    try {
        if (!platform::SyncFolder(platform::FolderOf(file)))
            throw Error(given, kUpdateIt, platform::LastErrorText());
        Redo redo(file, OpenMode::Update);
        if (const std::string fault = redo.Fault(); !fault.empty())
            throw Error(given, kUpdateIt, "its journal cannot be used: " + fault);
        redo.Apply();
        redo.SettleCompanions();
    } catch (const Error& error) {
        throw Error(given, kUpdateIt, error.Reason() + "; zmcraster recover goes on with it");
    }
}

Recovery RecoverUpdate(const std::string& file) {
    return WithJournal(file, OpenMode::Update, [](Redo& redo) -> Recovery {
        redo.Apply();
        redo.SettleCompanions();
        return {Outcome::Complete, "an update of it did not end; it has been finished"};
    });
}

Recovery LookForUpdate(const std::string& file) {
    return WithJournal(file, OpenMode::Read, [](const Redo&) -> Recovery {
        return {Outcome::Pending, "an update of it did not end; zmcraster recover finishes it"};
    });
}

bool DiscardUpdate(const std::string& file) {
    const auto refuse = [&](const std::string& why) {
        throw Error(file, "discard the journal of its update", why);
    };
    const Recovery found = LookForUpdate(file);
    if (found.outcome == Outcome::Nothing) return false;
    if (found.outcome == Outcome::UnderWay) refuse("another process is updating the file");
    if (found.outcome == Outcome::Pending) refuse("the update can be finished");
    if (found.outcome == Outcome::Failed) refuse(found.text);
    if (!platform::RemoveEntry(UpdateJournal::PathFor(file))) refuse(platform::LastErrorText());
    return true;
}

}  // namespace zmchost
