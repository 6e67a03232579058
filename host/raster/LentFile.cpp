#include "host/raster/LentFile.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "host/base/Error.h"
#include "host/base/Text.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

using zelm::files::ByteSource;
using zelm::files::Failure;
using zelm::files::FailureRecord;
using zelm::files::FileSource;
using zelm::files::OpenMode;
using zelm::files::Operation;

std::string ReasonNotToOpen(int error) {
    if (error == ENOENT) return "there is no such file";
    if (error == EISDIR || error == EINVAL) return "it is not a file";
    return platform::ErrorText(error);
}

std::string Bytes(std::uint64_t count) { return std::to_string(count) + " bytes"; }

std::string Describe(const Failure& failure) {
    const auto transfer = [&](const char* verb) {
        return verb + Bytes(failure.size) + " at offset " + std::to_string(failure.offset);
    };
    switch (failure.operation) {
        case Operation::Read:
            return transfer("reading ");
        case Operation::Write:
            return transfer("writing ");
        case Operation::Truncate:
            return "making it " + Bytes(failure.offset) + " long";
        case Operation::Size:
            return "asking for its size";
        case Operation::Sync:
            return "waiting for the disk";
        case Operation::Remove:
            break;
    }
    return "removing it";
}

std::string CutTo(std::uint64_t before, std::uint64_t now) {
    return "it was cut from " + std::to_string(before) + " to " + Bytes(now);
}

}  // namespace

std::shared_ptr<FileSource> OpenPlainFile(const std::string& file, bool forUpdate) {
    const zelm::String name = WideFileName(file);
    int error = 0;
    std::shared_ptr<FileSource> source;
    if (forUpdate && !platform::StatusOf(file).readOnly)
        source = FileSource::Open(name, OpenMode::Update);
    if (!source) source = FileSource::Open(name, OpenMode::Read, &error);
    if (error == ENOMEM) throw std::bad_alloc();
    if (!source) throw Error(file, "open the raster", ReasonNotToOpen(error));
    return source;
}

std::shared_ptr<LentFile> LentFile::Create(const std::string& file) {
    const zelm::String name = WideFileName(file);
    int error = 0;
    std::shared_ptr<FileSource> source = FileSource::Open(name, OpenMode::Update, &error);
    const bool isNew = error == ENOENT;
    if (isNew) source = FileSource::Open(name, OpenMode::Create, &error);
    if (error == ENOMEM) throw std::bad_alloc();
    if (!source) throw Error(file, "create the raster", ReasonNotToOpen(error));
    auto made = std::make_shared<LentFile>(source, file);
    made->goesAgain = isNew;
    return made;
}

LentFile::LentFile(std::shared_ptr<ByteSource> source, std::string name)
    : plain(std::dynamic_pointer_cast<FileSource>(source)),
      recording(std::make_shared<zelm::files::RecordingSource>(std::move(source))),
      lent(zelm::files::Lend(recording)),
      file(std::move(name)) {
    if (!lent) throw Error(file, "open the raster", "it cannot be lent to the module");
    Accept();
}

LentFile::~LentFile() {
    if (goesAgain) recording->Remove();
}

std::uint64_t LentFile::Size() const {
    std::uint64_t size = 0;
    return recording->TellSize(size) ? size : 0;
}

std::string LentFile::PlainName() const { return plain ? Narrow(plain->Name()) : ""; }

std::string LentFile::TakeFailure() const {
    const FailureRecord record = recording->Take();
    if (record.first)
        return platform::ErrorText(record.first->error) + " (" + Describe(*record.first) + ")";
    if (!record.firstEnd) return "";
    const std::uint64_t size = recording->Size();
    const std::uint64_t end = record.firstEnd->offset + record.firstEnd->moved;
    if (WasCutTo(size)) return CutTo(acceptedSize, size);
    return end < size ? "less was read than is there (" + Describe(*record.firstEnd) + ")" : "";
}

void LentFile::Accept() {
    goesAgain = false;
    acceptedSize = Size();
    accepted = recording->Identify();
}

void LentFile::AcceptOwnChange(std::uint64_t least) {
    const std::uint64_t size = recording->Size();
    if (size != ByteSource::kUnknownSize && size >= least) Accept();
    recording->Reset();
}

std::string LentFile::LossOfName() const {
    if (!plain || plain->NameStillMeansThis()) return "";
    return plain->IdentifyName().known ? "another file has taken its name"
                                       : "its name leads to no file any more";
}

bool LentFile::WasCutTo(std::uint64_t size) const {
    return size != ByteSource::kUnknownSize && size < acceptedSize;
}

std::string LentFile::ContentChange() const {
    const std::uint64_t size = recording->Size();
    if (WasCutTo(size)) return CutTo(acceptedSize, size);
    const bool same = !accepted.known || recording->Identify().SameContent(accepted);
    return same ? "" : "others have written to it";
}

std::string LentFile::Change() const {
    std::string loss = WasCutTo(recording->Size()) ? "" : LossOfName();
    return loss.empty() ? ContentChange() : loss;
}

}  // namespace zmchost
