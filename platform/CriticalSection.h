// The recursive lock that the object model calls a critical section.
//
// A plain record with four operations, because it is embedded in structures whose life is managed
// by hand. Initialise before the first use, delete after the last; entering again on the thread
// that holds it succeeds, and leaves as often as it entered. Leaving on a thread that does not hold
// it, deleting one that is held, or using one before it is initialised is undefined. Nothing throws
// unless the system is out of locks. On Windows the platform's own type and functions take this
// header's place.
#ifndef ZMC_PLATFORM_CRITICALSECTION_H
#define ZMC_PLATFORM_CRITICALSECTION_H

#include <cstddef>
#include <mutex>
#include <new>

struct CRITICAL_SECTION {
    alignas(std::recursive_mutex) std::byte storage[sizeof(std::recursive_mutex)];

    // The lock that Initialize made there.
    std::recursive_mutex& Mutex() {
        return *std::launder(reinterpret_cast<std::recursive_mutex*>(storage));
    }
};

// The four take the address of the record, which must not move while it is in use.
inline void InitializeCriticalSection(CRITICAL_SECTION* section) {
    ::new (static_cast<void*>(section->storage)) std::recursive_mutex;
}
inline void EnterCriticalSection(CRITICAL_SECTION* section) { section->Mutex().lock(); }
inline void LeaveCriticalSection(CRITICAL_SECTION* section) { section->Mutex().unlock(); }
inline void DeleteCriticalSection(CRITICAL_SECTION* section) {
    section->Mutex().~recursive_mutex();
}

#endif
