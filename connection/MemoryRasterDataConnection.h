// MemoryRasterDataConnection: a raster in the caller's own memory, described by a parameter string
// that carries the buffer's address as text.
//
//   SAMPLES=640;LINES=480;BANDS=2;INTERLEAVE=2;PIXELTYPE=12;PIXELSIZE=1,1;TIEPTMAP=0,0;NAME=scene;
//   PIXELDATA=0x55d01a2b3c40
//
// All nine keys are required, in any order, in upper case. PIXELSIZE and TIEPTMAP must be pairs of
// numbers and have no effect: the georeference is the one given to Open. Pixels are never
// allocated, copied as a whole or freed here, and the buffer must live as long as the reader.
//
// The address is taken as it stands: one that is a number but not the caller's memory, or a buffer
// too small for the sizes, cannot be told from a good one. Such a string is therefore made only by
// code of the process, and never taken from outside of it. One thread at a time.
#ifndef ZMC_CONNECTION_MEMORYRASTERDATACONNECTION_H
#define ZMC_CONNECTION_MEMORYRASTERDATACONNECTION_H

#include "connection/RasterDataConnection.h"

namespace zelm {

class MemoryRasterDataConnection final : public RasterDataConnection {
public:
    bool initialised = true;  // never cleared
    String name;              // value of NAME, handed out nowhere
    RasterReaderDispatchPtr reader;
    RasterProps rasterProps;
    void* pixelData = nullptr;  // the caller's buffer
    Array<String> parameters;
    String connectionString;

    MemoryRasterDataConnection() = default;
    MemoryRasterDataConnection(const MemoryRasterDataConnection&) = delete;
    MemoryRasterDataConnection& operator=(const MemoryRasterDataConnection&) = delete;
    ~MemoryRasterDataConnection() override;

    // Without exactly one parameter, false and nothing else. Other failures, memory that runs out
    // among them, close the connection and may leave a new name. An unreadable address succeeds and
    // leaves it without pixels, so that IsOpen is false.
    bool Open(const Array<String>& openParameters, GeoRefPtr geoRef, MetadataPtr metadata) override;
    // The reader, the name and the connection string stay: a reader in use works on.
    void Close() override;
    bool IsOpen() override;
    Array<String> GetParameters() override;
    String GetConnectionString() override;
    bool IsAvailable() override;
    std::uint32_t GetPixelType() override;
    bool IsReadable() override;
    bool ReservedConnectionQuery() override { return false; }

    // A null pointer if memory ran out; the next call tries again.
    RasterReaderDispatchPtr GetReader() override;
    // Takes the reader's properties over. With an invalid dispatch these are the defaults, which
    // closes the connection in effect.
    RasterProps GetRasterProps() override;
    bool Create(const Array<String>&, const RasterProps&) override { return false; }

private:
    bool ParseMemoryParameters(const String& source, const GeoRefPtr& geoRef);
    bool TakeParameters(const String& source);
};

}  // namespace zelm

#endif
