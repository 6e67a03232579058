// What the process holds: descriptors, mappings, bytes on the heap, bytes in memory.
#ifndef ZMC_TESTS_SUPPORT_HOLDINGS_H
#define ZMC_TESTS_SUPPORT_HOLDINGS_H

#include <dlfcn.h>
#include <malloc.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <filesystem>
#include <fstream>

#include "tests/support/ScratchDirectory.h"

namespace zmctest {

struct Holdings {
    std::ptrdiff_t descriptors = 0, mappings = 0, heap = 0, resident = 0;
};

inline std::ptrdiff_t HeapBytes() {
    // The sanitizers keep a heap of their own, and count it.
    using Count = std::size_t (*)();
    static const auto count =
        reinterpret_cast<Count>(dlsym(RTLD_DEFAULT, "__sanitizer_get_current_allocated_bytes"));
    return static_cast<std::ptrdiff_t>(count ? count() : mallinfo2().uordblks);
}

inline Holdings HeldNow() {
    Holdings held;
    for ([[maybe_unused]] const auto& entry : std::filesystem::directory_iterator("/proc/self/fd"))
        ++held.descriptors;
    const std::string maps = ReadText("/proc/self/maps");
    held.mappings = std::count(maps.begin(), maps.end(), '\n');
    held.heap = HeapBytes();
    std::ptrdiff_t all = 0, pages = 0;
    std::ifstream("/proc/self/statm") >> all >> pages;
    held.resident = pages * sysconf(_SC_PAGESIZE);
    return held;
}

}  // namespace zmctest

#endif
