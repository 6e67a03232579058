// Naive models of rasters and tiles: one index formula for each interleave, one sample at a time.
#ifndef ZMC_TESTS_SUPPORT_TILEMODEL_H
#define ZMC_TESTS_SUPPORT_TILEMODEL_H

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <random>
#include <type_traits>
#include <vector>

#include "core/Array.h"
#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"

namespace zmctest {

using namespace zelm;

inline constexpr std::int32_t kInterleaves[] = {Interleave::None, Interleave::BIP, Interleave::BIL,
                                                Interleave::BSQ};

struct Box {
    std::size_t width;
    std::size_t height;
    std::size_t bands;

    std::size_t Index(std::int32_t interleave, std::size_t band, std::size_t line,
                      std::size_t sample) const {
        switch (interleave) {
            case Interleave::BIP:
                return (line * width + sample) * bands + band;
            case Interleave::BIL:
                return (line * bands + band) * width + sample;
            case Interleave::BSQ:
                return (band * height + line) * width + sample;
            default:
                return line * width + sample;
        }
    }

    std::size_t Elements(std::int32_t interleave) const {
        return width * height * (interleave == Interleave::None ? 1 : bands);
    }
};

// A sample from 1 to 100, different for neighbouring numbers.
template <class T>
T SampleOf(std::size_t number) {
    const auto value = static_cast<int>(number * 7 % 100 + 1);
    if constexpr (kIsComplex<T>) {
        using Part = decltype(T::re);
        return T(static_cast<Part>(value), static_cast<Part>(number % 13));
    } else {
        return static_cast<T>(value);
    }
}

template <class T>
std::vector<T> Samples(std::size_t count, std::size_t first = 0) {
    std::vector<T> samples(count);
    for (std::size_t i = 0; i < count; ++i) samples[i] = SampleOf<T>(first + i);
    return samples;
}

// Equality of bits, for which a NaN equals itself.
template <class T>
bool SameBits(const std::vector<T>& a, const std::vector<T>& b) {
    return a.size() == b.size() &&
           (a.empty() || std::memcmp(a.data(), b.data(), a.size() * sizeof(T)) == 0);
}

// Views take their buffer as it is, so that a list costs no copy.
inline Array<int> ListView(std::vector<int>& bands) {
    return bands.empty()
               ? Array<int>()
               : Array<int>(bands.data(), ArrayShape(static_cast<std::uint32_t>(bands.size())));
}

inline std::vector<int> AllBands(std::size_t bands) {
    std::vector<int> list(bands);
    for (std::size_t i = 0; i < bands; ++i) list[i] = static_cast<int>(i);
    return list;
}

class Random {
public:
    explicit Random(std::uint32_t seed) : engine(seed) {}
    // From `low` to `high`, both inclusive.
    std::size_t Between(std::size_t low, std::size_t high) {
        return low + engine() % (high - low + 1);
    }
    bool OneIn(std::size_t n) { return Between(1, n) == 1; }

private:
    std::mt19937 engine;
};

}  // namespace zmctest

#endif
