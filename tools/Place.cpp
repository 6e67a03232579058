#include "tools/Place.h"

#include <cstdio>
#include <memory>

#include "describe/Place.h"
#include "gdal/Dataset.h"
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
    SetSubject(file);
    TakeGdalError(file);
    const auto dataset = Open(file);
    Json place = zmcdescribe::DescribePlace(dataset.get());
    if (const std::string wrong = TakeGdalError(file); !wrong.empty()) Warn(file, wrong);
    return place;
}

void PrintPlace(const Json& place) {
    if (!place["crs"].is_null()) PrintSystem(place["crs"]);
    if (!place["geoTransform"].is_null()) PrintTransform(place["geoTransform"]);
    if (!place["noData"].is_null()) PrintNoData(place["noData"]);
}

}  // namespace zmctools
