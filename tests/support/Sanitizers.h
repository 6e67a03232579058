// Whether the program runs under the address sanitizer, which makes everything slower and larger.
#ifndef ZMC_TESTS_SUPPORT_SANITIZERS_H
#define ZMC_TESTS_SUPPORT_SANITIZERS_H

#include <dlfcn.h>

namespace zmctest {

inline bool IsSanitized() {
    static const bool sanitized = dlsym(RTLD_DEFAULT, "__asan_init") != nullptr;
    return sanitized;
}

// How much of a long test is done: all of it, or with sanitizers, which look at each step of the
// code and need no further repetition of it, `share`.
template <class Length>
Length WithSanitizers(Length share, Length all) {
    return IsSanitized() ? share : all;
}

}  // namespace zmctest

#endif
