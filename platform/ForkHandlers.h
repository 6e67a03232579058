// What is to be done when the process makes a copy of itself.
#ifndef ZMC_PLATFORM_FORKHANDLERS_H
#define ZMC_PLATFORM_FORKHANDLERS_H

namespace platform {

// From now on, `before` runs in front of every fork, on the thread that forks, and `after` behind
// it, in both processes. With `before` taking a lock and `after` giving it back, the copy never
// starts with the lock held by a thread that it does not have. For the life of the process: the
// functions must stay loaded. They must not throw. Of systems without fork nothing is asked.
void AtFork(void (*before)(), void (*after)());

}  // namespace platform

#endif
