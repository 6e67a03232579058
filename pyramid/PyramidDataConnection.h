// PyramidDataConnection: a raster in a pyramid file.
//
// The one parameter is the file name, taken exactly as it is given. The connection holds a counted
// reference on the dataset, as does every reader built from it, so that readers work on after
// Close. The reader is built once and kept from then on: a connection that is closed and opened
// again hands out the old one, still bound to the old file. Of the georeference and the metadata
// the readers get those given to Open. One thread at a time.
#ifndef ZMC_PYRAMID_PYRAMIDDATACONNECTION_H
#define ZMC_PYRAMID_PYRAMIDDATACONNECTION_H

#include "connection/RasterDataConnection.h"
#include "pyramid/PyramidDataset.h"

namespace zelm {

class PyramidDataConnection final : public RasterDataConnection {
public:
    PyramidDatasetPtr dataset;  // empty while closed
    GeoRefPtr geoRef;
    MetadataPtr metadata;
    RasterReaderDispatchPtr reader;  // empty until asked for
    RasterProps rasterProps;         // last answer of GetRasterProps
    Array<String> parameters;
    String connectionString;

    PyramidDataConnection() = default;
    PyramidDataConnection(const PyramidDataConnection&) = delete;
    PyramidDataConnection& operator=(const PyramidDataConnection&) = delete;
    ~PyramidDataConnection() override;

    // Without exactly one parameter, false and nothing else. Other failures close the connection.
    bool Open(const Array<String>& openParameters, GeoRefPtr newGeoRef,
              MetadataPtr newMetadata) override;
    // Metadata, reader, properties and connection string stay.
    void Close() override;
    bool IsOpen() override { return static_cast<bool>(dataset); }
    Array<String> GetParameters() override { return parameters; }
    String GetConnectionString() override { return connectionString; }
    bool IsAvailable() override { return static_cast<bool>(dataset); }
    std::uint32_t GetPixelType() override { return dataset ? dataset->PixelType : 0; }
    // Always false; on an open connection it leaves the reader built.
    bool IsReadable() override;
    bool ReservedConnectionQuery() override { return false; }

    // A null pointer if memory ran out; the next call tries again.
    RasterReaderDispatchPtr GetReader() override;
    RasterProps GetRasterProps() override;
    // Describes a new file by the first parameter, its name, and `props`, whose format has to be
    // one of the known ones. No file exists before a reader's BuildPyramid.
    bool Create(const Array<String>& createParameters, const RasterProps& props) override;

    PyramidDatasetPtr GetDataset() const { return dataset; }

private:
    bool TakeName(const String& fileName);
};

}  // namespace zelm

#endif
