// What the sources of platform/File.h and of those who open files in other ways share.
#ifndef ZMC_PLATFORM_POSIX_FILEPARTS_H
#define ZMC_PLATFORM_POSIX_FILEPARTS_H

#include <sys/stat.h>

#include <memory>

#include "platform/File.h"

namespace platform {

FileIdentity IdentityFrom(const struct stat& status);

// The file of a descriptor that was opened for reading, which is taken over; null, with errno in
// `error`, for a descriptor below 0 and for what is no regular file.
std::unique_ptr<File> TakeForReading(int descriptor, int* error);

}  // namespace platform

#endif
