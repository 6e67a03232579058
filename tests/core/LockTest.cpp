#include "core/Lock.h"

#include <gtest/gtest.h>

#include <thread>

namespace zelm {
namespace {

class LockTest : public ::testing::Test {
protected:
    LockTest() { InitializeCriticalSection(&section); }
    ~LockTest() override { DeleteCriticalSection(&section); }

    bool FreeForAnotherThread() {
        bool taken = false;
        std::thread([&] {
            taken = section.Mutex().try_lock();
            if (taken) section.Mutex().unlock();
        }).join();
        return taken;
    }

    CRITICAL_SECTION section;
};

TEST_F(LockTest, NullSectionIsNeitherEnteredNorLeft) {
    const std::unique_ptr<PrivateLock> lock(new MutexLock(nullptr));
    EXPECT_TRUE(FreeForAnotherThread());
}

TEST_F(LockTest, LeavesItsSectionWhenDeletedThroughTheBase) {
    PrivateLock* lock = new MutexLock(&section);
    EXPECT_FALSE(FreeForAnotherThread());
    delete lock;
    EXPECT_TRUE(FreeForAnotherThread());
}

TEST_F(LockTest, CanBeEnteredAgainOnTheSameThread) {
    auto outer = HoldLock(&section);
    {
        const auto inner = HoldLock(&section);
        EXPECT_FALSE(FreeForAnotherThread());
    }
    EXPECT_FALSE(FreeForAnotherThread());
    outer.reset();
    EXPECT_TRUE(FreeForAnotherThread());
}

TEST_F(LockTest, HoldingNothingIsANullHolder) { EXPECT_EQ(HoldLock(nullptr), nullptr); }

TEST_F(LockTest, IsLeftByAnException) {
    try {
        const auto lock = HoldLock(&section);
        throw 1;
    } catch (int) {
    }
    EXPECT_TRUE(FreeForAnotherThread());
}

TEST_F(LockTest, ReservedOperationsDoNothing) {
    MutexLock lock(&section);
    lock.ReservedLockOperation1();
    lock.ReservedLockOperation2();
    EXPECT_FALSE(FreeForAnotherThread());
}

}  // namespace
}  // namespace zelm
