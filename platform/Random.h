// Randomness of the system.
#ifndef ZMC_PLATFORM_RANDOM_H
#define ZMC_PLATFORM_RANDOM_H

#include <cstddef>

namespace platform {

// Fills `buffer` with bytes that nobody can foretell, whatever else of the process they know. False
// if the system has none, with no promise for the buffer. Any thread; nothing throws. Waits, once
// after the start of a machine, until the system has gathered enough.
bool RandomBytes(void* buffer, std::size_t size);

}  // namespace platform

#endif
