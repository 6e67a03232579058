// What the thread sanitizer cannot see of the dynamic loader: it is not instrumented, and it runs
// the initialisers and destructors of libraries under a recursive lock of its own, on whichever
// thread loads a library first and lets go of it last. Programs that link this take a lock of the
// same extent around it, which the sanitizer does see.
#include <dlfcn.h>

#include <mutex>

namespace {

// Never destroyed: libraries are unloaded up to the end of the process.
std::recursive_mutex& Order() {
    static auto* const order = new std::recursive_mutex;
    return *order;
}

template <class Function>
Function* Next(const char* name) {
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

// In the place of the system's own, for the shared libraries of the program too.
extern "C" {

__attribute__((visibility("default"))) void* dlopen(const char* name, int mode) noexcept {
    static const auto next = Next<void*(const char*, int)>("dlopen");
    const std::lock_guard<std::recursive_mutex> lock(Order());
    return next(name, mode);
}

__attribute__((visibility("default"))) int dlclose(void* library) noexcept {
    static const auto next = Next<int(void*)>("dlclose");
    const std::lock_guard<std::recursive_mutex> lock(Order());
    return next(library);
}
}
