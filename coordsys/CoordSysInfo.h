// Description of a coordinate system. Fields without a meaning of their own here are the engine's;
// the order of the fields is fixed.
#ifndef ZMC_COORDSYS_COORDSYSINFO_H
#define ZMC_COORDSYS_COORDSYSINFO_H

#include <cstddef>
#include <cstdint>

#include "coordsys/CoordSysParameter.h"
#include "core/String.h"

namespace zelm {

// NOLINTNEXTLINE(bugprone-reserved-identifier): of the loop that a compiler copies arrays in.
struct CoordSysInfo {
    String firstText;
    std::int64_t firstValue = 0;
    String secondText;
    String thirdText;
    String datumName = "D_Unknown";
    String fifthText;
    CoordSysParameter parameters[3];
    String unitName = "Meter";
    double unitFactor = 1.0;     // metres for a linear unit, degrees for an angular one
    std::uint32_t unitKind = 0;  // 0: linear, 1: angular
    std::int32_t unitCode = 9001;
    String lastText;
    std::byte block[128] = {};
};

}  // namespace zelm

#endif
