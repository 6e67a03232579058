// What PROJ says of a coordinate system, taken down once so that answering needs no lock.
#ifndef ZMC_ZMCPE_PROJDESCRIPTION_H
#define ZMC_ZMCPE_PROJDESCRIPTION_H

#include <proj.h>

#include "zmcpe/CoordSysImpl.h"
#include "zmcpe/ProjContext.h"

namespace zelm {

struct ProjDescription {
    String name;
    String datumName;
    String unitName;
    String wkt2;
    double unitFactor = 1.0;
    std::uint32_t unitKind = 0;
    std::int32_t unitCode = 0;
    CoordSysImpl::Kind kind = CoordSysImpl::Kind::Other;
};

ProjDescription DescribeProj(PJ_CONTEXT* context, const PJ* crs) ZMC_REQUIRES(projMutex);

}  // namespace zelm

#endif
