#include "examples/Examples.h"

#include <cpl_conv.h>
#include <dlfcn.h>
#include <gdal_priv.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <memory>

namespace examples {
namespace {

struct ColourStop {
    double at;  // -1 for the lowest height, 0 for zero, 1 for the highest
    Rgb colour;
};

constexpr ColourStop kStops[] = {
    {-1.0, {8, 29, 88}},    {-0.6, {34, 94, 168}},   {-0.25, {65, 160, 205}},
    {0.0, {199, 233, 225}}, {0.02, {102, 166, 102}}, {0.3, {180, 190, 110}},
    {0.6, {166, 118, 70}},  {0.85, {130, 84, 52}},   {1.0, {250, 248, 245}},
};

unsigned char Mix(unsigned char a, unsigned char b, double t) {
    return static_cast<unsigned char>(std::lround(a + (b - a) * t));
}

// Lambertian shade of the surface, exaggerated so that gentle slopes show.
double Shade(const Heights& h, std::uint32_t x, std::uint32_t y) {
    const auto at = [&h](std::uint32_t column, std::uint32_t row) {
        return static_cast<double>(h.values[std::size_t{row} * h.width + column]);
    };
    const std::uint32_t west = x == 0 ? h.width - 1 : x - 1;  // the grid goes round the globe
    const std::uint32_t east = x + 1 == h.width ? 0 : x + 1;
    const std::uint32_t north = y == 0 ? 0 : y - 1;
    const std::uint32_t south = std::min(y + 1, h.height - 1);
    const double scale = 0.5 * h.width / 1440.0;
    const double dx = (at(east, y) - at(west, y)) * scale;
    const double dy = (at(x, south) - at(x, north)) * scale;
    const double light = (1.0 + (dx + dy) * 0.7) / std::sqrt(1.0 + dx * dx + dy * dy);
    return std::clamp(0.55 + 0.45 * light, 0.35, 1.25);
}

}  // namespace

void Fail(const std::string& text) {
    static_cast<void>(std::fprintf(stderr, "%s\n", text.c_str()));
    // NOLINTNEXTLINE(concurrency-mt-unsafe): the examples have one thread.
    std::exit(1);
}

Host::Host(const char* modulePath, const char* kind) {
    void* module = dlopen(modulePath, RTLD_NOW | RTLD_LOCAL);
    // NOLINTNEXTLINE(concurrency-mt-unsafe): likewise.
    if (!module) Fail(dlerror());
    const auto create = reinterpret_cast<decltype(&CreateDataConnectionFactory)>(
        dlsym(module, "CreateDataConnectionFactory"));
    deleteFactory = reinterpret_cast<decltype(&DeleteDataConnectionFactory)>(
        dlsym(module, "DeleteDataConnectionFactory"));
    if (!create || !deleteFactory) Fail(std::string(modulePath) + ": not the module");
    factory = create(zelm::String(kind));
    if (!factory) Fail(std::string(modulePath) + ": no factory for " + kind);
}

Host::~Host() { deleteFactory(factory); }

Heights ReadHeights(const std::string& file) {
    GDALAllRegister();
    const std::unique_ptr<GDALDataset> dataset(GDALDataset::Open(file.c_str(), GDAL_OF_RASTER));
    if (!dataset) Fail(file + ": cannot be opened");
    GDALRasterBand* band = dataset->GetRasterBand(1);
    Heights heights;
    heights.width = static_cast<std::uint32_t>(band->GetXSize());
    heights.height = static_cast<std::uint32_t>(band->GetYSize());
    heights.noData = band->GetNoDataValue();
    heights.values.resize(std::size_t{heights.width} * heights.height);
    if (band->RasterIO(GF_Read, 0, 0, band->GetXSize(), band->GetYSize(), heights.values.data(),
                       band->GetXSize(), band->GetYSize(), GDT_Float32, 0, 0) != CE_None)
        Fail(file + ": cannot be read");
    return heights;
}

Rgb HeightColour(double height, double lowest, double highest) {
    const double at = height < 0 ? -height / lowest : height / highest;
    const ColourStop* upper = std::find_if(std::begin(kStops) + 1, std::end(kStops) - 1,
                                           [at](const ColourStop& s) { return s.at >= at; });
    const ColourStop& a = upper[-1];
    const ColourStop& b = *upper;
    const double t = std::clamp((at - a.at) / (b.at - a.at), 0.0, 1.0);
    return {Mix(a.colour.red, b.colour.red, t), Mix(a.colour.green, b.colour.green, t),
            Mix(a.colour.blue, b.colour.blue, t)};
}

void WriteShadedPicture(const std::string& file, const Heights& heights) {
    const auto [low, high] = std::minmax_element(heights.values.begin(), heights.values.end());
    const double lowest = std::min(-1.0, static_cast<double>(*low));
    const double highest = std::max(1.0, static_cast<double>(*high));
    const int width = static_cast<int>(heights.width);
    const int height = static_cast<int>(heights.height);
    GDALDriver* memory = GetGDALDriverManager()->GetDriverByName("MEM");
    GDALDriver* png = GetGDALDriverManager()->GetDriverByName("PNG");
    const std::unique_ptr<GDALDataset> picture(
        memory->Create("", width, height, 3, GDT_Byte, nullptr));
    std::vector<unsigned char> row(std::size_t{heights.width} * 3);
    for (std::uint32_t y = 0; y < heights.height; ++y) {
        for (std::uint32_t x = 0; x < heights.width; ++x) {
            const double value =
                static_cast<double>(heights.values[std::size_t{y} * heights.width + x]);
            const Rgb c = HeightColour(value, lowest, highest);
            const double shade = Shade(heights, x, y);
            const auto lit = [shade](unsigned char component) {
                return static_cast<unsigned char>(std::min(255.0, component * shade));
            };
            const std::size_t pixel = std::size_t{x} * 3;
            row[pixel] = lit(c.red);
            row[pixel + 1] = lit(c.green);
            row[pixel + 2] = lit(c.blue);
        }
        if (picture->RasterIO(GF_Write, 0, static_cast<int>(y), width, 1, row.data(), width, 1,
                              GDT_Byte, 3, nullptr, 3, 0, 1) != CE_None)
            Fail(file + ": cannot be drawn");
    }
    CPLSetConfigOption("GDAL_PAM_ENABLED", "NO");
    const std::unique_ptr<GDALDataset> written(
        png->CreateCopy(file.c_str(), picture.get(), 0, nullptr, nullptr, nullptr));
    if (!written) Fail(file + ": cannot be written");
}

BandList::BandList(std::initializer_list<int> bands) {
    SetShape(zelm::ArrayShape(static_cast<std::uint32_t>(bands.size())));
    std::copy(bands.begin(), bands.end(), data);
}

}  // namespace examples
