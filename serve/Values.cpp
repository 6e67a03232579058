#include "serve/Values.h"

#include <cmath>

#include "core/ElementTypes.h"

namespace zmcserve {
namespace {

using zmcdescribe::Json;

template <class T>
Json ExactValue(const T& value) {
    if constexpr (std::is_integral_v<T> && sizeof(T) == 8)
        return std::to_string(value);
    else
        return zmcdescribe::JsonNumber(value);
}

Json CoordinatesOf(ServedRaster& raster, std::uint32_t level, double x, double y) {
    const auto& transform = raster.Place().transform;
    if (!transform) return nullptr;
    const double scale = std::ldexp(1.0, static_cast<int>(level - raster.FinestLevel()));
    double east = (x + 0.5) * scale, north = (y + 0.5) * scale;
    Apply(*transform, east, north);
    return {zmcdescribe::JsonNumber(east), zmcdescribe::JsonNumber(north)};
}

}  // namespace

Json ValuesOf(std::uint32_t pixelType, const unsigned char* samples, std::size_t count) {
    Json::array_t values;
    zelm::VisitElementType(pixelType, [&]<class T>(std::type_identity<T>) {
        const T* const typed = reinterpret_cast<const T*>(samples);
        for (std::size_t i = 0; i < count; ++i) values.push_back(ExactValue(typed[i]));
    });
    return values;
}

Json NumbersOf(const std::vector<std::uint32_t>& bands) {
    Json list = Json::array();
    for (const std::uint32_t band : bands) list.push_back(band + 1);
    return list;
}

Json DescribePixel(ServedRaster& raster, std::uint32_t level, std::uint32_t x, std::uint32_t y,
                   const std::vector<std::uint32_t>& bands, const Deadline& deadline) {
    // Aligned for every type.
    std::vector<unsigned char> samples(bands.size() * raster.SampleBytes());
    raster.Borrow(deadline)->Pixels().Read(level, {x, y, 1, 1}, bands, samples.data());
    raster.File().CheckUnchanged();
    return {{"x", x},
            {"y", y},
            {"level", level},
            {"coordinates", CoordinatesOf(raster, level, x, y)},
            {"bands", NumbersOf(bands)},
            {"values", ValuesOf(raster.Header().pixelType, samples.data(), bands.size())}};
}

}  // namespace zmcserve
