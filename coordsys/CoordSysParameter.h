// One parameter of a coordinate system, as text and as number: two forms of one value, in the unit
// that the engine gives it. Zero in a system that nobody has described.
#ifndef ZMC_COORDSYS_COORDSYSPARAMETER_H
#define ZMC_COORDSYS_COORDSYSPARAMETER_H

#include "core/String.h"

namespace zelm {

struct CoordSysParameter {
    String text = "0.0";  // for display
    double value = 0.0;   // for computing
};

}  // namespace zelm

#endif
