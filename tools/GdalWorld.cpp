#include "tools/GdalWorld.h"

#include <cpl_conv.h>
#include <cpl_error.h>
#include <cpl_string.h>

#include <algorithm>
#include <mutex>
#include <new>
#include <string_view>

#include "gdal/Driver.h"
#include "host/base/Xerces.h"
#include "host/build/PartGrid.h"
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

bool UserBoundsBlocks() { return CPLGetConfigOption("GDAL_CACHEMAX", nullptr) != nullptr; }

// Whether all that is read of a source are blocks of its first band's size.
bool HasBlocksOfItsOwn(GDALDataset& source) {
    constexpr int kNoOtherFile = GMF_ALL_VALID | GMF_NODATA | GMF_ALPHA;
    GDALDriver* const driver = source.GetDriver();
    return driver && std::string_view(driver->GetDescription()) == "GTiff" &&
           (source.GetRasterBand(1)->GetMaskFlags() & kNoOtherFile) != 0;
}

}  // namespace

void StartGdal() {
    zmchost::InitialiseXerces();
    CPLSetErrorHandler(&TakeError);
    GDALRegister_ZMCPyramid();
    GDALAllRegister();
    OpenRegularFilesOnly();
    if (!UserBoundsBlocks()) GDALSetCacheMax64(kBlockCache);
    if (GDALDriver* const memory = GetGDALDriverManager()->GetDriverByName("MEM")) {
        memory->pfnOpen = nullptr;
        memory->pfnIdentify = nullptr;
    }
}

void KeepBlocksForStrips(GDALDataset& source, std::uint64_t width) {
    if (UserBoundsBlocks() || !HasBlocksOfItsOwn(source)) return;
    int blockWidth = 1, blockHeight = 1;
    source.GetRasterBand(1)->GetBlockSize(&blockWidth, &blockHeight);
    std::uint64_t pixelBytes = 0;
    for (int band = 1; band <= source.GetRasterCount(); ++band)
        pixelBytes += static_cast<std::uint64_t>(
            GDALGetDataTypeSizeBytes(source.GetRasterBand(band)->GetRasterDataType()));
    // A strip may begin and end within a block, in either direction.
    const std::uint64_t lines = zmchost::kTileSide + 2 * static_cast<std::uint64_t>(blockHeight);
    const std::uint64_t columns = width + 2 * static_cast<std::uint64_t>(blockWidth);
    const auto most = static_cast<std::uint64_t>(kBlockCache);
    // Sizes of files are no sizes of memory: the product is bounded before it is made.
    const bool fits = lines < most && columns < most && lines * columns < most / pixelBytes;
    const std::uint64_t bytes = fits ? lines * columns * pixelBytes : most;
    GDALSetCacheMax64(static_cast<GIntBig>(std::clamp(bytes, most / 24, most)));
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
