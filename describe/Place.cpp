#include "describe/Place.h"

#include <ogr_spatialref.h>

#include <memory>

#include "gdal/NoDataValues.h"

namespace zmcdescribe {
namespace {

Json SystemOf(const GDALDataset& dataset) {
    const OGRSpatialReference* const system = dataset.GetSpatialRef();
    if (!system) return nullptr;
    const std::string wkt = WktOf(*system);
    const char* const name = system->GetName();
    const char* const authority = system->GetAuthorityName(nullptr);
    const char* const code = system->GetAuthorityCode(nullptr);
    return {{"name", name ? Json(name) : Json()},
            {"authority", authority && code ? Json(std::string(authority) + ":" + code) : Json()},
            {"wkt", wkt.empty() ? Json() : Json(wkt)}};
}

Json TransformOf(GDALDataset& dataset) {
    double numbers[6];
    if (GDALGetGeoTransform(GDALDataset::ToHandle(&dataset), numbers) != CE_None) return nullptr;
    Json list = Json::array();
    for (const double number : numbers) list.push_back(JsonNumber(number));
    return list;
}

Json NoDataOf(GDALDataset& dataset) {
    Json list = Json::array();
    bool any = false;
    for (int number = 1; number <= dataset.GetRasterCount(); ++number) {
        list.push_back(zmcgdal::VisitNoData(
            *dataset.GetRasterBand(number),
            [](auto value, GDALDataType) { return value ? JsonNumber(*value) : Json(); }));
        any |= !list.back().is_null();
    }
    return any ? list : Json();
}

}  // namespace

std::string WktOf(const OGRSpatialReference& system) {
    const char* const options[] = {"FORMAT=WKT2_2019", "MULTILINE=NO", nullptr};
    char* text = nullptr;
    system.exportToWkt(&text, options);
    const std::unique_ptr<char, decltype(&CPLFree)> wkt(text, &CPLFree);
    return text ? text : "";
}

Json DescribePlace(GDALDataset* dataset) {
    if (!dataset) return {{"crs", nullptr}, {"geoTransform", nullptr}, {"noData", nullptr}};
    return {{"crs", SystemOf(*dataset)},
            {"geoTransform", TransformOf(*dataset)},
            {"noData", NoDataOf(*dataset)}};
}

}  // namespace zmcdescribe
