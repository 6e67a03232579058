// Description of a coordinate system: what handles carry of it. A plain record; one thread at a
// time.
//
// DescribeCoordSys (BindCoordSys.h) fills in the name of the datum and the unit, which is all that
// the engine here tells. The other fields are places for engines and hosts of other makes; the
// order of the fields is fixed, since both sides are compiled apart. The defaults are those of a
// system that nobody has described: an unknown datum, in metres.
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
    CoordSysParameter parameters[3];  // of the projection
    String unitName = "Meter";        // of coordinates, as the engine calls it
    double unitFactor = 1.0;          // metres for a linear unit, degrees for an angular one
    std::uint32_t unitKind = 0;       // 0: linear, 1: angular
    std::int32_t unitCode = 9001;     // EPSG code of the unit: 9001 is the metre
    String lastText;
    std::byte block[128] = {};  // room of the engine's own
};

}  // namespace zelm

#endif
