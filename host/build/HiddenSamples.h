// HiddenSamples: which samples of a window of any level the masks of a raster hide.
//
// A pixel of level L is hidden where all pixels of level 0 that it stands for are, 2^L by 2^L of
// them from (x << L, y << L) on: what ReduceRow and WeighRow make step by step, from the mask of
// the finest level alone. The memory taken is bounded, whatever the level.
#ifndef ZMC_HOST_BUILD_HIDDENSAMPLES_H
#define ZMC_HOST_BUILD_HIDDENSAMPLES_H

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

#include "host/raster/RasterSource.h"

namespace zmchost {

class HiddenSamples {
public:
    // `masked` are the bands of the raster whose masks are looked at, by their place in `bands`.
    // Both have to outlive this object.
    HiddenSamples(SampleWeights& sampleWeights, std::span<const std::uint32_t> sourceBands,
                  std::vector<std::uint32_t> maskedPlaces);

    // Bytes that Mark takes at the most.
    static std::uint64_t WorkMemory(std::size_t masked);

    // Sets kHiddenBit in the mask bytes of a window, one per sample and pixel-interleaved, where
    // the sample is hidden; other bits and bands stay.
    void Mark(std::uint32_t level, const Window& window, unsigned char* mask);

private:
    void Show(std::uint32_t level, const Window& window, const Window& part, unsigned char* mask);

    SampleWeights& weights;
    std::size_t bands;
    std::vector<std::uint32_t> places;   // within a pixel
    std::vector<std::uint32_t> numbers;  // of the source
    std::vector<unsigned char> shown;
};

}  // namespace zmchost

#endif
