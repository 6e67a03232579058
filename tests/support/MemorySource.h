// A raster source over samples in memory, which can be told to fail, and the module that tests use.
#ifndef ZMC_TESTS_SUPPORT_MEMORYSOURCE_H
#define ZMC_TESTS_SUPPORT_MEMORYSOURCE_H

#include <cstring>
#include <functional>
#include <map>
#include <optional>
#include <random>
#include <span>
#include <stdexcept>
#include <string>
#include <vector>

#include "core/ElementTypes.h"
#include "host/raster/Module.h"
#include "host/raster/RasterSource.h"

namespace zmctest {

inline zmchost::ModulePtr TestModule() { return zmchost::Module::Load(ZMC_MODULE_PATH); }

template <class T>
class MemorySource : public zmchost::RasterSource {
public:
    MemorySource(std::uint32_t samples, std::uint32_t lines, std::uint32_t bands) {
        props.samples = samples;
        props.lines = lines;
        props.bands = bands;
        props.pixelType = zelm::ElementTraits<T>::code;
        pixels.resize(std::size_t{samples} * lines * bands);
    }

    std::string Name() const override { return "memory"; }
    zelm::RasterProps Props() const override { return props; }
    zelm::PalettePtr BandPalette(std::uint32_t band) const override {
        const auto found = palettes.find(band);
        return found == palettes.end() ? zelm::PalettePtr() : found->second;
    }

    void Read(const zmchost::Window& window, std::span<const std::uint32_t> bands,
              void* out) override {
        if (beforeRead) beforeRead(window);
        read += std::uint64_t{window.width} * window.height;
        T* to = static_cast<T*>(out);
        for (std::uint32_t y = window.y; y < window.y + window.height; ++y)
            for (std::uint32_t x = window.x; x < window.x + window.width; ++x)
                for (const std::uint32_t band : bands)
                    *to++ = pixels[(std::size_t{y} * props.samples + x) * props.bands + band];
    }

    std::optional<std::uint32_t> AlphaBand(std::uint32_t band) const override {
        const auto found = alphas.find(band);
        return found == alphas.end() ? std::nullopt : std::optional(found->second);
    }
    bool HasMask(std::uint32_t band) const override { return masks.count(band) != 0; }
    void ReadMask(const zmchost::Window& window, std::span<const std::uint32_t> bands,
                  unsigned char* shown) override {
        for (std::uint32_t y = window.y; y < window.y + window.height; ++y)
            for (std::uint32_t x = window.x; x < window.x + window.width; ++x)
                for (const std::uint32_t band : bands) *shown++ = Shown(x, y, band) ? 255 : 0;
    }
    bool Shown(std::uint32_t x, std::uint32_t y, std::uint32_t band) const {
        const std::size_t pixel = std::size_t{y} * props.samples + x;
        if (const auto mask = masks.find(band); mask != masks.end())
            return mask->second[pixel] != 0;
        return !(pixels[pixel * props.bands + alphas.at(band)] == T{});
    }

    // Reproducible noise over a slope, so that neighbours differ and no value is special.
    void FillWithNoise(unsigned seed) {
        std::mt19937 random(seed);
        for (std::size_t i = 0; i < pixels.size(); ++i)
            pixels[i] = Noise(static_cast<std::uint32_t>(random()), i);
    }

    zelm::RasterProps props;
    std::vector<T> pixels;
    std::map<std::uint32_t, zelm::PalettePtr> palettes;
    std::map<std::uint32_t, std::uint32_t> alphas;              // of a band, its alpha band
    std::map<std::uint32_t, std::vector<unsigned char>> masks;  // by pixel
    std::function<void(const zmchost::Window&)> beforeRead;
    std::uint64_t read = 0;  // pixels asked for so far

private:
    static T Noise(std::uint32_t number, std::size_t place) {
        const double slope = static_cast<double>(place % 97) + static_cast<double>(number % 100000);
        if constexpr (zelm::kIsComplex<T>)
            return T(static_cast<decltype(T::re)>(slope / 3),
                     static_cast<decltype(T::re)>(static_cast<double>(number % 1000) - 500));
        else if constexpr (std::is_floating_point_v<T>)
            return static_cast<T>(slope / 7 - 5000);
        else
            return static_cast<T>(number);
    }
};

}  // namespace zmctest

#endif
