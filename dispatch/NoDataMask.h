// The only place that compares pixels with no-data values: bit 0 of the mask bytes.
//
// A sample is marked when it equals the no-data value of its band or, for floating and complex
// types, when it is not finite. Bits 1 to 7 of the mask are never changed.
//
// Shapes: a tile has `width` samples a line, `height` lines and `bandCount` bands, each from 0 on
// and multiplied in 64 bits; its samples lie by the interleave of the reader's properties, the mask
// has one byte for each of them in the same order. With interleave None there is one plane,
// whatever `bandCount` says. Both buffers are borrowed and must not overlap.
//
// The number of a band is its place in the tile, since neither function sees the band list: a tile
// read with the bands (3, 1) is tested against the values of bands 0 and 1. The reader is asked
// once for each band, before the band's samples are looked at.
//
// A null buffer or mask, or an interleave that is not known, leaves all as it is. Nothing is
// allocated but the properties that the reader returns, and what the reader throws goes through.
// The functions keep no state: they may run on several threads for different tiles, if the reader
// answers its queries so.
#ifndef ZMC_DISPATCH_NODATAMASK_H
#define ZMC_DISPATCH_NODATAMASK_H

#include <cstdint>

#include "raster/RasterReader.h"

namespace zelm {

// Sets or clears bit 0 for every sample of a tile that was read.
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
