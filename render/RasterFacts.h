// RasterFacts: what a renderer has to know of a raster before it sees a sample.
//
// Of a pyramid FactsOf reads it from the archived documents. What stands beside or inside a file
// for other programs (no-data values, meanings of bands) is told by whoever knows it. A plain
// value.
#ifndef ZMC_RENDER_RASTERFACTS_H
#define ZMC_RENDER_RASTERFACTS_H

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "host/raster/Raster.h"
#include "render/Number.h"

namespace zmcrender {

// Bin i counts the samples from minimum + i * binSize up to, and without, the start of the next;
// the last one counts `maximum` too.
struct HistogramFacts {
    Number minimum;
    Number maximum;
    double binSize = 0;
    std::vector<std::uint64_t> counts;
};

enum class BandMeaning { Unknown, Grey, Red, Green, Blue, Alpha, Palette };

struct BandFacts {
    BandMeaning meaning = BandMeaning::Unknown;
    std::optional<Number> noData;
    // Of the archived statistics.
    std::optional<Number> minimum;
    std::optional<Number> maximum;
    std::optional<double> mean;
    std::optional<double> deviation;
    std::optional<HistogramFacts> histogram;  // of the finest level that has one
    // From the index 0 on: red, green, blue, alpha. Empty: none.
    std::vector<std::array<unsigned char, 4>> palette;
};

struct RasterFacts {
    std::string name;             // for messages
    std::uint32_t pixelType = 0;  // code, as in core/ElementTypes.h
    std::vector<BandFacts> bands;
};

// What a pyramid's documents and its Raster tell. Throws zmchost::Error if the file cannot be read;
// a malformed document tells nothing.
RasterFacts FactsOf(const zmchost::Raster& raster);

// Whether a band is shown in its palette where the style does not say so: where it has one and the
// samples are integers. Others are values and no indices, even if the file archives colours.
bool HasUsualPalette(const RasterFacts& facts, std::uint32_t band);

// The bands that a picture shows where the style names none, counted from 1: red, green, blue and
// alpha by their meanings where the raster has the three colours; grey and alpha of a raster of two
// bands of which the second is alpha; else 1,2,3 of three bands or more of which the first is not
// shown in a palette; else 1.
std::vector<std::uint32_t> UsualBands(const RasterFacts& facts);

// The value below which `percent` per cent of the counted samples lie. With target = percent times
// the number of samples / 100 and i the first bin with counts where the sum up to it, itself
// included, is at least target: in reals
//     minimum + (i + f) binSize, f = (target - sum before i) / counts[i]
// in integers minimum + i binSize + min(floor(f binSize), binSize - 1): in bins of one value, that
// value. Never above the maximum. No number for a histogram without counts.
std::optional<Number> PercentileOf(const HistogramFacts& histogram, double percent,
                                   std::uint32_t pixelType);

}  // namespace zmcrender

#endif
