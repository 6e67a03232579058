// What the system tells of a file, as FileStatus has it.
#ifndef ZMC_PLATFORM_POSIX_STATUSFROM_H
#define ZMC_PLATFORM_POSIX_STATUSFROM_H

#include <sys/stat.h>

#include "platform/FileSystem.h"

namespace platform {

// Without `readOnly` where that depends on the process: it is true of what nobody may write.
inline FileStatus StatusFrom(const struct stat& info) {
    FileStatus status;
    status.exists = true;
    status.isFolder = S_ISDIR(info.st_mode);
    status.isRegular = S_ISREG(info.st_mode);
    status.readOnly = (info.st_mode & (S_IWUSR | S_IWGRP | S_IWOTH)) == 0;
    if (status.isRegular) status.size = static_cast<std::uint64_t>(info.st_size);
    status.number = static_cast<std::uint64_t>(info.st_ino);
    status.owner = static_cast<std::uint64_t>(info.st_uid);
    return status;
}

}  // namespace platform

#endif
