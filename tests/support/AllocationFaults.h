// Allocations that fail on purpose.
//
// A test program that links zmc_allocation_faults has every form of operator new and delete
// replaced, in the program and in the modules that it loads, by malloc and free behind a switch:
// while an AllocationFaults lives, the n-th allocation of its thread fails, by std::bad_alloc or by
// null as the form promises. Counting and failing are per thread, so that other threads (a
// scheduler's, a sanitizer's) are left alone, unless the whole process is asked for.
#ifndef ZMC_TESTS_SUPPORT_ALLOCATIONFAULTS_H
#define ZMC_TESTS_SUPPORT_ALLOCATIONFAULTS_H

#include <gtest/gtest.h>

#include <cstddef>
#include <string>

namespace zmctest {

enum class FaultMode {
    Once,        // the n-th allocation alone fails
    FromThenOn,  // the n-th fails and all that follow
};

enum class FaultScope {
    Thread,
    Process,  // all threads, whose allocations count as they come
};

// One at a time on a thread, and one of the whole process.
class AllocationFaults {
public:
    // `n` counts from 1, starting with the next allocation; 0 lets none fail and only counts.
    explicit AllocationFaults(std::size_t n, FaultMode mode = FaultMode::Once,
                              FaultScope scope = FaultScope::Thread);
    ~AllocationFaults();
    AllocationFaults(const AllocationFaults&) = delete;
    AllocationFaults& operator=(const AllocationFaults&) = delete;

    // Lets all further allocations succeed; the counts stand. Call it before an expectation, which
    // allocates itself.
    void Disarm();
    // Starts again, with the counts at 0: for attempts that disarm to make what they need.
    void Rearm();
    // Allocations asked for since construction, failed ones included.
    std::size_t Count() const;
    // How many of them failed.
    std::size_t Failed() const;

private:
    FaultScope scope;
};

// Allocations that `call` asks for.
template <class Call>
std::size_t CountAllocations(Call&& call) {
    AllocationFaults counter(0);
    call();
    counter.Disarm();
    return counter.Count();
}

// Runs `attempt(faults)` with the 1st, 2nd, ... allocation failing, in both modes, until a run
// meets no failure; returns the points of failure met in the first mode. `attempt` makes its own
// objects, calls what is tested, and disarms before it looks at the result.
template <class Attempt>
std::size_t ForEachAllocationFailing(Attempt&& attempt, std::size_t limit = 100000) {
    std::size_t points = 0;
    for (const FaultMode mode : {FaultMode::Once, FaultMode::FromThenOn}) {
        bool failed = true;
        for (std::size_t n = 1; failed && n <= limit; ++n) {
            SCOPED_TRACE((mode == FaultMode::Once ? "allocation " : "allocations from ") +
                         std::to_string(n));
            AllocationFaults faults(n, mode);
            attempt(faults);
            faults.Disarm();
            failed = faults.Failed() != 0;
            if (failed && mode == FaultMode::Once) points = n;
        }
        EXPECT_FALSE(failed) << "the limit of attempts was met";
    }
    return points;
}

}  // namespace zmctest

#endif
