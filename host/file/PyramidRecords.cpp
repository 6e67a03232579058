#include "host/file/PyramidRecords.h"

#include <cstring>

#include "host/base/Checksum.h"
#include "host/base/Error.h"
#include "host/base/FixedNumbers.h"
#include "host/base/PackedNumbers.h"
#include "host/base/Text.h"
#include "host/file/SideFile.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

using zelm::files::FileSource;
using zelm::files::Identity;
using zelm::files::OpenMode;

constexpr std::string_view kRecordsMagic = "ZMCRECS1";
constexpr std::uint64_t kRecordsHead = 24;
constexpr std::uint64_t kRecordsTail = 16;
constexpr std::uint64_t kMaxRecordsIndex = std::uint64_t{64} << 20;
constexpr std::uint64_t kMaxRecordsPiece = std::uint64_t{64} << 20;
constexpr const char* kUseRecords = "use the records of its statistics";
constexpr const char* kKeepRecords = "keep records of its statistics";

// What tells a state of a pyramid.
std::string StateOfPyramid(const std::string& pyramid) {
    const Identity found = FileSource::IdentifyName(WideFileName(pyramid));
    return FixedNumber(found.size) + FixedNumber(static_cast<std::uint64_t>(found.modified));
}

std::string ReadRange(FileSource& source, std::uint64_t offset, std::uint64_t size) {
    std::string bytes(static_cast<std::size_t>(size), '\0');
    bytes.resize(source.ReadAt(offset, bytes.data(), bytes.size()));
    return bytes;
}

}  // namespace

std::string PyramidRecords::PathFor(const std::string& pyramid) {
    const std::string target = platform::ResolveLinks(pyramid);
    return platform::JoinPath(platform::FolderOf(target), SideFile::Stem(target) + kEnding);
}

bool PyramidRecords::ReadIndex(std::string_view index, std::uint64_t end) {
    NumberUnpacker numbers(index);
    facts = numbers.Take();
    const std::uint64_t noteSize = numbers.Take();
    const std::uint64_t count = numbers.Take();
    if (!numbers.Good() || count > index.size()) return false;
    std::uint64_t offset = kRecordsHead;
    for (std::uint64_t i = 0; i < count; ++i) {
        const Place place{offset, numbers.Take(), numbers.Take()};
        if (!numbers.Good() || place.size > kMaxRecordsPiece || place.size > end - offset)
            return false;
        pieces.push_back(place);
        offset += place.size;
    }
    note = numbers.Rest();
    return noteSize == note.size() && offset == end;
}

std::unique_ptr<PyramidRecords> PyramidRecords::Find(const std::string& pyramid) {
    const std::string path = PathFor(pyramid);
    const platform::FileStatus status = platform::StatusOf(path);
    if (!status.exists) return nullptr;
    const auto fail = [&](const std::string& why) { throw Error(pyramid, kUseRecords, why); };
    if (!status.isRegular) fail("they are no regular file");
    auto found = std::make_unique<PyramidRecords>();
    found->name = pyramid;
    int error = 0;
    found->source = FileSource::Open(WideFileName(path), OpenMode::Read, &error);
    if (!found->source) throw Error(pyramid, kUseRecords, platform::ErrorText(error));
    FileSource& source = *found->source;
    const std::uint64_t size = source.Size();
    const std::string damaged = "they are damaged";
    if (size == FileSource::kUnknownSize || size < kRecordsHead + kRecordsTail) fail(damaged);
    const std::string head = ReadRange(source, 0, kRecordsHead);
    const std::string tail = ReadRange(source, size - kRecordsTail, kRecordsTail);
    if (head.size() != kRecordsHead || tail.size() != kRecordsTail ||
        !head.starts_with(kRecordsMagic))
        fail(damaged);
    const std::uint64_t end = FixedNumberAt(tail, 0);
    if (end < kRecordsHead || end > size - kRecordsTail ||
        size - kRecordsTail - end > kMaxRecordsIndex)
        fail(damaged);
    const std::string index = ReadRange(source, end, size - kRecordsTail - end);
    if (Checksum(index) != FixedNumberAt(tail, 8) || !found->ReadIndex(index, end)) fail(damaged);
    if (head.substr(kRecordsMagic.size()) != StateOfPyramid(pyramid))
        fail("the file was written to since they were made");
    return found;
}

std::string PyramidRecords::Piece(std::size_t number) const {
    const Place& place = pieces.at(number);
    std::string bytes = ReadRange(*source, place.offset, place.size);
    if (bytes.size() != place.size || Checksum(bytes) != place.sum)
        throw Error(name, kUseRecords, "they are damaged");
    return bytes;
}

void PyramidRecords::Stamp(const std::string& records, const std::string& pyramid) {
    int error = 0;
    const auto file = FileSource::Open(WideFileName(records), OpenMode::Update, &error);
    const std::string state = StateOfPyramid(pyramid);
    if (!file ||
        file->WriteAt(kRecordsMagic.size(), state.data(), state.size(), &error) != state.size() ||
        !file->Sync(&error))
        throw Error(pyramid, kKeepRecords, platform::ErrorText(error));
}

namespace {

std::shared_ptr<FileSource> Created(const std::string& path, const std::string& pyramid) {
    int error = 0;
    auto file = FileSource::Open(WideFileName(path), OpenMode::Create, &error);
    if (!file) throw Error(pyramid, kKeepRecords, platform::ErrorText(error));
    return file;
}

}  // namespace

RecordsWriter::RecordsWriter(const std::string& path, const std::string& pyramid)
    : name(pyramid), file(Created(path, pyramid)) {
    static const std::string front = std::string(kRecordsMagic) + FixedNumber(0) + FixedNumber(0);
    Write(front);
}

void RecordsWriter::Write(std::string_view bytes) {
    int error = 0;
    if (file->WriteAt(end, bytes.data(), bytes.size(), &error) != bytes.size())
        throw Error(name, kKeepRecords, platform::ErrorText(error));
    end += bytes.size();
}

void RecordsWriter::Append(std::string_view piece) {
    pieces.push_back({end, piece.size(), Checksum(piece)});
    Write(piece);
}

void RecordsWriter::End(std::uint64_t facts, const std::string& note) {
    NumberPacker index;
    index.Put(facts);
    index.Put(std::uint64_t{note.size()});
    index.Put(std::uint64_t{pieces.size()});
    for (const PyramidRecords::Place& place : pieces) {
        index.Put(place.size);
        index.Put(place.sum);
    }
    index.PutText(note);
    const std::string start = FixedNumber(end);
    Write(index.Bytes());
    Write(start + FixedNumber(Checksum(index.Bytes())));
    int error = 0;
    if (!file->Sync(&error)) throw Error(name, kKeepRecords, platform::ErrorText(error));
}

}  // namespace zmchost
