// The table of units of coordinate systems, with their factors and codes.
#ifndef ZMC_COORDSYS_COORDSYSUNIT_H
#define ZMC_COORDSYS_COORDSYSUNIT_H

#include <cstdint>

#include "core/String.h"

namespace zelm {

struct CoordSysUnit {
    String name;
    String label;  // for display
    double factor;
    std::uint32_t kind;  // 0: linear, the factor is in metres; 1: angular, it is in degrees
    std::int32_t code;
};

// The last row, "THE_END", is the end mark. A vocabulary for hosts, which nothing here reads: what
// `info` says of a coordinate system is the engine's word. The factor of "SECOND" is ten times a
// second of arc, and stays so, since the rows are fixed; do not compute with it.
extern const CoordSysUnit kCoordSysUnits[];

}  // namespace zelm

#endif
