// Values: samples as JSON, exact.
#ifndef ZMC_SERVE_VALUES_H
#define ZMC_SERVE_VALUES_H

#include <cstddef>
#include <cstdint>
#include <vector>

#include "describe/JsonNumbers.h"
#include "serve/ServedRaster.h"

namespace zmcserve {

// Integers of 64 bits are texts, however small: readers that know doubles only take them for what
// they are.
zmcdescribe::Json ValuesOf(std::uint32_t pixelType, const unsigned char* samples,
                           std::size_t count);
// Bands, which count from 0, as numbers that count from 1.
zmcdescribe::Json NumbersOf(const std::vector<std::uint32_t>& bands);

// The values of a pixel that the level has: {"x", "y", "level", "coordinates", "bands", "values"};
// the coordinates are of its middle in the raster's own system, null where it has none. Throws
// zmchost::Error, and Refusal where the file changes meanwhile.
zmcdescribe::Json DescribePixel(ServedRaster& raster, std::uint32_t level, std::uint32_t x,
                                std::uint32_t y, const std::vector<std::uint32_t>& bands,
                                const Deadline& deadline);

}  // namespace zmcserve

#endif
