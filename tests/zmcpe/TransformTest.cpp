// The engine's figures beside those of the command-line tools of PROJ and GDAL.
#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <sstream>

#include "coordsys/BindCoordSys.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "tests/support/ChildProcess.h"
#include "zmcpe/CoordSysImpl.h"

namespace zelm {
namespace {

struct Case {
    int code;
    double longitude;
    double latitude;
    bool northingFirst;  // the order of its axes by its authority, which cs2cs keeps
    double tolerance;    // 1 mm, or 1e-9 degrees
    double printed = 1;  // what cs2cs makes of one unit: it takes and prints all angles in degrees
};

constexpr double kMillimetre = 1e-3;
constexpr double kNanodegree = 1e-9;

const Case kCases[] = {
    {32633, 15.25, 52.5, false, kMillimetre},          // transverse Mercator
    {27700, -1.5, 52.5, false, kMillimetre},           // with a change of datum
    {3857, 103.8, 1.3, false, kMillimetre},            // spherical Mercator
    {2263, -74.0, 40.7, false, kMillimetre / 0.3048},  // conic, in US survey feet
    {3035, 10.5, 48.25, true, kMillimetre},            // azimuthal, northing first
    {3031, 45.0, -75.5, false, kMillimetre},           // polar stereographic
    {2193, 174.5, -41.25, true, kMillimetre},          // southern hemisphere, northing first
    {5070, -96.5, 37.75, false, kMillimetre},          // equal-area conic
    {28992, 5.4, 52.15, false, kMillimetre},           // oblique stereographic
    {2056, 7.45, 46.95, false, kMillimetre},           // oblique Mercator
    {4269, -100.25, 40.5, true, kNanodegree},          // geographic, another datum
    {4807, 2.35, 48.85, true, kNanodegree, 0.9},       // geographic, in grads from Paris
};

using Point = std::array<double, 2>;

std::string Format(double first, double second) {
    char line[128];
    std::snprintf(line, sizeof line, "%.15g %.15g\n", first, second);
    return line;
}

Point Parse(const std::string& text) {
    Point point{};
    std::istringstream(text) >> point[0] >> point[1];
    return point;
}

Point Scaled(const Point& point, double factor) { return {point[0] * factor, point[1] * factor}; }

Point Swapped(const Point& point) { return {point[1], point[0]}; }

Point ByGdal(const std::string& from, const std::string& to, const Point& point) {
    const auto result =
        zmctest::RunChild({"gdaltransform", "-s_srs", from, "-t_srs", to, "-output_xy"}, {},
                          Format(point[0], point[1]));
    EXPECT_EQ(result.status, 0) << result.err;
    return Parse(result.out);
}

// In and out in the order of the authority.
Point ByProj(const std::string& from, const std::string& to, const Point& point) {
    const auto result =
        zmctest::RunChild({"cs2cs", "-f", "%.13f", from, to}, {}, Format(point[0], point[1]));
    EXPECT_EQ(result.status, 0) << result.err;
    return Parse(result.out);
}

class Transform : public testing::Test {
protected:
    static void SetUpTestSuite() {
        Environment().GetSetting(EnvironmentKeys::kBinDirectory) = ZMC_ENGINE_DIRECTORY;
    }
    static Point ByEngine(const CoordSys& from, const CoordSys& to, Point point) {
        EXPECT_EQ(from.impl->Transform(*to.impl, 1, &point[0], &point[1], nullptr), 1u);
        return point;
    }
    static void ExpectNear(const Point& actual, const Point& expected, double tolerance) {
        EXPECT_NEAR(actual[0], expected[0], tolerance);
        EXPECT_NEAR(actual[1], expected[1], tolerance);
    }
};

class TransformCase : public Transform, public testing::WithParamInterface<Case> {};

TEST_P(TransformCase, AgreesWithTheTools) {
    const Case& sample = GetParam();
    const auto geographic = BindCoordSys(4326);
    const auto system = BindCoordSys(sample.code);
    ASSERT_NE(geographic, nullptr);
    ASSERT_NE(system, nullptr);
    const std::string name = "EPSG:" + std::to_string(sample.code);
    const Point place = {sample.longitude, sample.latitude};

    const Point there = ByEngine(*geographic, *system, place);
    ExpectNear(there, ByGdal("EPSG:4326", name, place), sample.tolerance);
    const Point official = Scaled(ByProj("EPSG:4326", name, Swapped(place)), 1 / sample.printed);
    ExpectNear(there, sample.northingFirst ? Swapped(official) : official, sample.tolerance);

    const Point back = ByEngine(*system, *geographic, there);
    ExpectNear(back, ByGdal(name, "EPSG:4326", there), kNanodegree);
    const Point officialThere =
        Scaled(sample.northingFirst ? Swapped(there) : there, sample.printed);
    ExpectNear(back, Swapped(ByProj(name, "EPSG:4326", officialThere)), kNanodegree);
}

INSTANTIATE_TEST_SUITE_P(Codes, TransformCase, testing::ValuesIn(kCases), [](const auto& sample) {
    return "Epsg" + std::to_string(sample.param.code);
});

struct KeptAxes {
    int code;
    Point place;  // longitude and latitude
    Point axes;   // what its own axes say there, in their own order and directions
};

// Systems whose axes do not point north and east keep them, whichever comes first: westing and
// southing in the Cape, southing and westing in Bohemia.
TEST_F(Transform, AxesThatPointElsewhereStayAsTheyAre) {
    const auto geographic = BindCoordSys(4326);
    ASSERT_NE(geographic, nullptr);
    for (const KeptAxes& sample : {KeptAxes{2053, {28.5, -26}, {50059.251, 2876930.325}},
                                   KeptAxes{2065, {15, 50}, {1058147.274, 703011.882}}}) {
        const auto system = BindCoordSys(sample.code);
        ASSERT_NE(system, nullptr);
        const std::string name = "EPSG:" + std::to_string(sample.code);
        const Point there = ByEngine(*geographic, *system, sample.place);
        ExpectNear(there, sample.axes, kMillimetre);
        ExpectNear(there, ByProj("EPSG:4326", name, Swapped(sample.place)), kMillimetre);
        ExpectNear(there, ByGdal("EPSG:4326", name, sample.place), kMillimetre);
        ExpectNear(ByEngine(*system, *geographic, there), ByGdal(name, "EPSG:4326", there),
                   kNanodegree);
    }
}

// Both axes point away from the pole; their names tell easting from northing.
TEST_F(Transform, EastingIsFirstAtThePolesToo) {
    const auto geographic = BindCoordSys(4326);
    const auto northingFirst = BindCoordSys(32661);
    const auto eastingFirst = BindCoordSys(5041);
    ASSERT_NE(northingFirst, nullptr);
    ASSERT_NE(eastingFirst, nullptr);
    const Point place = {30, 85};
    const Point there = ByEngine(*geographic, *northingFirst, place);
    ExpectNear(there, {2277728.696, 1518959.788}, kMillimetre);
    ExpectNear(there, ByEngine(*geographic, *eastingFirst, place), kMillimetre);
    ExpectNear(there, Swapped(ByProj("EPSG:4326", "EPSG:32661", Swapped(place))), kMillimetre);
}

}  // namespace
}  // namespace zelm
