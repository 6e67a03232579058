// The example host's figures for the geoid grid, beside those of gdaltransform.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sstream>

#include "tests/support/ChildProcess.h"

namespace {

constexpr char kGrid[] = "/usr/share/proj/egm96_15.gtx";

// The words that are numbers.
std::vector<double> Numbers(const std::string& text) {
    std::vector<double> numbers;
    std::istringstream words(text);
    for (std::string word; words >> word;) {
        char* end = nullptr;
        const double number = std::strtod(word.c_str(), &end);
        if (*end == '\0') numbers.push_back(number);
    }
    return numbers;
}

TEST(CoordSysExample, PrintsTheRastersSystemAndItsCornersAsGdalHasThem) {
    const auto example = zmctest::RunChild({ZMC_EXAMPLE, ZMC_ENGINE_DIRECTORY, kGrid, "EPSG:8857"});
    ASSERT_EQ(example.status, 0) << example.err;
    EXPECT_THAT(example.out, testing::HasSubstr("name   WGS 84\n"));
    EXPECT_THAT(example.out, testing::HasSubstr("unit   degree, 1 degrees, code 9122\n"));
    const std::size_t corners = example.out.find("Corners in EPSG:8857\n");
    ASSERT_NE(corners, example.out.npos);
    const auto actual = Numbers(example.out.substr(corners + 21));
    const auto expected =
        Numbers(zmctest::RunChild(
                    {"gdaltransform", "-s_srs", "EPSG:4326", "-t_srs", "EPSG:8857", "-output_xy"},
                    {}, "-180 90\n179.75 90\n179.75 -90\n-180 -90\n")
                    .out);
    ASSERT_EQ(actual.size(), 16u) << example.out;
    ASSERT_EQ(expected.size(), 8u);
    for (std::size_t corner = 0; corner < 4; ++corner) {
        EXPECT_NEAR(actual[4 * corner + 2], expected[2 * corner], 1e-3);
        EXPECT_NEAR(actual[4 * corner + 3], expected[2 * corner + 1], 1e-3);
    }
}

TEST(CoordSysExample, SaysWhatItCannotDo) {
    EXPECT_NE(zmctest::RunChild({ZMC_EXAMPLE, "/nowhere", kGrid}).status, 0);
    EXPECT_NE(zmctest::RunChild({ZMC_EXAMPLE, ZMC_ENGINE_DIRECTORY, "/nowhere.tif"}).status, 0);
    EXPECT_NE(zmctest::RunChild({ZMC_EXAMPLE, ZMC_ENGINE_DIRECTORY, kGrid, "nonsense"}).status, 0);
}

}  // namespace
