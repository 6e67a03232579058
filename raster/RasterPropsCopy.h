// A copy of a reader's properties for an operation that may not throw.
#ifndef ZMC_RASTER_RASTERPROPSCOPY_H
#define ZMC_RASTER_RASTERPROPSCOPY_H

#include <cstdint>
#include <limits>

#include "raster/RasterProps.h"

namespace zelm {

// Interleave of a record that could not be copied. It is none of the codes, not even None, so that
// a mask is left alone rather than computed by a layout that the tile does not have.
inline constexpr std::int32_t kNoLayout = std::numeric_limits<std::int32_t>::min();

// What stands for a record that could not be copied: not valid, with kNoLayout for an interleave.
inline RasterProps PropsNotCopied() noexcept {
    RasterProps nothing;
    nothing.interleave = kNoLayout;
    return nothing;
}

// The copy, or PropsNotCopied where memory ran out or the host's georeference threw.
inline RasterProps CopyOfProps(const RasterProps& props) noexcept {
    try {
        return props;
    } catch (...) {
        return PropsNotCopied();
    }
}

}  // namespace zelm

#endif
