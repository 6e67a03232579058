// GeoRef: georeference of a raster, defined by the host. The module carries it and calls nothing
// but the operations below.
#ifndef ZMC_CORE_GEOREF_H
#define ZMC_CORE_GEOREF_H

#include <cstdint>

#include "core/Pointer.h"

namespace zelm {

class GeoRef {
public:
    virtual ~GeoRef() = default;
    // A new object that the caller owns.
    virtual GeoRef* Clone() const = 0;
    // Tells the size of the raster, in samples and lines.
    virtual void SetRasterSize(std::uint32_t samples, std::uint32_t lines) = 0;
};

class GeoRefPtr : public Pointer<GeoRef> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
