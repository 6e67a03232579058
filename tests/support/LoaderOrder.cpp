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

}  // namespace

extern "C" {

void* __real_dlopen(const char* name, int mode);
int __real_dlclose(void* library);
void* __wrap_dlopen(const char* name, int mode);
int __wrap_dlclose(void* library);

void* __wrap_dlopen(const char* name, int mode) {
    const std::lock_guard<std::recursive_mutex> lock(Order());
    return __real_dlopen(name, mode);
}

int __wrap_dlclose(void* library) {
    const std::lock_guard<std::recursive_mutex> lock(Order());
    return __real_dlclose(library);
}
}
