#include "tests/support/AllocationFaults.h"

#include <dlfcn.h>

#include <atomic>
#include <memory>
#include <new>
#include <thread>
#include <vector>

namespace zmctest {
namespace {

// Keeps the compiler from leaving out an allocation that nobody uses.
void* volatile sink;

bool Allocates() {
    void* const memory = ::operator new(16, std::nothrow);
    sink = memory;
    ::operator delete(memory);
    return memory != nullptr;
}

TEST(AllocationFaults, OnceFailsTheNthAlone) {
    AllocationFaults faults(2);
    const bool got[] = {Allocates(), Allocates(), Allocates()};
    faults.Disarm();
    EXPECT_TRUE(got[0]);
    EXPECT_FALSE(got[1]);
    EXPECT_TRUE(got[2]);
    EXPECT_EQ(faults.Count(), 3u);
    EXPECT_EQ(faults.Failed(), 1u);
    EXPECT_TRUE(Allocates());
    EXPECT_EQ(faults.Count(), 3u);
}

TEST(AllocationFaults, FromThenOnFailsTheRest) {
    AllocationFaults faults(2, FaultMode::FromThenOn);
    const bool got[] = {Allocates(), Allocates(), Allocates()};
    faults.Disarm();
    EXPECT_TRUE(got[0]);
    EXPECT_FALSE(got[1]);
    EXPECT_FALSE(got[2]);
    EXPECT_EQ(faults.Failed(), 2u);
}

TEST(AllocationFaults, ThrowingFormsThrow) {
    bool thrown[4] = {};
    const auto attempt = [&thrown](int form, auto allocate) {
        AllocationFaults faults(1);
        try {
            allocate();
        } catch (const std::bad_alloc&) {
            thrown[form] = true;
        }
    };
    attempt(0, [] { ::operator delete(::operator new(8)); });
    attempt(1, [] { ::operator delete[](::operator new[](8)); });
    attempt(2, [] {
        ::operator delete (::operator new (8, std::align_val_t{64}), std::align_val_t{64});
    });
    attempt(3, [] { std::vector<int> grown(10); });
    for (const bool each : thrown) EXPECT_TRUE(each);
}

TEST(AllocationFaults, OtherThreadsAreLeftAlone) {
    std::atomic<bool> go{false};
    bool got = false;
    std::thread other([&] {
        while (!go) std::this_thread::yield();
        got = Allocates();
    });
    {
        AllocationFaults faults(1, FaultMode::FromThenOn);
        go = true;
        other.join();
        EXPECT_EQ(faults.Failed(), 0u);
    }
    EXPECT_TRUE(got);
}

TEST(AllocationFaults, CountsWhatACallAllocates) {
    EXPECT_EQ(CountAllocations([] { Allocates(); }), 1u);
    EXPECT_EQ(CountAllocations([] {}), 0u);
}

TEST(AllocationFaults, EachPointOfFailureIsMetOnceInEachMode) {
    int attempts = 0;
    const std::size_t points = ForEachAllocationFailing([&attempts](AllocationFaults&) {
        ++attempts;
        Allocates();
        Allocates();
        Allocates();
    });
    EXPECT_EQ(points, 3u);
    EXPECT_EQ(attempts, 8);  // three failures and one success, twice
}

TEST(AllocationFaults, ReachTheModulesThatAProgramLoads) {
    void* const module = dlopen(ZMC_ALLOCATING_MODULE, RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(module, nullptr) << dlerror();
    const auto allocate = reinterpret_cast<unsigned (*)()>(dlsym(module, "AllocateFourTimes"));
    ASSERT_NE(allocate, nullptr);
    EXPECT_EQ(allocate(), 15u);
    unsigned got[5] = {};
    for (std::size_t n = 1; n <= 4; ++n) {
        AllocationFaults faults(n);
        got[n] = allocate();
    }
    EXPECT_EQ(got[1], 15u - 1);
    EXPECT_EQ(got[2], 15u - 2);
    EXPECT_EQ(got[3], 15u - 4);
    EXPECT_EQ(got[4], 15u - 8);
    dlclose(module);
}

}  // namespace
}  // namespace zmctest
