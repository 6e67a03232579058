#include "connection/RasterDataConnectionFactory.h"

#include <new>

#include "connection/ConnectionStrings.h"
#include "connection/MemoryRasterDataConnection.h"
#include "pyramid/PyramidDataConnection.h"

namespace zelm {
namespace {

constexpr const char* kMemoryRaster = "MemoryRaster";
constexpr const char* kPyramid = "Pyramid";

// Looks for three keys, whatever their case, and at no value: the test says yes to strings that
// Open refuses, whose keys are upper case.
bool ProbeMemoryRaster(const Array<String>& parameters) {
    if (parameters.shape.elements != 1) return false;
    String folded = parameters.data[0];
    if (folded.IsEmpty()) return false;
    folded.ToLower();
    for (const char* key : {"pixeldata=", "samples=", "lines="})
        if (folded.Find(key) == String::kNotFound) return false;
    return true;
}

// Any name will do: the file is not touched.
bool ProbePyramid(const Array<String>& parameters) {
    return parameters.shape.elements == 1 && parameters.data[0].wide &&
           !parameters.data[0].IsEmpty();
}

// Makes a connection and keeps it if it opens. It never sees the host's metadata: every connection
// starts with a new, empty pointer.
template <class Connection>
DataConnectionPtr OpenConnection(const Array<String>& parameters, const GeoRefPtr& geoRef) {
    const DataConnectionPtr connection(new (std::nothrow) Connection);
    if (connection && connection->Open(parameters, geoRef, MetadataPtr())) return connection;
    return DataConnectionPtr();
}

}  // namespace

bool RasterDataConnectionFactory::Test(const Array<String>& connection) {
    try {
        String kind;
        Array<String> parameters;
        SplitConnection(connection, kind, parameters);
        if (kind == kMemoryRaster) return ProbeMemoryRaster(parameters);
        if (kind == kPyramid) return ProbePyramid(parameters);
        return ProbeMemoryRaster(parameters) || ProbePyramid(parameters);
    } catch (...) {
        return false;
    }
}

DataConnectionPtr RasterDataConnectionFactory::Open(const Array<String>& connection,
                                                    GeoRefPtr geoRef, MetadataPtr) {
    try {
        String kind;
        Array<String> parameters;
        SplitConnection(connection, kind, parameters);
        if (kind == kPyramid) return OpenPyramid(parameters, geoRef);
        const DataConnectionPtr memory = OpenMemoryRaster(parameters, geoRef);
        if (memory || kind == kMemoryRaster) return memory;
        return OpenPyramid(parameters, geoRef);
    } catch (...) {
        return DataConnectionPtr();
    }
}

DataConnectionPtr RasterDataConnectionFactory::Create(const Array<String>& connection,
                                                      const RasterProps& props) {
    try {
        Array<String> parameters;
        ExtractConnectionParameters(connection, parameters);
        if (!(props.formatName == kPyramid)) return DataConnectionPtr();
        return CreatePyramid(parameters, props);
    } catch (...) {
        return DataConnectionPtr();
    }
}

DataConnectionPtr RasterDataConnectionFactory::OpenMemoryRaster(const Array<String>& parameters,
                                                                const GeoRefPtr& geoRef) {
    return OpenConnection<MemoryRasterDataConnection>(parameters, geoRef);
}

DataConnectionPtr RasterDataConnectionFactory::OpenPyramid(const Array<String>& parameters,
                                                           const GeoRefPtr& geoRef) {
    return OpenConnection<PyramidDataConnection>(parameters, geoRef);
}

DataConnectionPtr RasterDataConnectionFactory::CreatePyramid(const Array<String>& parameters,
                                                             const RasterProps& props) {
    const RasterDataConnectionPtr connection(new (std::nothrow) PyramidDataConnection);
    if (connection && connection->Create(parameters, props)) return DataConnectionPtr(connection);
    return DataConnectionPtr();
}

}  // namespace zelm
