// A loadable module that allocates in every common form, for the test of the allocation switch.
#include <new>

namespace {

struct alignas(64) Wide {
    char bytes[64];
};

// Keeps the compiler from leaving out allocations that nobody uses.
void* volatile sink;

template <class T>
bool Tried(T* memory) {
    sink = memory;
    const bool got = memory != nullptr;
    delete memory;
    return got;
}

template <class Allocate>
bool Caught(Allocate allocate) {
    try {
        return Tried(allocate());
    } catch (const std::bad_alloc&) {
        return false;
    }
}

}  // namespace

// One bit for each of four allocations that succeeded.
extern "C" __attribute__((visibility("default"))) unsigned AllocateFourTimes() {
    unsigned got = 0;
    if (Caught([] { return new int(1); })) got |= 1;
    if (Tried(new (std::nothrow) int(2))) got |= 2;
    if (Caught([] { return new Wide; })) got |= 4;
    if (Tried(new (std::nothrow) Wide)) got |= 8;
    return got;
}
