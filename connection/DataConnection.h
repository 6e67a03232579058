// DataConnection: the object through which a host reaches one dataset.
//
// Made empty, bound by Open, unbound by Close, and can be bound again. The order of the operations
// is fixed. Nothing throws and no reason is given: failure is a false or empty result. One thread
// at a time; the counts of the pointers alone are atomic.
//
// A host gets connections from a factory (DataConnectionFactory.h), bound already, and asks them
// for what they hold: RasterDataConnection.h tells of rasters, which all connections of this module
// are.
#ifndef ZMC_CONNECTION_DATACONNECTION_H
#define ZMC_CONNECTION_DATACONNECTION_H

#include <cstdint>

#include "core/Array.h"
#include "core/GeoRef.h"
#include "core/String.h"
#include "metadata/Metadata.h"

namespace zelm {

class DataConnection {
public:
    // Binds the connection to the dataset that `parameters`, one element, names: a parameter string
    // or a file name. The pointers may be empty, and are released by the callee.
    virtual bool Open(const Array<String>& parameters, GeoRefPtr geoRef, MetadataPtr metadata) = 0;
    // Lets go of the dataset. Readers that were handed out keep working on what they hold.
    virtual void Close() = 0;
    // Whether it is bound to a dataset.
    virtual bool IsOpen() = 0;
    // The kind word and the parameter string of the last success.
    virtual Array<String> GetParameters() = 0;
    // "{MemoryRaster}@" or "{PyramidRaster}@" and the parameter string; empty before the first
    // success. Nothing reads it back.
    virtual String GetConnectionString() = 0;
    // Whether the dataset can be used now.
    virtual bool IsAvailable() = 0;
    // Pixel type code, 0 if not open.
    virtual std::uint32_t GetPixelType() = 0;
    // What a memory raster answers by whether it is open; false of every pyramid, which is read by
    // its reader all the same.
    virtual bool IsReadable() = 0;
    // A place of the interface that nobody asks: always false.
    virtual bool ReservedConnectionQuery() = 0;
    virtual ~DataConnection() = default;
};

// Shares one connection among its copies; the last one deletes it.
class DataConnectionPtr : public Pointer<DataConnection> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
