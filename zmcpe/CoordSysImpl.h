// CoordSysImpl: one coordinate system of the projection engine, as the engine's users see it.
//
// Reference-counted: an entry point that creates one hands its caller the only reference.
// ReleaseReference drops one and never destroys; when it answers less than 1, the object goes back
// to the engine by Esri_Pe_Release, and only that destroys it. A CoordSys (coordsys/CoordSys.h)
// does all this in its destructor.
//
// An object does not change once it is made: any thread may call any operation at any time. All
// work of PROJ is done in one context of the engine's under one lock, so batches of several threads
// run one after another. Nothing throws. The order of the operations is fixed.
#ifndef ZMC_ZMCPE_COORDSYSIMPL_H
#define ZMC_ZMCPE_COORDSYSIMPL_H

#include <cstddef>
#include <cstdint>

#include "core/String.h"

namespace zelm {

class CoordSysImpl {
public:
    enum class Kind : std::int32_t { Other = 0, Geographic = 1, Projected = 2 };

    // Drops one reference and returns how many remain.
    virtual std::int32_t ReleaseReference() = 0;
    // Adds one reference and returns how many there are.
    virtual std::int32_t AddReference() = 0;

    // Texts go into `text`, which becomes null where there is none.
    virtual void GetName(String& text) const = 0;
    virtual void GetDatumName(String& text) const = 0;
    virtual void GetUnitName(String& text) const = 0;

    // Size of the unit of the first axis: metres for a linear unit, degrees for an angular one.
    virtual double GetUnitFactor() const = 0;
    // 0: linear, 1: angular.
    virtual std::uint32_t GetUnitKind() const = 0;
    // EPSG code of the unit, or 0 if it has none.
    virtual std::int32_t GetUnitCode() const = 0;

    // Kind of the horizontal part: a system with heights is what it is without them.
    virtual Kind GetKind() const = 0;

    // The definition as WKT 2 (2019) on one line; null where WKT 2 has no words for it.
    virtual void GetWkt2(String& text) const = 0;

    // Transforms `count` points of this system into `target` in place, and returns how many came
    // out. Where a system's axes point north and then east, or are a pole's northing and easting, x
    // is the easting or longitude and y the northing or latitude, although its authority has them
    // the other way round. In every other system x is the first axis and y the second, each in its
    // own direction: EPSG:2053 has westing and southing, EPSG:2065 southing and westing. Units are
    // those of the systems; z may be null for points without heights. All coordinates of a point
    // that cannot be transformed become infinite. `target` must come from the same engine.
    virtual std::size_t Transform(const CoordSysImpl& target, std::size_t count, double* x,
                                  double* y, double* z) const = 0;

protected:
    ~CoordSysImpl() = default;
};

}  // namespace zelm

#endif
