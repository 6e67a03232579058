#include "gdal/Band.h"

#include <algorithm>
#include <climits>
#include <cstring>
#include <mutex>
#include <optional>
#include <span>

#include "core/PixelVocabulary.h"
#include "gdal/Create.h"
#include "gdal/MaskBand.h"
#include "gdal/NoDataValues.h"
#include "gdal/Reporting.h"
#include "gdal/Sidecar.h"
#include "raster/RasterBandStats.h"

namespace zmcgdal {
namespace {

// Signed bytes that GDAL holds as 16 bits, back to bytes, in place.
void NarrowSamples(std::vector<unsigned char>& samples) {
    const std::size_t count = samples.size() / sizeof(std::int16_t);
    for (std::size_t i = 0; i < count; ++i) {
        std::int16_t value = 0;
        std::memcpy(&value, samples.data() + i * sizeof value, sizeof value);
        const int clamped = std::clamp<int>(value, SCHAR_MIN, SCHAR_MAX);
        samples[i] = static_cast<unsigned char>(clamped);
    }
    samples.resize(count);
}

}  // namespace

Band::Band(Dataset& dataset, int number)
    : owner(dataset), index(static_cast<std::uint32_t>(number - 1)) {
    poDS = &dataset;
    nBand = number;
    eDataType = owner.File().tiles.Type();
    eAccess = owner.GetAccess();
    nRasterXSize = owner.GetRasterXSize();
    nRasterYSize = owner.GetRasterYSize();
    nBlockXSize = nBlockYSize = static_cast<int>(owner.File().info.header.tileSize);
    const bool signedByte = owner.File().info.header.pixelType == zelm::PixelTypeCode::Char;
    if (signedByte && eDataType == GDT_Byte) structure.SetNameValue("PIXELTYPE", "SIGNEDBYTE");
}

Band::~Band() = default;

Band* Band::MainBand() { return static_cast<Band*>(owner.Main().GetRasterBand(nBand)); }

// --- pixels ---

CPLErr Band::IReadBlock(int blockX, int blockY, void* data) {
    return Reporting(CE_Failure, [&] {
        const Creation* const creation = owner.UnderCreation();
        if (creation && !creation->IsWritten(BlockNumber(blockX, blockY), index)) {
            FillUnwritten(
                data, static_cast<std::size_t>(GDALGetDataTypeSizeBytes(eDataType)),
                static_cast<std::size_t>(nBlockXSize) * static_cast<std::size_t>(nBlockYSize));
            return CE_None;
        }
        WindowReader& tiles = owner.File().tiles;
        const zelm::Rectangle tile = tiles.TileAt(owner.Level(), blockX, blockY);
        const auto size = static_cast<GSpacing>(GDALGetDataTypeSizeBytes(eDataType));
        const int band = static_cast<int>(index);
        // Blocks at the right and bottom edge are padded with zeros.
        if (tile.width < static_cast<std::uint32_t>(nBlockXSize) ||
            tile.height < static_cast<std::uint32_t>(nBlockYSize))
            std::memset(data, 0,
                        static_cast<std::size_t>(nBlockXSize) *
                            static_cast<std::size_t>(nBlockYSize) * static_cast<std::size_t>(size));
        if (tiles.Read(owner.Level(), tile, &band, 1,
                       {data, eDataType, size, size * nBlockXSize, 0}))
            return CE_None;
        return CE_Failure;
    });
}

// GDAL counts the blocks of a band when it first looks for one.
std::size_t Band::BlockNumber(int blockX, int blockY) const {
    const std::size_t across = owner.File().info.header.Geometry(owner.Level()).tilesAcross;
    return static_cast<std::size_t>(blockY) * across + static_cast<std::size_t>(blockX);
}

// Blocks that nobody wrote hold the no-data value, to its last digit, or zeros.
void Band::FillUnwritten(void* samples, std::size_t stride, std::size_t count) {
    VisitNoData(*this, [&](auto noData, GDALDataType form) {
        const auto value = noData.value_or(0);
        GDALCopyWords64(&value, form, 0, samples, eDataType, static_cast<int>(stride),
                        static_cast<GPtrDiff_t>(count));
    });
}

// Copies the part of a padded block that lies in the tile, at `stride` bytes per pixel.
void Band::CopyFromBlock(const void* block, const zelm::Rectangle& tile, unsigned char* samples,
                         std::size_t stride) const {
    const int size = GDALGetDataTypeSizeBytes(eDataType);
    const auto* line = static_cast<const unsigned char*>(block);
    for (std::uint32_t y = 0; y < tile.height; ++y, line += std::ptrdiff_t{size} * nBlockXSize) {
        GDALCopyWords64(line, eDataType, size, samples, eDataType, static_cast<int>(stride),
                        tile.width);
        samples += stride * tile.width;
    }
}

// Puts this band's samples of a tile where they belong in whole pixels: from a block that waits in
// the cache, which goes to `waiting`, else from the file, else what an unwritten block holds.
void Band::CompleteTile(int blockX, int blockY, const zelm::Rectangle& tile, unsigned char* samples,
                        std::size_t stride, WaitingBlocks& waiting) {
    if (GDALRasterBlock* const block = TryGetLockedBlockRef(blockX, blockY)) {
        waiting.push_back({LockedBlock(block), this});
        CopyFromBlock(block->GetDataRef(), tile, samples, stride);
        return;
    }
    const Creation* const creation = owner.UnderCreation();
    if (creation && !creation->IsWritten(BlockNumber(blockX, blockY), index)) {
        FillUnwritten(samples, stride, tile.Pixels());
        return;
    }
    const int band = static_cast<int>(index);
    const auto pixelSpace = static_cast<GSpacing>(stride);
    const Target target{samples, eDataType, pixelSpace, pixelSpace * tile.width, 0};
    if (!owner.File().tiles.Read(owner.Level(), tile, &band, 1, target))
        throw zmchost::Error(owner.GetDescription(), "write a block",
                             "the rest of its tile cannot be read");
}

// The tile as the file holds it, with all bands where they lie together; `bands` tells which.
std::vector<unsigned char> Band::GatherTile(int blockX, int blockY, const zelm::Rectangle& tile,
                                            const void* data, std::vector<std::uint32_t>& bands,
                                            WaitingBlocks& waiting) {
    const zmchost::Raster& raster = owner.File().raster.Get();
    if (owner.File().tiles.IsPixelInterleaved())
        bands = raster.AllBands();
    else
        bands = {index};
    owner.File().CheckBlock(owner.Level());
    const auto size = static_cast<std::size_t>(GDALGetDataTypeSizeBytes(eDataType));
    const std::size_t stride = size * bands.size();
    std::vector<unsigned char> samples(tile.Pixels() * stride);
    unsigned char* first = samples.data();
    for (const std::uint32_t band : bands) {
        if (band == index)
            CopyFromBlock(data, tile, first, stride);
        else
            static_cast<Band*>(owner.BandOf(static_cast<int>(band) + 1))
                ->CompleteTile(blockX, blockY, tile, first, stride, waiting);
        first += size;
    }
    if (IsWidened(raster.PixelType(), eDataType)) NarrowSamples(samples);
    return samples;
}

bool Band::HasDirtyBlock(int blockX, int blockY) {
    const LockedBlock block(TryGetLockedBlockRef(blockX, blockY));
    return block && block->GetDirty();
}

// Its samples are in the file with those of its tile.
void Band::WaitingBlock::Settle() const { block->MarkClean(); }

CPLErr Band::IWriteBlock(int blockX, int blockY, void* data) {
    WindowReader& tiles = owner.File().tiles;
    const zelm::Rectangle tile = tiles.TileAt(owner.Level(), blockX, blockY);
    Creation* const creation = owner.UnderCreation();
    const auto write = [&] {
        std::vector<std::uint32_t> bands;
        WaitingBlocks waiting;
        const auto samples = GatherTile(blockX, blockY, tile, data, bands, waiting);
        // What a write that fails leaves in the tile is anything.
        tiles.Forget();
        LetRecordsAge();
        for (const WaitingBlock& other : waiting)
            if (other.block->GetDirty()) other.band->LetRecordsAge();
        owner.File().raster.Get().Write(owner.Level(), tile, bands, samples.data());
        for (const WaitingBlock& other : waiting) other.Settle();
        for (const std::uint32_t band : bands)
            if (creation) creation->MarkWritten(BlockNumber(blockX, blockY), band);
        if (creation) creation->NoteBytes(samples.size());
    };
    if (Reported(write, CPLE_FileIO)) return CE_None;
    if (creation) creation->MarkLost(BlockNumber(blockX, blockY), index);
    return CE_Failure;
}

void Band::WriteUnwritten() {
    const Creation& creation = *owner.UnderCreation();
    if (!InitBlockInfo()) throw std::bad_alloc();  // which GDAL does when a block is asked for
    const std::size_t size = static_cast<std::size_t>(GDALGetDataTypeSizeBytes(eDataType));
    const std::size_t samples =
        static_cast<std::size_t>(nBlockXSize) * static_cast<std::size_t>(nBlockYSize);
    std::vector<unsigned char> block;
    for (int y = 0; y < nBlocksPerColumn; ++y)
        for (int x = 0; x < nBlocksPerRow; ++x) {
            if (creation.IsWritten(BlockNumber(x, y), index)) continue;
            if (block.empty()) {
                block.resize(samples * size);
                FillUnwritten(block.data(), size, samples);
            }
            if (IWriteBlock(x, y, block.data()) != CE_None)
                throw zmchost::Error(owner.GetDescription(), "build it",
                                     "some of its blocks could not be written");
        }
}

CPLErr Band::IRasterIO(GDALRWFlag mode, int x, int y, int width, int height, void* data,
                       int bufferWidth, int bufferHeight, GDALDataType bufferType,
                       GSpacing pixelSpace, GSpacing lineSpace, GDALRasterIOExtraArg* extra) {
    return Reporting(CE_Failure, [&] {
        if (mode == GF_Write) owner.File().CheckBlock(owner.Level());
        const bool reduced = mode == GF_Read && bufferWidth < width && bufferHeight < height;
        if (reduced && !owner.Overviews().empty()) {
            Dataset::Shown shown(x, y, width, height, *extra);
            if (Dataset* const coarser = owner.CoarserFor(shown, bufferWidth, bufferHeight))
                return coarser->BandOf(nBand)->RasterIO(
                    mode, shown.x, shown.y, shown.width, shown.height, data, bufferWidth,
                    bufferHeight, bufferType, pixelSpace, lineSpace, &shown.extra);
        } else if (reduced) {
            int tried = FALSE;
            const CPLErr result =
                TryOverviewRasterIO(mode, x, y, width, height, data, bufferWidth, bufferHeight,
                                    bufferType, pixelSpace, lineSpace, extra, &tried);
            if (tried) return result;
        }
        std::optional<PlannedRead> planned;
        if (mode == GF_Read)
            planned.emplace(owner.File(), owner.Level(), RectangleOf(x, y, width, height),
                            std::span(&nBand, 1));
        if (mode == GF_Read && bufferWidth == width && bufferHeight == height &&
            owner.ReadsDirectly(x, y, width, height, std::span(&nBand, 1))) {
            const int band = static_cast<int>(index);
            const Target target{data, bufferType, pixelSpace, lineSpace, 0};
            if (owner.File().tiles.Read(owner.Level(), RectangleOf(x, y, width, height), &band, 1,
                                        target, extra))
                return CE_None;
            return CE_Failure;
        }
        return CompanionBand::IRasterIO(mode, x, y, width, height, data, bufferWidth, bufferHeight,
                                        bufferType, pixelSpace, lineSpace, extra);
    });
}

CPLErr Band::AdviseRead(int x, int y, int width, int height, int bufferWidth, int bufferHeight,
                        GDALDataType bufferType, Items options) {
    return owner.AdviseRead(x, y, width, height, bufferWidth, bufferHeight, bufferType, 1, &nBand,
                            options);
}

// --- no-data values and masks ---

double Band::GetNoDataValue(int* success) {
    ReportSuccess(success, false);
    return Reporting<double>(0.0, [&]() -> double {
        if (owner.IsOverview()) return MainBand()->GetNoDataValue(success);
        return CompanionBand::GetNoDataValue(success);
    });
}

std::int64_t Band::GetNoDataValueAsInt64(int* success) {
    ReportSuccess(success, false);
    return Reporting<std::int64_t>(0, [&]() -> std::int64_t {
        if (owner.IsOverview()) return MainBand()->GetNoDataValueAsInt64(success);
        return CompanionBand::GetNoDataValueAsInt64(success);
    });
}

std::uint64_t Band::GetNoDataValueAsUInt64(int* success) {
    ReportSuccess(success, false);
    return Reporting<std::uint64_t>(0, [&]() -> std::uint64_t {
        if (owner.IsOverview()) return MainBand()->GetNoDataValueAsUInt64(success);
        return CompanionBand::GetNoDataValueAsUInt64(success);
    });
}

CPLErr Band::SetNoDataValue(double value) {
    return Reporting(CE_Failure, [&] {
        if (owner.IsOverview()) return MainBand()->SetNoDataValue(value);
        if (!owner.MayChange()) return CE_Failure;
        InvalidateMaskBand();
        return CompanionBand::SetNoDataValue(value);
    });
}

CPLErr Band::SetNoDataValueAsInt64(std::int64_t value) {
    return Reporting(CE_Failure, [&] {
        if (owner.IsOverview()) return MainBand()->SetNoDataValueAsInt64(value);
        if (!owner.MayChange()) return CE_Failure;
        InvalidateMaskBand();
        return CompanionBand::SetNoDataValueAsInt64(value);
    });
}

CPLErr Band::SetNoDataValueAsUInt64(std::uint64_t value) {
    return Reporting(CE_Failure, [&] {
        if (owner.IsOverview()) return MainBand()->SetNoDataValueAsUInt64(value);
        if (!owner.MayChange()) return CE_Failure;
        InvalidateMaskBand();
        return CompanionBand::SetNoDataValueAsUInt64(value);
    });
}

CPLErr Band::DeleteNoDataValue() {
    return Reporting(CE_Failure, [&] {
        if (owner.IsOverview()) return MainBand()->DeleteNoDataValue();
        if (!owner.MayChange()) return CE_Failure;
        InvalidateMaskBand();
        return CompanionBand::DeleteNoDataValue();
    });
}

// GDAL's own search comes first: a mask file, an alpha band or a set of values over all bands
// override what the pixels of one band tell.
bool Band::UsesOwnMask() {
    CompanionBand::GetMaskBand();
    const bool byValue = (nMaskFlags & GMF_NODATA) != 0 && (nMaskFlags & GMF_PER_DATASET) == 0;
    const bool mayBeNotFinite =
        GDALDataTypeIsFloating(eDataType) || GDALDataTypeIsComplex(eDataType);
    return byValue || (nMaskFlags == GMF_ALL_VALID && mayBeNotFinite);
}

// A mask file is one of the finest level.
bool Band::MaskIsBesideTheFile() {
    if (!owner.IsOverview()) return false;
    constexpr int kOthers = GMF_ALPHA | GMF_NODATA | GMF_ALL_VALID;
    const int flags = MainBand()->GetMaskFlags();
    return (flags & GMF_PER_DATASET) != 0 && (flags & kOthers) == 0;
}

CPLErr Band::CreateMaskBand(int flags) {
    return Reporting(CE_Failure, [&] {
        if (!owner.MayChange()) return CE_Failure;
        return owner.NamedAsDraft([&] { return GDALPamRasterBand::CreateMaskBand(flags); });
    });
}

GDALRasterBand* Band::GetMaskBand() {
    return Reporting<GDALRasterBand*>(nullptr, [&]() -> GDALRasterBand* {
        const std::lock_guard lock(owner.File().late);
        if (MaskIsBesideTheFile()) {
            if (!levelMask)
                levelMask = std::make_unique<LevelMask>(*this, *MainBand(),
                                                        owner.Level() - owner.Main().Level());
            return levelMask.get();
        }
        // GDAL's own mask of pixels that are all valid serves one thread; ours comes out the same.
        const bool ours = UsesOwnMask() || (owner.IsShared() && nMaskFlags == GMF_ALL_VALID);
        if (!ours) return CompanionBand::GetMaskBand();
        if (!ownMask) ownMask = std::make_unique<MaskBand>(*this);
        return ownMask.get();
    });
}

// A mask of samples that are not finite follows from the pixels as well as one by value does: told
// as a mask of its own, it would be copied into a mask file with every translation.
int Band::GetMaskFlags() {
    return Reporting<int>(GMF_ALL_VALID, [&]() -> int {
        const std::lock_guard lock(owner.File().late);
        if (MaskIsBesideTheFile()) return MainBand()->GetMaskFlags();
        return UsesOwnMask() ? GMF_NODATA : CompanionBand::GetMaskFlags();
    });
}

bool Band::MaskIsOurs() {
    const int flags = GetMaskFlags();
    if (UsesOwnMask() || flags == GMF_ALL_VALID) return true;
    return (flags & GMF_ALPHA) != 0 && eDataType == GDT_Byte;
}

// --- levels ---

int Band::GetOverviewCount() {
    return Reporting<int>(0, [&]() -> int {
        const auto own = static_cast<int>(owner.Overviews().size());
        return own > 0 || owner.IsOverview() ? own : CompanionBand::GetOverviewCount();
    });
}

GDALRasterBand* Band::GetOverview(int overview) {
    return Reporting<GDALRasterBand*>(nullptr, [&]() -> GDALRasterBand* {
        const auto& own = owner.Overviews();
        if (own.empty() && !owner.IsOverview()) return CompanionBand::GetOverview(overview);
        if (overview < 0 || overview >= static_cast<int>(own.size())) return nullptr;
        return own[static_cast<std::size_t>(overview)]->BandOf(nBand);
    });
}

// --- colours ---

// Of a file that has a table nobody would see another one beside it.
CPLErr Band::KeepColorTable(GDALColorTable* table) {
    if (!owner.IsOverview() && owner.File().archive.ColorTable(index)) {
        ReportError(CE_Failure, CPLE_NoWriteAccess,
                    "the color table is in the file: open it for update");
        return CE_Failure;
    }
    const CPLErr kept = CompanionBand::SetColorTable(table);
    return kept == CE_None ? owner.SaveSidecarNow() : kept;
}

GDALColorInterp Band::DefaultInterpretation() {
    const int bands = owner.GetRasterCount();
    const auto* const first = static_cast<Band*>(owner.GetRasterBand(1));
    const bool told = first->psPam && first->psPam->eColorInterp != GCI_Undefined;
    const bool picture =
        !told && (bands == 3 || bands == 4) && (eDataType == GDT_Byte || eDataType == GDT_UInt16);
    if (picture && nBand <= 3) return static_cast<GDALColorInterp>(GCI_RedBand + nBand - 1);
    return nBand == 1 ? GCI_GrayIndex : GCI_Undefined;
}

GDALColorInterp Band::GetColorInterpretation() {
    return Reporting<GDALColorInterp>(GCI_Undefined, [&]() -> GDALColorInterp {
        if (owner.IsOverview()) return MainBand()->GetColorInterpretation();
        const GDALColorInterp chosen = CompanionBand::GetColorInterpretation();
        if (chosen != GCI_Undefined) return chosen;
        return GetColorTable() ? GCI_PaletteIndex : DefaultInterpretation();
    });
}

GDALColorTable* Band::GetColorTable() {
    return Reporting<GDALColorTable*>(nullptr, [&]() -> GDALColorTable* {
        if (owner.IsOverview()) return MainBand()->GetColorTable();
        const std::lock_guard lock(owner.File().late);
        GDALColorTable* const stored = owner.File().archive.ColorTable(index);
        return stored ? stored : CompanionBand::GetColorTable();
    });
}

CPLErr Band::SetColorTable(GDALColorTable* table) {
    return Reporting(CE_Failure, [&] {
        if (!owner.MayChange()) return CE_Failure;
        if (!StoresInFile() || owner.IsOverview()) return KeepColorTable(table);
        if (owner.File().archive.StoreColorTable(index, table)) return CE_None;
        ReportError(CE_Failure, CPLE_FileIO, "the color table was not stored");
        return CE_Failure;
    });
}

}  // namespace zmcgdal
