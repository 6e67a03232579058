#include "tools/GdalWorld.h"

#include <cpl_conv.h>
#include <cpl_error.h>
#include <cpl_string.h>

#include <mutex>
#include <new>

#include "gdal/Driver.h"
#include "host/base/Xerces.h"
#include "platform/FileSystem.h"
#include "tools/Message.h"
#include "tools/RegularFiles.h"

namespace zmctools {
namespace {

// GDAL would take a twentieth of the machine for blocks of its own; a row of tiles is enough here.
constexpr GIntBig kBlockCache = GIntBig{96} << 20;

std::mutex mutex;
std::string firstError;
std::string subject;

std::string WithoutPrefix(const std::string& text, const std::string& prefix) {
    return text.compare(0, prefix.size(), prefix) == 0 ? text.substr(prefix.size()) : text;
}

// The lock is held. So short a text takes no memory.
void TakeLoss(CPLErr kind) {
    if (kind == CE_Warning) WarnOfLoss();
    if (kind >= CE_Failure && firstError.empty()) firstError = "out of memory";
}

// GDAL works on threads of its own too, so there is one place for all of them. It is called from C
// and from the ends of exceptions, and must throw none.
void CPL_STDCALL TakeError(CPLErr kind, CPLErrorNum, const char* text) noexcept {
    const std::lock_guard lock(mutex);
    try {
        if (kind == CE_Warning) Warn(subject, WithoutPrefix(text, subject + ": "));
        if (kind >= CE_Failure && firstError.empty()) firstError = text;
    } catch (const std::bad_alloc&) {
        TakeLoss(kind);
    }
}

}  // namespace

void StartGdal() {
    zmchost::InitialiseXerces();
    CPLSetErrorHandler(&TakeError);
    GDALRegister_ZMCPyramid();
    GDALAllRegister();
    OpenRegularFilesOnly();
    if (!CPLGetConfigOption("GDAL_CACHEMAX", nullptr)) GDALSetCacheMax64(kBlockCache);
    if (GDALDriver* const memory = GetGDALDriverManager()->GetDriverByName("MEM")) {
        memory->pfnOpen = nullptr;
        memory->pfnIdentify = nullptr;
    }
}

void SetSubject(const std::string& file) {
    const std::lock_guard lock(mutex);
    subject = file;
}

std::string TakeGdalError(const std::string& file) {
    const std::lock_guard lock(mutex);
    std::string text = WithoutPrefix(firstError, file + ": ");
    firstError.clear();
    return text;
}

DatasetPtr OpenDataset(const std::string& name, const std::vector<std::string>& options) {
    CPLStringList list;
    for (const std::string& option : options) list.AddString(option.c_str());
    if (platform::StatusOf(name).IsSpecial()) throw Failure(name, "it is not a regular file");
    TakeGdalError(name);
    SetSubject(name);
    DatasetPtr dataset(GDALDataset::Open(name.c_str(), GDAL_OF_RASTER | GDAL_OF_VERBOSE_ERROR,
                                         nullptr, list.List(), nullptr));
    std::string reason = TakeGdalError(name);
    if (dataset) return dataset;
    if (reason.find("not recognized as") != reason.npos)
        reason = "it is in no raster format that GDAL knows";
    if (reason == "No such file or directory") reason = "there is no such file";
    if (reason.empty()) reason = "GDAL does not open it and gives no reason";
    throw Failure(name, reason);
}

}  // namespace zmctools
