#include "tools/Place.h"

#include <ogr_spatialref.h>

#include <cstdio>
#include <memory>

#include "gdal/Dataset.h"
#include "gdal/NoDataValues.h"
#include "host/base/Error.h"
#include "tools/GdalWorld.h"
#include "tools/Message.h"

namespace zmctools {
namespace {

// Null where the driver does not show such a pyramid.
std::unique_ptr<zmcgdal::Dataset> Open(const std::string& file) {
    try {
        auto opened =
            std::make_shared<zmcgdal::OpenFile>(file, GA_ReadOnly, zmcgdal::OpenOptions{});
        auto dataset = zmcgdal::Dataset::FromFile(std::move(opened), GA_ReadOnly);
        dataset->LoadSidecar(file.c_str(), nullptr);
        return dataset;
    } catch (const zmchost::Error&) {
        return nullptr;
    }
}

Json SystemOf(const GDALDataset& dataset) {
    const OGRSpatialReference* const system = dataset.GetSpatialRef();
    if (!system) return nullptr;
    const char* const options[] = {"FORMAT=WKT2_2019", "MULTILINE=NO", nullptr};
    char* text = nullptr;
    system->exportToWkt(&text, options);
    const std::unique_ptr<char, decltype(&CPLFree)> wkt(text, &CPLFree);
    const char* const name = system->GetName();
    const char* const authority = system->GetAuthorityName(nullptr);
    const char* const code = system->GetAuthorityCode(nullptr);
    return {{"name", name ? Json(name) : Json()},
            {"authority", authority && code ? Json(std::string(authority) + ":" + code) : Json()},
            {"wkt", text ? Json(text) : Json()}};
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

// Text of a value as people read it.
std::string Shown(const Json& value) {
    if (value.is_null()) return "none";
    if (value.is_string()) return value.get<std::string>();
    if (!value.is_number_float()) return value.dump();
    char text[40];
    static_cast<void>(std::snprintf(text, sizeof text, "%.15g", value.get<double>()));
    return text;
}

std::string Joined(const Json& list) {
    std::string text;
    for (const Json& value : list) text.append(text.empty() ? "" : ", ").append(Shown(value));
    return text;
}

void PrintSystem(const Json& system) {
    const bool known = !system["authority"].is_null();
    std::printf("coordinate system %s%s%s\n", Visible(Shown(system["name"])).c_str(),
                known ? ", " : "", known ? Visible(Shown(system["authority"])).c_str() : "");
}

void PrintTransform(const Json& numbers) {
    if (numbers[2] == 0 && numbers[4] == 0)
        std::printf("upper left corner %s, %s; pixels of %s x %s\n", Shown(numbers[0]).c_str(),
                    Shown(numbers[3]).c_str(), Shown(numbers[1]).c_str(),
                    Shown(numbers[5]).c_str());
    else
        std::printf("geotransform %s\n", Joined(numbers).c_str());
}

void PrintNoData(const Json& values) {
    bool same = true;
    for (const Json& value : values) same = same && value == values[0];
    std::printf(same ? "no-data value %s\n" : "no-data values of the bands %s\n",
                same ? Shown(values[0]).c_str() : Joined(values).c_str());
}

}  // namespace

Json PlaceOf(const std::string& file) {
    Json place = {{"crs", nullptr}, {"geoTransform", nullptr}, {"noData", nullptr}};
    SetSubject(file);
    TakeGdalError(file);
    if (const auto dataset = Open(file)) {
        place["crs"] = SystemOf(*dataset);
        place["geoTransform"] = TransformOf(*dataset);
        place["noData"] = NoDataOf(*dataset);
    }
    if (const std::string wrong = TakeGdalError(file); !wrong.empty()) Warn(file, wrong);
    return place;
}

void PrintPlace(const Json& place) {
    if (!place["crs"].is_null()) PrintSystem(place["crs"]);
    if (!place["geoTransform"].is_null()) PrintTransform(place["geoTransform"]);
    if (!place["noData"].is_null()) PrintNoData(place["noData"]);
}

}  // namespace zmctools
