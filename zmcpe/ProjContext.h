// The engine's one PROJ context, and the lock under which all of PROJ is called.
//
// A context per thread would need thread-local destructors, and those crash a process that unloads
// the library first. When the library goes, at unload or at the end of the process, the objects
// that are still alive lose what they hold of PROJ before PROJ itself goes; they can then still be
// released, but transform nothing.
#ifndef ZMC_ZMCPE_PROJCONTEXT_H
#define ZMC_ZMCPE_PROJCONTEXT_H

#include <proj.h>

#include <memory>

#include "platform/Mutex.h"

namespace zelm {

struct PjDestroyer {
    void operator()(PJ* object) const { proj_destroy(object); }
};
using PjHolder = std::unique_ptr<PJ, PjDestroyer>;  // destroy under the lock

class ProjUser;

// Guards the context, the list of its users, and whatever they hold of PROJ.
extern platform::Mutex projMutex;

// Holds the lock for as long as it lives.
class ZMC_LOCK_HOLDER ProjContext {
public:
    ProjContext() ZMC_ACQUIRE(projMutex);
    ProjContext(const ProjContext&) = delete;
    ProjContext& operator=(const ProjContext&) = delete;
    ~ProjContext() ZMC_RELEASE();

    // The context, made by the first use; null if it cannot be made or is gone for good.
    PJ_CONTEXT* Get() ZMC_REQUIRES(projMutex);

    // Objects that hold something of PROJ, to be told when it goes.
    void Enlist(ProjUser* user) ZMC_REQUIRES(projMutex);
    void Dismiss(ProjUser* user) ZMC_REQUIRES(projMutex);

    // Lets every user drop what it holds, and ends the context for good.
    void CloseForGood() ZMC_REQUIRES(projMutex);
};

class ProjUser {
public:
    // Neighbours in the context's list; the context's alone to touch.
    ProjUser* previous ZMC_GUARDED_BY(projMutex) = nullptr;
    ProjUser* next ZMC_GUARDED_BY(projMutex) = nullptr;

    // Destroys everything of PROJ that the user holds.
    virtual void DropProj() ZMC_REQUIRES(projMutex) = 0;

protected:
    ~ProjUser() = default;
};

}  // namespace zelm

#endif
