// OpenModule: the loadable raster module, found and loaded, wherever the install stands.
//
//     const zmcraster::LoadedModule module = zmcraster::OpenModule();
//     if (!module) std::printf("%s: %s\n", module.path.c_str(), module.reason.c_str());
//     zelm::DataConnectionFactory* const factory = module.create("Pyramid");
//
// This code is a shared library that stands in one folder with the module's own folder, so its own
// place tells where the module is: an install can be moved or be reached through links, and a host
// needs no path. The working directory, the name that the program was started by and the search
// path of the system's loader play no part.
//
// Nothing throws, but for memory that runs out; any thread may call.
#ifndef ZMC_LOADER_OPENMODULE_H
#define ZMC_LOADER_OPENMODULE_H

#include <string>

#include "connection/DataConnectionFactory.h"

#if defined(_WIN32)
#define ZMCLOADER_EXPORT
#else
#define ZMCLOADER_EXPORT __attribute__((visibility("default")))
#endif

namespace zmcraster {

// What loading gave: the two functions of the module, or the reason why there are none. A plain
// value that may be copied; dropping it unloads nothing.
struct LoadedModule {
    std::string path;    // the file that was loaded, or should have been
    std::string reason;  // why it was not, as it stands behind "cannot load it: "; else empty

    // Makes a factory for "Pyramid" or "MemoryRaster", null for another word; and takes it back.
    // A connection may outlive its factory. Both are null where `reason` is not empty.
    decltype(&CreateDataConnectionFactory) create = nullptr;
    decltype(&DeleteDataConnectionFactory) destroy = nullptr;

    void* library = nullptr;  // the system's handle; one reference on the library

    explicit operator bool() const { return library != nullptr; }
};

// Where OpenModule() finds the module: the absolute path in the environment variable
// ZMCRASTER_MODULE, if it is set; else the module in the folder `zmcraster` beside this library, as
// installed; else the one beside this library itself, as built; else the one below the prefix that
// this library was configured for. If none of them is there, the first of these places. A program
// with the rights of another user than the one who started it ignores the variable.
ZMCLOADER_EXPORT std::string FindModule();

// Starts Xerces-C++, which the module uses and leaves to its host, and loads the module of that
// path; without one, that of FindModule(). ZMCRASTER_MODULE is refused where it holds a relative
// path. Loading it again gives the same library once more.
ZMCLOADER_EXPORT LoadedModule OpenModule(const std::string& path = {});

// Unloads the library once it is closed as often as it was opened, and empties the value. Every
// object that came out of the module has gone before, palettes and metadata included; most hosts
// keep it loaded until they end, and never call this.
ZMCLOADER_EXPORT void CloseModule(LoadedModule& module);

// Starts Xerces-C++ once, whoever asks and however often; it is never ended, since others in the
// process may still need it, and its start and end do not bear overlapping. OpenModule does it. A
// program that loads a library which starts Xerces itself, as GDAL does, calls this before. The
// reason where it does not start, else an empty text; a later call tries again.
ZMCLOADER_EXPORT std::string StartXerces();

}  // namespace zmcraster

#endif
