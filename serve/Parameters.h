// Parameters: what queries of several services have in common.
//
// All throw Refusal (400), which names the parameter and what is wrong with it.
#ifndef ZMC_SERVE_PARAMETERS_H
#define ZMC_SERVE_PARAMETERS_H

#include <cstdint>
#include <initializer_list>
#include <optional>
#include <string_view>
#include <vector>

#include "host/raster/RasterSource.h"
#include "render/Codec.h"
#include "render/Style.h"
#include "serve/Request.h"
#include "serve/Service.h"

namespace zmcserve {

// The style that the query's keys tell. Keys that are neither a style's nor among `others` are
// refused, so that one that is written wrongly is found.
zmcrender::Style StyleOf(const Request& request, std::initializer_list<std::string_view> others);

// 1 to 100; else the usual one.
int QualityOf(const Request& request);

// "x,y,w,h" in pixels, not empty, inside width x height; all of it where nothing is given.
zmchost::Window WindowOf(const Request& request, std::uint32_t width, std::uint32_t height);

// "3,1" counted from 1, as bands from 0; all where nothing is given. Any number, also of the same.
std::vector<std::uint32_t> BandsOf(const Request& request, std::uint32_t bands);

// Throws Refusal (404) where the raster has no pixels.
void CheckHasPixels(const ServedRaster& raster);

// The level that "level" names, or the finest. Throws Refusal (404) where there is no such, or none
// has a pixel.
std::uint32_t LevelOf(const Request& request, const ServedRaster& raster);

// Numbers with "," between, exactly `count` of them and finite.
std::vector<double> RealsOf(std::string_view key, std::string_view text, std::size_t count);

// Throws Refusal (400) where samples of that many pixels take more than one answer may hold.
void CheckWindow(const Service& service, std::uint64_t pixels, std::uint64_t pixelBytes);

}  // namespace zmcserve

#endif
