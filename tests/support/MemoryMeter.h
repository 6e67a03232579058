// Counts what operator new gives out while it is switched on.
//
// A program that links MemoryMeter.cpp has every form of operator new and delete replaced, in
// itself and in the modules that it loads; the parser library takes its memory there too. What
// comes from malloc by other ways, as text conversion in the C library does, is not counted.
#ifndef ZMC_TESTS_SUPPORT_MEMORYMETER_H
#define ZMC_TESTS_SUPPORT_MEMORYMETER_H

#include <cstdint>

namespace zmctest {

// For one thread at a time; other threads are not counted.
struct MemoryMeter {
    static void Reset();  // off, with nothing in use
    static void Switch(bool on);
    static std::int64_t Peak();  // most bytes in use at once since Reset
};

}  // namespace zmctest

#endif
