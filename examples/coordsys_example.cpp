// A host that asks the projection engine about a raster: its coordinate system, and where the
// centres of its corner pixels lie in another one. (The pixels' own corners may lie beyond a pole.)
//
// Usage: coordsys_example ENGINE-DIRECTORY RASTER [TARGET]
// TARGET is any definition of a coordinate system; EPSG:8857, the equal-area Equal Earth, by
// default.
#include <gdal_priv.h>

#include <array>
#include <cstdio>

#include "coordsys/BindCoordSys.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "examples/Examples.h"
#include "zmcpe/CoordSysImpl.h"

using examples::Fail;
using namespace zelm;

namespace {

// The centres of the corner pixels, from the upper left clockwise.
struct Corners {
    std::array<double, 4> x;
    std::array<double, 4> y;
};

struct Place {
    std::string definition;  // WKT of the coordinate system
    Corners corners;
};

Place ReadPlace(const char* file) {
    GDALAllRegister();
    const std::unique_ptr<GDALDataset> raster(GDALDataset::Open(file));
    std::array<double, 6> map{};
    if (!raster || raster->GetGeoTransform(map.data()) != CE_None) Fail("no raster with a place");
    Place place{raster->GetProjectionRef(), {}};
    const double width = raster->GetRasterXSize();
    const double height = raster->GetRasterYSize();
    const std::array<std::array<double, 2>, 4> pixels = {
        {{0.5, 0.5}, {width - 0.5, 0.5}, {width - 0.5, height - 0.5}, {0.5, height - 0.5}}};
    for (std::size_t i = 0; i < pixels.size(); ++i) {
        const auto [column, line] = pixels[i];
        place.corners.x[i] = map[0] + column * map[1] + line * map[2];
        place.corners.y[i] = map[3] + column * map[4] + line * map[5];
    }
    return place;
}

std::unique_ptr<CoordSys> Bind(const char* definition) {
    auto system = BindCoordSys(definition);
    if (!system) Fail(std::string("the engine takes no coordinate system from ") + definition);
    return system;
}

const char* KindWord(CoordSysImpl::Kind kind) {
    if (kind == CoordSysImpl::Kind::Geographic) return "geographic";
    return kind == CoordSysImpl::Kind::Projected ? "projected" : "other";
}

void Print(const CoordSys& system) {
    String name;
    String wkt;
    system.impl->GetName(name);
    system.impl->GetWkt2(wkt);
    std::printf("name   %s\n", name.wide ? name.GetUtf8() : "");
    std::printf("kind   %s\n", KindWord(system.impl->GetKind()));
    std::printf("datum  %s\n", system.info.datumName.GetUtf8());
    std::printf("unit   %s, %.15g %s, code %d\n", system.info.unitName.GetUtf8(),
                system.info.unitFactor, system.info.unitKind == 1 ? "degrees" : "metres",
                system.info.unitCode);
    std::printf("WKT 2  %s\n", wkt.wide ? wkt.GetUtf8() : "");
}

void PrintCorners(const Corners& from, const CoordSys& source, const CoordSys& target) {
    Corners to = from;
    source.impl->Transform(*target.impl, to.x.size(), to.x.data(), to.y.data(), nullptr);
    for (std::size_t i = 0; i < to.x.size(); ++i)
        std::printf("%15.9f %15.9f  ->  %18.4f %18.4f\n", from.x[i], from.y[i], to.x[i], to.y[i]);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 3) Fail("usage: coordsys_example ENGINE-DIRECTORY RASTER [TARGET]");
    Environment().GetSetting(EnvironmentKeys::kBinDirectory) = argv[1];
    const Place place = ReadPlace(argv[2]);
    const auto source = Bind(place.definition.c_str());
    const auto target = Bind(argc > 3 ? argv[3] : "EPSG:8857");
    Print(*source);
    std::printf("\nCorners in %s\n", argc > 3 ? argv[3] : "EPSG:8857");
    PrintCorners(place.corners, *source, *target);
    return 0;
}
