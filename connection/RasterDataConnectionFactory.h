// RasterDataConnectionFactory: the one factory of the module, for memory rasters and pyramids.
//
// It makes a connection, asks it to open itself, and keeps it or drops it; it parses nothing and
// touches no file. Without a format word, what is no memory raster is taken for a file name.
#ifndef ZMC_CONNECTION_RASTERDATACONNECTIONFACTORY_H
#define ZMC_CONNECTION_RASTERDATACONNECTIONFACTORY_H

#include "connection/DataConnectionFactory.h"

namespace zelm {

class RasterDataConnectionFactory final : public DataConnectionFactory {
public:
    bool IsRasterFactory() override { return true; }
    bool Test(const Array<String>& connection) override;
    DataConnectionPtr Open(const Array<String>& connection, GeoRefPtr geoRef,
                           MetadataPtr metadata) override;
    DataConnectionPtr Create(const Array<String>& connection, const RasterProps& props) override;
    DataConnectionPtr CreateDefault() override { return DataConnectionPtr(); }

private:
    // The open connection, or an empty pointer.
    DataConnectionPtr OpenMemoryRaster(const Array<String>& parameters, const GeoRefPtr& geoRef);
    DataConnectionPtr OpenPyramid(const Array<String>& parameters, const GeoRefPtr& geoRef);
    DataConnectionPtr CreatePyramid(const Array<String>& parameters, const RasterProps& props);
};

}  // namespace zelm

#endif
