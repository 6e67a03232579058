#include "gdal/Driver.h"

#include <gdal_priv.h>

#include <memory>

#include "files/Lending.h"
#include "gdal/Create.h"
#include "gdal/Dataset.h"
#include "gdal/Fetcher.h"
#include "gdal/Options.h"
#include "gdal/Reporting.h"
#include "gdal/VsiSource.h"
#include "host/base/Xerces.h"
#include "host/file/PyramidFileInfo.h"
#include "host/journal/MetadataJournal.h"

namespace zmcgdal {
namespace {

constexpr const char* kName = "ZMCPyramid";

std::string_view StartOf(const GDALOpenInfo& info) {
    if (!info.pabyHeader || info.nHeaderBytes <= 0) return {};
    return {reinterpret_cast<const char*>(info.pabyHeader),
            static_cast<std::size_t>(info.nHeaderBytes)};
}

// Whether it leads to a file on a server whose name is one of a pyramid: GDAL leaves URLs to
// drivers without a look at them, and most are none of ours.
bool IsPyramidUrl(std::string_view name) {
    if (!name.starts_with("http://") && !name.starts_with("https://")) return false;
    return name.substr(0, name.find_first_of("?#")).ends_with(".pyr");
}

// Names of lent sources are made and used within code of one process: one that comes from a user of
// GDAL is nobody's.
int Identify(GDALOpenInfo* info) {
    return Reporting<int>(FALSE, [&]() -> int {
        if (IsPyramidUrl(info->pszFilename)) return GDAL_IDENTIFY_UNKNOWN;
        const bool lent = zelm::files::LooksLent(info->pszFilename);
        return !lent && zmchost::LooksLikePyramid(StartOf(*info)) ? TRUE : FALSE;
    });
}

void WarnIfIncomplete(const Dataset& dataset, const zmchost::PyramidFileInfo& info, bool zeros) {
    if (info.complete) return;
    CPLError(CE_Warning, CPLE_AppDefined,
             "%s: the pyramid is incomplete, " CPL_FRMT_GUIB " bytes are missing; %s",
             dataset.GetDescription(), static_cast<GUIntBig>(info.bytesMissing),
             zeros ? "they are read as zeros" : "what is there can be read");
}

// What a store that was cut off has left: statistics that GDAL stores into it now would be lost
// when somebody else puts the old ones back.
// Who opens for reading writes nothing.
void PutInOrder(const std::string& name, GDALAccess access) {
    const zmchost::Recovery recovery =
        access == GA_Update ? zmchost::RecoverMetadata(name) : zmchost::LookForCopy(name);
    using Outcome = zmchost::Recovery::Outcome;
    if (recovery.outcome == Outcome::Restored || recovery.outcome == Outcome::Complete ||
        recovery.outcome == Outcome::Pending)
        CPLError(CE_Warning, CPLE_AppDefined, "%s: %s", name.c_str(), recovery.text.c_str());
    else if (!recovery.text.empty())
        CPLDebug(kName, "%s: %s", name.c_str(), recovery.text.c_str());
}

std::unique_ptr<Dataset> Show(std::shared_ptr<OpenFile> file, const std::string& name,
                              GDALOpenInfo& info, const OpenOptions& options) {
    const zmchost::PyramidFileInfo layout = file->info;
    const bool isRemote = file->raster.Remote();
    auto dataset = Dataset::FromFile(std::move(file), info.eAccess);
    // A look for each companion is cheaper than a list of the whole folder, unless that is there.
    const Items siblings = info.AreSiblingFilesLoaded() ? info.GetSiblingFiles() : nullptr;
    if (isRemote)
        dataset->LoadSidecarLater(name.c_str());
    else
        dataset->LoadSidecar(name.c_str(), siblings);
    WarnIfIncomplete(*dataset, layout, options.missingAsZeros);
    if (options.overview) dataset = Dataset::FromOverview(std::move(dataset), *options.overview);
    if (options.alone) dataset->StandAlone();
    if (options.shared) dataset->Share();
    return dataset;
}

// Where it is asked for and the dataset cannot do it, GDAL opens one for each thread.
bool IsToBeShared([[maybe_unused]] const GDALOpenInfo& info) {
#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 10, 0)
    return (info.nOpenFlags & GDAL_OF_THREAD_SAFE) != 0;
#else
    return false;
#endif
}

std::unique_ptr<Dataset> OpenDataset(GDALOpenInfo& info) {
    const std::string name = info.pszFilename;
    if (!IsVirtualName(name)) PutInOrder(name, info.eAccess);
    OpenOptions options = OpenOptionsFrom(info.papszOpenOptions);
    options.shared = IsToBeShared(info);
    return Show(std::make_shared<OpenFile>(name, info.eAccess, options), name, info, options);
}

// GDAL has not looked at what a URL leads to, and has a driver of its own for those that no other
// one takes: what cannot be read in parts, or is no pyramid, is left to that.
std::unique_ptr<Dataset> OpenUrl(GDALOpenInfo& info) {
    const std::string name = NameOfUrl(info.pszFilename);
    const OpenOptions options = OpenOptionsFrom(info.papszOpenOptions);
    std::shared_ptr<RemoteSource> source;
    try {
        source = std::make_shared<RemoteSource>(MakeFetcher(name), options.remoteBytes);
    } catch (const FetchError&) {
        return nullptr;
    }
    char start[64] = {};
    if (!zmchost::LooksLikePyramid({start, source->ReadAt(0, start, sizeof start)})) return nullptr;
    return Show(std::make_shared<OpenFile>(name, source, options), name, info, options);
}

GDALDataset* Open(GDALOpenInfo* info) {
    if (!Identify(info)) return nullptr;
    const auto open = IsPyramidUrl(info->pszFilename) ? OpenUrl : OpenDataset;
    return Reporting<GDALDataset*>(
        nullptr, [&] { return open(*info).release(); }, CPLE_OpenFailed);
}

void Describe(GDALDriver& driver) {
    driver.SetDescription(kName);
    driver.SetMetadataItem(GDAL_DCAP_RASTER, "YES");
    driver.SetMetadataItem(GDAL_DCAP_VIRTUALIO, "YES");
    driver.SetMetadataItem(GDAL_DMD_LONGNAME, "Pyramid raster");
    driver.SetMetadataItem(GDAL_DMD_EXTENSION, "pyr");
    driver.SetMetadataItem(GDAL_DMD_EXTENSIONS, "pyr");
    driver.SetMetadataItem(GDAL_DMD_OPENOPTIONLIST, kOpenOptionsXml);
    driver.SetMetadataItem(GDAL_DMD_CREATIONOPTIONLIST, kCreationOptionsXml);
    driver.SetMetadataItem(GDAL_DMD_CREATIONDATATYPES,
#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 7, 0)
                           "Int8 "
#endif
                           "Byte Int16 UInt16 Int32 UInt32 Int64 UInt64 Float32 Float64 "
                           "CFloat32 CFloat64");
    driver.pfnIdentify = Identify;
    driver.pfnOpen = Open;
    driver.pfnCreateCopy = CreateCopy;
    driver.pfnCreate = CreateNew;
}

}  // namespace
}  // namespace zmcgdal

void GDALRegister_ZMCPyramid(void) {
    if (!GDAL_CHECK_VERSION("ZMCPyramid") || GDALGetDriverByName(zmcgdal::kName)) return;
    zmcgdal::Reported([] {
        zmchost::InitialiseXerces();
        auto driver = std::make_unique<GDALDriver>();
        zmcgdal::Describe(*driver);
        GetGDALDriverManager()->RegisterDriver(driver.release());
    });
}
