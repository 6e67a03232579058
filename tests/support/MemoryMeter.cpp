#include "tests/support/MemoryMeter.h"

#include <malloc.h>

#include <algorithm>
#include <cstdlib>
#include <new>

namespace zmctest {
namespace {

struct State {
    bool on;
    std::int64_t inUse;
    std::int64_t peak;
};
// Plain data, so that it can be met by the first allocation of a thread.
thread_local State state;

void* Took(void* memory) {
    if (state.on && memory) {
        state.inUse += static_cast<std::int64_t>(malloc_usable_size(memory));
        state.peak = std::max(state.peak, state.inUse);
    }
    return memory;
}
void* Take(std::size_t size) { return Took(std::malloc(size != 0 ? size : 1)); }
void* TakeAligned(std::size_t size, std::align_val_t alignment) {
    const auto align = static_cast<std::size_t>(alignment);
    return Took(std::aligned_alloc(align, (size + align - 1) / align * align));
}
void* OrThrow(void* memory) {
    if (!memory) throw std::bad_alloc();
    return memory;
}
void Give(void* memory) noexcept {
    if (state.on && memory) state.inUse -= static_cast<std::int64_t>(malloc_usable_size(memory));
    std::free(memory);
}

}  // namespace

void MemoryMeter::Reset() { state = {}; }
void MemoryMeter::Switch(bool on) { state.on = on; }
std::int64_t MemoryMeter::Peak() { return state.peak; }

}  // namespace zmctest

using zmctest::Give;
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

void operator delete(void* p) noexcept { Give(p); }
void operator delete[](void* p) noexcept { Give(p); }
void operator delete(void* p, std::size_t) noexcept { Give(p); }
void operator delete[](void* p, std::size_t) noexcept { Give(p); }
void operator delete(void* p, const std::nothrow_t&) noexcept { Give(p); }
void operator delete[](void* p, const std::nothrow_t&) noexcept { Give(p); }
void operator delete(void* p, std::align_val_t) noexcept { Give(p); }
void operator delete[](void* p, std::align_val_t) noexcept { Give(p); }
void operator delete(void* p, std::size_t, std::align_val_t) noexcept { Give(p); }
void operator delete[](void* p, std::size_t, std::align_val_t) noexcept { Give(p); }
void operator delete(void* p, std::align_val_t, const std::nothrow_t&) noexcept { Give(p); }
void operator delete[](void* p, std::align_val_t, const std::nothrow_t&) noexcept { Give(p); }
