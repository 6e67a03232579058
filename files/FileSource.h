// FileSource: a plain file as a source, opened once.
//
// It stays the file that was opened, whatever happens to its name: renamed, replaced or removed, it
// goes on being read, and it goes when the source does. Asking Identify again tells whether the
// file itself was changed or cut since, and NameStillMeansThis whether somebody who opened the name
// now would get it.
//
// Transfers are system calls, without a buffer between. The file is not inherited by programs that
// are started, and never has the number of a standard stream. Everything may be called from any
// number of threads at once. A process that forks shares the file with its copy; since no position
// is kept, neither disturbs the other.
#ifndef ZMC_FILES_FILESOURCE_H
#define ZMC_FILES_FILESOURCE_H

#include <memory>

#include "core/String.h"
#include "files/ByteSource.h"
#include "files/FilesApi.h"

namespace platform {
class File;
}

namespace zelm::files {

class ZMC_FILES_API FileSource final : public ByteSource {
public:
    // Opens the regular file of that name. Null if that cannot be done, with the reason in `error`
    // (else 0), if that is not null. Names are taken as they are: nothing lent is looked for.
    // IsWritable is true of Create and Update.
    static std::shared_ptr<FileSource> Open(const String& name, OpenMode mode,
                                            int* error = nullptr) noexcept;
    ~FileSource() override;

    // The name that it was opened by, zero-terminated; good as long as the source.
    const WideChar* Name() const noexcept;
    // What the name leads to now, through links; unknown if to nothing. A relative name is looked
    // up from the folder that is current at the call.
    Identity IdentifyName() const noexcept;
    // The same of any name.
    static Identity IdentifyName(const String& name) noexcept;
    // Whether the name still leads to the file that is open here. False as well if neither can be
    // told. It may be otherwise a moment later.
    bool NameStillMeansThis() const noexcept;

protected:
    Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override;
    Transfer DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) override;
    int DoTellSize(std::uint64_t& size) const override;
    int DoTruncate(std::uint64_t size) override;
    int DoSync() override;
    bool DoIsWritable() const override;
    Identity DoIdentify() const override;
    // Removes the name, if it still means this file: ESTALE if not. Between the question and the
    // removal others may replace the file; no call of the system does both in one. Where the name
    // is a link, the link goes.
    int DoRemove() override;

private:
    FileSource(const String& name, bool isWritable);

    const String fileName;
    const bool writable;
    std::unique_ptr<platform::File> file;
};

}  // namespace zelm::files

#endif
