#include <gtest/gtest.h>

#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

struct GoldenCase {
    std::uint32_t type;
    std::uint32_t ordering;
};

// For each element type and ordering: files of sizes around the edges of tiles, all levels,
// written by one side and read by the other.
class GoldenFileTest : public PyramidFileTest, public testing::WithParamInterface<GoldenCase> {
protected:
    static std::vector<PyramidDescription> Descriptions() {
        std::vector<PyramidDescription> all;
        const auto add = [&](std::uint32_t samples, std::uint32_t lines, std::uint32_t bands,
                             std::uint32_t levelMin, std::uint32_t levelMax) {
            PyramidDescription d;
            d.samples = samples;
            d.lines = lines;
            d.bands = bands;
            d.levelMin = levelMin;
            d.levelMax = levelMax;
            d.type = GetParam().type;
            d.ordering = GetParam().ordering;
            all.push_back(d);
        };
        for (const std::uint32_t samples : {1u, 255u, 256u, 257u})
            for (const std::uint32_t lines : {1u, 255u, 256u, 257u})
                add(samples, lines, 1 + (samples + lines) % 3, 0, 2);
        add(1000, 777, 1, 0, 3);
        add(1001, 513, 2, 0, 8);
        add(1001, 513, 1, 2, 4);
        return all;
    }
};

TEST_P(GoldenFileTest, TheModuleReadsTheModelsFiles) {
    for (const PyramidDescription& d : Descriptions()) {
        PyramidModel model(d);
        model.StoreAllImages();
        model.Save(path);
        const auto dataset = Open();
        ASSERT_TRUE(dataset);
        EXPECT_TRUE(dataset->HasPyramid);
        EXPECT_EQ(dataset->TileDataEnd, model.tileDataEnd);
        for (std::uint32_t level = d.levelMin; level <= d.levelMax; ++level) {
            ASSERT_EQ(ReadRect(*dataset, 0, 0, model.Width(level), model.Height(level),
                               BandList(AllBands(d.bands)), static_cast<int>(level)),
                      model.Image(level))
                << d.samples << " x " << d.lines << " level " << level;
        }
    }
}

TEST_P(GoldenFileTest, TheModelReadsTheModulesFiles) {
    for (const PyramidDescription& d : Descriptions()) {
        const PyramidModel expected(d);
        const auto dataset = Create(d);
        for (std::uint32_t level = d.levelMin; level <= d.levelMax; ++level)
            FillLevel(*dataset, level, expected.Image(level));
        EXPECT_TRUE(dataset->RefreshPyramidState());
        EXPECT_TRUE(dataset->HasPyramid);
        const PyramidModel model(path);
        EXPECT_EQ(model.file.size(), dataset->TileDataEnd);
        for (std::uint32_t level = d.levelMin; level <= d.levelMax; ++level) {
            ASSERT_EQ(model.LoadImage(level), expected.Image(level))
                << d.samples << " x " << d.lines << " level " << level;
        }
    }
}

std::vector<GoldenCase> GoldenCases() {
    std::vector<GoldenCase> cases;
    for (const ModelType& type : ModelTypes())
        for (std::uint32_t ordering = 0; ordering < 3; ++ordering)
            cases.push_back({type.code, ordering});
    return cases;
}

std::string CaseName(const testing::TestParamInfo<GoldenCase>& info) {
    const char* const orders[] = {"Scanline", "Blocked", "Morton"};
    return std::string(FindModelType(info.param.type).word) + orders[info.param.ordering];
}

INSTANTIATE_TEST_SUITE_P(TypesAndOrderings, GoldenFileTest, testing::ValuesIn(GoldenCases()),
                         CaseName);

}  // namespace
}  // namespace zmctest
