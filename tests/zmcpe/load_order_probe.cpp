// Loads the libraries of its command line in their order, uses those that it finds among them, and
// unloads them in the order that they were loaded in, or, after the word "reverse", the other way.
#include <dlfcn.h>

#include <algorithm>
#include <cstdio>
#include <string>
#include <vector>

#include "zmcpe/CoordSysImpl.h"

namespace {

template <class Function>
Function* Find(void* library, const char* name) {
    return reinterpret_cast<Function*>(dlsym(library, name));
}

bool UseEngine(void* library) {
    const auto initialize = Find<int(zelm::String&, zelm::String&)>(library, "Esri_Pe_Initialize");
    if (!initialize) return true;  // another library
    const auto create = Find<zelm::CoordSysImpl*(int)>(library, "Esri_Pe_CreateFromCode");
    const auto release = Find<int(zelm::CoordSysImpl*)>(library, "Esri_Pe_Release");
    zelm::String none;
    if (initialize(none, none) != 1) return false;
    zelm::CoordSysImpl* const impl = create(4326);
    zelm::String name;
    impl->GetName(name);
    return name == "WGS 84" && impl->ReleaseReference() == 0 && release(impl) == 1;
}

bool UseSibling(void* library) {
    const auto draw = Find<unsigned(const zelm::String&)>(library, "GloballyUniqueObjectTypeCode");
    return !draw || (draw("Object") != 0 && draw("Object") == draw("Object"));
}

}  // namespace

int main(int argc, char** argv) {
    std::vector<void*> libraries;
    bool reverse = false;
    for (int i = 1; i < argc; ++i) {
        if (std::string(argv[i]) == "reverse") {
            reverse = true;
            continue;
        }
        libraries.push_back(dlopen(argv[i], RTLD_NOW | RTLD_LOCAL));
        if (!libraries.back()) {
            std::fprintf(stderr, "%s\n", dlerror());
            return 1;
        }
        if (!UseSibling(libraries.back()) || !UseEngine(libraries.back())) return 2;
    }
    for (void* library : libraries)
        if (!UseEngine(library) || !UseSibling(library)) return 3;
    if (reverse) std::reverse(libraries.begin(), libraries.end());
    for (void* library : libraries)
        if (dlclose(library) != 0) return 4;
    std::puts("done");
    return 0;
}
