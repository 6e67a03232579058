#include "gdal/GdalRasterSource.h"

#include <cpl_error.h>

#include "core/PixelVocabulary.h"
#include "gdal/ColorTables.h"
#include "gdal/ErrorCatcher.h"
#include "gdal/NoDataValues.h"
#include "gdal/SampleType.h"
#include "host/base/Error.h"

namespace zmcgdal {
namespace {

constexpr const char* kSource = "read the source";

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

}  // namespace

bool IsSignedByte(GDALRasterBand& band) {
    const char* const word = band.GetMetadataItem("PIXELTYPE", "IMAGE_STRUCTURE");
    return band.GetRasterDataType() == GDT_Byte && word && EQUAL(word, "SIGNEDBYTE");
}

GdalRasterSource::GdalRasterSource(GDALDataset& source, bool signedByte) : dataset(source) {
    if (dataset.GetRasterCount() == 0) throw zmchost::Error(Name(), kSource, "it has no bands");
    ChooseType(signedByte);
    FindLosses();
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
    bufferType = GdalTypeOf(pixelType, SignedByteAs::FlaggedByte);
}

void GdalRasterSource::FindLosses() {
    for (int number = 1; number <= dataset.GetRasterCount(); ++number) {
        GDALRasterBand& band = *dataset.GetRasterBand(number);
        const std::string which = "of band " + std::to_string(number);
        const GDALColorTable* const table = band.GetColorTable();
        if (table && !FitsPalette(*table))
            losses.push_back("the color table " + which + ", which is not made of 8-bit RGBA");
        if (NoDataAsDouble(band) && !NoDataFitsDouble(band))
            losses.push_back("the last digits of the no-data value " + which +
                             " while levels are reduced");
    }
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
    AddColors(*table, *palette);
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
    // Some drivers report a failure and answer that all went well.
    if (result == CE_None && errors.Text().empty()) return;
    throw zmchost::Error(Name(), "read lines from " + std::to_string(window.y),
                         errors.Text().empty() ? "GDAL gives no reason" : errors.Text());
}

}  // namespace zmcgdal
