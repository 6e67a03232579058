// Whether the program runs under the address sanitizer, which makes everything slower and larger.
#ifndef ZMC_TESTS_SUPPORT_SANITIZERS_H
#define ZMC_TESTS_SUPPORT_SANITIZERS_H

#include <dlfcn.h>

namespace zmctest {

inline bool IsSanitized() {
    static const bool sanitized = dlsym(RTLD_DEFAULT, "__asan_init") != nullptr;
    return sanitized;
}

}  // namespace zmctest

#endif
