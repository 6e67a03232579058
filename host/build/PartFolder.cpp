#include "host/build/PartFolder.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "files/FileSource.h"
#include "host/base/Checksum.h"
#include "host/base/Error.h"
#include "host/base/PackedNumbers.h"
#include "host/base/Text.h"
#include "platform/Directory.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

using zelm::files::FileSource;
using zelm::files::OpenMode;

constexpr const char* kScenes = "scenes";
constexpr const char* kPiecesEnding = ".pieces";
constexpr std::string_view kPartMagic = "ZMCPART1";
// Tables of every value of as many bands as the largest budget has room for.
constexpr std::uint64_t kMaxPartBytes = std::uint64_t{256} << 20;

const char* EndingOf(PartFolder::Kind kind) {
    switch (kind) {
        case PartFolder::Kind::Count:
            return ".count";
        case PartFolder::Kind::Store:
            return ".store";
        default:
            return ".part";
    }
}

// Records, and those that never got their name.
bool IsPartRecord(std::string_view name) {
    if (name == kScenes) return true;
    if (name.starts_with('.')) name.remove_prefix(1);
    const std::size_t digits = std::min(name.find_first_not_of("0123456789"), name.size());
    const std::string_view rest = name.substr(digits);
    return digits != 0 && (rest.starts_with(".part") || rest.starts_with(".count") ||
                           rest.starts_with(".store") || rest.starts_with(kPiecesEnding));
}

std::string ReadWhole(const std::string& path) {
    const auto source = FileSource::Open(WideFileName(path), OpenMode::Read);
    if (!source || source->Size() > kMaxPartBytes) return "";
    std::string bytes(static_cast<std::size_t>(source->Size()), '\0');
    bytes.resize(source->ReadAt(0, bytes.data(), bytes.size()));
    return bytes;
}

// The reason, if it could not be done.
std::string WriteWhole(const std::string& path, const std::string& bytes, bool durable) {
    int error = 0;
    const auto file = FileSource::Open(WideFileName(path), OpenMode::Create, &error);
    if (!file || file->WriteAt(0, bytes.data(), bytes.size(), &error) != bytes.size())
        return platform::ErrorText(error);
    return durable && !platform::SyncFile(path) ? platform::LastErrorText() : "";
}

}  // namespace

PartFolder::PartFolder(std::string folderPath, std::uint64_t buildNumber, bool isDurable)
    : folder(std::move(folderPath)), build(buildNumber), durable(isDurable) {}

void PartFolder::Make() const {
    if (!platform::MakeDirectory(folder.c_str()))
        throw Error(folder, "make the folder", platform::LastErrorText());
}

std::string PartFolder::NameOf(Kind kind, std::uint64_t part) const {
    return platform::JoinPath(folder, std::to_string(part) + EndingOf(kind));
}

std::string PartFolder::NewPath(const std::string& name) const {
    return platform::JoinPath(folder, '.' + name + '-' +
                                          std::to_string(platform::CurrentProcess()) + '-' +
                                          std::to_string(platform::RandomNumber()) + ".tmp");
}

std::string PartFolder::PiecesPath(std::uint64_t part) const {
    return platform::JoinPath(folder, std::to_string(part) + kPiecesEnding);
}

std::string PartFolder::NewPiecesPath(std::uint64_t part) const {
    return NewPath(std::to_string(part) + kPiecesEnding);
}

std::string PartFolder::Encode(Kind kind, std::uint64_t part, const PartResult& result) const {
    NumberPacker body;
    body.Put(build);
    body.Put(part);
    body.Put(static_cast<std::uint64_t>(kind));
    body.Put(result.tiles);
    body.PutText(result.sums);
    NumberPacker record;
    record.PutText(kPartMagic);
    record.Put(Checksum(body.Bytes()));
    record.PutText(body.Bytes());
    return record.Bytes();
}

void PartFolder::Keep(Kind kind, std::uint64_t part, const PartResult& result) const {
    const std::string path = NameOf(kind, part);
    const std::string made = NewPath(std::to_string(part) + EndingOf(kind));
    std::string reason = WriteWhole(made, Encode(kind, part, result), durable);
    if (reason.empty() && !platform::RenameFile(made, path)) reason = platform::LastErrorText();
    if (reason.empty() && durable && !platform::SyncFolder(folder))
        reason = platform::LastErrorText();
    if (reason.empty()) return;
    platform::RemoveEntry(made);
    throw Error(path, "keep the record of the part", reason);
}

std::optional<PartResult> PartFolder::Find(Kind kind, std::uint64_t part) const {
    const std::string bytes = ReadWhole(NameOf(kind, part));
    if (!bytes.starts_with(kPartMagic)) return std::nullopt;
    NumberUnpacker record(std::string_view(bytes).substr(kPartMagic.size()));
    if (record.Take() != Checksum(record.Rest())) return std::nullopt;
    const bool ours = record.Take() == build && record.Take() == part &&
                      record.Take() == static_cast<std::uint64_t>(kind);
    PartResult result;
    result.tiles = record.Take();
    result.sums = record.Rest();
    return ours && record.Good() ? std::optional(std::move(result)) : std::nullopt;
}

void PartFolder::KeepScenes(const std::string& bytes) const {
    const std::string path = platform::JoinPath(folder, kScenes);
    const std::string reason = WriteWhole(path, bytes, durable);
    if (!reason.empty()) throw Error(path, "keep what the source is made of", reason);
}

std::string PartFolder::Scenes() const { return ReadWhole(platform::JoinPath(folder, kScenes)); }

void PartFolder::Remove() const noexcept try {
    for (const std::string& name : platform::ListFolder(folder))
        if (IsPartRecord(name)) platform::RemoveEntry(platform::JoinPath(folder, name));
    platform::RemoveFolder(folder);
} catch (const std::bad_alloc&) {
    // What is left over is removed by whoever builds next.
}

}  // namespace zmchost
