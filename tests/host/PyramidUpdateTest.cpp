// Updates, held byte for byte against builds of the changed source.
#include "host/build/PyramidUpdate.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <random>

#include "files/MemorySource.h"
#include "host/file/PyramidRecords.h"
#include "host/journal/StagedSource.h"
#include "host/journal/UpdateJournal.h"
#include "tests/host/Palettes.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/FailureOf.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using testing::HasSubstr;
using zmctest::CampaignLength;
using zmctest::FailureOf;
using zmctest::MemorySource;
using zmctest::ScratchDirectory;
using zmctest::TestModule;

class Updates : public testing::Test {
protected:
    Window AnyWindow(std::uint32_t width, std::uint32_t height) {
        const auto upTo = [&](std::uint32_t most) {
            return std::uniform_int_distribution<std::uint32_t>(0, most)(random);
        };
        const std::uint32_t x = upTo(width - 1), y = upTo(height - 1);
        const std::uint32_t most = upTo(2) == 0 ? 600 : 20;
        return {x, y, 1 + upTo(std::min(width - x, most) - 1),
                1 + upTo(std::min(height - y, most) - 1)};
    }

    template <class T>
    void Change(MemorySource<T>& source, const Window& window) {
        MemorySource<T> other(source.props.samples, source.props.lines, source.props.bands);
        other.FillWithNoise(static_cast<unsigned>(random()));
        const std::size_t pixel = source.props.bands;
        for (std::uint64_t y = window.y; y < window.Bottom(); ++y)
            std::copy_n(other.pixels.begin() + static_cast<std::ptrdiff_t>(
                                                   (y * source.props.samples + window.x) * pixel),
                        window.width * pixel,
                        source.pixels.begin() + static_cast<std::ptrdiff_t>(
                                                    (y * source.props.samples + window.x) * pixel));
    }

    // Several updates, one behind the other, each of some windows.
    template <class T>
    void ExpectThatOfBuild(MemorySource<T>& source, BuildOptions options, bool records) {
        const std::string target = folder / "updated.zmc", full = folder / "full.zmc";
        options.overwrite = true;
        options.threads = 2;
        builder.Build(source, target, options);
        PyramidUpdate update(TestModule(), source, target, options);
        if (records) update.KeepRecords("a note");
        for (std::size_t round = 0; round < 2; ++round) {
            std::vector<Window> changed;
            for (std::size_t i = 0; i <= round; ++i) {
                changed.push_back(AnyWindow(source.props.samples, source.props.lines));
                Change(source, changed.back());
            }
            const UpdateReport report = update.Run(changed, {records, records, "a note"});
            EXPECT_GE(report.tiles, 1u);
            builder.Build(source, full, options);
            ASSERT_TRUE(zmctest::ReadText(target) == zmctest::ReadText(full))
                << zelm::ElementTraits<T>::word << ", round " << round << ", window "
                << changed.front().x << ',' << changed.front().y << ',' << changed.front().width
                << ',' << changed.front().height;
        }
        EXPECT_EQ(PyramidRecords::Find(target) != nullptr, records);
    }

    const ScratchDirectory folder{zmctest::MemoryFolder()};
    const PyramidBuilder builder{TestModule()};
    std::mt19937 random{11};
};

template <class T>
MemorySource<T> NoiseOf(std::uint32_t width, std::uint32_t height, std::uint32_t bands) {
    MemorySource<T> source(width, height, bands);
    source.FillWithNoise(3);
    return source;
}

TEST_F(Updates, TypesAreThoseOfBuild) {
    const auto all = [&]<class T>(std::type_identity<T>) {
        for (const bool records : {false, true}) {
            MemorySource<T> source = NoiseOf<T>(600, 530, 2);
            ExpectThatOfBuild(source, {}, records);
        }
    };
#define ZMC_X(type, name, code) all(std::type_identity<type>());
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}

TEST_F(Updates, MethodsAreThoseOfBuild) {
    for (std::size_t number = 0; number < kResamplings; ++number) {
        BuildOptions options;
        options.resampling = static_cast<Resampling>(number);
        MemorySource<float> reals = NoiseOf<float>(1050, 771, 1);
        if (SupportsElementType(*options.resampling, reals.props.pixelType))
            ExpectThatOfBuild(reals, options, number % 2 == 0);
        MemorySource<unsigned char> bytes = NoiseOf<unsigned char>(777, 1035, 3);
        options.levels = 9;
        if (SupportsElementType(*options.resampling, bytes.props.pixelType))
            ExpectThatOfBuild(bytes, options, number % 2 != 0);
    }
}

TEST_F(Updates, OrderingsNoDataAndStatisticsAreThoseOfBuild) {
    for (const Ordering ordering : {Ordering::Scanline, Ordering::Blocked, Ordering::Auto}) {
        const bool morton = ordering == Ordering::Auto;
        MemorySource<short> source = NoiseOf<short>(1300, 700, morton ? 9 : 2);
        BuildOptions options;
        options.ordering = ordering;
        options.noData = BuildOptions::NoData{7.0};
        ExpectThatOfBuild(source, options, true);
        options.statistics = false;
        ExpectThatOfBuild(source, options, false);
        ExpectThatOfBuild(source, options, true);
    }
}

TEST_F(Updates, ManyBlocksAreThoseOfBuild) {
    MemorySource<float> source = NoiseOf<float>(4500, 2100, 1);
    ExpectThatOfBuild(source, {}, true);
}

TEST_F(Updates, RandomWindowsAreThoseOfBuild) {
    for (std::size_t i = 0; i < CampaignLength(std::size_t{6}, std::size_t{100}); ++i) {
        BuildOptions options;
        options.resampling = static_cast<Resampling>(random() % kResamplings);
        MemorySource<unsigned short> source =
            NoiseOf<unsigned short>(1 + static_cast<std::uint32_t>(random() % 2600),
                                    1 + static_cast<std::uint32_t>(random() % 1600),
                                    1 + static_cast<std::uint32_t>(random() % 3));
        ExpectThatOfBuild(source, options, random() % 2 == 0);
    }
}

class Refusals : public Updates {
protected:
    Refusals() { builder.Build(source, target); }

    MemorySource<unsigned char> source = NoiseOf<unsigned char>(700, 600, 1);
    const std::string target = folder / "made.zmc";
    PyramidUpdate update{TestModule(), source, target, {}};
};

TEST_F(Refusals, NameWhatIsWrongAndChangeNothing) {
    const std::string before = zmctest::ReadText(target);
    const std::vector<Window> outside = {
        {0, 0, 0, 5}, {700, 0, 1, 1}, {0, 599, 1, 2}, {0xFFFFFFFF, 0, 0xFFFFFFFF, 1}};
    for (const Window& window : outside)
        EXPECT_THAT(FailureOf([&] { update.Run({window}); }), HasSubstr("not inside the raster"));
    EXPECT_THAT(FailureOf([&] {
                    update.Run({{0, 0, 1, 1}}, {true, true, ""});
                }),
                HasSubstr("it has none"));
    MemorySource<unsigned char> larger = NoiseOf<unsigned char>(701, 600, 1);
    EXPECT_THAT(FailureOf([&] {
                    PyramidUpdate(TestModule(), larger, target, {}).Run({{0, 0, 1, 1}});
                }),
                HasSubstr("laid out for another raster"));
    const UpdateJournal other(target);
    EXPECT_THAT(FailureOf([&] {
                    update.Run({{0, 0, 1, 1}});
                }),
                HasSubstr("another process is updating it"));
    EXPECT_EQ(zmctest::ReadText(target), before);
}

TEST_F(Refusals, RecordsOfAnotherStateAndDamagedOnes) {
    update.KeepRecords("note");
    const std::string path = PyramidRecords::PathFor(target);
    EXPECT_EQ(PyramidRecords::Find(target)->Note(), "note");
    const std::string records = zmctest::ReadText(path), before = zmctest::ReadText(target);
    for (std::size_t i = 0; i < records.size(); ++i) {
        std::string damaged = records;
        damaged[i] = static_cast<char>(damaged[i] ^ 0x10);
        zmctest::WriteText(path, damaged);
        const auto use = [&] { update.Run({{0, 0, 1, 1}}, {true, true, ""}); };
        // Of the one block, which is looked at anew, the piece does not count.
        const std::string failure = FailureOf(use);
        if (failure == "no failure") break;
        EXPECT_THAT(failure, HasSubstr("records of its statistics")) << i;
        EXPECT_EQ(zmctest::ReadText(target), before);
    }
}

TEST(StagedSources, ReadAsIfWritten) {
    std::mt19937 random(5);
    const auto upTo = [&](std::size_t most) {
        return std::uniform_int_distribution<std::size_t>(0, most)(random);
    };
    for (int round = 0; round < 30; ++round) {
        zelm::files::MemorySource::Bytes first(200);
        std::generate(first.begin(), first.end(),
                      [&] { return static_cast<unsigned char>(upTo(255)); });
        auto model = std::make_shared<zelm::files::MemorySource>(first);
        auto base = std::make_shared<zelm::files::MemorySource>(first);
        StagedSource staged(base, std::make_shared<zelm::files::MemorySource>());
        for (int step = 0; step < 60; ++step) {
            const std::size_t offset = upTo(300), size = upTo(90);
            zelm::files::MemorySource::Bytes bytes(size + 1), seen(size + 1);
            if (step % 7 == 0) {
                model->Truncate(offset);
                staged.Truncate(offset);
            } else if (step % 2 == 0) {
                std::generate(bytes.begin(), bytes.end(),
                              [&] { return static_cast<unsigned char>(upTo(255)); });
                model->WriteAt(offset, bytes.data(), bytes.size());
                staged.WriteAt(offset, bytes.data(), bytes.size());
            }
            ASSERT_EQ(staged.Size(), model->Size());
            const std::size_t from = upTo(300);
            ASSERT_EQ(staged.ReadAt(from, seen.data(), seen.size()),
                      model->ReadAt(from, bytes.data(), bytes.size()));
            if (step % 2 != 0) {
                ASSERT_EQ(seen, bytes);
            }
        }
        EXPECT_EQ(base->Content(), first);
    }
}

}  // namespace
}  // namespace zmchost
