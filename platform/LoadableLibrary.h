// Libraries that are loaded by path while the process runs.
//
// A handle stays good until it is unloaded as often as it was loaded. Nothing throws; any thread
// may call. Loading runs the library's initialisers.
#ifndef ZMC_PLATFORM_LOADABLELIBRARY_H
#define ZMC_PLATFORM_LOADABLELIBRARY_H

namespace platform {

using LibraryHandle = void*;

// What the platform puts before and behind the bare name of a library to name its file.
extern const char kLibraryPrefix[];
extern const char kLibrarySuffix[];

// Loads the library of that zero-terminated UTF-16 path, with all that it needs; null if that
// cannot be done.
LibraryHandle LoadLibraryFile(const char16_t* path);

// Address of an exported symbol, or null.
void* FindSymbol(LibraryHandle library, const char* name);

void UnloadLibrary(LibraryHandle library);

}  // namespace platform

#endif
