// Tiles of a raster's own grid: which there are, where they lie in the file, and their samples.
#ifndef ZMC_SERVE_TILE_H
#define ZMC_SERVE_TILE_H

#include <array>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>

#include "serve/Conditions.h"
#include "serve/SampleAnswer.h"
#include "serve/Service.h"

namespace zmcserve {

inline constexpr const char* kNoTile = "there is no such tile";

// A number of a tile: digits. Throws Refusal: 400 for anything else, 404 for what no tile has.
std::uint32_t TileNumber(std::string_view text);

struct TilePlace {
    std::uint32_t level = 0;
    std::uint32_t column = 0;
    std::uint32_t row = 0;
    zmchost::Window window;  // in pixels of the level, in its true size at the edges
};

// The tile of a zoom, which counts from the coarsest level. Throws Refusal (404).
TilePlace FindTile(const ServedRaster& raster, std::uint64_t zoom, std::uint64_t column,
                   std::uint64_t row);

// Where all samples of a tile lie in the file side by side: in the orderings Scanline and Blocked.
// Nothing where they do not. Throws Refusal (404) for a tile that the file lacks as yet.
std::optional<ByteRange> RangeOfTile(const ServedRaster& raster, const TilePlace& tile);

// Samples of a window of a level as an answer without validators, read through the module. Throws
// Refusal (400) for more than an answer may hold.
Answer ReadSamples(const Service& service, ServedRaster& raster, std::uint32_t level,
                   const zmchost::Window& window, std::span<const std::uint32_t> bands,
                   SampleFormat format, const Deadline& deadline);

// West, south, east and north in degrees of WGS 84, of what has a place there.
std::optional<std::array<double, 4>> BoundsInDegrees(ServedRaster& raster);

}  // namespace zmcserve

#endif
