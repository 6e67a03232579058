#include "gdal/Sidecar.h"

#include <cpl_string.h>
#include <gdal_utils.h>

#include <algorithm>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "gdal/Band.h"
#include "gdal/Dataset.h"
#include "gdal/ErrorCatcher.h"
#include "host/base/Error.h"
#include "host/file/EmbeddedItems.h"

namespace zmcgdal {
namespace {

// Domains that describe the source's own file.
bool DescribesTheFile(const char* domain) {
    const char* const names[] = {"IMAGE_STRUCTURE", "SUBDATASETS",   "DERIVED_SUBDATASETS",
                                 "ZMCPYRAMID",      kEmbeddedDomain, "TIFF"};
    return std::any_of(std::begin(names), std::end(names),
                       [&](const char* name) { return EQUAL(domain, name); });
}

bool IsStatistic(const char* item) { return STARTS_WITH_CI(item, "STATISTICS_"); }

void SetItems(GDALMajorObject& target, const CPLStringList& items) {
    for (int i = 0; i < items.Count(); ++i) {
        char* name = nullptr;
        const char* const value = CPLParseNameValue(items[i], &name);
        if (name) target.SetMetadataItem(name, value);
        CPLFree(name);
    }
}

void CopyMetadata(GDALMajorObject& source, GDALMajorObject& target) {
    CPLStringList domains(source.GetMetadataDomainList());
    if (domains.FindString("") < 0) domains.AddString("");
    for (int i = 0; i < domains.Count(); ++i) {
        if (DescribesTheFile(domains[i])) continue;
        CPLStringList items = WithoutStatistics(source.GetMetadata(domains[i]));
        if (items.Count() == 0) continue;
        // One by one, since a list without statistics removes them.
        if (*domains[i] == '\0')
            SetItems(target, items);
        else
            target.SetMetadata(items.List(), domains[i]);
    }
}

// A picture is taken for red, green and blue unless something else is written down.
void CopyInterpretation(GDALDataset& source, Dataset& target) {
    for (int number = 1; number <= target.GetRasterCount(); ++number) {
        const GDALColorInterp wanted = source.GetRasterBand(number)->GetColorInterpretation();
        GDALRasterBand& band = *target.GetRasterBand(number);
        if (wanted != GCI_Undefined && wanted != GCI_PaletteIndex &&
            band.GetColorInterpretation() != wanted)
            band.SetColorInterpretation(wanted);
    }
}

// To GDAL a sidecar that was cut off is worth a warning, and its flush answers nothing before 3.7.
void Save(GDALDataset& dataset, const std::string& name, const std::string& operation) {
    const ErrorCatcher errors(CE_Warning);
    dataset.FlushCache(false);
    if (!errors.Text().empty()) throw zmchost::Error(name, operation, errors.Text());
}

std::string KeepingMask(const std::string& name) {
    return "keep its mask in " + name + kMaskEnding;
}

// GDAL reports what cannot be read.
void ReadAll(const std::string& file) {
    const std::unique_ptr<GDALDataset> opened(
        GDALDataset::Open(file.c_str(), GDAL_OF_RASTER | GDAL_OF_VERBOSE_ERROR));
    if (!opened) return;
    GDALRasterBand& band = *opened->GetRasterBand(1);
    int width = 0, height = 0;
    band.GetBlockSize(&width, &height);
    std::vector<unsigned char> block(static_cast<std::size_t>(width) *
                                     static_cast<std::size_t>(height));
    for (int y = 0; y < (band.GetYSize() + height - 1) / height; ++y)
        for (int x = 0; x < (band.GetXSize() + width - 1) / width; ++x)
            if (band.ReadBlock(x, y, block.data()) != CE_None) return;
}

void SaveMask(std::unique_ptr<Dataset> dataset, const std::string& name) {
    GDALRasterBand& first = *dataset->GetRasterBand(1);
    if ((first.GetMaskFlags() & GMF_PER_DATASET) == 0) return;
    GDALDataset* const mask = first.GetMaskBand()->GetDataset();
    // An alpha band is a mask of the dataset too, and no file.
    if (!mask || mask == dataset.get()) return;
    const std::string file = mask->GetDescription();
    Save(*mask, name, KeepingMask(name));
    CloseMask(*dataset, file, name);
}

}  // namespace

bool HasStatistics(CSLConstList items) {
    for (; items && *items; ++items)
        if (IsStatistic(*items)) return true;
    return false;
}

CPLStringList WithoutStatistics(CSLConstList items) {
    CPLStringList kept;
    for (; items && *items; ++items)
        if (!IsStatistic(*items)) kept.AddString(*items);
    return kept;
}

CPLErr CopySidecar(GDALDataset& source, Dataset& target, bool strict) {
    constexpr int kByHand =
        GCIF_METADATA | GCIF_BAND_METADATA | GCIF_COLORINTERP | GCIF_COLORTABLE | GCIF_MASK;
    target.CloneInfo(&source, GCIF_PAM_DEFAULT & ~kByHand);
    CopyMetadata(source, target);
    for (int number = 1; number <= target.GetRasterCount(); ++number)
        CopyMetadata(*source.GetRasterBand(number), *target.GetRasterBand(number));
    CopyInterpretation(source, target);
    const int maskFlags = source.GetRasterBand(1)->GetMaskFlags();
    const bool maskFile = (maskFlags & GMF_PER_DATASET) != 0 &&
                          (maskFlags & (GMF_ALPHA | GMF_NODATA | GMF_ALL_VALID)) == 0;
    if (!maskFile) return CE_None;
    return GDALDriver::DefaultCopyMasks(&source, &target, strict ? TRUE : FALSE);
}

void KeepStatistics(const std::vector<zmchost::FullStatistics>& stored, Dataset& target,
                    Archive& inFile) {
    for (const zmchost::FullStatistics& each : stored)
        static_cast<Band*>(target.GetRasterBand(static_cast<int>(each.band) + 1))
            ->KeepFull(each, inFile);
}

void CloseMask(Dataset& dataset, const std::string& file, const std::string& name) {
    const ErrorCatcher errors(CE_Failure);
    dataset.CloseMask();
    ReadAll(file);
    if (!errors.Text().empty()) throw zmchost::Error(name, KeepingMask(name), errors.Text());
}

void SaveSidecar(std::unique_ptr<Dataset> dataset, const std::string& name) {
    Save(*dataset, name, "keep its metadata in " + name + kSidecarEnding);
    SaveMask(std::move(dataset), name);
}

void EmbedSidecar(std::unique_ptr<Dataset> dataset, const std::string& name) {
    const std::string items = dataset->SidecarText();
    dataset->ForgetChanges();
    if (!items.empty()) zmchost::EmbedItems(*dataset->File().source, name, items);
    SaveMask(std::move(dataset), name);
}

bool KeepSidecar(GDALDataset& source, const Built& built,
                 const std::vector<zmchost::FullStatistics>& stored,
                 std::shared_ptr<OpenFile> file) {
    // A virtual raster selects the bands; only its metadata are looked at.
    CPLStringList list;
    for (const char* const word : {"-of", "VRT"}) list.AddString(word);
    for (const std::uint32_t band : built.bands) {
        list.AddString("-b");
        list.AddString(std::to_string(band + 1).c_str());
    }
    if (!built.noData.empty()) {
        list.AddString("-a_nodata");
        list.AddString(built.noData.c_str());
    }
    const std::unique_ptr<GDALTranslateOptions, decltype(&GDALTranslateOptionsFree)> translate(
        GDALTranslateOptionsNew(list.List(), nullptr), &GDALTranslateOptionsFree);
    const std::unique_ptr<GDALDataset> selected(GDALDataset::FromHandle(
        GDALTranslate("", GDALDataset::ToHandle(&source), translate.get(), nullptr)));
    auto pyramid = Dataset::FromFile(std::move(file), GA_Update);
    pyramid->LoadSidecar(built.base.c_str(), nullptr);
    if (!selected || CopySidecar(*selected, *pyramid, true) != CE_None) return false;
    KeepStatistics(stored, *pyramid, pyramid->File().archive);
    (built.embed ? EmbedSidecar : SaveSidecar)(std::move(pyramid), built.name);
    return true;
}

}  // namespace zmcgdal
