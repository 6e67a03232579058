#include "tools/RegularFiles.h"

#include <cpl_vsi_virtual.h>

#include <cerrno>
#include <new>

#include "gdal/FileVersions.h"
#include "platform/FileSystem.h"

namespace zmctools {
namespace {

// 0, or the error by which a file does not open. GDAL calls from C, so that nothing is thrown.
int Refusal(const char* name) noexcept {
    try {
        return platform::StatusOf(name).IsSpecial() ? EINVAL : 0;
    } catch (const std::bad_alloc&) {
        return ENOMEM;
    }
}

// Hands all that concerns files, folders and how they are written on to the file system that GDAL
// had before. What belongs to files on a network alone, such as addresses, stays as good as absent.
class RegularFiles final : public zmcgdal::ForwardedFiles {
public:
    using ForwardedFiles::ForwardedFiles;

    zmcgdal::OpenedFile Open(const char* name, const char* access, bool setsError,
                             CSLConstList options) override {
        const int refusal = Refusal(name);
        if (refusal == 0) return plain->Open(name, access, setsError, options);
        errno = refusal;
        return nullptr;
    }
    int Stat(const char* name, VSIStatBufL* status, int flags) override {
        return plain->Stat(name, status, flags);
    }
    int Unlink(const char* name) override { return plain->Unlink(name); }
    int* UnlinkBatch(CSLConstList names) override { return plain->UnlinkBatch(names); }
    int Mkdir(const char* name, long mode) override { return plain->Mkdir(name, mode); }
    int Rmdir(const char* name) override { return plain->Rmdir(name); }
    int RmdirRecursive(const char* name) override { return plain->RmdirRecursive(name); }
    char** ReadDirEx(const char* name, int most) override { return plain->ReadDirEx(name, most); }
    char** SiblingFiles(const char* name) override { return plain->SiblingFiles(name); }
    int IsCaseSensitive(const char* name) override { return plain->IsCaseSensitive(name); }
    GIntBig GetDiskFreeSpace(const char* name) override { return plain->GetDiskFreeSpace(name); }
    int SupportsSparseFiles(const char* name) override { return plain->SupportsSparseFiles(name); }
    int HasOptimizedReadMultiRange(const char* name) override {
        return plain->HasOptimizedReadMultiRange(name);
    }
    bool Sync(const char* from, const char* to, const char* const* options,
              GDALProgressFunc progress, void* progressData, char*** outputs) override {
        return plain->Sync(from, to, options, progress, progressData, outputs);
    }
    char** GetFileMetadata(const char* name, const char* domain, CSLConstList options) override {
        return plain->GetFileMetadata(name, domain, options);
    }
    bool SetFileMetadata(const char* name, CSLConstList metadata, const char* domain,
                         CSLConstList options) override {
        return plain->SetFileMetadata(name, metadata, domain, options);
    }
    VSIDIR* OpenDir(const char* name, int depth, const char* const* options) override {
        return plain->OpenDir(name, depth, options);
    }
    bool SupportsSequentialWrite(const char* name, bool mayBeCopied) override {
        return plain->SupportsSequentialWrite(name, mayBeCopied);
    }
    bool SupportsRandomWrite(const char* name, bool mayBeCopied) override {
        return plain->SupportsRandomWrite(name, mayBeCopied);
    }
    bool SupportsRead(const char* name) override { return plain->SupportsRead(name); }
};

}  // namespace

void OpenRegularFilesOnly() { zmcgdal::InstallForPlainNames<RegularFiles>(); }

}  // namespace zmctools
