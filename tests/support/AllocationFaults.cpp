#include "tests/support/AllocationFaults.h"

#include <cstdlib>
#include <new>

namespace testsupport {
namespace {

struct State {
    bool armed;
    std::size_t failAt;
    FaultMode mode;
    std::size_t count;
    std::size_t failed;
};

// Plain data, so that it needs no initialiser and can be met by the first allocation of a thread.
thread_local State state;

bool ShallFail() {
    if (!state.armed) return false;
    ++state.count;
    const bool fail =
        state.failAt != 0 &&
        (state.mode == FaultMode::Once ? state.count == state.failAt : state.count >= state.failAt);
    if (fail) ++state.failed;
    return fail;
}

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

AllocationFaults::AllocationFaults(std::size_t n, FaultMode mode) { state = {true, n, mode, 0, 0}; }
AllocationFaults::~AllocationFaults() { Disarm(); }
void AllocationFaults::Disarm() { state.armed = false; }
void AllocationFaults::Rearm() { state = {true, state.failAt, state.mode, 0, 0}; }
std::size_t AllocationFaults::Count() const { return state.count; }
std::size_t AllocationFaults::Failed() const { return state.failed; }

}  // namespace testsupport

using testsupport::OrThrow;
using testsupport::Take;
using testsupport::TakeAligned;

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
