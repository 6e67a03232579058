// MemoryPixels: levels of samples in memory as a source of the renderer, which counts what is read.
#ifndef ZMC_TESTS_RENDER_MEMORYPIXELS_H
#define ZMC_TESTS_RENDER_MEMORYPIXELS_H

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "core/ElementTypes.h"
#include "render/Renderer.h"

namespace zmctest {

template <class T>
struct MemoryPixels final : zmcrender::PixelSource {
    struct Level {
        std::uint32_t width, height;
        std::vector<T> samples;           // pixel-interleaved
        std::vector<unsigned char> mask;  // empty: none
    };

    MemoryPixels(std::uint32_t width, std::uint32_t height, std::uint32_t bandCount,
                 std::vector<T> samples)
        : bands(bandCount) {
        levels.push_back({width, height, std::move(samples), {}});
    }

    std::uint32_t bands;
    std::vector<Level> levels;
    std::vector<std::uint32_t> readLevels;
    std::uint64_t mostRead = 0;  // samples at once

    zmcrender::RasterFacts Facts() const {
        return {Name(), PixelType(), std::vector<zmcrender::BandFacts>(bands)};
    }

    std::string Name() const override { return "memory"; }
    std::uint32_t PixelType() const override { return zelm::ElementTraits<T>::code; }
    std::uint32_t Bands() const override { return bands; }
    std::uint32_t MinLevel() const override { return 0; }
    std::uint32_t MaxLevel() const override {
        return static_cast<std::uint32_t>(levels.size() - 1);
    }
    std::uint32_t Width(std::uint32_t level) const override { return levels[level].width; }
    std::uint32_t Height(std::uint32_t level) const override { return levels[level].height; }
    std::uint32_t TileSide() const override { return 16; }
    void Read(std::uint32_t level, const zmchost::Window& window,
              std::span<const std::uint32_t> wanted, void* pixels) override {
        const Level& from = levels[level];
        T* to = static_cast<T*>(pixels);
        for (std::size_t y = window.y; y < window.Bottom(); ++y)
            for (std::size_t x = window.x; x < window.Right(); ++x)
                for (const std::uint32_t band : wanted)
                    *to++ = from.samples[(y * from.width + x) * bands + band];
        readLevels.push_back(level);
        mostRead = std::max<std::uint64_t>(mostRead, window.Pixels() * wanted.size());
    }
    bool HasMask() const override { return !levels[0].mask.empty(); }
    void ReadMask(std::uint32_t level, const zmchost::Window& window,
                  unsigned char* shown) override {
        const Level& from = levels[level];
        for (std::size_t y = window.y; y < window.Bottom(); ++y)
            for (std::size_t x = window.x; x < window.Right(); ++x)
                *shown++ = from.mask[y * from.width + x];
    }
};

inline zmcrender::Style Styled(const std::vector<std::pair<std::string, std::string>>& pairs) {
    zmcrender::Style style;
    for (const auto& [key, value] : pairs) style.Set(key, value);
    return style;
}

// The picture of all of a source, of which the finest level is shown as it is.
inline zmcrender::Picture Rendered(zmcrender::PixelSource& source,
                                   const zmcrender::RasterFacts& facts,
                                   const zmcrender::Style& style) {
    const zmcrender::Renderer renderer(facts, style, source);
    return RenderWindow(renderer, source, WholeOf(source), source.Width(0), source.Height(0));
}

}  // namespace zmctest

#endif
