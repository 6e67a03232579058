#include "gdal/GdalRasterSource.h"

#include <cpl_error.h>

#include <new>

#include "core/PixelVocabulary.h"
#include "gdal/Band.h"
#include "gdal/ColorTables.h"
#include "gdal/Dataset.h"
#include "gdal/ErrorCatcher.h"
#include "gdal/NoDataValues.h"
#include "gdal/SampleType.h"
#include "host/base/Error.h"

namespace zmcgdal {
namespace {

constexpr const char* kSource = "read the source";

// Some drivers report a failure and answer that all went well.
void CheckRead(const std::string& name, const zmchost::Window& window, CPLErr result,
               const ErrorCatcher& errors) {
    if (result == CE_None && errors.Text().empty()) return;
    throw zmchost::Error(name, "read lines from " + std::to_string(window.y),
                         errors.Text().empty() ? "GDAL gives no reason" : errors.Text());
}

bool FitsBytes(const GDALColorEntry& entry) {
    const auto fits = [](short component) { return component >= 0 && component <= 255; };
    return fits(entry.c1) && fits(entry.c2) && fits(entry.c3) && fits(entry.c4);
}

bool FitsPalette(const GDALColorTable& table) {
    if (table.GetPaletteInterpretation() != GPI_RGB) return false;
    for (int i = 0; i < table.GetColorEntryCount(); ++i)
        if (!FitsBytes(*table.GetColorEntry(i))) return false;
    return true;
}

// Whether GDAL knows of a mask that follows neither from alpha nor from the band's own no-data
// value.
bool IsMasked(GDALRasterBand& band) {
    // GDAL looks for alpha first, and so for palettes.
    auto* const own = dynamic_cast<Band*>(&band);
    if (own && !own->Owner().MayHaveMasks()) return false;
    const int flags = band.GetMaskFlags();
    return (flags & (GMF_ALL_VALID | GMF_ALPHA)) == 0 && flags != GMF_NODATA;
}

// Ours are alpha where their sidecar says so, and need not be looked through for palettes.
bool IsAlpha(GDALRasterBand& band) {
    auto* const own = dynamic_cast<Band*>(&band);
    return (own ? own->CompanionBand::GetColorInterpretation() : band.GetColorInterpretation()) ==
           GCI_AlphaBand;
}

bool FitsMask(GDALRasterBand& band) {
    GDALRasterBand* const mask = band.GetMaskBand();
    return mask && mask->GetXSize() == band.GetXSize() && mask->GetYSize() == band.GetYSize();
}

}  // namespace

bool IsSignedByte(GDALRasterBand& band) {
    // GDAL warns of a question for the item alone from 3.7 on.
    const char* const word = CSLFetchNameValue(band.GetMetadata("IMAGE_STRUCTURE"), "PIXELTYPE");
    return band.GetRasterDataType() == GDT_Byte && word && EQUAL(word, "SIGNEDBYTE");
}

GdalRasterSource::GdalRasterSource(GDALDataset& source, bool signedByte) : dataset(source) {
    if (dataset.GetRasterCount() == 0) throw zmchost::Error(Name(), kSource, "it has no bands");
    ChooseType(signedByte);
    FindAlpha();
}

GDALRasterBand& GdalRasterSource::BandOf(std::uint32_t band) const {
    return *dataset.GetRasterBand(static_cast<int>(band) + 1);
}

void GdalRasterSource::FindAlpha() {
    for (int number = 1; number <= dataset.GetRasterCount() && !alphaBand; ++number)
        if (IsAlpha(*dataset.GetRasterBand(number)))
            alphaBand = static_cast<std::uint32_t>(number - 1);
}

void GdalRasterSource::ChooseType(bool signedByte) {
    GDALRasterBand& first = *dataset.GetRasterBand(1);
    bool isSigned = signedByte || IsSignedByte(first);
    GDALDataType type = first.GetRasterDataType();
    for (int number = 2; number <= dataset.GetRasterCount(); ++number) {
        GDALRasterBand& band = *dataset.GetRasterBand(number);
        if (band.GetRasterDataType() != type || (!signedByte && IsSignedByte(band) != isSigned)) {
            isSigned = false;
            type = GDALDataTypeUnion(type, band.GetRasterDataType());
        }
    }
    pixelType = PixelTypeFor(type, isSigned);
    if (pixelType == 0)
        throw zmchost::Error(
            Name(), kSource,
            std::string("no pyramid holds samples of type ") + GDALGetDataTypeName(type));
    const bool flagged = isSigned && type == GDT_Byte;
    bufferType = GdalTypeOf(pixelType, flagged ? SignedByteAs::FlaggedByte : SignedByteAs::Own);
}

std::vector<std::string> GdalRasterSource::Losses() const {
    std::vector<std::string> losses;
    for (int number = 1; number <= dataset.GetRasterCount(); ++number) {
        GDALRasterBand& band = *dataset.GetRasterBand(number);
        const std::string which = "of band " + std::to_string(number);
        const GDALColorTable* const table = band.GetColorTable();
        if (table && !FitsPalette(*table))
            losses.push_back("the color table " + which + ", which is not made of 8-bit RGBA");
        if (NoDataAsDouble(band) && !NoDataFitsDouble(band))
            losses.push_back("the last digits of the no-data value " + which +
                             " while levels are reduced");
        if (IsMasked(band) && !FitsMask(band))
            losses.push_back("the mask " + which + ", which is of another size");
    }
    return losses;
}

std::string GdalRasterSource::Name() const { return dataset.GetDescription(); }

zelm::RasterProps GdalRasterSource::Props() const {
    zelm::RasterProps props;
    props.SetSamples(static_cast<std::uint32_t>(dataset.GetRasterXSize()));
    props.SetLines(static_cast<std::uint32_t>(dataset.GetRasterYSize()));
    props.SetBands(static_cast<std::uint32_t>(dataset.GetRasterCount()));
    props.interleave = zelm::Interleave::BIP;
    props.pixelType = pixelType;
    for (int number = 1; number <= dataset.GetRasterCount(); ++number) {
        const auto value = NoDataAsDouble(*dataset.GetRasterBand(number));
        if (value) props.SetNoDataValue(static_cast<std::uint32_t>(number - 1), *value);
    }
    return props;
}

zelm::PalettePtr GdalRasterSource::BandPalette(std::uint32_t band) const {
    const GDALColorTable* const table =
        dataset.GetRasterBand(static_cast<int>(band) + 1)->GetColorTable();
    if (!table || !FitsPalette(*table)) return zelm::PalettePtr();
    zelm::PalettePtr palette(new zelm::Palette);
    if (!palette) throw std::bad_alloc();
    ColorsOf(*table).CopyTo(*palette);
    return palette;
}

void GdalRasterSource::Read(const zmchost::Window& window, std::span<const std::uint32_t> bands,
                            void* pixels) {
    std::vector<int> numbers;
    for (const std::uint32_t band : bands) numbers.push_back(static_cast<int>(band) + 1);
    const GSpacing size = GDALGetDataTypeSizeBytes(bufferType);
    const GSpacing pixel = size * static_cast<GSpacing>(numbers.size());
    const int width = static_cast<int>(window.width);
    const int height = static_cast<int>(window.height);
    GDALRasterIOExtraArg extra;
    INIT_RASTERIO_EXTRA_ARG(extra);
    CPLErrorReset();
    const ErrorCatcher errors(CE_Failure);
    const CPLErr result = dataset.RasterIO(GF_Read, static_cast<int>(window.x),
                                           static_cast<int>(window.y), width, height, pixels, width,
                                           height, bufferType, static_cast<int>(numbers.size()),
                                           numbers.data(), pixel, pixel * width, size, &extra);
    CheckRead(Name(), window, result, errors);
}

std::optional<std::uint32_t> GdalRasterSource::AlphaBand(std::uint32_t band) const {
    return alphaBand == band ? std::nullopt : alphaBand;
}

bool GdalRasterSource::HasMask(std::uint32_t band) const {
    return IsMasked(BandOf(band)) && FitsMask(BandOf(band));
}

void GdalRasterSource::ReadMask(const zmchost::Window& window, std::span<const std::uint32_t> bands,
                                unsigned char* shown) {
    const std::size_t pixels = std::size_t{window.width} * window.height;
    const std::size_t stride = bands.size();
    // Bands of one mask follow each other, as a rule: it is read once for all of them.
    std::vector<unsigned char> plane(pixels);
    const GDALRasterBand* known = nullptr;
    for (std::size_t i = 0; i < stride; ++i) {
        const bool masked = HasMask(bands[i]);
        GDALRasterBand& from = masked ? *BandOf(bands[i]).GetMaskBand() : BandOf(alphaBand.value());
        if (&from != known) ReadShown(from, masked, window, plane);
        known = &from;
        for (std::size_t pixel = 0; pixel < pixels; ++pixel)
            shown[pixel * stride + i] = plane[pixel];
    }
}

void GdalRasterSource::ReadShown(GDALRasterBand& from, bool isMask, const zmchost::Window& window,
                                 std::vector<unsigned char>& shown) {
    // A mask is made of bytes; alpha may be less than 1.
    const GDALDataType type = isMask ? GDT_Byte : GDT_Float64;
    std::vector<double> alpha(isMask ? 0 : shown.size());
    void* const target = isMask ? static_cast<void*>(shown.data()) : alpha.data();
    const int width = static_cast<int>(window.width);
    const int height = static_cast<int>(window.height);
    GDALRasterIOExtraArg extra;
    INIT_RASTERIO_EXTRA_ARG(extra);
    CPLErrorReset();
    const ErrorCatcher errors(CE_Failure);
    const CPLErr result =
        from.RasterIO(GF_Read, static_cast<int>(window.x), static_cast<int>(window.y), width,
                      height, target, width, height, type, 0, 0, &extra);
    CheckRead(Name(), window, result, errors);
    for (std::size_t i = 0; i < alpha.size(); ++i) shown[i] = alpha[i] > 0 ? 1 : 0;
}

}  // namespace zmcgdal
