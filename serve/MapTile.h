// MapTile: pictures of tiles of a whole size, in the raster's own grid or in Web Mercator, for all
// services that follow a standard.
//
// Where a tile goes beyond the raster it is transparent, or white in JPEG. Tiles that a set of
// tiles does not have are not found; those of Web Mercator that the raster does not reach are
// empty.
#ifndef ZMC_SERVE_MAPTILE_H
#define ZMC_SERVE_MAPTILE_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "render/Codec.h"
#include "render/Style.h"
#include "serve/Answer.h"
#include "serve/Request.h"
#include "serve/Service.h"
#include "serve/Warp.h"

namespace zmcserve {

inline constexpr const char* kMercatorSet = "WebMercatorQuad";
// Of the raster's own grid.
std::string OwnSetOf(std::string_view name);
// Whose own grid it is; nothing where the words are those of no such set.
std::optional<std::string> NameOfOwnSet(std::string_view set);

// A tile by the words of an address.
struct MapTile {
    bool isMercator = false;
    std::uint32_t matrix = 0;  // 0: the coarsest
    std::uint32_t row = 0;
    std::uint32_t column = 0;
};

// Whether the set of tiles is that of Web Mercator, or else the raster's own. Throws Refusal (404)
// for any other.
bool IsMercatorSet(std::string_view set, std::string_view name);

// How a tile is to look.
struct MapLook {
    zmcrender::Style style;
    zmcrender::PictureFormat format = zmcrender::PictureFormat::Png;
    int quality = zmcrender::kDefaultQuality;
    Resampling resampling = Resampling::Bilinear;
};
// "nearest", "bilinear" (the usual one) or "cubic". Throws Refusal (400).
Resampling ResamplingOf(const Request& request);

// The tile as an answer, with validators. Throws Refusal (404) for one that there is not, and what
// rendering throws.
Answer MapTileAnswer(const Request& request, const Service& service, ServedRaster& raster,
                     const MapTile& tile, const MapLook& look);

// The pixel of the finest level, counted in it, that stands in the middle of pixel (i, j) of a
// tile; none where that lies outside of the raster. Throws Refusal: 404 for a tile that there is
// not.
struct Pixel {
    std::uint32_t x = 0, y = 0;
};
std::optional<Pixel> PixelOfTile(ServedRaster& raster, const MapTile& tile, std::uint32_t i,
                                 std::uint32_t j, const Deadline& deadline);
// Pixels along a side of a tile.
std::uint32_t SideOfTile(const ServedRaster& raster, const MapTile& tile);

}  // namespace zmcserve

#endif
