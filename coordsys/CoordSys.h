// CoordSys: handle on one coordinate system of the projection engine.
//
// Destroying the handle releases its reference on the engine object, under the lock of the
// subsystem where there is one; the last reference gives the object back to the engine, which the
// release loads if nobody has. A handle without an engine object touches nothing. Handles are not
// copied. BindCoordSys.h makes bound ones.
#ifndef ZMC_COORDSYS_COORDSYS_H
#define ZMC_COORDSYS_COORDSYS_H

#include <cstdint>

#include "coordsys/CoordSysInfo.h"

namespace zelm {

class CoordSysImpl;

class CoordSys {
public:
    CoordSysImpl* impl = nullptr;  // one reference on it is ours; null in an unbound handle
    std::uint32_t id;              // counts the handles that this module has made, from 1
    CoordSysInfo info;

    CoordSys();
    CoordSys(const CoordSys&) = delete;
    CoordSys& operator=(const CoordSys&) = delete;
    virtual ~CoordSys();

private:
    void ReleaseImpl();
};

}  // namespace zelm

#endif
