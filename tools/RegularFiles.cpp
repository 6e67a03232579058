#include "tools/RegularFiles.h"

#include <cpl_vsi_virtual.h>

#include <cerrno>
#include <memory>
#include <new>

#include "platform/FileSystem.h"

namespace zmctools {
namespace {

// 0, or the error by which a file does not open. GDAL calls from C, so that nothing is thrown.
int Refusal(const char* name) noexcept {
    try {
        const platform::FileStatus status = platform::StatusOf(name);
        return status.exists && !status.isRegular && !status.isFolder ? EINVAL : 0;
    } catch (const std::bad_alloc&) {
        return ENOMEM;
    }
}

// Hands everything on to the file system that GDAL had before.
class RegularFiles final : public VSIFilesystemHandler {
public:
    explicit RegularFiles(VSIFilesystemHandler* before) : plain(before) {}

    VSIVirtualHandle* Open(const char* name, const char* access, bool setsError,
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
    int Mkdir(const char* name, long mode) override { return plain->Mkdir(name, mode); }
    int Rmdir(const char* name) override { return plain->Rmdir(name); }
    char** ReadDirEx(const char* name, int most) override { return plain->ReadDirEx(name, most); }
    char** ReadDir(const char* name) override { return plain->ReadDir(name); }
    int Rename(const char* from, const char* to) override { return plain->Rename(from, to); }
    int IsCaseSensitive(const char* name) override { return plain->IsCaseSensitive(name); }
    GIntBig GetDiskFreeSpace(const char* name) override { return plain->GetDiskFreeSpace(name); }
    int SupportsSparseFiles(const char* name) override { return plain->SupportsSparseFiles(name); }
    VSIDIR* OpenDir(const char* name, int depth, const char* const* options) override {
        return plain->OpenDir(name, depth, options);
    }
    bool IsLocal(const char* name) override { return plain->IsLocal(name); }

private:
    std::unique_ptr<VSIFilesystemHandler> plain;
};

}  // namespace

void OpenRegularFilesOnly() {
    // The manager deletes the one that it has last.
    VSIFileManager::InstallHandler("", new RegularFiles(VSIFileManager::GetHandler("")));
}

}  // namespace zmctools
