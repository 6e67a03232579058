#include "python/Facts.h"

#include <ogr_spatialref.h>

#include "gdal/NoDataValues.h"
#include "gdal/SampleType.h"
#include "host/base/Error.h"

namespace zmcpython {
namespace {

std::string WktOf(GDALDataset& dataset) {
    const OGRSpatialReference* const reference = dataset.GetSpatialRef();
    if (!reference) return "";
    char* text = nullptr;
    reference->exportToWkt(&text);
    const std::unique_ptr<char, decltype(&CPLFree)> owned(text, &CPLFree);
    return text ? text : "";
}

Items ItemsOf(GDALMajorObject& object) {
    Items items;
    for (CSLConstList item = object.GetMetadata(); item && *item; ++item) {
        char* name = nullptr;
        const char* const value = CPLParseNameValue(*item, &name);
        const std::unique_ptr<char, decltype(&CPLFree)> owned(name, &CPLFree);
        if (name && value) items.emplace_back(name, value);
    }
    return items;
}

std::optional<Number> NoDataOf(GDALRasterBand& band) {
    return zmcgdal::VisitNoData(band, [](auto value, GDALDataType) {
        return value ? std::optional<Number>(*value) : std::nullopt;
    });
}

BandFacts BandFactsOf(GDALRasterBand& band) {
    return {band.GetDescription(),
            band.GetUnitType(),
            GDALGetColorInterpretationName(band.GetColorInterpretation()),
            band.GetScale(),
            band.GetOffset(),
            NoDataOf(band),
            ItemsOf(band)};
}

// Only what is understood by itself: no file, and nobody in the network, is asked.
OGRSpatialReference ReferenceOf(const std::string& text) {
    OGRSpatialReference reference;
    reference.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
    const CPLErr before = CPLGetLastErrorType();
    CPLPushErrorHandler(CPLQuietErrorHandler);
    const OGRErr result = reference.SetFromUserInput(
        text.c_str(), OGRSpatialReference::SET_FROM_USER_INPUT_LIMITATIONS_get());
    CPLPopErrorHandler();
    if (before == CE_None) CPLErrorReset();
    if (result != OGRERR_NONE) throw BadArgument("crs is not understood");
    return reference;
}

template <class T>
T As(const Number& number) {
    return std::visit([](auto value) { return static_cast<T>(value); }, number);
}

void SetNoData(GDALRasterBand& band, const Number& value) {
    if (band.GetRasterDataType() == GDT_Int64)
        band.SetNoDataValueAsInt64(As<std::int64_t>(value));
    else if (band.GetRasterDataType() == GDT_UInt64)
        band.SetNoDataValueAsUInt64(As<std::uint64_t>(value));
    else
        band.SetNoDataValue(As<double>(value));
}

}  // namespace

double AsDouble(const Number& number) { return As<double>(number); }

Facts FactsOf(GDALDataset& dataset) {
    Facts facts{WktOf(dataset), std::nullopt, ItemsOf(dataset), {}};
    Transform transform{};
    if (GDALGetGeoTransform(GDALDataset::ToHandle(&dataset), transform.data()) == CE_None)
        facts.transform = transform;
    for (int number = 1; number <= dataset.GetRasterCount(); ++number)
        facts.bands.push_back(BandFactsOf(*dataset.GetRasterBand(number)));
    return facts;
}

void Tell(const GivenFacts& facts, GDALDataset& dataset) {
    const auto bands = static_cast<std::size_t>(dataset.GetRasterCount());
    if (facts.descriptions.size() > bands)
        throw BadArgument("there are more descriptions than bands");
    if (facts.alpha && (*facts.alpha == 0 || *facts.alpha > bands))
        throw BadArgument("the alpha band is none of the bands");
    if (!facts.crs.empty()) {
        const OGRSpatialReference reference = ReferenceOf(facts.crs);
        dataset.SetSpatialRef(&reference);
    }
    if (facts.transform) {
        Transform transform = *facts.transform;
        GDALSetGeoTransform(GDALDataset::ToHandle(&dataset), transform.data());
    }
    for (const auto& [name, value] : facts.items)
        dataset.SetMetadataItem(name.c_str(), value.c_str());
    for (std::size_t i = 0; i < bands; ++i) {
        GDALRasterBand& band = *dataset.GetRasterBand(static_cast<int>(i) + 1);
        if (facts.noData) SetNoData(band, *facts.noData);
        if (i < facts.descriptions.size() && !facts.descriptions[i].empty())
            band.SetDescription(facts.descriptions[i].c_str());
    }
    if (facts.alpha)
        dataset.GetRasterBand(static_cast<int>(*facts.alpha))
            ->SetColorInterpretation(GCI_AlphaBand);
}

std::unique_ptr<GDALDataset> OutlineOf(const GivenFacts& facts, std::uint32_t width,
                                       std::uint32_t height, std::uint32_t bands,
                                       std::uint32_t pixelType) {
    GDALDriver* const driver = GetGDALDriverManager()->GetDriverByName("VRT");
    std::unique_ptr<GDALDataset> outline;
    if (driver)
        outline.reset(driver->Create(
            "", static_cast<int>(width), static_cast<int>(height), static_cast<int>(bands),
            zmcgdal::GdalTypeOf(pixelType, zmcgdal::SignedByteAs::Own), nullptr));
    if (!outline) throw BadArgument("GDAL has no room for what is told of the raster");
    Tell(facts, *outline);
    return outline;
}

}  // namespace zmcpython
