// The one place that knows what gpCoordSysMutex points to.
//
// The contract of zmcg types the symbol as a pointer to a TBB mutex, and says that it leads to a
// critical section: a lock that one thread may enter again, which a TBB mutex is not. An engine
// needs that, since it may destroy a coordinate system of its own inside a release. So the pointer
// is never used as what its type says, only converted here.
//
// The section guards the end of engine objects: from the count that ReleaseReference answers to the
// return of the object, no other thread releases one. The factory that such a release may have to
// make is guarded by it likewise, but for the first release of a process, before there is a
// section.
#ifndef ZMC_COORDSYS_COORDSYSMUTEX_H
#define ZMC_COORDSYS_COORDSYSMUTEX_H

#include <new>

#include "platform/CriticalSection.h"
#include "zmcg/zmcg.h"

namespace zelm {

// The section; null until the engine has been loaded.
inline CRITICAL_SECTION* CoordSysSection() {
    return reinterpret_cast<CRITICAL_SECTION*>(gpCoordSysMutex);
}

// Makes the section if there is none; it is never deleted. Without memory there is none.
inline void EnsureCoordSysSection() {
    if (gpCoordSysMutex) return;
    auto* section = new (std::nothrow) CRITICAL_SECTION;
    if (!section) return;
    InitializeCriticalSection(section);
    gpCoordSysMutex = reinterpret_cast<tbb::mutex*>(section);
}

}  // namespace zelm

#endif
