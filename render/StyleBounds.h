// StyleBounds: what a style's stretch comes to for a raster, by its records or by its samples.
#ifndef ZMC_RENDER_STYLEBOUNDS_H
#define ZMC_RENDER_STYLEBOUNDS_H

#include <cstddef>
#include <functional>
#include <span>

#include "render/Channel.h"
#include "render/PixelSource.h"
#include "render/RasterFacts.h"
#include "render/Renderer.h"
#include "render/Style.h"

namespace zmcrender {

// The no-data value of a band in a style; none where nothing is.
std::optional<Number> NoDataOf(const RasterFacts& facts, const Style& style, std::uint32_t band);
// A channel of a band, from 0, that tells values and no levels.
std::unique_ptr<const Channel> ValuesChannel(const RasterFacts& facts, const Style& style,
                                             std::uint32_t band);

// Bounds of a band, from 0, for any stretch but pairs of the user's; `shown` tells how many bands
// are shown together, of which each is a colour. Reads samples where the records do not tell.
Range BoundsOfBand(const RasterFacts& facts, const Style& style, PixelSource& source,
                   std::uint32_t band, std::size_t shown);

// Values of the samples that VisitSamples hands out: NaN of those that are missing or hidden.
using LineValues = std::function<void(const PixelLine& line, double* values)>;

// The same of values that no record tells of; `bands` are those that are read for them.
Range BoundsOfValues(const Style& style, PixelSource& source, std::span<const std::uint32_t> bands,
                     const LineValues& tell);

// Calls take(samples) for some windows of a coarse level.
void VisitSamples(PixelSource& source, std::span<const std::uint32_t> bands, std::uint32_t halo,
                  const std::function<void(const Samples& samples)>& take);

// By what heights of a band have to be multiplied to make pleasant slopes.
double SuitingZFactor(const Channel& heights, PixelSource& source, std::uint32_t band);

}  // namespace zmcrender

#endif
