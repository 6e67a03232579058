// SampleDifferences: where and by how much two rasters of one size and number of bands differ.
//
// Samples are compared as numbers, whatever the two types are: exactly, or up to a tolerance on the
// absolute difference (of complex numbers: its magnitude). Two NaN are equal; a NaN and a number
// differ by infinity. One thread at a time.
#ifndef ZMC_TOOLS_SAMPLEDIFFERENCES_H
#define ZMC_TOOLS_SAMPLEDIFFERENCES_H

#include <cstddef>
#include <cstdint>
#include <vector>

#include "host/raster/RasterSource.h"

namespace zmctools {

struct BandDifference {
    std::uint64_t samples = 0;  // that differ by more than the tolerance
    long double greatest = 0;   // difference, of all samples
    std::uint32_t x = 0;        // the first sample that differs, line by line
    std::uint32_t y = 0;
};

class SampleDifferences {
public:
    SampleDifferences(std::uint32_t firstType, std::uint32_t secondType, std::uint32_t bandCount,
                      double allowed);

    // Takes a window of both rasters, pixel-interleaved, without gaps.
    void Take(const zmchost::Window& window, const void* first, const void* second);

    // Takes all that `other`, of the same types and bands, has found elsewhere.
    void Merge(const SampleDifferences& other);

    const std::vector<BandDifference>& Bands() const { return bands; }
    std::uint64_t Samples() const;  // that differ, of all bands

private:
    void TakeLine(std::uint32_t x, std::uint32_t y, std::size_t samples, const unsigned char* first,
                  const unsigned char* second);
    // A sample of a line, counted over all its bands.
    void TakeSample(std::uint32_t x, std::uint32_t y, std::size_t sample, long double distance);

    struct Value {
        long double re = 0;
        long double im = 0;
    };
    static void Widen(std::uint32_t type, const unsigned char* samples, std::vector<Value>& out);
    static long double Distance(const Value& a, const Value& b);

    std::uint32_t types[2];
    std::size_t sizes[2];
    double tolerance;
    std::vector<BandDifference> bands;
    std::vector<Value> values[2];
};

}  // namespace zmctools

#endif
