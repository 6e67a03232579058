// Scoped locks that are made on the heap and held through their base.
//
// `new MutexLock(section)` enters, deleting through PrivateLock* leaves; the holder on the stack
// is a std::unique_ptr<PrivateLock>. A null section, or an allocation that gives nothing, means
// that the code goes on with no lock held.
#ifndef ZMC_CORE_LOCK_H
#define ZMC_CORE_LOCK_H

#include <memory>
#include <new>

#include "platform/CriticalSection.h"

namespace zelm {

class PrivateLock {
public:
    PrivateLock() = default;
    PrivateLock(const PrivateLock&) = delete;
    PrivateLock& operator=(const PrivateLock&) = delete;
    virtual ~PrivateLock() = default;
    // Two places of the interface that no lock fills and nobody calls.
    virtual void ReservedLockOperation1() {}
    virtual void ReservedLockOperation2() {}
};

class MutexLock : public PrivateLock {
public:
    // Blocks until the section is free; null locks nothing.
    explicit MutexLock(CRITICAL_SECTION* lockedSection) : section(lockedSection) {
        if (section) EnterCriticalSection(section);
    }
    ~MutexLock() override {
        if (section) LeaveCriticalSection(section);
        section = nullptr;
    }

private:
    CRITICAL_SECTION* section;
};

// Locks `section` for as long as the result lives.
inline std::unique_ptr<PrivateLock> HoldLock(CRITICAL_SECTION* section) {
    return std::unique_ptr<PrivateLock>(section ? new (std::nothrow) MutexLock(section) : nullptr);
}

}  // namespace zelm

#endif
