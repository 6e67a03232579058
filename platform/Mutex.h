// A lock that says what it guards, and has the compiler check it.
//
// clang's thread-safety analysis follows locks that are marked as such, which those of the standard
// library are not; so here is one, with its holder and the marks. Members and functions carry
// ZMC_GUARDED_BY and ZMC_REQUIRES with the lock that they need, and a build by clang refuses code
// that does not hold it. Other compilers see nothing of it. Constructors and destructors are not
// followed: an object that is being made or destroyed is known to one thread.
#ifndef ZMC_PLATFORM_MUTEX_H
#define ZMC_PLATFORM_MUTEX_H

#include <mutex>

#if defined(__clang__)
#define ZMC_THREAD_MARK(mark) __attribute__((mark))
#else
#define ZMC_THREAD_MARK(mark)
#endif

// A member or variable that is read and written under `mutex` alone.
#define ZMC_GUARDED_BY(mutex) ZMC_THREAD_MARK(guarded_by(mutex))
// A function whose caller holds the lock.
#define ZMC_REQUIRES(...) ZMC_THREAD_MARK(requires_capability(__VA_ARGS__))
// A function that takes the lock, or gives it back.
#define ZMC_ACQUIRE(...) ZMC_THREAD_MARK(acquire_capability(__VA_ARGS__))
#define ZMC_RELEASE(...) ZMC_THREAD_MARK(release_capability(__VA_ARGS__))
// A class that is a lock, and one that holds a lock for as long as it lives.
#define ZMC_LOCK ZMC_THREAD_MARK(capability("mutex"))
#define ZMC_LOCK_HOLDER ZMC_THREAD_MARK(scoped_lockable)
// A function that needs no lock for a reason which the compiler cannot see; say the reason.
#define ZMC_NO_LOCK_NEEDED ZMC_THREAD_MARK(no_thread_safety_analysis)

namespace platform {

class ZMC_LOCK Mutex {
public:
    void Lock() ZMC_ACQUIRE() { mutex.lock(); }
    void Unlock() ZMC_RELEASE() { mutex.unlock(); }

private:
    std::mutex mutex;
};

// Holds `heldMutex` for as long as it lives.
class ZMC_LOCK_HOLDER MutexHolder {
public:
    explicit MutexHolder(Mutex& heldMutex) ZMC_ACQUIRE(heldMutex) : mutex(heldMutex) {
        mutex.Lock();
    }
    MutexHolder(const MutexHolder&) = delete;
    MutexHolder& operator=(const MutexHolder&) = delete;
    ~MutexHolder() ZMC_RELEASE() { mutex.Unlock(); }

private:
    Mutex& mutex;
};

}  // namespace platform

#endif
