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

// As open, with a mode of 0666, O_CLOEXEC, and a number that is no standard stream's even where
// those are closed; -1 with errno on failure.
inline int OpenForData(const char* path, int flags) {
    const int opened = Uninterrupted([&] { return ::open(path, flags | O_CLOEXEC, 0666); });
    if (opened < 0 || opened >= kFirstDataDescriptor) return opened;
    const int moved = ::fcntl(opened, F_DUPFD_CLOEXEC, kFirstDataDescriptor);
    const int kept = errno;
    ::close(opened);
    errno = kept;
    return moved;
}

}  // namespace platform

#endif
