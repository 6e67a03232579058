#include "files/OpenSource.h"

#include <cerrno>

#include "files/FileSource.h"
#include "files/Lending.h"
#include "platform/File.h"

namespace zelm::files {
namespace {

// 0, or why a source that is lent cannot be opened for that.
int Prepare(ByteSource* source, OpenMode mode) {
    if (!source) return ENOENT;
    if (mode == OpenMode::Read) return 0;
    if (!source->IsWritable()) return EACCES;
    int error = 0;
    if (mode == OpenMode::Create) source->Truncate(0, &error);
    return error;
}

}  // namespace

std::shared_ptr<ByteSource> OpenSource(const String& name, OpenMode mode, int* error) noexcept {
    if (!LooksLent(name)) return FileSource::Open(name, mode, error);
    std::shared_ptr<ByteSource> source = FindLent(name);
    const int failure = Prepare(source.get(), mode);
    if (error) *error = failure;
    return failure == 0 ? source : nullptr;
}

bool RemoveSource(const String& name, int* error) noexcept {
    if (!LooksLent(name)) return platform::RemoveFile(name.wide, error);
    if (const std::shared_ptr<ByteSource> source = FindLent(name)) return source->Remove(error);
    if (error) *error = ENOENT;
    return false;
}

}  // namespace zelm::files
