#include "host/build/HiddenSamples.h"

#include <algorithm>

#include "host/reduce/Weighing.h"

namespace zmchost {
namespace {

// Pixels of the finest level that are asked for at a time, in the order of a tile's row.
constexpr std::uint32_t kPartWidth = 4096;
constexpr std::uint32_t kPartPixels = 1u << 20;

}  // namespace

HiddenSamples::HiddenSamples(SampleWeights& sampleWeights,
                             std::span<const std::uint32_t> sourceBands,
                             std::vector<std::uint32_t> maskedPlaces)
    : weights(sampleWeights), bands(sourceBands.size()), places(std::move(maskedPlaces)) {
    for (const std::uint32_t place : places) numbers.push_back(sourceBands[place]);
}

std::uint64_t HiddenSamples::WorkMemory(std::size_t masked) {
    return std::max<std::uint64_t>(kPartPixels, kPartWidth * std::uint64_t{masked});
}

void HiddenSamples::Mark(std::uint32_t level, const Window& window, unsigned char* mask) {
    const std::size_t pixels = std::size_t{window.width} * window.height;
    for (std::size_t pixel = 0; pixel < pixels; ++pixel)
        for (const std::uint32_t place : places) mask[pixel * bands + place] |= kHiddenBit;
    const Window fine{window.x << level, window.y << level, window.width << level,
                      window.height << level};
    const std::uint32_t most =
        std::max(1u, kPartPixels / kPartWidth / static_cast<std::uint32_t>(places.size()));
    for (std::uint32_t y = 0; y < fine.height; y += most)
        for (std::uint32_t x = 0; x < fine.width; x += kPartWidth)
            Show(level, window,
                 {fine.x + x, fine.y + y, std::min(kPartWidth, fine.width - x),
                  std::min(most, fine.height - y)},
                 mask);
}

void HiddenSamples::Show(std::uint32_t level, const Window& window, const Window& part,
                         unsigned char* mask) {
    shown.resize(std::size_t{part.width} * part.height * places.size());
    weights.ReadMask(part, numbers, shown.data());
    constexpr auto kept = static_cast<unsigned char>(~kHiddenBit);
    const unsigned char* from = shown.data();
    for (std::uint32_t y = part.y; y < part.y + part.height; ++y) {
        const std::size_t line = ((y >> level) - window.y) * std::size_t{window.width};
        for (std::uint32_t x = part.x; x < part.x + part.width; ++x) {
            unsigned char* const pixel = mask + (line + (x >> level) - window.x) * bands;
            for (const std::uint32_t place : places)
                pixel[place] &= *from++ != 0 ? kept : static_cast<unsigned char>(0xFF);
        }
    }
}

}  // namespace zmchost
