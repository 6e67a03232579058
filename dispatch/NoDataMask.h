// The only place that compares pixels with no-data values: bit 0 of the mask bytes.
//
// A sample is marked when it equals the no-data value of its band or, for floating and complex
// types, when it is not finite. Bits 1 to 7 of the mask are never changed. Both functions take the
// band's place in the tile for its number, since they never see the band list: a tile read with
// the bands (3, 1) is tested against the values of bands 0 and 1. They may run on several threads
// for different tiles, if the reader answers its queries so.
#ifndef ZMC_DISPATCH_NODATAMASK_H
#define ZMC_DISPATCH_NODATAMASK_H

#include <cstdint>

#include "raster/RasterReader.h"

namespace zelm {

// Sets or clears bit 0 for every sample of a tile that was read, laid out by the interleave of the
// reader's properties. A null buffer or mask, or an interleave that is not known, leaves all as it
// is. With interleave None there is one plane, whatever `bandCount` says.
template <class T>
void ComputeNoDataMask(const RasterReader<T>& reader, std::uint32_t width, std::uint32_t height,
                       std::uint32_t bandCount, const T* pixels, unsigned char* mask);

// Writes the band's no-data value into every sample whose mask byte has bit 0 set; bands without a
// value keep their pixels. The mask is only read.
template <class T>
void ApplyNoDataMask(const RasterReader<T>& reader, std::uint32_t width, std::uint32_t height,
                     std::uint32_t bandCount, T* pixels, const unsigned char* mask);

}  // namespace zelm

#endif
