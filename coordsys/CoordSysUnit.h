// The units of coordinate systems, with their factors and codes.
#ifndef ZMC_COORDSYS_COORDSYSUNIT_H
#define ZMC_COORDSYS_COORDSYSUNIT_H

#include <cstddef>
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

inline constexpr std::size_t kCoordSysUnitCount = 17;

// The last row, "THE_END", is the end mark. The factor of "SECOND" is ten times a second of arc:
// tables of other modules carry the same figure, and a description must compare equal to theirs.
extern const CoordSysUnit kCoordSysUnits[kCoordSysUnitCount];

}  // namespace zelm

#endif
