// The four functions that the engine exports, by plain name and nothing else.
//
// They are found by name at run time (coordsys/CoordSysFuncPtrs.h), so nobody links against them.
// Nothing throws; any thread may call.
#ifndef ZMC_ZMCPE_ENTRYPOINTS_H
#define ZMC_ZMCPE_ENTRYPOINTS_H

#include "zmcpe/CoordSysImpl.h"

#define ZMCPE_EXPORT extern "C" __attribute__((visibility("default")))

// Directories that PROJ searches for its data before its own, in place of those of an earlier call.
// An empty text or "Not Set" names none. 1 if the engine is ready to work, else 0, as with a
// directory whose database cannot be used: it is the first of its name, so the engine knows no code
// until the next call. Without this call the engine works with PROJ's own data. Objects that are
// there already keep what they know.
ZMCPE_EXPORT int Esri_Pe_Initialize(zelm::String& peDirectory, zelm::String& gdalDirectory);

// The coordinate system that a text describes: WKT 1 or 2, PROJJSON, a PROJ string, "EPSG:n".
// Null for what PROJ refuses and for what is no coordinate system.
ZMCPE_EXPORT zelm::CoordSysImpl* Esri_Pe_CreateFromString(const zelm::String& definition);

// The coordinate system of an EPSG code; null likewise.
ZMCPE_EXPORT zelm::CoordSysImpl* Esri_Pe_CreateFromCode(int code);

// Destroys an object without references and returns 1. 0 for null, and for an object that still
// has references, which stays.
ZMCPE_EXPORT int Esri_Pe_Release(zelm::CoordSysImpl* impl);

#endif
