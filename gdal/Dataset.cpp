#include "gdal/Dataset.h"

#include <cpl_minixml.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "core/PixelVocabulary.h"
#include "format/PyramidLayout.h"
#include "gdal/Band.h"
#include "gdal/Create.h"
#include "gdal/ErrorCatcher.h"
#include "gdal/LevelRefresh.h"
#include "gdal/RecordRenewal.h"
#include "gdal/Reporting.h"
#include "gdal/Sidecar.h"
#include "gdal/SidecarStage.h"
#include "gdal/TileWriter.h"
#include "gdal/VsiSource.h"
#include "host/file/EmbeddedItems.h"
#include "host/raster/LentFile.h"
#include "platform/FileSystem.h"

namespace zmcgdal {
namespace {

// The dataset's own item of the sidecar: how many records, of statistics and of histograms, there
// were when pixels began to change.
constexpr const char* kEditing = "EDITING";

constexpr std::uint64_t kMaxTileBytes = INT_MAX;
constexpr int kMostReadyBands = 1024;  // of a level

zmchost::PyramidFileInfo CheckedInfo(const std::string& fileName,
                                     const zmchost::PyramidHeader& header) {
    const auto refuse = [&](const char* why) {
        throw zmchost::Error(fileName, "show it to GDAL", why);
    };
    zmchost::PyramidFileInfo info = zmchost::DescribePyramidFile(header);
    const auto* const base = info.FindLevel(header.levelMin);
    if (!base || base->width == 0 || base->height == 0) refuse("it holds no pixels");
    if (header.width > INT_MAX || header.height > INT_MAX) refuse("it is too large");
    const auto bands = std::min<std::uint32_t>(header.bandCount, INT_MAX);
    if (!GDALCheckBandCount(static_cast<int>(bands), FALSE)) refuse("of its number of bands");
    const std::uint64_t tilePixels = std::uint64_t{header.tileSize} * header.tileSize;
    const std::uint64_t together = header.IsPlanar() ? 1 : bands;
    if (tilePixels * zelm::PixelSize(header.pixelType) > kMaxTileBytes / together)
        refuse("its tiles are too large");
    return info;
}

// What is neither a file nor a folder where GDAL looks for companions of a file: to open a pipe is
// to wait for its other end.
bool HasPipesBeside(const std::string& base) {
    for (const char* const ending : {kSidecarEnding, kMaskEnding, kOverviewsEnding}) {
        if (!platform::StatusOf(base + ending).IsSpecial()) continue;
        CPLError(CE_Warning, CPLE_AppDefined,
                 "%s%s is no regular file; what stands beside the raster is not looked at",
                 base.c_str(), ending);
        return true;
    }
    return false;
}

// What GDAL takes for told in any sidecar that tells something of the band: a unit of none, a scale
// of 1 and an offset of 0.
struct Scale {
    int number = 0;  // of the band, from 1
    std::string unit;
    double scale = 1, offset = 0;
};

std::vector<Scale> ScalesOf(GDALDataset& dataset) {
    std::vector<Scale> scales;
    for (int number = 1; number <= dataset.GetRasterCount(); ++number) {
        GDALRasterBand& band = *dataset.GetRasterBand(number);
        Scale told{number, band.GetUnitType(), band.GetScale(), band.GetOffset()};
        if (!told.unit.empty() || told.scale != 1 || told.offset != 0)
            scales.push_back(std::move(told));
    }
    return scales;
}

void PutBack(const std::vector<Scale>& scales, GDALDataset& dataset) {
    for (const Scale& told : scales) {
        GDALRasterBand& band = *dataset.GetRasterBand(told.number);
        if (*band.GetUnitType() == '\0') band.SetUnitType(told.unit.c_str());
        if (band.GetScale() == 1) band.SetScale(told.scale);
        if (band.GetOffset() == 0) band.SetOffset(told.offset);
    }
}

// In the domain OVERVIEWS GDAL looks for the names of files to open. Who puts a sidecar beside a
// file may say so; a file that comes from anywhere may not.
void DropOtherFiles(CPLXMLNode& root) {
    for (CPLXMLNode* child = root.psChild; child;) {
        CPLXMLNode* const next = child->psNext;
        if (EQUAL(CPLGetXMLValue(child, "domain", ""), "OVERVIEWS") &&
            CPLRemoveXMLChild(&root, child))
            CPLDestroyXMLNode(child);
        child = next;
    }
}

// What a flush answers; where it answers nothing, that all is well.
template <class Work>
CPLErr FlushResult(Work&& work) {
    if constexpr (std::is_void_v<Flushed>) {
        work();
        return CE_None;
    } else {
        return work();
    }
}

}  // namespace

OpenFile::OpenFile(const std::string& fileName, GDALAccess access, const OpenOptions& options)
    : OpenFile(fileName, OpenByName(fileName, access == GA_Update, options.remoteBytes), options) {}

OpenFile::OpenFile(const std::string& fileName, std::shared_ptr<zelm::files::ByteSource> opened,
                   const OpenOptions& options)
    : source(std::move(opened)),
      info(CheckedInfo(fileName, zmchost::PyramidHeader::Read(*source, fileName))),
      raster(fileName, source, info.header, options.keepCopies),
      pixels(fileName, raster.WithoutDocument(), info.header, false),
      tiles(raster.Remote() ? pixels : raster, info,
            {GdalTypeOf(info.header.pixelType, options.signedByteAs), options.missingAsZeros,
             options.threads, options.shared, options.keepsTiles}),
      archive(raster, info.HasMetadataDocument(), limits),
      renewsStatistics(options.statistics) {
    if (raster.Remote()) raster.Remote()->SetDocument(info.MetaDocumentOffset());
}

WindowTiles OpenFile::TilesOf(std::uint32_t level, const zelm::Rectangle& window,
                              std::span<const int> bandNumbers) const {
    std::vector<std::uint32_t> bands;
    for (const int number : bandNumbers) bands.push_back(static_cast<std::uint32_t>(number - 1));
    return {info.header, level, window, std::move(bands)};
}

void OpenFile::Advise(std::uint32_t level, const zelm::Rectangle& window,
                      std::span<const int> bandNumbers) {
    RemoteSource* const remote = raster.Remote();
    if (remote && !remote->Advise(TilesOf(level, window, bandNumbers))) raster.CheckNetwork();
}

PlannedRead::PlannedRead(OpenFile& file, std::uint32_t level, const zelm::Rectangle& window,
                         std::span<const int> bandNumbers)
    : remote(file.isPlanned ? nullptr : file.raster.Remote()), isPlanned(file.isPlanned) {
    if (!remote) return;
    remote->Plan(file.TilesOf(level, window, bandNumbers));
    isPlanned = true;
}

PlannedRead::~PlannedRead() {
    if (!remote) return;
    remote->EndPlan();
    isPlanned = false;
}

void OpenFile::CheckTile(std::uint32_t level, std::uint32_t bands, const char* operation) const {
    const zelm::LevelGeometry grid = info.header.Geometry(level);
    const std::uint64_t bytes = std::uint64_t{std::min(grid.tileSize, grid.samples)} *
                                std::min(grid.tileSize, grid.lines) * bands *
                                zelm::PixelSize(info.header.pixelType);
    const std::string wrong = limits.Judge(&zmchost::Limits::tile, bytes,
                                           "its tiles have " + std::to_string(bytes) + " bytes");
    if (!wrong.empty()) throw zmchost::Error(raster.Name(), operation, wrong);
}

void OpenFile::CheckBlock(std::uint32_t level) const {
    CheckTile(level, tiles.IsPixelInterleaved() ? info.header.bandCount : 1, "write a block");
}

Dataset::Dataset(std::shared_ptr<OpenFile> openFile, std::uint32_t levelShown, GDALAccess access,
                 Dataset* mainDataset)
    : file(std::move(openFile)), level(levelShown), main(mainDataset) {
    const zmchost::PyramidLevelInfo& shown = *file->info.FindLevel(level);
    nRasterXSize = static_cast<int>(shown.width);
    nRasterYSize = static_cast<int>(shown.height);
    eAccess = access;
    // Only the main dataset has a sidecar.
    if (main) nPamFlags |= GPF_DISABLED;
    AddBands();
}

Dataset::~Dataset() {
    Finish();
    CloseDependentDatasets();
}

CPLErr Dataset::Finish() {
    if (std::exchange(finished, true)) return CE_None;
    CPLErr pixels = CE_None;
    const auto flush = [&] {
        // NOLINTNEXTLINE(bugprone-parent-virtual-call): the pixels, and the sidecar not yet.
        pixels = FlushResult([&] { return GDALDataset::FlushCache(true); });
    };
    bool done = Reported(flush);
    if (done && file->renewsStatistics) Reported([&] { RenewEdited(); });
    Reported([&] { EndEditing(); });
    if (creation) done = done && creation->Finish(*this);
    // Without a raster there is nothing that a sidecar could belong to.
    if (creation && !done) ForgetChanges();
    const CPLErr items = Reporting(
        CE_Failure, [&] { return FlushResult([&] { return GDALPamDataset::FlushCache(true); }); });
    return done ? std::max(pixels, items) : CE_Failure;
}

std::unique_ptr<Dataset> Dataset::FromFile(std::shared_ptr<OpenFile> file, GDALAccess access) {
    const std::uint32_t base = file->info.header.levelMin;
    return std::unique_ptr<Dataset>(new Dataset(std::move(file), base, access, nullptr));
}

std::unique_ptr<Dataset> Dataset::FromOverview(std::unique_ptr<Dataset> raster, int overview) {
    const auto& all = raster->Overviews();
    if (overview >= static_cast<int>(all.size()))
        throw zmchost::Error(raster->GetDescription(), "show overview " + std::to_string(overview),
                             "it has " + std::to_string(all.size()));
    if (raster->eAccess == GA_Update)
        throw zmchost::Error(raster->GetDescription(), "show an overview for update",
                             "the raster alone can be changed");
    const std::uint32_t level = all[static_cast<std::size_t>(overview)]->level;
    std::unique_ptr<Dataset> shown(new Dataset(raster->file, level, GA_ReadOnly, raster.get()));
    shown->kept = std::move(raster);
    shown->SetDescription(shown->kept->GetDescription());
    for (int number = 1; number <= shown->GetRasterCount(); ++number) shown->BandOf(number);
    return shown;
}

// GDAL holds half a kilobyte and more for each band of each level, and of tens of thousands only
// some are looked at: levels have them when they are asked for. The last one tells the number.
void Dataset::AddBands() {
    const auto count = static_cast<int>(file->info.header.bandCount);
    const bool all = !main || count <= kMostReadyBands;
    for (int number = all ? 1 : count; number <= count; ++number)
        SetBand(number, new Band(*this, number));
}

GDALRasterBand* Dataset::BandOf(int number) {
    if (!GetRasterBand(number)) SetBand(number, new Band(*this, number));
    return GetRasterBand(number);
}

const std::vector<std::unique_ptr<Dataset>>& Dataset::Overviews() {
    if (!overviewsMade) AddOverviews();
    return overviews;
}

// Of an incomplete file those that are there from end to end: whoever reads fewer pixels than there
// are is given them unasked.
void Dataset::AddOverviews() {
    std::vector<std::unique_ptr<Dataset>> made;
    const zmchost::PyramidHeader& header = file->info.header;
    const zmchost::PresentTiles present(header);
    const bool mayHave =
        zelm::PyramidLayout::MayHaveLevels(header.versionMajor, header.versionMinor);
    if ((!main || kept) && !creation && mayHave)
        for (const zmchost::PyramidLevelInfo& coarser : file->info.levels)
            if (coarser.level > level && coarser.width > 0 && coarser.height > 0 &&
                present.HaveLevel(coarser.level, header.fileSize))
                made.push_back(
                    std::unique_ptr<Dataset>(new Dataset(file, coarser.level, eAccess, &Main())));
    overviews = std::move(made);
    overviewsMade = true;
}

// GDAL's objects for what stands beside a file, or follows from several bands, serve one thread.
bool Dataset::IsAllOurs() {
    if (eAccess == GA_Update || creation || kept || main || file->raster.Remote()) return false;
    if (oOvManager.HaveMaskFile()) return false;
    if (Overviews().empty() && GetRasterBand(1)->GetOverviewCount() > 0) return false;
    for (int number = 1; number <= nBands; ++number)
        if (!static_cast<Band*>(GetRasterBand(number))->MaskIsOurs()) return false;
    return true;
}

// All that is made at the first use of it otherwise, but for what has a lock.
void Dataset::Prepare() {
    DescribeFile();
    for (int number = 1; number <= nBands; ++number) BandOf(number);
    GetGCPs();
    for (const auto& coarser : Overviews()) coarser->Prepare();
    SetShared();
#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 10, 0)
    nOpenFlags = GDAL_OF_RASTER | GDAL_OF_THREAD_SAFE;
    for (const OGRSpatialReference* const told : {GetSpatialRef(), GetGCPSpatialRef()})
        if (told && !main)
            const_cast<OGRSpatialReference*>(told)->AssignAndSetThreadSafe(
                OGRSpatialReference(*told));
#endif
}

bool Dataset::Share() {
    if (!IsAllOurs()) return false;
    Prepare();
    return true;
}

void Dataset::DescribeFile() {
    const zmchost::PyramidHeader& header = file->info.header;
    const auto set = [&](const char* name, const std::string& value) {
        description.SetNameValue(name, value.c_str());
    };
    set("ORDERING", zelm::TileOrderName(header.tileOrdering));
    set("VERSION", std::to_string(header.versionMajor) + "." + std::to_string(header.versionMinor));
    set("PIXEL_TYPE", zelm::PixelTypeName(header.pixelType));
    set("INTERLEAVE", zelm::InterleaveName(header.interleave));
    set("TILE_SIZE", std::to_string(header.tileSize));
    set("LEVEL", std::to_string(level));
    set("LEVEL_MIN", std::to_string(header.levelMin));
    set("LEVEL_MAX", std::to_string(header.levelMax));
    set("COMPLETE", file->info.complete ? "YES" : "NO");
    if (file->info.bytesMissing > 0) set("BYTES_MISSING", std::to_string(file->info.bytesMissing));
    // Last, since it tells that all of it is there.
    structure.SetNameValue("INTERLEAVE", file->tiles.IsPixelInterleaved() ? "PIXEL" : "BAND");
}

// A mask that another raster has left beside the target's name is none of this one's.
void Dataset::BeginCreation(std::unique_ptr<Creation> state) {
    creation = std::move(state);
    oOvManager.Initialize(this, creation->DraftName().c_str());
    oOvManager.HaveMaskFile(nullptr, creation->DraftName().c_str());
}

// Nothing of the file before is remembered but in GDAL's cache.
void Dataset::Reopen(std::shared_ptr<OpenFile> draft) { file = std::move(draft); }

CPLErr Dataset::NamedAsDraft(const std::function<CPLErr()>& make) {
    if (!creation) return make();
    const std::string name = GetDescription();
    SetDescription(creation->DraftName().c_str());
    const CPLErr made = make();
    SetDescription(name.c_str());
    return made;
}

CPLErr Dataset::CreateMaskBand(int flags) {
    return Reporting(CE_Failure, [&] {
        if (!MayChange()) return CE_Failure;
        return NamedAsDraft([&] { return GDALPamDataset::CreateMaskBand(flags); });
    });
}

// Nor is anything written there.
void Dataset::IgnoreCompanions() { nPamFlags |= GPF_DISABLED; }

void Dataset::LoadSidecarLater(const char* fileName) {
    SetDescription(fileName);
    PutOff([this, name = std::string(fileName)] {
        GDALOpenInfo info(name.c_str(), GDAL_OF_RASTER);
        LoadSidecar(name.c_str(), info.GetSiblingFiles());
    });
}

void Dataset::LoadSidecar(const char* fileName, Items siblings) {
    SetDescription(fileName);
    std::string base = fileName;
    if (!IsVirtualName(base)) {
        if (eAccess == GA_Update)
            SettleSidecar(base, *file->source, file->info.header);
        else
            base = SidecarBase(base, *file->source, file->info.header);
        if (HasPipesBeside(base)) return IgnoreCompanions();
    }
    const bool staged = base != fileName;
    if (staged) SetPhysicalFilename(base.c_str());
    TryLoadXML(staged ? nullptr : siblings);
    try {
        TakeEmbedded(staged ? nullptr : siblings);
    } catch (const zmchost::Error& error) {
        CPLError(CE_Warning, CPLE_AppDefined, "%s", error.what());
    }
    oOvManager.Initialize(this, base.c_str(), staged ? nullptr : siblings);
    // Without this GDAL looks for a mask beside the usual name, when it is asked for one.
    if (staged) oOvManager.HaveMaskFile(nullptr, base.c_str());
    LoadNote();
}

// --- what the sidecar tells of records ---

void Dataset::LoadNote() {
    const char* const note = CompanionDataset::GetMetadataItem(kEditing, kOwnDomain);
    const CPLStringList counts(CSLTokenizeString(note ? note : ""));
    const auto count = [&](int place) {
        const char* const text = place < counts.Count() ? counts[place] : "0";
        return static_cast<std::uint32_t>(std::strtoul(text, nullptr, 10));
    };
    inDoubt = {count(0), count(1)};
}

void Dataset::NoteEditing() {
    if (editing) return;
    editing = true;
    const RecordCounts now = file->archive.Counts();
    const std::string note = std::to_string(now.statistics) + " " + std::to_string(now.histograms);
    CompanionDataset::SetMetadataItem(kEditing, note.c_str(), kOwnDomain);
    if (SaveSidecarNow(CE_Warning) != CE_None)
        ReportError(CE_Warning, CPLE_FileIO,
                    "its statistics cannot be marked as those of pixels that have changed");
}

void Dataset::RenewEdited() {
    if (creation || main) return;
    std::vector<std::uint32_t> bands;
    for (int number = 1; number <= nBands; ++number)
        if (static_cast<Band*>(GetRasterBand(number))->IsEdited())
            bands.push_back(static_cast<std::uint32_t>(number - 1));
    // Complex samples have no order, and so no statistics.
    if (bands.empty() || GDALDataTypeIsComplex(GetRasterBand(1)->GetRasterDataType())) return;
    RenewRecords(*this, bands, 1);
}

// The bands have marks of their own by now.
void Dataset::EndEditing() {
    if (!editing) return;
    editing = false;
    const bool left = inDoubt.statistics != 0 || inDoubt.histograms != 0;
    const std::string note =
        std::to_string(inDoubt.statistics) + " " + std::to_string(inDoubt.histograms);
    CompanionDataset::SetMetadataItem(kEditing, left ? note.c_str() : nullptr, kOwnDomain);
}

void Dataset::SettleRecords() {
    inDoubt = {};
    if (!editing) CompanionDataset::SetMetadataItem(kEditing, nullptr, kOwnDomain);
}

CPLErr Dataset::SaveSidecarNow(CPLErr kind) {
    if (creation || main) return CE_None;
    Load();
    if (!psPam || (nPamFlags & (GPF_DISABLED | GPF_NOSAVE)) != 0) {
        if (kind == CE_Failure)
            ReportError(kind, CPLE_NoWriteAccess, "it has no sidecar to store this in");
        return kind;
    }
    if ((nPamFlags & GPF_DIRTY) == 0) return CE_None;
    failureKind = kind;
    const CPLErr saved = TrySaveXML();
    failureKind = CE_None;
    return saved == CE_None ? CE_None : kind;
}

// GDAL looks neither at what closing a file answers nor at what is there then.
bool Dataset::SidecarIsWhole() const {
    constexpr std::string_view kEnd = "</PAMDataset>";
    VSILFILE* const sidecar = VSIFOpenL(psPam->pszPamFilename, "rb");
    if (!sidecar) return true;  // there was nothing to say
    char end[32] = {};
    VSIFSeekL(sidecar, 0, SEEK_END);
    const vsi_l_offset size = VSIFTellL(sidecar);
    VSIFSeekL(sidecar, size > sizeof end ? size - sizeof end : 0, SEEK_SET);
    const std::size_t read = VSIFReadL(end, 1, sizeof end, sidecar);
    VSIFCloseL(sidecar);
    return std::string_view(end, read).find(kEnd) != std::string_view::npos;
}

// A warning to GDAL, which a program need not look at. Whoever opens for reading alone may have no
// right to write there.
CPLErr Dataset::TrySaveXML() {
    return Reporting(CE_Failure, [&] {
        const CPLErr saved = GDALPamDataset::TrySaveXML();
        if (!psPam || !psPam->pszPamFilename || (nPamFlags & GPF_NOSAVE) != 0) return saved;
        if (saved == CE_None && SidecarIsWhole()) return CE_None;
        const CPLErr usual = eAccess == GA_Update ? CE_Failure : CE_Warning;
        const CPLErr kind = failureKind != CE_None ? failureKind : usual;
        ReportError(kind, CPLE_FileIO, "%s could not be written", psPam->pszPamFilename);
        return kind;
    });
}

void Dataset::ClearStatistics() {
    Reported([&] {
        if (!MayChange()) return;
        if (creation || main) return CompanionDataset::ClearStatistics();
        for (int number = 1; number <= nBands; ++number)
            static_cast<Band*>(GetRasterBand(number))->ForgetStatistics();
        SaveSidecarNow();
    });
}

bool Dataset::MayHaveMasks() {
    Load();
    return main || oOvManager.HaveMaskFile() || CompanionDataset::GetMetadataItem("NODATA_VALUES");
}

// GDAL takes what it is given last, so the sidecar is read once more, behind the items of the file.
// A sidecar that was made of them has all of them that are still wanted.
void Dataset::TakeEmbedded(Items siblings) {
    if (CompanionDataset::GetMetadataItem(kEmbeddedItem, kEmbeddedDomain)) return;
    const std::string items =
        zmchost::ReadEmbeddedItems(*file->source, file->raster.Name(), file->info.header);
    if (items.empty()) return;
    const int changed = nPamFlags & GPF_DIRTY;
    const ErrorCatcher quiet(CE_Failure);
    const std::unique_ptr<CPLXMLNode, decltype(&CPLDestroyXMLNode)> tree(
        CPLParseXMLString(items.c_str()), &CPLDestroyXMLNode);
    CPLXMLNode* const root = CPLGetXMLNode(tree.get(), "=PAMDataset");
    if (!root) return;
    DropOtherFiles(*root);
    if (XMLInit(root, nullptr) != CE_None) return;
    const auto scales = ScalesOf(*this);
    TryLoadXML(siblings);
    PutBack(scales, *this);
    nPamFlags = (nPamFlags & ~GPF_DIRTY) | changed;
}

std::string Dataset::SidecarText() {
    using Tree = std::unique_ptr<CPLXMLNode, decltype(&CPLDestroyXMLNode)>;
    if (!Tree(SerializeToXML(nullptr), &CPLDestroyXMLNode)) return "";
    SetMetadataItem(kEmbeddedItem, "YES", kEmbeddedDomain);
    const Tree tree(SerializeToXML(nullptr), &CPLDestroyXMLNode);
    const std::unique_ptr<char, decltype(&CPLFree)> text(CPLSerializeXMLTree(tree.get()), &CPLFree);
    return text ? text.get() : "";
}

// Whether no block of the window waits in the cache to be written.
bool Dataset::IsWritten(const zelm::Rectangle& window, std::span<const int> bandNumbers) {
    const std::uint32_t side = file->info.header.tileSize;
    const auto lastColumn = static_cast<std::uint32_t>((window.Right() - 1) / side);
    const auto lastRow = static_cast<std::uint32_t>((window.Bottom() - 1) / side);
    return std::all_of(bandNumbers.begin(), bandNumbers.end(), [&](int number) {
        auto* const band = static_cast<Band*>(BandOf(number));
        for (std::uint32_t row = window.y / side; row <= lastRow; ++row)
            for (std::uint32_t column = window.x / side; column <= lastColumn; ++column)
                if (band->HasDirtyBlock(static_cast<int>(column), static_cast<int>(row)))
                    return false;
        return true;
    });
}

bool Dataset::ReadsDirectly(int x, int y, int width, int height, std::span<const int> bandNumbers) {
    const zelm::Rectangle window = RectangleOf(x, y, width, height);
    const auto readTogether = [&] {
        return !creation &&
               file->tiles.ThreadsFor(window, static_cast<int>(bandNumbers.size())) > 1;
    };
    const bool quiet = eAccess != GA_Update || (creation && creation->IsSealed()) ||
                       (readTogether() && IsWritten(window, bandNumbers));
    if (!quiet || bForceCachedIO) return false;
    // Threads need no lock for this.
    if (IsShared()) return true;
    // Blocks of such tiles would fill the cache.
    if (!file->tiles.IsHeld(file->tiles.TileAt(level, 0, 0))) return true;
    // In 64 bits: a raster may have as many columns as an int can tell.
    const std::int64_t side = file->info.header.tileSize;
    const auto touched = [side](std::int64_t start, std::int64_t extent, std::int64_t limit) {
        const std::int64_t end = std::min((start + extent - 1) / side * side + side, limit);
        return end - start / side * side;
    };
    constexpr int kLeastShare = 4;
    return std::int64_t{width} * height * kLeastShare >=
           touched(x, width, nRasterXSize) * touched(y, height, nRasterYSize);
}

CPLStringList* Dataset::OwnDomain(const char* domain) {
    if (structure.Count() == 0) DescribeFile();
    if (domain && EQUAL(domain, kStructureDomain)) return &structure;
    if (domain && EQUAL(domain, kOwnDomain)) return &description;
    return nullptr;
}

char** Dataset::GetMetadataDomainList() {
    return Reporting<char**>(nullptr, [&] {
        const std::lock_guard lock(file->late);
        return BuildMetadataDomainList(CompanionDataset::GetMetadataDomainList(), TRUE,
                                       kStructureDomain, kOwnDomain, nullptr);
    });
}

Items Dataset::GetMetadata(const char* domain) {
    return Reporting<Items>(nullptr, [&]() -> Items {
        const std::lock_guard lock(file->late);
        if (CPLStringList* const own = OwnDomain(domain)) return own->List();
        return kept ? ScaledDomain(domain) : CompanionDataset::GetMetadata(domain);
    });
}

const char* Dataset::GetMetadataItem(const char* name, const char* domain) {
    return Reporting<const char*>(nullptr, [&] {
        const std::lock_guard lock(file->late);
        if (CPLStringList* const own = OwnDomain(domain)) return own->FetchNameValue(name);
        if (kept) return CSLFetchNameValue(ScaledDomain(domain), name);
        return CompanionDataset::GetMetadataItem(name, domain);
    });
}

double Dataset::Factor() const {
    return std::ldexp(1.0, static_cast<int>(level - (main ? main->level : level)));
}

// What counts in pixels of the raster counts in those of the level.
Items Dataset::ScaledDomain(const char* domain) {
    constexpr const char* kDivided[] = {"LINE_OFF",   "SAMP_OFF",    "LINE_SCALE",
                                        "SAMP_SCALE", "LINE_OFFSET", "PIXEL_OFFSET"};
    constexpr const char* kMultiplied[] = {"LINE_STEP", "PIXEL_STEP"};
    scaled = CPLStringList(CSLDuplicate(main->GetMetadata(domain)), TRUE);
    if (!domain || !(EQUAL(domain, "RPC") || EQUAL(domain, "GEOLOCATION"))) return scaled.List();
    const auto scale = [&](const char* name, double factor) {
        if (const char* const value = scaled.FetchNameValue(name))
            scaled.SetNameValue(name, CPLSPrintf("%.17g", CPLAtof(value) * factor));
    };
    for (const char* const name : kDivided) scale(name, 1 / Factor());
    for (const char* const name : kMultiplied) scale(name, Factor());
    return scaled.List();
}

CPLErr Dataset::ReadTransform(double* transform) const {
    return Reporting(CE_Failure, [&] {
        if (!main) return CompanionDataset::ReadTransform(transform);
        const CPLErr result = main->ReadTransform(transform);
        for (const int i : {1, 2, 4, 5})
            if (result == CE_None) transform[i] *= Factor();
        return result;
    });
}

const OGRSpatialReference* Dataset::GetSpatialRef() const {
    return Reporting<const OGRSpatialReference*>(
        nullptr, [&] { return main ? main->GetSpatialRef() : CompanionDataset::GetSpatialRef(); });
}

int Dataset::GetGCPCount() {
    return Reporting<int>(
        0, [&] { return main ? main->GetGCPCount() : CompanionDataset::GetGCPCount(); });
}

const GDAL_GCP* Dataset::GetGCPs() {
    return Reporting<const GDAL_GCP*>(nullptr, [&]() -> const GDAL_GCP* {
        if (!main) return CompanionDataset::GetGCPs();
        if (IsShared()) return points.data();
        const GDAL_GCP* const given = main->GetGCPs();
        points.assign(given, given + main->GetGCPCount());
        for (GDAL_GCP& point : points) {
            point.dfGCPPixel /= Factor();
            point.dfGCPLine /= Factor();
        }
        return points.data();
    });
}

const OGRSpatialReference* Dataset::GetGCPSpatialRef() const {
    return Reporting<const OGRSpatialReference*>(nullptr, [&] {
        return main ? main->GetGCPSpatialRef() : CompanionDataset::GetGCPSpatialRef();
    });
}

char** Dataset::GetFileList() {
    return Reporting<char**>(nullptr, [&] {
        const std::lock_guard lock(file->late);
        return kept ? kept->GetFileList() : CompanionDataset::GetFileList();
    });
}

CPLErr Dataset::IRasterIO(GDALRWFlag mode, int x, int y, int width, int height, void* data,
                          int bufferWidth, int bufferHeight, GDALDataType bufferType, int bandCount,
                          int* bandMap, GSpacing pixelSpace, GSpacing lineSpace, GSpacing bandSpace,
                          GDALRasterIOExtraArg* extra) {
    return Reporting(CE_Failure, [&] {
        return ReadOrWrite(mode, x, y, width, height, data, bufferWidth, bufferHeight, bufferType,
                           bandCount, bandMap, pixelSpace, lineSpace, bandSpace, extra);
    });
}

// GDAL chooses by what a band says of its levels, and the last band is there in all of them.
Dataset* Dataset::CoarserFor(Shown& shown, int bufferWidth, int bufferHeight) {
    const int chosen = GDALBandGetBestOverviewLevel2(GetRasterBand(GetRasterCount()), shown.x,
                                                     shown.y, shown.width, shown.height,
                                                     bufferWidth, bufferHeight, &shown.extra);
    return chosen < 0 ? nullptr : Overviews()[static_cast<std::size_t>(chosen)].get();
}

CPLErr Dataset::ReadOrWrite(GDALRWFlag mode, int x, int y, int width, int height, void* data,
                            int bufferWidth, int bufferHeight, GDALDataType bufferType,
                            int bandCount, int* bandMap, GSpacing pixelSpace, GSpacing lineSpace,
                            GSpacing bandSpace, GDALRasterIOExtraArg* extra) {
    if (mode == GF_Write) file->CheckBlock(level);
    if (mode == GF_Write && bufferWidth == width && bufferHeight == height &&
        WritesDirectly(x, y, width, height, std::span(bandMap, static_cast<std::size_t>(bandCount)),
                       *extra))
        return WriteTiles(RectangleOf(x, y, width, height),
                          {data, bufferType, pixelSpace, lineSpace, bandSpace}, bandMap, extra);
    const bool reduced = mode == GF_Read && bufferWidth < width && bufferHeight < height;
    if (reduced && !Overviews().empty()) {
        Shown shown(x, y, width, height, *extra);
        if (Dataset* const coarser = CoarserFor(shown, bufferWidth, bufferHeight)) {
            for (int i = 0; i < bandCount; ++i) coarser->BandOf(bandMap[i]);
            return coarser->RasterIO(mode, shown.x, shown.y, shown.width, shown.height, data,
                                     bufferWidth, bufferHeight, bufferType, bandCount, bandMap,
                                     pixelSpace, lineSpace, bandSpace, &shown.extra);
        }
    } else if (reduced) {
        int tried = FALSE;
        const CPLErr result = TryOverviewRasterIO(mode, x, y, width, height, data, bufferWidth,
                                                  bufferHeight, bufferType, bandCount, bandMap,
                                                  pixelSpace, lineSpace, bandSpace, extra, &tried);
        if (tried) return result;
    }
    std::optional<PlannedRead> planned;
    if (mode == GF_Read)
        planned.emplace(*file, level, RectangleOf(x, y, width, height),
                        std::span(bandMap, static_cast<std::size_t>(bandCount)));
    if (mode == GF_Read && bufferWidth == width && bufferHeight == height &&
        ReadsDirectly(x, y, width, height,
                      std::span(bandMap, static_cast<std::size_t>(bandCount)))) {
        std::vector<int> bands(bandMap, bandMap + bandCount);
        for (int& band : bands) --band;
        const Target target{data, bufferType, pixelSpace, lineSpace, bandSpace};
        if (file->tiles.Read(level, RectangleOf(x, y, width, height), bands.data(), bandCount,
                             target, extra))
            return CE_None;
        return CE_Failure;
    }
    return GDALPamDataset::IRasterIO(mode, x, y, width, height, data, bufferWidth, bufferHeight,
                                     bufferType, bandCount, bandMap, pixelSpace, lineSpace,
                                     bandSpace, extra);
}

// GDAL tells whoever wants to know of progress by itself.
bool Dataset::WritesDirectly(int x, int y, int width, int height, std::span<const int> numbers,
                             const GDALRasterIOExtraArg& extra) const {
    if (!creation || bForceCachedIO || extra.pfnProgress) return false;
    if (!file->tiles.IsHeld(file->tiles.TileAt(level, 0, 0))) return false;
    if (IsWidened(file->info.header.pixelType, file->tiles.Type())) return false;
    if (static_cast<int>(numbers.size()) != nBands) return false;
    for (int number = 1; number <= nBands; ++number)
        if (numbers[static_cast<std::size_t>(number - 1)] != number) return false;
    return WholeTiles(file->info.header.Geometry(level), RectangleOf(x, y, width, height))
               .Pixels() != 0;
}

CPLErr Dataset::WriteTiles(const zelm::Rectangle& window, const Target& from, int* bandMap,
                           GDALRasterIOExtraArg* extra) {
    const auto at = [&](const zelm::Rectangle& part) {
        Target moved = from;
        moved.data = static_cast<unsigned char*>(from.data) + (part.y - window.y) * from.lineSpace +
                     (part.x - window.x) * from.pixelSpace;
        return moved;
    };
    const zelm::Rectangle tiles = WholeTiles(file->info.header.Geometry(level), window);
    CPLErr result = TileWriter(*this).Write(tiles, at(tiles)) ? CE_None : CE_Failure;
    for (const zelm::Rectangle& part : Around(window, tiles)) {
        if (part.Pixels() == 0) continue;
        const auto width = static_cast<int>(part.width), height = static_cast<int>(part.height);
        const CPLErr written = GDALPamDataset::IRasterIO(
            GF_Write, static_cast<int>(part.x), static_cast<int>(part.y), width, height,
            at(part).data, width, height, from.type, nBands, bandMap, from.pixelSpace,
            from.lineSpace, from.bandSpace, extra);
        result = std::max(result, written);
    }
    return result;
}

bool Dataset::HasWindow(int x, int y, int width, int height) const {
    return x >= 0 && y >= 0 && width > 0 && height > 0 && width <= nRasterXSize - x &&
           height <= nRasterYSize - y;
}

bool Dataset::HasBands(std::span<const int> numbers) const {
    return std::all_of(numbers.begin(), numbers.end(),
                       [this](int number) { return number >= 1 && number <= nBands; });
}

// GDAL looks at what it is asked for only where it does this itself.
CPLErr Dataset::AdviseRead(int x, int y, int width, int height, int bufferWidth, int bufferHeight,
                           GDALDataType, int bandCount, int* bandMap, Items) {
    return Reporting(CE_Failure, [&] {
        if (!file->raster.Remote()) return CE_None;
        std::vector<int> bands;
        for (int i = 0; i < bandCount; ++i) bands.push_back(bandMap ? bandMap[i] : i + 1);
        if (!HasWindow(x, y, width, height) || !HasBands(bands))
            throw zmchost::Error(GetDescription(), "read ahead", "it has no such window or band");
        GDALRasterIOExtraArg extra;
        INIT_RASTERIO_EXTRA_ARG(extra);
        Shown shown(x, y, width, height, extra);
        const bool reduced = bufferWidth < width && bufferHeight < height && !Overviews().empty();
        Dataset* const coarser = reduced ? CoarserFor(shown, bufferWidth, bufferHeight) : nullptr;
        file->Advise(coarser ? coarser->level : level,
                     RectangleOf(shown.x, shown.y, shown.width, shown.height), bands);
        return CE_None;
    });
}

CPLErr Dataset::IBuildOverviews(const char* resampling, int overviewCount, const int* factors,
                                int bandCount, const int* bands, GDALProgressFunc progress,
                                void* progressData, CSLConstList options) {
    // GDAL divides by them where it makes levels beside the file.
    if (std::any_of(factors, factors + overviewCount, [](int factor) { return factor < 1; })) {
        ReportError(CE_Failure, CPLE_IllegalArg, "levels are reduced by 1 at the least");
        return CE_Failure;
    }
    return Reporting(CE_Failure, [&] {
        if (!MayChange()) return CE_Failure;
        if (creation) return creation->ChooseLevels(*this, resampling, overviewCount, factors);
        if (file->info.bytesMissing > 0) {
            CPLError(CE_Failure, CPLE_NotSupported,
                     "%s: the pyramid is incomplete, " CPL_FRMT_GUIB
                     " bytes are missing; no levels are made of it",
                     GetDescription(), static_cast<GUIntBig>(file->info.bytesMissing));
            return CE_Failure;
        }
        if (Overviews().empty())
            return GDALPamDataset::IBuildOverviews(resampling, overviewCount, factors, bandCount,
                                                   bands, progress, progressData, options);
        return RefreshLevels(*this, resampling, std::vector<int>(factors, factors + overviewCount),
                             progress, progressData);
    });
}

// The pixels first, by which the sidecar changes.
Flushed Dataset::FlushCache(bool atClosing) {
    const CPLErr flushed = Reporting(CE_Failure, [&] {
        // NOLINTNEXTLINE(bugprone-parent-virtual-call): them alone.
        const CPLErr pixels = FlushResult([&] { return GDALDataset::FlushCache(atClosing); });
        // The sidecar of a raster that there is not yet waits for it.
        if (creation) return pixels;
        EndEditing();
        const auto save = [&] { return GDALPamDataset::FlushCache(atClosing); };
        return std::max(pixels, FlushResult(save));
    });
    return static_cast<Flushed>(flushed);
}

int Dataset::CloseDependentDatasets() {
    return Reporting(FALSE, [&] {
        int closed = GDALPamDataset::CloseDependentDatasets();
        if (!overviews.empty()) {
            overviews.clear();
            closed = TRUE;
        }
        return closed;
    });
}

}  // namespace zmcgdal
