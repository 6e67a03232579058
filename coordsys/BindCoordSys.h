// A host's way to coordinate systems: from a text or a code to a bound CoordSys with its
// description filled in.
//
// The engine is found by the directory settings (EnvironmentKeys.h) and loaded by the first call,
// so fill the table before. Destroying the result releases the engine object. Nothing throws; any
// thread may call, also several at a time.
#ifndef ZMC_COORDSYS_BINDCOORDSYS_H
#define ZMC_COORDSYS_BINDCOORDSYS_H

#include <memory>

#include "coordsys/CoordSys.h"

namespace zelm {

// The system that a text describes: WKT 1 or 2, PROJJSON, a PROJ string or "EPSG:n". Null without
// an engine, or if the engine refuses the text.
std::unique_ptr<CoordSys> BindCoordSys(const String& definition);

// The system of an EPSG code; null likewise.
std::unique_ptr<CoordSys> BindCoordSys(int epsgCode);

// What `info` of a bound CoordSys says: datum and unit as the engine object gives them. A datum
// that has no name, and the other fields, keep their defaults.
CoordSysInfo DescribeCoordSys(const CoordSysImpl& impl);

}  // namespace zelm

#endif
