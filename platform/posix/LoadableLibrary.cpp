#include "platform/LoadableLibrary.h"

#include <dlfcn.h>

#include <string>

#include "platform/TextConversion.h"

namespace platform {

const char kLibraryPrefix[] = "lib";
const char kLibrarySuffix[] = ".so";

LibraryHandle LoadLibraryFile(const char16_t* path) {
    if (!path) return nullptr;
    try {
        const std::size_t units = std::char_traits<char16_t>::length(path);
        const std::size_t bytes = Utf16ToUtf8(path, units, nullptr, 0);
        if (bytes == kConversionFailed) return nullptr;
        std::string narrow(bytes, '\0');
        Utf16ToUtf8(path, units, narrow.data(), bytes);
        return dlopen(narrow.c_str(), RTLD_NOW | RTLD_LOCAL);
    } catch (...) {
        return nullptr;
    }
}

void* FindSymbol(LibraryHandle library, const char* name) { return dlsym(library, name); }

void UnloadLibrary(LibraryHandle library) { dlclose(library); }

}  // namespace platform
