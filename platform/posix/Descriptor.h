// Descriptors of files that hold data.
#ifndef ZMC_PLATFORM_POSIX_DESCRIPTOR_H
#define ZMC_PLATFORM_POSIX_DESCRIPTOR_H

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "platform/posix/Uninterrupted.h"

namespace platform {

// The lowest number that is not one of the standard streams.
inline constexpr int kFirstDataDescriptor = 3;

// The same open file under a number that is no standard stream's, even where those are closed; -1
// with errno on failure, and for a descriptor below 0.
inline int AwayFromStreams(int opened) {
    if (opened < 0 || opened >= kFirstDataDescriptor) return opened;
    const int moved = ::fcntl(opened, F_DUPFD_CLOEXEC, kFirstDataDescriptor);
    const int kept = errno;
    ::close(opened);
    errno = kept;
    return moved;
}

// As open, with a mode of 0666, O_CLOEXEC, and such a number.
inline int OpenForData(const char* path, int flags) {
    return AwayFromStreams(Uninterrupted([&] { return ::open(path, flags | O_CLOEXEC, 0666); }));
}

}  // namespace platform

#endif
