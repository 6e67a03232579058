// The contract between the module and its sibling `zmcg`: thirteen names, and nothing else.
//
// Any library that exports these names under this contract can stand in zmcg's place. The two
// functions that draw codes, and the table of settings, must work from load-time initialisers of
// any module in the process, whatever the order of loading; the data symbols are therefore
// constant-initialised, and the functions keep their state in objects that arise on first use and
// are never destroyed. The code functions are safe to call from any thread; the rest is not
// synchronised.
#ifndef ZMC_ZMCG_ZMCG_H
#define ZMC_ZMCG_ZMCG_H

#include <oneapi/tbb/mutex.h>

#include <cstdint>

#include "core/ObjectCodes.h"  // two of the names
#include "core/String.h"
#include "zmcg/EnvironmentImpl.h"
#include "zmcg/FormatRecord.h"

class MetadataParseLog;

namespace zelm {
class CoordSysFactory;
class CoordSysImpl;
class CoordSysLog;
}  // namespace zelm

// The formats that datasets can have; read-only for every user.
ZMCG_SYMBOL FormatRecord gCdfFormatRecords[];
ZMCG_SYMBOL std::int32_t gCdfFormatRecordCount;

// The process-wide parse log, created by whoever builds the first Metadata.
ZMCG_SYMBOL MetadataParseLog* gpMetadataParseLogInstance;

// The one table of directory settings of the process. A C name with a C++ type is meant: symbols
// are found by plain name.
#if defined(__clang__)
#pragma clang diagnostic push
#pragma clang diagnostic ignored "-Wreturn-type-c-linkage"
#endif
ZMCG_SYMBOL zelm::EnvironmentImpl& GetGlobalEnvironmentImpl();
#if defined(__clang__)
#pragma clang diagnostic pop
#endif

// The coordinate-system singletons and the entry points of the projection engine; all null until
// the engine is asked for. gpCoordSysMutex points to a critical section, whatever its type says:
// only coordsys/CoordSysMutex.h looks behind it.
ZMCG_SYMBOL tbb::mutex* gpCoordSysMutex;
ZMCG_SYMBOL zelm::CoordSysLog* gpCoordSysLogInstance;
ZMCG_SYMBOL zelm::CoordSysFactory* gpCoordSysFactoryInstance;
ZMCG_SYMBOL int (*fp_Esri_Pe_Initialize)(zelm::String&, zelm::String&);
ZMCG_SYMBOL zelm::CoordSysImpl* (*fp_Esri_Pe_CreateFromString)(const zelm::String&);
ZMCG_SYMBOL zelm::CoordSysImpl* (*fp_Esri_Pe_CreateFromCode)(int);
ZMCG_SYMBOL int (*fp_Esri_Pe_Release)(zelm::CoordSysImpl*);

#endif
