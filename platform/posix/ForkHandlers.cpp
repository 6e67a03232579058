#include "platform/ForkHandlers.h"

#include <pthread.h>

namespace platform {

// Fails for want of memory alone. A fork is then as good as without handlers, which is right unless
// another thread holds the lock at that very moment.
void AtFork(void (*before)(), void (*after)()) {
    static_cast<void>(pthread_atfork(before, after, after));
}

}  // namespace platform
