#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <sstream>
#include <thread>
#include <vector>

#include "coordsys/BindCoordSys.h"
#include "coordsys/CoordSysFactory.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/ScratchDirectory.h"
#include "zmcg/zmcg.h"
#include "zmcpe/CoordSysImpl.h"

namespace zelm {
namespace {

using testing::HasSubstr;
using testing::StartsWith;

std::string Text(void (CoordSysImpl::*get)(String&) const, const CoordSys& system) {
    String text;
    (system.impl->*get)(text);
    return text.wide ? text.GetUtf8() : "(null)";
}

std::string Narrow(const String& text) { return text.wide ? text.GetUtf8() : "(null)"; }

class Engine : public testing::Test {
protected:
    static void SetUpTestSuite() {
        Environment().GetSetting(EnvironmentKeys::kBinDirectory) = ZMC_ENGINE_DIRECTORY;
        ASSERT_NE(CoordSysFactory::GetInstance(), nullptr);
        ASSERT_NE(fp_Esri_Pe_Initialize, nullptr) << "the engine is loaded before any test";
    }
};

TEST_F(Engine, TakesEveryFormOfDefinition) {
    const std::string json =
        zmctest::RunChild({"projinfo", "-q", "-o", "PROJJSON", "EPSG:32633"}).out;
    const std::string wkt1 =
        zmctest::RunChild({"projinfo", "-q", "-o", "WKT1_GDAL", "EPSG:32633"}).out;
    const std::string wkt2 =
        zmctest::RunChild({"projinfo", "-q", "-o", "WKT2:2019", "EPSG:32633"}).out;
    ASSERT_THAT(json, StartsWith("{"));
    ASSERT_THAT(wkt1, StartsWith("PROJCS["));
    ASSERT_THAT(wkt2, StartsWith("PROJCRS["));
    for (const std::string& definition : {std::string("EPSG:32633"), json, wkt1, wkt2}) {
        const auto system = BindCoordSys(definition.c_str());
        ASSERT_NE(system, nullptr) << definition;
        EXPECT_EQ(Text(&CoordSysImpl::GetName, *system), "WGS 84 / UTM zone 33N");
        EXPECT_EQ(system->impl->GetKind(), CoordSysImpl::Kind::Projected);
    }
}

TEST_F(Engine, TakesProjStrings) {
    for (const char* definition :
         {"+proj=utm +zone=33 +datum=WGS84", "+proj=utm +zone=33 +datum=WGS84 +type=crs",
          "proj=utm zone=33 datum=WGS84"}) {
        const auto system = BindCoordSys(definition);
        ASSERT_NE(system, nullptr) << definition;
        EXPECT_EQ(system->impl->GetKind(), CoordSysImpl::Kind::Projected) << definition;
    }
}

TEST_F(Engine, RefusesWhatIsNoCoordinateSystem) {
    for (const char* definition :
         {"", "nonsense of no kind", "EPSG:999999", "EPSG:", "+proj=nosuch", "PROJCS[\"broken\"",
          "{\"type\": \"ProjectedCRS\"}", "+proj=pipeline +step +proj=axisswap +order=2,1",
          "urn:ogc:def:ellipsoid:EPSG::7030"})
        EXPECT_EQ(BindCoordSys(definition), nullptr) << definition;
    EXPECT_EQ(BindCoordSys(String()), nullptr);
    for (const int code : {0, -1, 1, 999999, 2147483647, -2147483647 - 1})
        EXPECT_EQ(BindCoordSys(code), nullptr) << code;
}

struct Description {
    const char* definition;
    CoordSysImpl::Kind kind;
    const char* datum;
    const char* unit;
    double factor;
    unsigned unitKind;
    int unitCode;
};

using Kind = CoordSysImpl::Kind;

const Description kDescriptions[] = {
    {"EPSG:4326", Kind::Geographic, "World Geodetic System 1984", "degree", 1, 1, 9122},
    {"EPSG:4979", Kind::Geographic, "World Geodetic System 1984", "degree", 1, 1, 9122},
    {"EPSG:32633", Kind::Projected, "World Geodetic System 1984", "metre", 1, 0, 9001},
    {"EPSG:2263", Kind::Projected, "North American Datum 1983", "US survey foot",
     0.3048006096012192, 0, 9003},
    {"EPSG:2222", Kind::Projected, "North American Datum 1983", "foot", 0.3048, 0, 9002},
    {"EPSG:7405", Kind::Projected, "Ordnance Survey of Great Britain 1936", "metre", 1, 0, 9001},
    {"EPSG:4978", Kind::Other, "World Geodetic System 1984", "metre", 1, 0, 9001},
    {"EPSG:5773", Kind::Other, "EGM96 geoid", "metre", 1, 0, 9001},
    {"EPSG:4807", Kind::Geographic, "Nouvelle Triangulation Francaise (Paris)", "grad", 0.9, 1,
     9105},
    {"+proj=utm +zone=33 +ellps=bessel +towgs84=1,2,3 +units=km", Kind::Projected,
     "Unknown based on Bessel 1841 ellipsoid using towgs84=1,2,3", "kilometre", 1000, 0, 9036},
    {"LOCAL_CS[\"bench\",UNIT[\"cubit\",0.4572]]", Kind::Other, "D_Unknown", "cubit", 0.4572, 0, 0},
};

TEST_F(Engine, InfoIsWhatTheEngineSays) {
    for (const Description& expected : kDescriptions) {
        const auto system = BindCoordSys(expected.definition);
        ASSERT_NE(system, nullptr) << expected.definition;
        EXPECT_EQ(system->impl->GetKind(), expected.kind) << expected.definition;
        EXPECT_EQ(Narrow(system->info.datumName), expected.datum) << expected.definition;
        EXPECT_EQ(Narrow(system->info.unitName), expected.unit) << expected.definition;
        EXPECT_NEAR(system->info.unitFactor, expected.factor, 1e-12) << expected.definition;
        EXPECT_EQ(system->info.unitKind, expected.unitKind) << expected.definition;
        EXPECT_EQ(system->info.unitCode, expected.unitCode) << expected.definition;
    }
}

std::string InUnit(const std::string& unit) {
    return "PROJCS[\"x\",GEOGCS[\"x\",DATUM[\"x\",SPHEROID[\"x\",6378137,298]],"
           "PRIMEM[\"Greenwich\",0],UNIT[\"degree\",0.0174532925199433]],"
           "PROJECTION[\"Transverse_Mercator\"]," +
           unit + "]";
}

// Names and factors near those of the table of units do not draw its rows in.
TEST_F(Engine, UnitsWithoutCodeStayAsTheyAre) {
    const auto foot = BindCoordSys(InUnit("UNIT[\"Foot_US\",0.3048006]").c_str());
    ASSERT_NE(foot, nullptr);
    EXPECT_EQ(Narrow(foot->info.unitName), "Foot_US");
    EXPECT_EQ(foot->info.unitFactor, 0.3048006);
    EXPECT_EQ(foot->info.unitCode, 0);
    const auto odd = BindCoordSys(InUnit("UNIT[\"furlongish\",1852]").c_str());
    ASSERT_NE(odd, nullptr);
    EXPECT_EQ(Narrow(odd->info.unitName), "furlongish");
    EXPECT_EQ(odd->info.unitFactor, 1852);
    EXPECT_EQ(odd->info.unitCode, 0);
}

// The table of units has ten times as much for a second of arc.
TEST_F(Engine, SecondsOfArcHaveTheFactorOfTheEngine) {
    const auto seconds = BindCoordSys(
        "GEOGCS[\"x\",DATUM[\"x\",SPHEROID[\"x\",6378137,298]],PRIMEM[\"Greenwich\",0],"
        "UNIT[\"arc-second\",4.84813681109536E-06,AUTHORITY[\"EPSG\",\"9104\"]]]");
    ASSERT_NE(seconds, nullptr);
    EXPECT_EQ(Narrow(seconds->info.unitName), "arc-second");
    EXPECT_NEAR(seconds->info.unitFactor, 1 / 3600.0, 1e-12);
    EXPECT_EQ(seconds->info.unitKind, 1u);
    EXPECT_EQ(seconds->info.unitCode, 9104);
    EXPECT_EQ(seconds->info.unitFactor, seconds->impl->GetUnitFactor());
}

TEST_F(Engine, Wkt2IsOneLineAndReadsBack) {
    const auto system = BindCoordSys(27700);
    ASSERT_NE(system, nullptr);
    const std::string wkt = Text(&CoordSysImpl::GetWkt2, *system);
    EXPECT_THAT(wkt, StartsWith("PROJCRS[\"OSGB36 / British National Grid\""));
    EXPECT_EQ(wkt.find('\n'), wkt.npos);
    const auto again = BindCoordSys(wkt.c_str());
    ASSERT_NE(again, nullptr);
    EXPECT_EQ(Text(&CoordSysImpl::GetWkt2, *again), wkt);
}

TEST_F(Engine, ReferencesAreCounted) {
    CoordSysImpl* const impl = fp_Esri_Pe_CreateFromCode(4326);
    ASSERT_NE(impl, nullptr);
    EXPECT_EQ(impl->AddReference(), 2);
    EXPECT_EQ(impl->AddReference(), 3);
    EXPECT_EQ(fp_Esri_Pe_Release(impl), 0);
    EXPECT_EQ(impl->ReleaseReference(), 2);
    EXPECT_EQ(impl->ReleaseReference(), 1);
    EXPECT_EQ(fp_Esri_Pe_Release(impl), 0);
    EXPECT_EQ(impl->ReleaseReference(), 0);
    EXPECT_EQ(fp_Esri_Pe_Release(impl), 1);
    EXPECT_EQ(fp_Esri_Pe_Release(nullptr), 0);
}

TEST_F(Engine, ChainReleasesObjectsOfOneAndThreeReferences) {
    for (const int references : {1, 3}) {
        std::vector<std::unique_ptr<CoordSys>> handles;
        handles.push_back(BindCoordSys(32633));
        ASSERT_NE(handles[0], nullptr);
        for (int i = 1; i < references; ++i) {
            handles[0]->impl->AddReference();
            handles.push_back(std::make_unique<CoordSys>());
            handles.back()->impl = handles[0]->impl;
        }
        CoordSysImpl* const impl = handles[0]->impl;
        while (handles.size() > 1) {
            handles.pop_back();
            EXPECT_EQ(impl->GetKind(), Kind::Projected);  // alive as long as one handle is
        }
    }
}

TEST_F(Engine, FailedPointsAreInfiniteAndNotCounted) {
    const auto geographic = BindCoordSys(4326);
    const auto projected = BindCoordSys("+proj=gnom +lat_0=90 +lon_0=0 +datum=WGS84");
    ASSERT_NE(projected, nullptr);
    double x[] = {0, 0, NAN, 10};
    double y[] = {80, -80, 80, INFINITY};
    EXPECT_EQ(geographic->impl->Transform(*projected->impl, 4, x, y, nullptr), 1u);
    EXPECT_TRUE(std::isfinite(x[0]) && std::isfinite(y[0]));
    for (int i = 1; i < 4; ++i) {
        EXPECT_EQ(x[i], INFINITY);
        EXPECT_EQ(y[i], INFINITY);
    }
    EXPECT_EQ(geographic->impl->Transform(*projected->impl, 0, nullptr, nullptr, nullptr), 0u);
}

TEST_F(Engine, HeightsGoThrough) {
    const auto geographic = BindCoordSys(4979);
    const auto geocentric = BindCoordSys(4978);
    double x = 0;
    double y = 0;
    double z = 100;
    EXPECT_EQ(geographic->impl->Transform(*geocentric->impl, 1, &x, &y, &z), 1u);
    EXPECT_NEAR(x, 6378237, 1e-6);
    EXPECT_NEAR(y, 0, 1e-6);
    EXPECT_NEAR(z, 0, 1e-6);
}

TEST_F(Engine, AnotherTargetAtTheSameAddressIsAnotherTarget) {
    const auto geographic = BindCoordSys(4326);
    for (const int zone : {32, 33, 34, 35}) {
        const auto utm = BindCoordSys(32600 + zone);
        double x = 6 * zone - 183;
        double y = 50;
        EXPECT_EQ(geographic->impl->Transform(*utm->impl, 1, &x, &y, nullptr), 1u);
        EXPECT_NEAR(x, 500000, 1e-6) << zone;
    }
}

TEST_F(Engine, ThreadsShareObjects) {
    const auto geographic = BindCoordSys(4326);
    const auto mercator = BindCoordSys(3857);
    ASSERT_NE(mercator, nullptr);
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&] {
            for (int i = 0; i < 20; ++i) {
                double x[] = {90};
                double y[] = {0};
                EXPECT_EQ(geographic->impl->Transform(*mercator->impl, 1, x, y, nullptr), 1u);
                EXPECT_NEAR(x[0], 10018754.171394622, 1e-6);
                const auto own = BindCoordSys(32601 + i);
                EXPECT_NE(own, nullptr);
                String name;
                mercator->impl->GetName(name);
                EXPECT_TRUE(name == "WGS 84 / Pseudo-Mercator");
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
}

TEST_F(Engine, DirectoriesOfTheHostStandBeforeThoseOfProj) {
    const zmctest::ScratchDirectory empty;
    String pe(empty.String().c_str());
    String gdal("Not Set");
    EXPECT_EQ(fp_Esri_Pe_Initialize(pe, gdal), 1);
    EXPECT_NE(BindCoordSys(4326), nullptr);
    String none;
    EXPECT_EQ(fp_Esri_Pe_Initialize(none, none), 1);
    EXPECT_NE(BindCoordSys(3857), nullptr);
}

// Each is the first of its name that PROJ finds, and nothing that it can work with.
TEST_F(Engine, UnusableDatabaseIsRefusedInSilenceAndForgottenAtTheNextCall) {
    const zmctest::ScratchDirectory scratch;
    for (const char* kind : {"garbage", "empty", "folder"}) {
        const std::filesystem::path directory = scratch / kind;
        std::filesystem::create_directories(directory);
        if (kind == std::string("folder"))
            std::filesystem::create_directory(directory / "proj.db");
        else
            zmctest::WriteText(directory / "proj.db",
                               kind == std::string("empty") ? "" : std::string(5000, 'x'));
        String pe(directory.c_str());
        String none("Not Set");
        testing::internal::CaptureStderr();
        EXPECT_EQ(fp_Esri_Pe_Initialize(pe, none), 0) << kind;
        EXPECT_EQ(BindCoordSys(4326), nullptr) << kind;
        EXPECT_EQ(BindCoordSys("EPSG:3857"), nullptr) << kind;
        EXPECT_EQ(testing::internal::GetCapturedStderr(), "") << kind;
        EXPECT_EQ(fp_Esri_Pe_Initialize(none, none), 1) << kind;
        EXPECT_NE(BindCoordSys(4326), nullptr) << kind;
    }
}

TEST(EngineLibrary, ExportsFourNamesAndNothingElse) {
    const auto names = zmctest::RunChild(
        {"nm", "-D", "--defined-only", "-f", "posix", ZMC_ENGINE_DIRECTORY "/libzmcpe.so"});
    ASSERT_EQ(names.status, 0) << names.err;
    std::vector<std::string> found;
    std::istringstream lines(names.out);
    for (std::string line; std::getline(lines, line);)
        found.push_back(line.substr(0, line.find(' ')));
    EXPECT_THAT(found,
                testing::UnorderedElementsAre("Esri_Pe_Initialize", "Esri_Pe_CreateFromString",
                                              "Esri_Pe_CreateFromCode", "Esri_Pe_Release"));
}

TEST(EngineLibrary, HandleMayOutliveTheDestructorsOfTheEngine) {
    const auto result = zmctest::RunChild({ZMC_LATE_HANDLE_PROBE, ZMC_ENGINE_DIRECTORY});
    EXPECT_EQ(result.status, 0) << result.err;
    EXPECT_EQ(result.out, "bound\n");
}

}  // namespace
}  // namespace zelm
