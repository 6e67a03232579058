#include "host/raster/Module.h"

#include <cstdlib>

#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/base/Xerces.h"
#include "platform/FileSystem.h"
#include "platform/LoadableLibrary.h"

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

std::string ModuleFileName() {
    return std::string(platform::kLibraryPrefix) + "zmcraster" + platform::kLibrarySuffix;
}

template <class Function>
Function FindFunction(void* library, const char* name) {
    return reinterpret_cast<Function>(platform::FindSymbol(library, name));
}

}  // namespace

ModulePtr Module::Load(const std::string& path) {
    InitialiseXerces();
    const std::shared_ptr<Module> module(new Module(path.empty() ? DefaultPath() : path));
    module->Bind();
    return module;
}

std::string Module::DefaultPath() {
    // NOLINTNEXTLINE(concurrency-mt-unsafe): nothing of ours changes the environment.
    if (const char* const set = std::getenv("ZMCRASTER_MODULE"); set && *set) return set;
    const std::string name = ModuleFileName();
    const std::string here = platform::FolderOf(
        platform::FileOfCode(reinterpret_cast<const void*>(&Module::DefaultPath)));
    for (const char* const folder : {"", "zmcraster", "../zmcraster", "../lib/zmcraster", "../lib",
                                     ZMC_INSTALLED_MODULE_DIR}) {
        const bool absolute = folder[0] == '/';
        const std::string beside = *folder ? platform::JoinPath(here, folder) : here;
        const std::string candidate = platform::JoinPath(absolute ? folder : beside, name);
        if (platform::StatusOf(candidate).isRegular) return candidate;
    }
    return name;
}

Module::Module(std::string libraryPath) : path(std::move(libraryPath)) {}

void Module::Bind() {
    const zelm::String wide = WideFileName(path);
    library = platform::LoadLibraryFile(wide.wide);
    if (!library) {
        const bool there = platform::StatusOf(path).exists;
        throw Error(path, "load the raster module",
                    there ? "it is no loadable library, or one that it needs is missing"
                          : "there is no such file (set ZMCRASTER_MODULE to its path)");
    }
    using Create = zelm::DataConnectionFactory* (*)(const zelm::String&);
    const auto create = FindFunction<Create>(library, "CreateDataConnectionFactory");
    deleteFactory = FindFunction<decltype(deleteFactory)>(library, "DeleteDataConnectionFactory");
    if (!create || !deleteFactory)
        throw Error(path, "use the raster module", "its two functions are not in it");
    factory = create("Pyramid");
    if (!factory) throw Error(path, "use the raster module", "it gives no factory");
}

Module::~Module() {
    if (factory) deleteFactory(factory);
    if (library) platform::UnloadLibrary(library);
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
