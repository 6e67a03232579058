#include "zmcpe/EntryPoints.h"

#include <string>
#include <string_view>
#include <vector>

#include "zmcpe/ProjCoordSys.h"

using zelm::CoordSysImpl;
using zelm::ProjContext;
using zelm::ProjCoordSys;
using zelm::String;

namespace {

constexpr char kPathListSeparator = ':';

void AddDirectory(const String& directory, std::vector<std::string>& paths) {
    const char* const name = directory.GetUtf8();
    if (name && *name && std::string_view(name) != "Not Set") paths.emplace_back(name);
}

// PROJ's own directories stay in the list: the host's may hold grids but no database.
void AddDefaultDirectories(std::vector<std::string>& paths) ZMC_REQUIRES(zelm::projMutex) {
    const char* const defaults = proj_info().searchpath;
    std::string_view rest(defaults ? defaults : "");
    while (!rest.empty()) {
        const std::size_t length = rest.find(kPathListSeparator);
        const std::string_view path = rest.substr(0, length);
        if (!path.empty()) paths.emplace_back(path);
        rest.remove_prefix(length == rest.npos ? rest.size() : length + 1);
    }
}

// Without any path, the context goes back to PROJ's own.
void SetSearchPaths(PJ_CONTEXT* context, const std::vector<std::string>& paths)
    ZMC_REQUIRES(zelm::projMutex) {
    std::vector<const char*> names;
    for (const std::string& path : paths) names.push_back(path.c_str());
    proj_context_set_search_paths(context, static_cast<int>(names.size()), names.data());
}

// A PROJ string names an operation unless it says that it means a coordinate system.
std::string Definition(const char* text) {
    std::string definition(text);
    const bool isProjString =
        definition.find("proj=") < definition.find('[') && definition.find('{') == definition.npos;
    if (isProjString && definition.find("type=crs") == definition.npos) definition += " +type=crs";
    return definition;
}

}  // namespace

int Esri_Pe_Initialize(String& peDirectory, String& gdalDirectory) {
    try {
        std::vector<std::string> paths;
        AddDirectory(peDirectory, paths);
        AddDirectory(gdalDirectory, paths);
        ProjContext context;
        PJ_CONTEXT* const proj = context.Get();
        if (!proj) return 0;
        if (!paths.empty()) AddDefaultDirectories(paths);
        SetSearchPaths(proj, paths);
        // A context looks for its database once, unless it is told to; without a name, on its
        // paths.
        return proj_context_set_database_path(proj, nullptr, nullptr, nullptr);
    } catch (...) {
        return 0;
    }
}

CoordSysImpl* Esri_Pe_CreateFromString(const String& definition) {
    try {
        const String own(definition);  // the narrow form is cached in the object, so take a copy
        const char* const text = own.GetUtf8();
        return text ? ProjCoordSys::Create(Definition(text).c_str()) : nullptr;
    } catch (...) {
        return nullptr;
    }
}

CoordSysImpl* Esri_Pe_CreateFromCode(int code) {
    try {
        return ProjCoordSys::Create(("EPSG:" + std::to_string(code)).c_str());
    } catch (...) {
        return nullptr;
    }
}

int Esri_Pe_Release(CoordSysImpl* impl) {
    auto* const system = static_cast<ProjCoordSys*>(impl);
    if (!system || system->References() > 0) return 0;
    delete system;
    return 1;
}
