// DataConnectionFactory: makes connections from connection arguments, and the two functions by
// which a host gets one.
//
// A connection argument is an array of strings: an optional format word ("MemoryRaster" or
// "Pyramid") and the parameters. The order of the operations is fixed, the destructor last.
// Nothing throws; failure is false or an empty pointer. A factory has no state, so calls may
// overlap, and connections may outlive it. The module must stay loaded as long as anything that
// came from it.
//
//     Array<String> argument;
//     argument.Append(String("Pyramid"));
//     argument.Append(String("/data/scene.pyr"));
//     DataConnectionPtr connection = factory->Open(argument, GeoRefPtr(), MetadataPtr());
//     if (!connection) ...   // not a pyramid, or not to be opened
#ifndef ZMC_CONNECTION_DATACONNECTIONFACTORY_H
#define ZMC_CONNECTION_DATACONNECTIONFACTORY_H

#include "connection/DataConnection.h"
#include "core/Array.h"
#include "core/String.h"
#include "raster/RasterProps.h"

namespace zelm {

class DataConnectionFactory {
public:
    // True: what this factory makes are connections to rasters, RasterDataConnection.
    virtual bool IsRasterFactory() = 0;
    // True if the argument could be opened here; the dataset itself is not touched.
    virtual bool Test(const Array<String>& connection) = 0;
    // The open connection, or an empty pointer. `metadata` is released without being read.
    virtual DataConnectionPtr Open(const Array<String>& connection, GeoRefPtr geoRef,
                                   MetadataPtr metadata) = 0;
    // A connection to a new dataset of props' format, or an empty pointer.
    virtual DataConnectionPtr Create(const Array<String>& connection, const RasterProps& props) = 0;
    // Always empty.
    virtual DataConnectionPtr CreateDefault() = 0;
    virtual ~DataConnectionFactory() = default;
};

}  // namespace zelm

#if defined(_WIN32)
#define ZMCRASTER_EXPORT extern "C" __declspec(dllexport)
#else
#define ZMCRASTER_EXPORT extern "C" __attribute__((visibility("default")))
#endif

// All that the module exports. The first gives a factory that the caller owns and hands back to
// the second, or null unless `format` is "MemoryRaster" or "Pyramid". Null may be deleted.
ZMCRASTER_EXPORT zelm::DataConnectionFactory* CreateDataConnectionFactory(
    const zelm::String& format);
ZMCRASTER_EXPORT void DeleteDataConnectionFactory(zelm::DataConnectionFactory* factory);

#endif
