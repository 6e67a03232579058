#include "platform/Random.h"

#include <sys/random.h>
#include <sys/types.h>

#include <cerrno>

namespace platform {

bool RandomBytes(void* buffer, std::size_t size) {
    unsigned char* const bytes = static_cast<unsigned char*>(buffer);
    std::size_t done = 0;
    while (done < size) {
        const ssize_t got = ::getrandom(bytes + done, size - done, 0);
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) return false;
        done += static_cast<std::size_t>(got);
    }
    return true;
}

}  // namespace platform
