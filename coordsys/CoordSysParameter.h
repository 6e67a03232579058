// One parameter of a coordinate system, as text and as number.
#ifndef ZMC_COORDSYS_COORDSYSPARAMETER_H
#define ZMC_COORDSYS_COORDSYSPARAMETER_H

#include "core/String.h"

namespace zelm {

struct CoordSysParameter {
    String text = "0.0";
    double value = 0.0;
};

}  // namespace zelm

#endif
