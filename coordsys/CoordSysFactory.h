// CoordSysFactory: finds the projection engine by the directory settings, starts the projection
// log, loads the engine and initialises it.
//
// One per process, shared through gpCoordSysFactoryInstance, created on first use and not deleted.
// A missing engine leaves a factory whose entry points are null. The first call is not guarded
// against a second one on another thread; see BindCoordSys.h for a host's way in.
#ifndef ZMC_COORDSYS_COORDSYSFACTORY_H
#define ZMC_COORDSYS_COORDSYSFACTORY_H

#include "coordsys/CoordSysFuncPtrs.h"

namespace zelm {

class CoordSysFactory {
public:
    CoordSysFuncPtrs funcPtrs;

    CoordSysFactory() = default;
    CoordSysFactory(const CoordSysFactory&) = delete;
    CoordSysFactory& operator=(const CoordSysFactory&) = delete;
    virtual ~CoordSysFactory() = default;

    // The factory; null if memory ran out or the engine threw while it started, and then without
    // entry points either. Never throws.
    static CoordSysFactory* GetInstance();

    // Reads the settings of the bin, pe and gdal directories, each "Not Set" if it is empty, and
    // brings up log and engine. Always 1, whatever the engine answers. Throws std::bad_alloc.
    int Init();
};

}  // namespace zelm

#endif
