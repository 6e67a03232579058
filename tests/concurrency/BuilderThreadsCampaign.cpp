// Builds with several threads each, several at a time, and what comes of them: the same file as one
// thread makes. Meant for the thread sanitizer.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <thread>

#include "host/build/PyramidBuilder.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {
namespace {

using zmchost::BuildOptions;
using zmchost::PyramidBuilder;

constexpr std::uint32_t kBuilders = 2;

template <class T>
void BuildTwice(const zmchost::ModulePtr& module, const std::string& path, std::uint32_t bands,
                unsigned seed, std::uint32_t threads) {
    zmctest::MemorySource<T> source(560, 540, bands);
    source.FillWithNoise(seed);
    BuildOptions options;
    options.overwrite = true;
    options.threads = 1;
    PyramidBuilder(module).Build(source, path + "1", options);
    options.threads = threads;
    std::atomic<int> calls{0};
    options.progress = [&](const zmchost::BuildProgress&) { return ++calls > 0; };
    if (seed % 3 == 0) options.noData = BuildOptions::NoData{7.0};
    PyramidBuilder(module).Build(source, path + "2", options);
    EXPECT_GT(calls, 0);
    if (!options.noData) {
        EXPECT_EQ(zmctest::ReadText(path + "1"), zmctest::ReadText(path + "2"));
    }
}

TEST(BuilderThreads, BuildSideBySide) {
    const zmctest::ScratchDirectory folder;
    const zmchost::ModulePtr module = zmctest::TestModule();
    const auto end = std::chrono::steady_clock::now() +
                     CampaignLength(std::chrono::seconds(4), std::chrono::seconds(60));
    std::atomic<int> builds{0};
    std::vector<std::thread> builders;
    for (std::uint32_t i = 0; i < kBuilders; ++i)
        builders.emplace_back([&, i] {
            const std::string path = folder / ("file" + std::to_string(i));
            for (unsigned seed = 0; seed < 2 || std::chrono::steady_clock::now() < end; ++seed) {
                switch (seed % 4) {
                    case 0:
                        BuildTwice<unsigned char>(module, path, 3, seed, 8);
                        break;
                    case 1:
                        BuildTwice<float>(module, path, 1, seed, 4);
                        break;
                    case 2:
                        BuildTwice<short>(module, path, 9, seed, 3);
                        break;
                    default:
                        BuildTwice<double>(module, path, 2, seed, 8);
                }
                builds += 2;
            }
        });
    for (std::thread& builder : builders) builder.join();
    std::printf("%d builds\n", builds.load());
}

}  // namespace
}  // namespace zmctest
