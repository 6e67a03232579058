// How the samples of a block of pixels move between a tile's layout and the caller's.
//
// One procedure serves reading and writing, tiles of whole pixels and tiles of single bands, and
// all sample sizes. No sample is examined or converted: a complex sample moves as one unit.
#ifndef ZMC_PYRAMID_TILEGATHER_H
#define ZMC_PYRAMID_TILEGATHER_H

#include <cstddef>
#include <cstdint>

namespace zelm {

// Where the samples of a block of pixels lie; Byte is unsigned char or const unsigned char. The
// sample of list position i starts at `data` + row * rowStep + column * pixelStep + band *
// bandStep, band being bands[i], or i itself where there is no list.
template <class Byte>
struct SampleBlock {
    Byte* data;
    std::size_t rowStep;
    std::size_t pixelStep;
    std::size_t bandStep;
    const int* bands = nullptr;

    std::size_t BandOffset(std::uint32_t i) const {
        return (bands ? static_cast<std::size_t>(bands[i]) : i) * bandStep;
    }
    // Whole pixels of `count` samples, one after the other.
    bool IsPacked(std::uint32_t count, std::size_t sampleBytes) const {
        return !bands && (count == 1 || bandStep == sampleBytes) &&
               pixelStep == count * sampleBytes;
    }
};

// Moves `bands` samples of each pixel of a block. `sampleBytes` is 1, 2, 4, 8 or 16.
void MoveSamples(const SampleBlock<const unsigned char>& from, const SampleBlock<unsigned char>& to,
                 std::uint32_t rows, std::uint32_t columns, std::uint32_t bands,
                 std::uint32_t sampleBytes);

}  // namespace zelm

#endif
