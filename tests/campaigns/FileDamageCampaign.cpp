// Files that were cut off, whose bits have turned, or parts of which were overwritten.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>

#include "tests/campaigns/Campaign.h"
#include "tests/campaigns/FileTrial.h"
#include "tests/campaigns/Samples.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {
namespace {

constexpr std::uint64_t kWindowsOfASample = 8000;

TEST(FileDamage, CutOffAtEveryByte) {
    FileTrial trial;
    Campaign campaign("FileDamage.CutOffAtEveryByte", 17);
    for (const Sample& sample : Samples()) {
        const Bytes file = sample.File();
        campaign.Run(sample.name, file.size() + 1, [&](std::uint64_t length) {
            return trial.Try({file.begin(), file.begin() + static_cast<std::ptrdiff_t>(length)},
                             {});
        });
    }
}

TEST(FileDamage, EveryBitOfTheFront) {
    FileTrial trial;
    Campaign campaign("FileDamage.EveryBitOfTheFront", 7);
    for (const Sample& sample : Samples())
        campaign.Run(sample.name, sample.model.tileDataStart * 8, [&](std::uint64_t bit) {
            Bytes file = sample.File();
            file[bit / 8] = static_cast<unsigned char>(file[bit / 8] ^ (1u << bit % 8));
            return trial.Try(file, {});
        });
}

// A run of bytes anywhere becomes zeros, ones, noise, or what stands elsewhere in the file, as
// blocks of a disk do. Half of the runs lie in the two documents.
Bytes WithWindow(const Sample& sample, std::uint64_t seed) {
    constexpr std::size_t lengths[] = {1, 2, 4, 8, 16, 64, 256, 512, 1024, 4096};
    std::mt19937_64 random(seed);
    const auto below = [&](std::size_t end) { return static_cast<std::size_t>(random() % end); };
    Bytes file = sample.File();
    const std::size_t front = sample.model.tileDataStart, end = sample.model.tileDataEnd;
    std::size_t start = below(file.size());
    if (seed % 4 == 1) start = below(front);
    if (seed % 4 == 3) start = end + below(file.size() - end);
    const std::size_t length = std::min(lengths[below(std::size(lengths))], file.size() - start);
    const auto at = file.begin() + static_cast<std::ptrdiff_t>(start);
    const auto to = at + static_cast<std::ptrdiff_t>(length);
    switch (below(4)) {
        case 0:
            std::fill(at, to, static_cast<unsigned char>(0));
            break;
        case 1:
            std::fill(at, to, static_cast<unsigned char>(0xFF));
            break;
        case 2:
            std::generate(at, to, [&] { return static_cast<unsigned char>(random()); });
            break;
        default: {
            const Bytes old = sample.File();
            std::copy_n(old.begin() + static_cast<std::ptrdiff_t>(below(old.size() - length + 1)),
                        length, at);
        }
    }
    return file;
}

TEST(FileDamage, WindowsOverwritten) {
    FileTrial trial;
    Campaign campaign("FileDamage.WindowsOverwritten", 11);
    for (const Sample& sample : Samples())
        campaign.Run(sample.name, kWindowsOfASample,
                     [&](std::uint64_t seed) { return trial.Try(WithWindow(sample, seed), {}); });
}

}  // namespace
}  // namespace zmctest
