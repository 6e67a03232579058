// Builds in parts, held byte for byte against builds in one go.
#include "host/build/PartBuild.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <limits>
#include <numeric>
#include <optional>
#include <random>

#include "host/base/PackedNumbers.h"
#include "host/build/BuildPlan.h"
#include "host/build/PartFolder.h"
#include "tests/host/Palettes.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/FailureOf.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::CampaignLength;
using zmctest::FailureOf;
using zmctest::MemorySource;
using zmctest::ScratchDirectory;
using zmctest::TestModule;

// Of what has many variants a run takes every n-th, from one day to the next another one first; the
// full form of the tests takes all.
bool IsDrawn(std::size_t variant, std::size_t n) {
    const char* const fixed = std::getenv("ZMC_CAMPAIGN_PHASE");
    const std::uint64_t phase =
        fixed ? std::strtoull(fixed, nullptr, 10)
              : static_cast<std::uint64_t>(std::time(nullptr)) / (24 * 60 * 60);
    return (variant + phase) % CampaignLength(n, std::size_t{1}) == 0;
}

struct Way {
    std::uint32_t partWidth = 512;
    std::uint32_t partHeight = 512;
    bool countInParts = false;
    std::uint32_t workers = 3;
    std::optional<PartGrid> grid = std::nullopt;  // in place of a planned one
};

class PartBuilds : public testing::Test {
protected:
    // Parts in any order, each by one of several workers, some of them twice.
    template <class T>
    void ExpectThatOfBuild(MemorySource<T>& source, BuildOptions options, const Way& way) {
        options.overwrite = true;
        options.threads = 2;
        const std::string target = folder / "parts.zmc";
        const BuildReport built = builder.Build(source, folder / "built.zmc", options);
        options.threads = 1;
        BuildFile file(target, true);
        builder.LayOut(source, file, target, options);
        PartBuild last(TestModule(), source, target, options, file.Path());
        const PartGrid grid = way.grid.value_or(last.Plan(way.partWidth, way.partHeight));
        last.SetGrid(grid);
        const std::vector<PartResult> results = MakeAll(source, file.Path(), options, grid, way);
        for (std::uint64_t part = 0; part < grid.Count(); ++part)
            ASSERT_TRUE(last.Take(part, results[part])) << part;
        if (way.countInParts) CountAll(last, source, file.Path(), options, grid, results);
        const BuildReport report = last.Finish(file);
        EXPECT_EQ(report.fileSize, built.fileSize);
        EXPECT_EQ(report.maxLevel, built.maxLevel);
        file.Commit();
        EXPECT_EQ(zmctest::ReadText(target), zmctest::ReadText(folder / "built.zmc"))
            << zelm::ElementTraits<T>::word << " " << ResamplingName(report.resampling) << ", "
            << grid.Count() << " parts of level " << grid.level;
        parts += grid.Count();
    }

    template <class T>
    std::vector<PartResult> MakeAll(MemorySource<T>& source, const std::string& path,
                                    BuildOptions options, const PartGrid& grid, const Way& way) {
        std::vector<std::uint64_t> order(static_cast<std::size_t>(grid.Count()));
        std::iota(order.begin(), order.end(), 0);
        for (std::size_t i = 0; i < 2; ++i) order.push_back(order[i % grid.Count()]);
        std::shuffle(order.begin(), order.end(), random);
        std::vector<PartResult> results(static_cast<std::size_t>(grid.Count()));
        for (std::uint32_t worker = 0; worker < way.workers; ++worker) {
            options.threads = worker + 1;
            PartBuild build(TestModule(), source, "worker", options, path);
            build.SetGrid(grid);
            for (std::size_t i = worker; i < order.size(); i += way.workers) {
                const PartResult made = build.Make(order[i]);
                PartResult& known = results[order[i]];
                EXPECT_TRUE(known.sums.empty() || known == made);
                known = made;
            }
        }
        return results;
    }

    template <class T>
    void CountAll(PartBuild& last, MemorySource<T>& source, const std::string& path,
                  const BuildOptions& options, const PartGrid& grid,
                  const std::vector<PartResult>& results) {
        PartBuild other(TestModule(), source, "worker", options, path);
        other.SetGrid(grid);
        for (std::uint64_t part = 0; part < grid.Count(); ++part)
            ASSERT_TRUE(other.Take(part, results[part]));
        ASSERT_EQ(other.NeedsCounts(), last.NeedsCounts());
        // The last one is left to whoever finishes.
        for (std::uint64_t part = 0; other.NeedsCounts() && part + 1 < grid.Count(); ++part)
            EXPECT_TRUE(last.TakeCounts(part, other.Count(part)));
    }

    const ScratchDirectory folder;
    const PyramidBuilder builder{TestModule()};
    std::mt19937 random{7};
    std::uint64_t parts = 0;
};

template <class T>
MemorySource<T> Noise(std::uint32_t width, std::uint32_t height, std::uint32_t bands) {
    MemorySource<T> source(width, height, bands);
    source.FillWithNoise(5);
    return source;
}

TEST_F(PartBuilds, TypesByMethodsAreThatOfBuild) {
    std::size_t variant = 0;
    const auto all = [&]<class T>(std::type_identity<T>) {
        MemorySource<T> source = Noise<T>(531, 523, 2);
        for (std::size_t number = 0; number < kResamplings; ++number) {
            const auto method = static_cast<Resampling>(number);
            if (!IsDrawn(variant++, 7)) continue;
            if (!SupportsElementType(method, source.props.pixelType)) continue;
            BuildOptions options;
            options.resampling = method;
            ExpectThatOfBuild(source, options, {512, 512, true, 2});
        }
    };
#define ZMC_X(type, name, code) all(std::type_identity<type>());
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    EXPECT_EQ(variant, 12u * 12);
    EXPECT_GT(parts, 4 * 10 * CampaignLength(1u, 10u));
}

TEST_F(PartBuilds, PartsOfAnySizeAreThatOfBuild) {
    auto bytes = Noise<unsigned char>(1100, 1370, 1);
    auto reals = Noise<float>(1300, 670, 1);
    std::size_t variant = 0;
    for (const auto& [width, height] : {std::pair{256u, 256u},
                                        {300u, 9999u},
                                        {1024u, 1024u},
                                        {9999u, 600u},
                                        {9999u, 9999u},
                                        {1u, 1u}})
        for (const Resampling method : {Resampling::Average, Resampling::Lanczos}) {
            BuildOptions options;
            options.resampling = method;
            if (IsDrawn(variant, 3)) ExpectThatOfBuild(bytes, options, {width, height, false, 2});
            if (IsDrawn(++variant, 3))
                ExpectThatOfBuild(reals, options, {width, height, width == 1024, 1});
        }
}

TEST_F(PartBuilds, MarginsOfSeveralRowsOfTilesAreThatOfBuild) {
    auto source = Noise<unsigned short>(130, 17000, 1);
    std::size_t variant = 0;
    for (const Resampling method : {Resampling::Gauss, Resampling::Lanczos})
        for (const std::uint32_t level : {5u, 6u}) {
            if (!IsDrawn(variant++, 3)) continue;
            BuildOptions options;
            options.resampling = method;
            ExpectThatOfBuild(source, options, {0, 0, false, 2, PartGrid{130, 17000, level, 1, 1}});
        }
}

TEST_F(PartBuilds, PartsInColumnsAreThatOfBuild) {
    auto source = Noise<double>(3000, 540, 1);
    BuildOptions options;
    options.memory = 7 << 20;
    for (const Resampling method : {Resampling::Average, Resampling::Cubic}) {
        options.resampling = method;
        ExpectThatOfBuild(source, options, {3000, 512, false, 2});
    }
    EXPECT_EQ(parts, 2u * 2);
}

TEST_F(PartBuilds, OrderingsAndManyBandsAreThatOfBuild) {
    BuildOptions options;
    for (const Ordering ordering : {Ordering::Scanline, Ordering::Blocked}) {
        options.ordering = ordering;
        auto source = Noise<short>(700, 600, 3);
        ExpectThatOfBuild(source, options, {});
    }
    options.ordering = Ordering::Auto;
    auto morton = Noise<unsigned int>(700, 600, 11);
    ExpectThatOfBuild(morton, options, {512, 512, true, 2});
    morton.props.noDataValues[3] = 17;
    options.levels = 1;
    ExpectThatOfBuild(morton, options, {256, 1024, false, 2});
}

TEST_F(PartBuilds, NoDataAlphaMasksAndPalettesAreThatOfBuild) {
    auto source = Noise<float>(800, 690, 3);
    source.props.noDataValues[1] = -7777;
    for (std::size_t i = 0; i < source.pixels.size(); i += 3)
        source.pixels[i] = i % 2 ? -7777.0f : std::numeric_limits<float>::quiet_NaN();
    ExpectThatOfBuild(source, {}, {512, 512, true, 2});
    source.alphas = {{0, 2}, {1, 2}};
    ExpectThatOfBuild(source, {}, {});
    source.alphas.clear();
    std::vector<unsigned char>& mask = source.masks[0];
    for (std::size_t i = 0; i < std::size_t{800} * 690; ++i) mask.push_back(i % 800 / 3 % 2);
    BuildOptions options;
    for (const Resampling method : {Resampling::Average, Resampling::Lanczos}) {
        options.resampling = method;
        ExpectThatOfBuild(source, options, {});
    }
    auto classes = Noise<unsigned char>(800, 690, 1);
    classes.palettes[0] = zmctest::PaletteOf({{1, 2, 3, 255}, {4, 5, 6, 255}, {7, 8, 9, 0}});
    ExpectThatOfBuild(classes, {}, {});
}

TEST_F(PartBuilds, LevelsAndStatisticsThatAreNotWantedAreNotMade) {
    auto source = Noise<int>(900, 700, 1);
    for (const std::uint32_t levels : {0u, 1u, 2u}) {
        BuildOptions options;
        options.levels = levels;
        ExpectThatOfBuild(source, options, {256, 256, true, 2});
        options.statistics = false;
        ExpectThatOfBuild(source, options, {});
    }
    auto small = Noise<double>(3, 2, 1);
    ExpectThatOfBuild(small, {}, {});
}

class PartsOfOne : public PartBuilds {
protected:
    void LayOut() {
        file.emplace(folder / "a.zmc", true);
        builder.LayOut(source, *file, "a.zmc", options);
    }
    std::unique_ptr<PartBuild> Worker() {
        auto made =
            std::make_unique<PartBuild>(TestModule(), source, "a.zmc", options, file->Path());
        grid = made->Plan(512, 512);
        made->SetGrid(grid);
        return made;
    }

    MemorySource<float> source = Noise<float>(1100, 600, 1);
    BuildOptions options;
    std::optional<BuildFile> file;
    PartGrid grid;
};

TEST_F(PartsOfOne, ResultsOfSomethingElseAreNotTaken) {
    LayOut();
    const auto worker = Worker();
    const PartResult made = worker->Make(1);
    const auto last = Worker();
    EXPECT_FALSE(last->Take(0, made)) << "the tiles of another part";
    PartResult wrong = made;
    wrong.tiles += 1;
    EXPECT_FALSE(last->Take(1, wrong));
    wrong = made;
    wrong.sums.resize(wrong.sums.size() / 2);
    EXPECT_FALSE(last->Take(1, wrong));
    wrong.sums = made.sums + 'x';
    EXPECT_FALSE(last->Take(1, wrong));
    EXPECT_TRUE(last->Take(1, made));
    const std::string counts = last->Count(1);
    EXPECT_FALSE(last->TakeCounts(1, counts + 'x'));
    EXPECT_FALSE(last->TakeCounts(1, counts.substr(0, counts.size() / 2)));
    EXPECT_TRUE(last->TakeCounts(1, counts));
    // Other minima and maxima have other bins.
    const auto other = Worker();
    ASSERT_TRUE(other->Take(0, worker->Make(0)));
    EXPECT_FALSE(other->TakeCounts(1, counts));
}

TEST_F(PartsOfOne, GridsOfOtherRastersAreRefused) {
    LayOut();
    const auto worker = Worker();
    const PartGrid good = grid;
    for (const PartGrid& wrong :
         {PartGrid{1101, 600, good.level, 1, 1}, PartGrid{1100, 600, 30, 1, 1},
          PartGrid{1100, 600, 0, 0, 1}, PartGrid{1100, 600, 0, 1, 0xFFFFFFFF}})
        EXPECT_THAT(FailureOf([&] { worker->SetGrid(wrong); }),
                    testing::HasSubstr("those of another raster"));
    EXPECT_EQ(FailureOf([&] { worker->SetGrid(good); }), "no failure");
}

TEST_F(PartsOfOne, FactsTellOtherSourcesAndOptionsApart) {
    LayOut();
    const std::uint64_t facts = Worker()->Facts();
    EXPECT_EQ(Worker()->Facts(), facts);
    source.props.noDataValues[0] = 5;
    EXPECT_NE(Worker()->Facts(), facts);
    source.props.noDataValues.clear();
    options.resampling = Resampling::Cubic;
    EXPECT_NE(Worker()->Facts(), facts);
}

TEST_F(PartsOfOne, RecordsAreWholeOrMissing) {
    const PartFolder records(folder / "a.zmcparts", 99);
    records.Make();
    const PartResult result{17, std::string("\0\xFFsums", 6)};
    records.Keep(PartFolder::Kind::Part, 3, result);
    EXPECT_EQ(records.Find(PartFolder::Kind::Part, 3), result);
    EXPECT_FALSE(records.Find(PartFolder::Kind::Count, 3));
    EXPECT_FALSE(records.Find(PartFolder::Kind::Part, 4));
    EXPECT_FALSE(PartFolder(records.Path(), 98).Find(PartFolder::Kind::Part, 3));
    const std::string name = folder / "a.zmcparts/3.part";
    const std::string whole = zmctest::ReadText(name);
    for (std::size_t size = 0; size < whole.size(); ++size) {
        zmctest::WriteText(name, whole.substr(0, size));
        EXPECT_FALSE(records.Find(PartFolder::Kind::Part, 3)) << size;
    }
    for (std::size_t i = 0; i < whole.size(); ++i) {
        std::string damaged = whole;
        damaged[i] = static_cast<char>(damaged[i] ^ 4);
        zmctest::WriteText(name, damaged);
        EXPECT_FALSE(records.Find(PartFolder::Kind::Part, 3)) << i;
    }
    zmctest::WriteText(folder / "a.zmcparts/4.part", whole);
    EXPECT_FALSE(records.Find(PartFolder::Kind::Part, 4)) << "of another part";
    zmctest::WriteText(folder / "a.zmcparts/.7.part-1-2.tmp", "");
    records.Remove();
    EXPECT_EQ(FailureOf([&] { records.Make(); }), "no failure") << "the folder went too";
}

TEST(PackedNumbers, ComeBackAsTheyWere) {
    NumberPacker packer;
    const std::uint64_t numbers[] = {0, 1, 127, 128, 300, ~std::uint64_t{0}};
    for (const std::uint64_t number : numbers) packer.Put(number);
    const UInt128 wide = static_cast<UInt128>(-5);
    packer.Put(wide);
    NumberUnpacker unpacker(packer.Bytes());
    for (const std::uint64_t number : numbers) EXPECT_EQ(unpacker.Take(), number);
    EXPECT_TRUE(unpacker.TakeLong() == wide);
    EXPECT_TRUE(unpacker.Good() && unpacker.Rest().empty());
    unpacker.Take();
    EXPECT_FALSE(unpacker.Good());
    NumberUnpacker tooLong("\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\x02");
    tooLong.Take();
    EXPECT_FALSE(tooLong.Good());
}

TEST(PartGrids, PartsHoldEveryPixelOnceAndWholeTilesOfTheirLevel) {
    std::mt19937 random(3);
    const auto below = [&](std::uint32_t end) {
        return static_cast<std::uint32_t>(random()) % end;
    };
    for (int i = 0; i < 2000; ++i) {
        PlanInput input{1 + below(70000), 1 + below(70000), 0, below(6), 0, 0};
        input.maxLevel = DefaultMaxLevel(input.width, input.height, 1);
        input.pixelBytes = 1 + below(40);
        input.budget = LeastMemory(input) + below(100000000);
        const PartGrid grid = PlanParts(input, 1 + below(20000), 1 + below(20000));
        ASSERT_LE(grid.Count(), kMostParts);
        ASSERT_LE(grid.level, input.maxLevel);
        std::uint64_t pixels = 0;
        for (std::uint64_t part = 0; part < grid.Count(); ++part) {
            const Window area = grid.Area(part);
            ASSERT_EQ(area.x % (kTileSide << grid.level), 0u);
            ASSERT_EQ(area.y % (kTileSide << grid.level), 0u);
            pixels += area.Pixels();
        }
        ASSERT_EQ(pixels, std::uint64_t{input.width} * input.height);
        const Pass pass = PlanPart(input, grid, grid.Count() - 1);
        ASSERT_LE(pass.memory, std::max(input.budget, StripMemory(256 + 10, 0, 0, 40, 2)));
    }
}

TEST(PartGrids, ThereAreNoMoreThanCanBeHandled) {
    PlanInput input{4000000, 3000000, 15, 0, 4, std::uint64_t{64} << 20};
    const PartGrid grid = PlanParts(input, 256, 256);
    EXPECT_LE(grid.Count(), kMostParts);
    EXPECT_GT(grid.Count(), kMostParts / 10);
}

}  // namespace
}  // namespace zmchost
