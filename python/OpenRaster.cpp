#include "python/OpenRaster.h"

#include <cpl_string.h>

#include <algorithm>
#include <numeric>
#include <utility>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "gdal/Create.h"
#include "gdal/Driver.h"
#include "gdal/ErrorCatcher.h"
#include "gdal/Fetcher.h"
#include "host/base/Error.h"
#include "host/base/Xerces.h"
#include "host/journal/MetadataJournal.h"

namespace zmcpython {
namespace {

using zelm::Rectangle;

// As which GDAL knows what has no name: no file system of its, so that nothing is beside it.
constexpr const char* kNameless = "/vsizmcraster/object";
constexpr const char* kNothingElse = "object";

// What a store or an update that was cut off has left.
void PutInOrder(const std::string& name, bool update) {
    const zmchost::Recovery recovery =
        update ? zmchost::RecoverMetadata(name) : zmchost::LookForCopy(name);
    using Outcome = zmchost::Recovery::Outcome;
    if (recovery.outcome == Outcome::Restored || recovery.outcome == Outcome::Complete ||
        recovery.outcome == Outcome::Pending)
        CPLError(CE_Warning, CPLE_AppDefined, "%s: %s", name.c_str(), recovery.text.c_str());
}

OpenRaster::Layout LayoutOf(const zmchost::PyramidFileInfo& info) {
    const zmchost::PyramidHeader& header = info.header;
    OpenRaster::Layout layout;
    layout.bands = header.bandCount;
    layout.pixelType = header.pixelType;
    layout.tileSize = header.tileSize;
    layout.ordering = zelm::TileOrderName(header.tileOrdering);
    layout.bytesMissing = info.bytesMissing;
    layout.fileSize = header.fileSize;
    for (const zmchost::PyramidLevelInfo& level : info.levels)
        if (level.width > 0 && level.height > 0)
            layout.levels.push_back({level.level, level.width, level.height});
    if (!layout.levels.empty()) {
        layout.width = layout.levels.front().width;
        layout.height = layout.levels.front().height;
    }
    return layout;
}

// A type that GDAL has for the pixels of a raster that it makes, and whether they are signed bytes
// of which it has none.
std::pair<GDALDataType, bool> TypeToCreate(std::uint32_t pixelType) {
    const GDALDataType type = zmcgdal::GdalTypeOf(pixelType, zmcgdal::SignedByteAs::Own);
    const bool flagged = zmcgdal::IsWidened(pixelType, type);
    return {flagged ? GDT_Byte : type, flagged};
}

// Complex samples have no statistics.
bool HasOrder(const std::string& name) {
    bool hasOrder = false;
    zelm::VisitElementType(
        zmchost::PyramidHeader::Read(name).pixelType,
        [&]<class T>(std::type_identity<T>) { hasOrder = !zelm::kIsComplex<T>; });
    return hasOrder;
}

GDALRasterIOExtraArg UsualWay() {
    GDALRasterIOExtraArg extra;
    INIT_RASTERIO_EXTRA_ARG(extra);
    return extra;
}

}  // namespace

void StartLibraries() {
    zmchost::InitialiseXerces();
    GDALRegister_ZMCPyramid();
    GDALAllRegister();
}

OpenRaster::OpenRaster(std::string rasterName, Manner opened)
    : name(std::move(rasterName)), manner(std::move(opened)) {}

OpenRaster::~OpenRaster() = default;

std::unique_ptr<OpenRaster> OpenRaster::Open(const std::string& given, const Manner& manner) {
    const std::string name = zmcgdal::NameOfUrl(given);
    if (!zmcgdal::IsVirtualName(name)) PutInOrder(name, manner.update);
    zmcgdal::OpenOptions options;
    options.threads = manner.threads;
    options.missingAsZeros = manner.missingAsZeros;
    if (manner.update) options.statistics = manner.renews && HasOrder(name);
    options.shared = !manner.update;
    options.keepsTiles = manner.update;
    std::unique_ptr<OpenRaster> raster(new OpenRaster(given, manner));
    const GDALAccess access = manner.update ? GA_Update : GA_ReadOnly;
    raster->Show(std::make_shared<zmcgdal::OpenFile>(name, access, options), name, false);
    if (manner.update && !raster->dataset->File().raster.Get().IsWritable())
        throw zmchost::Error(given, "open it for writing", "it is read-only");
    return raster;
}

std::unique_ptr<OpenRaster> OpenRaster::Open(std::shared_ptr<zelm::files::ByteSource> source,
                                             const std::string& name, const Manner& manner) {
    zmcgdal::OpenOptions options;
    options.threads = manner.threads;
    options.missingAsZeros = manner.missingAsZeros;
    options.shared = true;
    options.keepsTiles = false;
    std::unique_ptr<OpenRaster> raster(new OpenRaster(name, manner));
    raster->Show(std::make_shared<zmcgdal::OpenFile>(name, std::move(source), options), kNameless,
                 true);
    return raster;
}

void OpenRaster::Show(std::shared_ptr<zmcgdal::OpenFile> opened, const std::string& sidecarName,
                      bool alone) {
    layout = LayoutOf(opened->info);
    sampleType = opened->tiles.Type();
    const bool isRemote = opened->raster.Remote() != nullptr;
    dataset =
        zmcgdal::Dataset::FromFile(std::move(opened), manner.update ? GA_Update : GA_ReadOnly);
    CPLStringList siblings;
    siblings.AddString(kNothingElse);
    if (isRemote)
        dataset->LoadSidecarLater(sidecarName.c_str());
    else
        dataset->LoadSidecar(sidecarName.c_str(), alone ? siblings.List() : nullptr);
}

std::unique_ptr<OpenRaster> OpenRaster::Create(const std::string& name, const NewRaster& raster) {
    const auto [type, flagged] = TypeToCreate(raster.pixelType);
    CPLStringList options;
    for (const std::string& option : raster.options) options.AddString(option.c_str());
    if (flagged) options.AddString("PIXELTYPE=SIGNEDBYTE");
    Manner manner;
    manner.update = true;
    std::unique_ptr<OpenRaster> made(new OpenRaster(name, manner));
    GDALDataset* const created = zmcgdal::CreateNew(
        name.c_str(), static_cast<int>(raster.width), static_cast<int>(raster.height),
        static_cast<int>(raster.bands), type, options.List());
    if (!created) return nullptr;
    made->dataset.reset(static_cast<zmcgdal::Dataset*>(created));
    made->created = true;
    try {
        Tell(raster.facts, *made->dataset);
    } catch (...) {
        made->Close(false);
        throw;
    }
    made->layout = LayoutOf(made->dataset->File().info);
    made->layout.bytesMissing = 0;
    made->sampleType = made->dataset->File().tiles.Type();
    return made;
}

std::size_t OpenRaster::SampleSize() const {
    return static_cast<std::size_t>(GDALGetDataTypeSizeBytes(sampleType));
}

void OpenRaster::Fail(const std::string& operation, const std::string& reason) const {
    throw zmchost::Error(name, operation, reason);
}

void OpenRaster::CheckOpen() const {
    if (!dataset) throw BadArgument(name + " is closed");
}

std::uint64_t OpenRaster::Judge(std::uint32_t level, const Rectangle& window,
                                const std::vector<int>& bands) const {
    const auto found = std::find_if(layout.levels.begin(), layout.levels.end(),
                                    [&](const Level& each) { return each.number == level; });
    if (found == layout.levels.end())
        throw BadArgument("there is no level " + std::to_string(level));
    if (window.IsEmpty()) throw BadArgument("the window is empty");
    if (window.Right() > found->width || window.Bottom() > found->height)
        throw BadArgument("the window reaches beyond the " + std::to_string(found->width) + " x " +
                          std::to_string(found->height) + " pixels of level " +
                          std::to_string(level));
    if (bands.empty()) throw BadArgument("no band is asked for");
    for (const int band : bands)
        if (band < 1 || static_cast<std::uint32_t>(band) > layout.bands)
            throw BadArgument("there is no band " + std::to_string(band));
    const std::uint64_t plane = window.Pixels() * zelm::PixelSize(layout.pixelType);
    // What a file does not have need not be asked for, nor the memory for it.
    if (!created && !manner.missingAsZeros && plane > layout.fileSize)
        Fail("read it", "its file ends before the pixels of that window");
    constexpr std::uint64_t kMost = std::uint64_t{1} << 62;
    if (plane > kMost / bands.size()) throw BadArgument("the window is too large");
    return plane * bands.size();
}

zmcgdal::Dataset& OpenRaster::LevelOf(std::uint32_t level) {
    if (dataset->Level() == level) return *dataset;
    for (const auto& coarser : dataset->Overviews())
        if (coarser->Level() == level) return *coarser;
    Fail("read level " + std::to_string(level), "the file has not all of it");
}

GDALRasterBand& OpenRaster::BandOf(int band) {
    CheckOpen();
    if (band < 1 || static_cast<std::uint32_t>(band) > layout.bands)
        throw BadArgument("there is no band " + std::to_string(band));
    return *dataset->BandOf(band);
}

void OpenRaster::Read(std::uint32_t level, const Rectangle& window, std::vector<int> bands,
                      const zmcgdal::Target& target) {
    std::unique_lock lock(mutex, std::defer_lock);
    const auto count = static_cast<int>(bands.size());
    if (manner.update) {
        lock.lock();
        CheckOpen();
        zmcgdal::Dataset& shown = LevelOf(level);
        for (const int band : bands) shown.BandOf(band);
        GDALRasterIOExtraArg extra = UsualWay();
        const auto width = static_cast<int>(window.width), height = static_cast<int>(window.height);
        const CPLErr result =
            shown.RasterIO(GF_Read, static_cast<int>(window.x), static_cast<int>(window.y), width,
                           height, target.data, width, height, target.type, count, bands.data(),
                           target.pixelSpace, target.lineSpace, target.bandSpace, &extra);
        if (result != CE_None) Fail("read it", "GDAL gives no reason");
        return;
    }
    zmcgdal::OpenFile& file = dataset->File();
    std::optional<zmcgdal::PlannedRead> planned;
    if (file.raster.Remote()) {
        lock.lock();
        planned.emplace(file, level, window, bands);
    }
    for (int& band : bands) --band;
    if (!file.tiles.Read(level, window, bands.data(), count, target, nullptr))
        Fail("read it", "no reason is given");
}

bool OpenRaster::HasMask(const std::vector<int>& bands) {
    const std::lock_guard lock(mutex);
    return std::any_of(bands.begin(), bands.end(), [this](int band) {
        return (BandOf(band).GetMaskFlags() & GMF_ALL_VALID) == 0;
    });
}

void OpenRaster::ReadMask(std::uint32_t level, const Rectangle& window,
                          const std::vector<int>& bands, unsigned char* valid) {
    std::unique_lock lock(mutex);
    CheckOpen();
    if (!shared) shared = !manner.update && dataset->Share();
    zmcgdal::Dataset& shown = LevelOf(level);
    std::vector<GDALRasterBand*> masked;
    for (const int band : bands) masked.push_back(shown.BandOf(band));
    if (*shared) lock.unlock();
    GDALRasterIOExtraArg extra = UsualWay();
    const auto width = static_cast<int>(window.width), height = static_cast<int>(window.height);
    for (GDALRasterBand* const band : masked) {
        const CPLErr result = band->GetMaskBand()->RasterIO(
            GF_Read, static_cast<int>(window.x), static_cast<int>(window.y), width, height, valid,
            width, height, GDT_Byte, 1, width, &extra);
        if (result != CE_None) Fail("read its mask", "GDAL gives no reason");
        valid += window.Pixels();
    }
}

void OpenRaster::Write(const Rectangle& window, std::vector<int> bands,
                       const zmcgdal::Target& from) {
    const std::lock_guard lock(mutex);
    CheckOpen();
    if (!manner.update) Fail("write into it", "it is open for reading; open it with mode \"r+\"");
    GDALRasterIOExtraArg extra = UsualWay();
    const auto width = static_cast<int>(window.width), height = static_cast<int>(window.height);
    written = true;
    const CPLErr result = dataset->RasterIO(
        GF_Write, static_cast<int>(window.x), static_cast<int>(window.y), width, height, from.data,
        width, height, from.type, static_cast<int>(bands.size()), bands.data(), from.pixelSpace,
        from.lineSpace, from.bandSpace, &extra);
    if (result != CE_None) Fail("write into it", "GDAL gives no reason");
}

Facts OpenRaster::Told() {
    const std::lock_guard lock(mutex);
    CheckOpen();
    return FactsOf(*dataset);
}

std::optional<OpenRaster::Statistics> OpenRaster::StatisticsOf(int band) {
    const std::lock_guard lock(mutex);
    Statistics told;
    const CPLErr result = BandOf(band).GetStatistics(FALSE, FALSE, &told.minimum, &told.maximum,
                                                     &told.mean, &told.standardDeviation);
    return result == CE_None ? std::optional(told) : std::nullopt;
}

std::optional<OpenRaster::Histogram> OpenRaster::HistogramOf(int band) {
    const std::lock_guard lock(mutex);
    Histogram told;
    int buckets = 0;
    GUIntBig* counts = nullptr;
    const CPLErr result = BandOf(band).GetDefaultHistogram(&told.lower, &told.upper, &buckets,
                                                           &counts, FALSE, nullptr, nullptr);
    const std::unique_ptr<GUIntBig, decltype(&CPLFree)> owned(counts, &CPLFree);
    if (result != CE_None || !counts) return std::nullopt;
    told.counts.assign(counts, counts + buckets);
    return told;
}

std::vector<std::uint8_t> OpenRaster::PaletteOf(int band) {
    const std::lock_guard lock(mutex);
    std::vector<std::uint8_t> colors;
    const GDALColorTable* const table = BandOf(band).GetColorTable();
    for (int i = 0; table && i < table->GetColorEntryCount(); ++i) {
        const GDALColorEntry& entry = *table->GetColorEntry(i);
        for (const short component : {entry.c1, entry.c2, entry.c3, entry.c4})
            colors.push_back(static_cast<std::uint8_t>(component));
    }
    return colors;
}

void OpenRaster::Renew() {
    std::vector<int> factors;
    for (const auto& coarser : dataset->Overviews())
        factors.push_back(1 << (coarser->Level() - dataset->Level()));
    if (factors.empty()) return;
    const char* const usual = dataset->BandOf(1)->GetColorTable() ? "MODE" : "AVERAGE";
    const CPLErr result = dataset->BuildOverviews(
        manner.resampling.empty() ? usual : manner.resampling.c_str(),
        static_cast<int>(factors.size()), factors.data(), 0, nullptr, nullptr, nullptr);
    if (result != CE_None) Fail("make its levels anew", "GDAL gives no reason");
}

// Threads that read go on, and the file is closed with this object.
void OpenRaster::Close(bool keep) {
    const std::lock_guard lock(mutex);
    if (!dataset || !manner.update) return;
    if (created && !keep) {
        // That there will be no target is what was asked for.
        const zmcgdal::ErrorCatcher quiet(CE_Failure);
        dataset->UnderCreation()->MarkLost(0, 0);
        return dataset.reset();
    }
    try {
        if (!created && written && manner.renews) Renew();
    } catch (...) {
        dataset.reset();
        throw;
    }
    dataset.reset();
}

}  // namespace zmcpython
