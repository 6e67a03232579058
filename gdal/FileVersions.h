// FileVersions: what GDAL calls its file systems with differs between its versions; it is told here
// alone. Seen with 3.6, 3.10 and 3.13; where between these it has changed is from GDAL's history.
#ifndef ZMC_GDAL_FILEVERSIONS_H
#define ZMC_GDAL_FILEVERSIONS_H

#include <cpl_vsi_virtual.h>
#include <gdal_version.h>

#include <memory>
#include <utility>

namespace zmcgdal {

// A pointer that owns, plain or clever; null where a file does not open.
using OpenedFile = decltype(std::declval<VSIFilesystemHandler&>().Open("", "", false, nullptr));

// A file system that hands on to another one what GDAL asks for in different ways.
class ForwardedFiles : public VSIFilesystemHandler {
public:
    explicit ForwardedFiles(std::shared_ptr<VSIFilesystemHandler> before)
        : plain(std::move(before)) {}

#if GDAL_VERSION_NUM < GDAL_COMPUTE_VERSION(3, 7, 0)
    char** ReadDir(const char* name) override { return plain->ReadDir(name); }
#endif
#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 11, 0)
    int Rename(const char* from, const char* to, GDALProgressFunc progress, void* data) override {
        return plain->Rename(from, to, progress, data);
    }
#else
    int Rename(const char* from, const char* to) override { return plain->Rename(from, to); }
#endif
#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 12, 0)
    bool IsLocal(const char* name) const override { return plain->IsLocal(name); }
#else
    bool IsLocal(const char* name) override { return plain->IsLocal(name); }
#endif

protected:
    const std::shared_ptr<VSIFilesystemHandler> plain;
};

#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 13, 0)
// GDAL's manager deletes a file system whose place another one takes, and gives out no share of it:
// its own is taken. Names of private members may stand where a template is instantiated by hand.
std::shared_ptr<VSIFilesystemHandler> FilesOfPlainNames();

template <auto Manager, auto Files>
struct ManagedFiles {
    friend std::shared_ptr<VSIFilesystemHandler> FilesOfPlainNames() { return Manager()->*Files; }
};
template struct ManagedFiles<&VSIFileManager::Get, &VSIFileManager::m_poDefaultHandler>;
#endif

// Has GDAL open plain names with such a ForwardedFiles, which hands on to what it opened them with
// before.
template <class Files>
void InstallForPlainNames() {
#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 13, 0)
    VSIFileManager::InstallHandler("", std::make_shared<Files>(FilesOfPlainNames()));
#else
    // The manager deletes none but the one that it has last.
    std::shared_ptr<VSIFilesystemHandler> before(VSIFileManager::GetHandler(""));
    VSIFileManager::InstallHandler("", new Files(std::move(before)));
#endif
}  // NOLINT(clang-analyzer-cplusplus.NewDeleteLeaks): handed over.

}  // namespace zmcgdal

#endif
