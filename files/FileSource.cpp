#include "files/FileSource.h"

#include <cerrno>
#include <new>

#include "platform/File.h"

namespace zelm::files {
namespace {

using platform::File;

static_assert(ByteSource::kUnknownSize == File::kUnknownSize);

File::Mode ModeOfFile(OpenMode mode) {
    switch (mode) {
        case OpenMode::Create:
            return File::Mode::Create;
        case OpenMode::Update:
            return File::Mode::Update;
        default:
            return File::Mode::Read;
    }
}

Identity Known(const platform::FileIdentity& file) {
    return {true, file.device, file.number, file.size, file.modified, file.changed};
}

}  // namespace

std::shared_ptr<FileSource> FileSource::Open(const String& name, OpenMode mode,
                                             int* error) noexcept {
    int failure = ENOMEM;
    std::shared_ptr<FileSource> source;
    try {
        source.reset(new FileSource(name, mode != OpenMode::Read));
        // The copy of a name that ran out of memory is none.
        const bool named = source->fileName.wide || !name.wide;
        if (named) source->file = File::Open(source->fileName.wide, ModeOfFile(mode), &failure);
        if (!source->file) source.reset();
    } catch (const std::bad_alloc&) {
    }
    if (error) *error = failure;
    return source;
}

FileSource::FileSource(const String& name, bool isWritable)
    : fileName(name), writable(isWritable) {}

FileSource::~FileSource() = default;

const WideChar* FileSource::Name() const noexcept { return fileName.wide; }

Identity FileSource::IdentifyName() const noexcept { return IdentifyName(fileName); }

Identity FileSource::IdentifyName(const String& name) noexcept {
    platform::FileIdentity identity;
    return name.wide && platform::TellIdentity(name.wide, identity) ? Known(identity) : Identity{};
}

bool FileSource::NameStillMeansThis() const noexcept {
    return Identify().SameThing(IdentifyName());
}

// The system tells the end of a file from a failure, so that nothing needs to be asked again.
Transfer FileSource::DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    Transfer done;
    done.bytes = file->ReadAt(offset, buffer, size, &done.error);
    done.end = done.error == 0;
    return done;
}

Transfer FileSource::DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
    Transfer done;
    done.bytes = file->WriteAt(offset, buffer, size, &done.error);
    return done;
}

int FileSource::DoTellSize(std::uint64_t& size) const {
    int error = 0;
    file->TellSize(size, &error);
    return error;
}

int FileSource::DoTruncate(std::uint64_t size) {
    int error = 0;
    file->Truncate(size, &error);
    return error;
}

int FileSource::DoSync() {
    int error = 0;
    file->Sync(&error);
    return error;
}

bool FileSource::DoIsWritable() const { return writable; }

Identity FileSource::DoIdentify() const {
    platform::FileIdentity identity;
    return file->TellIdentity(identity) ? Known(identity) : Identity{};
}

int FileSource::DoRemove() {
    if (!NameStillMeansThis()) return ESTALE;
    int error = 0;
    platform::RemoveFile(fileName.wide, &error);
    return error;
}

}  // namespace zelm::files
