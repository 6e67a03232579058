// RasterDataConnection: a connection to a raster.
#ifndef ZMC_CONNECTION_RASTERDATACONNECTION_H
#define ZMC_CONNECTION_RASTERDATACONNECTION_H

#include "connection/DataConnection.h"
#include "dispatch/RasterReaderDispatch.h"
#include "raster/RasterProps.h"

namespace zelm {

// DataConnection is its first and only base, so that pointers to both share one record.
class RasterDataConnection : public DataConnection {
public:
    // The reader, built by the first call and kept from then on, whatever happens to the
    // connection: an invalid dispatch fixed before Open stays invalid.
    virtual RasterReaderDispatchPtr GetReader() = 0;
    // The properties as the reader has them, no-data values included.
    virtual RasterProps GetRasterProps() = 0;
    // Makes a new dataset; false for a memory raster.
    virtual bool Create(const Array<String>& parameters, const RasterProps& props) = 0;
    // Wraps `this` in a pointer with a record of its own, which deletes the connection when its
    // last copy goes, whatever other pointers hold it: keep the result until those are gone.
    virtual DataConnectionPtr GetSelf() { return DataConnectionPtr(this); }
};

class RasterDataConnectionPtr : public Pointer<RasterDataConnection> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
