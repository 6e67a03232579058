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
#include <mutex>

namespace zelm {

struct PjDestroyer {
    void operator()(PJ* object) const { proj_destroy(object); }
};
using PjHolder = std::unique_ptr<PJ, PjDestroyer>;  // destroy under the lock

class ProjUser;

// Holds the lock for as long as it lives.
class ProjContext {
public:
    ProjContext();

    // The context, made by the first use; null if it cannot be made or is gone for good.
    PJ_CONTEXT* Get();

    // Objects that hold something of PROJ, to be told when it goes.
    void Enlist(ProjUser* user);
    void Dismiss(ProjUser* user);

    // Lets every user drop what it holds, and ends the context for good.
    void CloseForGood();

private:
    std::lock_guard<std::mutex> lock;
};

class ProjUser {
public:
    ProjUser* previous = nullptr;  // neighbours in the context's list; the context's alone to touch
    ProjUser* next = nullptr;

    // Destroys everything of PROJ that the user holds; called under the lock.
    virtual void DropProj() = 0;

protected:
    ~ProjUser() = default;
};

}  // namespace zelm

#endif
