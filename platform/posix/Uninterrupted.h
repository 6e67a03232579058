// Calls of the system that signals interrupt.
#ifndef ZMC_PLATFORM_POSIX_UNINTERRUPTED_H
#define ZMC_PLATFORM_POSIX_UNINTERRUPTED_H

#include <cerrno>

namespace platform {

// The answer of a call that is made again as often as a signal interrupts it.
template <class Call>
int Uninterrupted(Call&& call) {
    int result;
    do {
        result = call();
    } while (result < 0 && errno == EINTR);
    return result;
}

}  // namespace platform

#endif
