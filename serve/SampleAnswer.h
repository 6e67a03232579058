// Samples as they are: raw, or as a file of NumPy.
//
// Raw samples stand in the byte order of the file format, the least significant byte first, lines
// from the top, each pixel its bands side by side; headers tell what they are: X-Raster-Type (the
// word of core/ElementTypes.h), X-Raster-Width, X-Raster-Height, X-Raster-Bands and X-Raster-Order,
// which is "pixel". A NumPy file holds an array of height x width x bands.
#ifndef ZMC_SERVE_SAMPLEANSWER_H
#define ZMC_SERVE_SAMPLEANSWER_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "serve/Answer.h"

namespace zmcserve {

enum class SampleFormat { Raw, Npy };
std::optional<SampleFormat> SampleFormatOfName(std::string_view name);  // "raw" or "npy"

const char* MediaType(SampleFormat format);

struct SampleShape {
    std::uint32_t pixelType = 0;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    std::uint32_t bands = 0;

    std::uint64_t Bytes() const;
};

// What stands in front of the samples in a NumPy file of format version 1.0.
std::string NpyHeader(const SampleShape& shape);

// Sets type and headers. The body is still to be filled in.
Answer SampleAnswerOf(const SampleShape& shape, SampleFormat format);

}  // namespace zmcserve

#endif
