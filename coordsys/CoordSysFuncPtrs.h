// CoordSysFuncPtrs: the loaded library of the projection engine, and its four entry points.
//
// The entry points stand in the process-wide fp_Esri_Pe_ symbols; each may be null, and callers
// test it. One thread at a time.
#ifndef ZMC_COORDSYS_COORDSYSFUNCPTRS_H
#define ZMC_COORDSYS_COORDSYSFUNCPTRS_H

#include "core/String.h"
#include "platform/LoadableLibrary.h"

namespace zelm {

class CoordSysFuncPtrs {
public:
    platform::LibraryHandle module = nullptr;  // null until the library is loaded; owned

    CoordSysFuncPtrs() = default;
    CoordSysFuncPtrs(const CoordSysFuncPtrs&) = delete;
    CoordSysFuncPtrs& operator=(const CoordSysFuncPtrs&) = delete;
    // Unloads the library and leaves the entry points: they are the process's, and another loader
    // of the engine may be at work through them. Where there is none, they lead nowhere from then
    // on; whoever destroys the last loader sees to it that nobody calls them.
    virtual ~CoordSysFuncPtrs();

    // Loads the engine of that directory (see EngineFileName), fetches its entry points and makes
    // the lock of the subsystem. 1 on success. 0 without a file, without a loadable library, or at
    // the first entry point that is missing; the library then stays loaded, with the entry points
    // found before. Once loaded, the library is not searched again.
    int LoadFuncPtrs(const String& binDirectory);

    // Makes all entry points of the process null.
    static void ClearEntryPoints();

    // File name of the engine on this platform.
    static String EngineFileName();

private:
    bool FetchEntryPoints();
};

}  // namespace zelm

#endif
