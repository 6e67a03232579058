#include "tests/support/AllocationFaults.h"

#include <atomic>
#include <cstdlib>
#include <new>

// The parser library gives up its buffers without freeing them when its own memory runs out in the
// middle of a parse; nobody but it knows them. Leaks of ours are still reported.
extern "C" __attribute__((visibility("default"))) const char* __lsan_default_suppressions();
extern "C" const char* __lsan_default_suppressions() { return "leak:libxerces-c\n"; }

namespace zmctest {
namespace {

// Plain data, so that it needs no initialiser and can be met by the first allocation of a thread.
// Atomic because that of the process is met by all of them.
struct State {
    std::atomic<bool> armed;
    std::size_t failAt;
    FaultMode mode;
    std::atomic<std::size_t> count;
    std::atomic<std::size_t> failed;

    void Start(std::size_t n, FaultMode newMode) {
        armed = false;
        failAt = n;
        mode = newMode;
        count = failed = 0;
        armed = true;
    }

    bool ShallFail() {
        if (!armed) return false;
        const std::size_t number = ++count;
        const bool fail =
            failAt != 0 && (mode == FaultMode::Once ? number == failAt : number >= failAt);
        if (fail) ++failed;
        return fail;
    }
};

thread_local State ofThread;
State ofProcess;

State& Of(FaultScope scope) { return scope == FaultScope::Thread ? ofThread : ofProcess; }

bool ShallFail() { return ofThread.ShallFail() || ofProcess.ShallFail(); }

void* Take(std::size_t size) { return ShallFail() ? nullptr : std::malloc(size != 0 ? size : 1); }

void* TakeAligned(std::size_t size, std::align_val_t alignment) {
    if (ShallFail()) return nullptr;
    const auto align = static_cast<std::size_t>(alignment);
    return std::aligned_alloc(align, (size + align - 1) / align * align);
}

void* OrThrow(void* memory) {
    if (!memory) throw std::bad_alloc();
    return memory;
}

}  // namespace

AllocationFaults::AllocationFaults(std::size_t n, FaultMode mode, FaultScope ofWhat)
    : scope(ofWhat) {
    Of(scope).Start(n, mode);
}
AllocationFaults::~AllocationFaults() { Disarm(); }
void AllocationFaults::Disarm() { Of(scope).armed = false; }
void AllocationFaults::Rearm() { Of(scope).Start(Of(scope).failAt, Of(scope).mode); }
std::size_t AllocationFaults::Count() const { return Of(scope).count; }
std::size_t AllocationFaults::Failed() const { return Of(scope).failed; }

}  // namespace zmctest

using zmctest::OrThrow;
using zmctest::Take;
using zmctest::TakeAligned;

void* operator new(std::size_t size) { return OrThrow(Take(size)); }
void* operator new[](std::size_t size) { return OrThrow(Take(size)); }
void* operator new(std::size_t size, const std::nothrow_t&) noexcept { return Take(size); }
void* operator new[](std::size_t size, const std::nothrow_t&) noexcept { return Take(size); }
void* operator new(std::size_t size, std::align_val_t a) { return OrThrow(TakeAligned(size, a)); }
void* operator new[](std::size_t size, std::align_val_t a) { return OrThrow(TakeAligned(size, a)); }
void* operator new(std::size_t size, std::align_val_t a, const std::nothrow_t&) noexcept {
    return TakeAligned(size, a);
}
void* operator new[](std::size_t size, std::align_val_t a, const std::nothrow_t&) noexcept {
    return TakeAligned(size, a);
}

void operator delete(void* p) noexcept { std::free(p); }
void operator delete[](void* p) noexcept { std::free(p); }
void operator delete(void* p, std::size_t) noexcept { std::free(p); }
void operator delete[](void* p, std::size_t) noexcept { std::free(p); }
void operator delete(void* p, const std::nothrow_t&) noexcept { std::free(p); }
void operator delete[](void* p, const std::nothrow_t&) noexcept { std::free(p); }
void operator delete(void* p, std::align_val_t) noexcept { std::free(p); }
void operator delete[](void* p, std::align_val_t) noexcept { std::free(p); }
void operator delete(void* p, std::size_t, std::align_val_t) noexcept { std::free(p); }
void operator delete[](void* p, std::size_t, std::align_val_t) noexcept { std::free(p); }
void operator delete(void* p, std::align_val_t, const std::nothrow_t&) noexcept { std::free(p); }
void operator delete[](void* p, std::align_val_t, const std::nothrow_t&) noexcept { std::free(p); }
