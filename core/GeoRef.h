// GeoRef: georeference of a raster, defined by the host. The module carries it and calls nothing
// but the operations below.
//
// A host derives its own class, hands an object of it to Open in a GeoRefPtr, and finds a clone in
// the properties of the raster (RasterProps::geoRef), which it casts back. Each record of
// properties has a clone of its own: the module calls it on the threads on which its host copies,
// changes and drops records, and on none of its own. Both operations may throw; the record that was
// to change is then as it was, and across the module's interface come the answers of failure:
// false, an empty pointer, or a record that is not valid.
#ifndef ZMC_CORE_GEOREF_H
#define ZMC_CORE_GEOREF_H

#include <cstdint>

#include "core/Pointer.h"

namespace zelm {

class GeoRef {
public:
    virtual ~GeoRef() = default;
    // A new object that the caller owns, of the same place on earth. Never null.
    virtual GeoRef* Clone() const = 0;
    // Tells the size of the raster, in samples and lines of level 0: to a clone that a record
    // takes, and when SetSamples or SetLines changes the record's.
    virtual void SetRasterSize(std::uint32_t samples, std::uint32_t lines) = 0;
};

// Shares one georeference among its copies. Empty where a raster has none.
class GeoRefPtr : public Pointer<GeoRef> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
