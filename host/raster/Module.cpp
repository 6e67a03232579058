#include "host/raster/Module.h"

#include <utility>

#include "host/base/Error.h"
#include "host/base/Text.h"

namespace zmchost {
namespace {

// Both kinds of connection come from one class of connections, so the pointer to the base is also
// one to the derived class, which shares its record.
zelm::RasterDataConnectionPtr AsRaster(const zelm::DataConnectionPtr& connection) {
    zelm::RasterDataConnectionPtr raster;
    if (!connection) return raster;
    connection.record->count.fetch_add(1);
    raster.Release();
    raster.record = connection.record;
    return raster;
}

zelm::RasterDataConnectionPtr Open(zelm::DataConnectionFactory& factory, const char* kind,
                                   const zelm::String& parameters) {
    zelm::Array<zelm::String> argument;
    if (!argument.Append(kind) || !argument.Append(parameters)) throw std::bad_alloc();
    return AsRaster(factory.Open(argument, zelm::GeoRefPtr(), zelm::MetadataPtr()));
}

}  // namespace

ModulePtr Module::Load(const std::string& path) {
    zmcraster::LoadedModule opened = zmcraster::OpenModule(path);
    if (!opened) throw Error(opened.path, "load the raster module", opened.reason);
    const std::shared_ptr<Module> module(new Module(std::move(opened)));
    module->factory = module->loaded.create("Pyramid");
    if (!module->factory)
        throw Error(module->Path(), "use the raster module", "it gives no factory");
    return module;
}

std::string Module::DefaultPath() { return zmcraster::FindModule(); }

Module::Module(zmcraster::LoadedModule opened) : loaded(std::move(opened)) {}

Module::~Module() {
    if (factory) loaded.destroy(factory);
    zmcraster::CloseModule(loaded);
}

zelm::RasterDataConnectionPtr Module::OpenPyramid(const std::string& file) const {
    return Open(*factory, "Pyramid", WideFileName(file));
}

zelm::RasterDataConnectionPtr Module::OpenMemoryRaster(const std::string& parameters) const {
    return Open(*factory, "MemoryRaster", zelm::String(parameters.c_str()));
}

zelm::RasterDataConnectionPtr Module::CreatePyramid(const std::string& file,
                                                    zelm::RasterProps props) const {
    props.formatName = "Pyramid";
    zelm::Array<zelm::String> argument;
    if (!argument.Append(WideFileName(file))) throw std::bad_alloc();
    return AsRaster(factory->Create(argument, props));
}

}  // namespace zmchost
