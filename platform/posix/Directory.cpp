#include "platform/Directory.h"

#include <sys/stat.h>
#include <unistd.h>

namespace platform {

const char kPathSeparator[] = "/";

bool PathExists(const char* name) { return name && access(name, F_OK) == 0; }

bool MakeDirectory(const char* name) { return name && mkdir(name, 0777) == 0; }

}  // namespace platform
