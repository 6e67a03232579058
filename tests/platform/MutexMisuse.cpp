// Uses of what a lock guards without that lock, one for each value of ZMC_MISUSE.
#include "platform/Mutex.h"
#include "zmcpe/ProjContext.h"

struct Counter {
    platform::Mutex mutex;
    int count ZMC_GUARDED_BY(mutex) = 0;

    void Step() ZMC_REQUIRES(mutex) { ++count; }
};

void Use(Counter& counter, Counter& other, zelm::ProjUser* user) {
#if ZMC_MISUSE == 1
    counter.count = 1;  // misuse 1: written without the lock
#elif ZMC_MISUSE == 2
    const platform::MutexHolder lock(other.mutex);
    counter.Step();  // misuse 2: under the lock of another object
#elif ZMC_MISUSE == 3
    user->DropProj();  // misuse 3: PROJ without the engine's lock
#else
    {
        const platform::MutexHolder lock(counter.mutex);
        counter.Step();
    }
    const platform::MutexHolder lock(other.mutex);
    other.count = 1;
    const zelm::ProjContext context;
    user->DropProj();
#endif
}
