// The two functions that the module exports.
#include <new>

#include "connection/DataConnectionFactory.h"
#include "connection/RasterDataConnectionFactory.h"

zelm::DataConnectionFactory* CreateDataConnectionFactory(const zelm::String& format) {
    if (!format.wide || !(format == "MemoryRaster" || format == "Pyramid")) return nullptr;
    return new (std::nothrow) zelm::RasterDataConnectionFactory;
}

void DeleteDataConnectionFactory(zelm::DataConnectionFactory* factory) { delete factory; }
