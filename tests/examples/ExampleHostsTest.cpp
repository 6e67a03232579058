// The example hosts, run as programs on the real grid, and held against GDAL's own tools.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <sstream>

#include "tests/support/ChildProcess.h"
#include "tests/support/ScratchDirectory.h"

namespace {

using testing::HasSubstr;

// What gdalinfo says of a file, without leaving a sidecar beside it.
std::string GdalInfo(const std::string& file, const std::vector<std::string>& options = {}) {
    std::vector<std::string> command = {"gdalinfo"};
    command.insert(command.end(), options.begin(), options.end());
    command.push_back(file);
    const auto result = zmctest::RunChild(command, {"GDAL_PAM_ENABLED=NO"});
    EXPECT_EQ(result.status, 0) << result.err;
    return result.out;
}

// The number behind a label, as text: both tools print three decimals.
std::string NumberAfter(const std::string& text, const std::string& label) {
    const std::size_t at = text.find(label);
    if (at == text.npos) return "no " + label;
    std::istringstream rest(text.substr(at + label.size()));
    std::string number;
    rest >> number;
    return number.substr(0, number.find(','));
}

TEST(MemoryHost, TableAgreesWithGdalinfo) {
    const zmctest::ScratchDirectory scratch;
    const auto host =
        zmctest::RunChild({ZMC_MEMORY_HOST, ZMC_MODULE_PATH, ZMC_GRID, scratch / "geoid.png"});
    ASSERT_EQ(host.status, 0) << host.err;
    const std::string gdal = GdalInfo(ZMC_GRID, {"-stats"});
    EXPECT_THAT(host.out, HasSubstr("size 1440 x 721\ntype Single\nvalid samples 1038240 "));
    EXPECT_THAT(gdal, HasSubstr("Size is 1440, 721"));
    EXPECT_THAT(gdal, HasSubstr("STATISTICS_VALID_PERCENT=100"));
    EXPECT_EQ(NumberAfter(host.out, "minimum "), NumberAfter(gdal, "Minimum="));
    EXPECT_EQ(NumberAfter(host.out, "maximum "), NumberAfter(gdal, "Maximum="));
    EXPECT_EQ(NumberAfter(host.out, "mean "), NumberAfter(gdal, "Mean="));
    EXPECT_THAT(GdalInfo(scratch / "geoid.png"), HasSubstr("Size is 1440, 721"));
}

TEST(MemoryHost, WindowIsTheSameInEveryInterleave) {
    const zmctest::ScratchDirectory scratch;
    const auto host =
        zmctest::RunChild({ZMC_MEMORY_HOST, ZMC_MODULE_PATH, ZMC_GRID, scratch / "geoid.png"});
    ASSERT_EQ(host.status, 0) << host.err;
    const std::string label = ": checksum of a window in the bands (2, 0): ";
    const std::string sum = NumberAfter(host.out, "BIP" + label);
    EXPECT_NE(sum, "0.000");
    EXPECT_EQ(NumberAfter(host.out, "BIL" + label), sum);
    EXPECT_EQ(NumberAfter(host.out, "BSQ" + label), sum);
    EXPECT_THAT(host.out, HasSubstr("(2048 fewer while a tile was masked out)"));
}

TEST(PyramidHost, LevelsAndArchiveComeBack) {
    const zmctest::ScratchDirectory scratch;
    const auto host = zmctest::RunChild(
        {ZMC_PYRAMID_HOST, ZMC_MODULE_PATH, ZMC_GRID, scratch / "geoid.pyr", scratch / "geoid"});
    ASSERT_EQ(host.status, 0) << host.err;
    EXPECT_THAT(host.out, HasSubstr(" 1440 x  721     18 "));
    EXPECT_THAT(host.out, HasSubstr("  720 x  360      6 "));
    EXPECT_THAT(host.out, HasSubstr("  360 x  180      2 "));
    const std::string gdal = GdalInfo(ZMC_GRID, {"-stats"});
    EXPECT_EQ(NumberAfter(host.out, "minimum "), NumberAfter(gdal, "Minimum="));
    EXPECT_EQ(NumberAfter(host.out, "mean "), NumberAfter(gdal, "Mean="));
    EXPECT_EQ(NumberAfter(host.out, "standard deviation "), NumberAfter(gdal, "StdDev="));
    EXPECT_THAT(host.out, HasSubstr("a histogram of 64 bins, a palette of 64 colours"));
    EXPECT_THAT(GdalInfo(scratch / "geoid-level2.png"), HasSubstr("Size is 360, 180"));
}

TEST(ExampleHosts, FailWithOneLine) {
    const auto host =
        zmctest::RunChild({ZMC_MEMORY_HOST, "/no/module.so", ZMC_GRID, "/no/picture"});
    EXPECT_EQ(host.status, 1);
    EXPECT_THAT(host.err, HasSubstr("/no/module.so"));
    EXPECT_EQ(std::count(host.err.begin(), host.err.end(), '\n'), 1);
}

}  // namespace
