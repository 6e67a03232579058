// Module: the loadable raster module, held by whoever uses an object that came out of it.
//
// Loading takes the two functions by which the module is reached and makes its factory. The library
// is unloaded when the last holder lets go, so every object of this library that wraps one of the
// module's keeps a ModulePtr. Opening and creating may run on several threads.
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
    // the module needs and leaves to its host. Throws Error.
    static ModulePtr Load(const std::string& path = {});

    // Where zmcraster::FindModule finds it: what ZMCRASTER_MODULE names, else what was installed or
    // built with this library.
    static std::string DefaultPath();

    ~Module();
    Module(const Module&) = delete;
    Module& operator=(const Module&) = delete;

    const std::string& Path() const { return loaded.path; }

    // An open connection to the pyramid file of that name, or to the memory raster that the
    // parameter string describes. Empty if the module refuses, which it does without a reason.
    zelm::RasterDataConnectionPtr OpenPyramid(const std::string& file) const;
    zelm::RasterDataConnectionPtr OpenMemoryRaster(const std::string& parameters) const;
    // A connection to a pyramid that has no file yet; props.formatName is set here.
    zelm::RasterDataConnectionPtr CreatePyramid(const std::string& file,
                                                zelm::RasterProps props) const;

private:
    explicit Module(zmcraster::LoadedModule opened);

    zmcraster::LoadedModule loaded;
    zelm::DataConnectionFactory* factory = nullptr;
};

}  // namespace zmchost

#endif
