// Module: the loadable raster module, held by whoever uses an object that came out of it.
//
// Loading takes the two functions by which the module is reached and makes its factory. The library
// is unloaded when the last holder lets go, so every object of this library that wraps one of the
// module's keeps a ModulePtr:
//
//     const zmchost::ModulePtr module = zmchost::Module::Load();
//     zmchost::Raster raster = zmchost::Raster::Open(module, "scene.pyr");
//
// A host that keeps connections, palettes or metadata of its own beside those objects keeps a
// ModulePtr as long as them: code of an unloaded library would run when they go. One Module serves
// any number of rasters; loading again gives another that shares the library. Opening and creating
// may run on several threads; what they return belongs to one thread at a time.
#ifndef ZMC_HOST_RASTER_MODULE_H
#define ZMC_HOST_RASTER_MODULE_H

#include <memory>
#include <string>

#include "connection/DataConnectionFactory.h"
#include "connection/RasterDataConnection.h"
#include "loader/OpenModule.h"
#include "raster/RasterProps.h"

namespace zmchost {

class Module;
using ModulePtr = std::shared_ptr<const Module>;

class Module {
public:
    // Loads the module of that path; an empty path means DefaultPath(). Starts Xerces-C++, which
    // the module needs and leaves to its host. Throws Error, with nothing left loaded, if there is
    // no such file, or it cannot be loaded, or it is another library.
    static ModulePtr Load(const std::string& path = {});

    // Where zmcraster::FindModule finds it: what ZMCRASTER_MODULE names, else what was installed or
    // built with this library.
    static std::string DefaultPath();

    ~Module();
    Module(const Module&) = delete;
    Module& operator=(const Module&) = delete;

    // The file that was loaded, as it was found or named.
    const std::string& Path() const { return loaded.path; }

    // An open connection to the pyramid file of that UTF-8 name, or to the memory raster that the
    // parameter string describes; the memory that the string names lives as long as the connection.
    // Empty if the module refuses, which it does without a reason. Throws Error for a name that is
    // empty or no UTF-8, and std::bad_alloc.
    zelm::RasterDataConnectionPtr OpenPyramid(const std::string& file) const;
    zelm::RasterDataConnectionPtr OpenMemoryRaster(const std::string& parameters) const;
    // A connection to a pyramid that has no file yet; props.formatName is set here. Empty if the
    // module refuses the properties. Throws as above.
    zelm::RasterDataConnectionPtr CreatePyramid(const std::string& file,
                                                zelm::RasterProps props) const;

private:
    explicit Module(zmcraster::LoadedModule opened);

    zmcraster::LoadedModule loaded;
    zelm::DataConnectionFactory* factory = nullptr;
};

}  // namespace zmchost

#endif
