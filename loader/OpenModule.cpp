#include "loader/OpenModule.h"

#include "platform/FileSystem.h"
#include "platform/LoadableLibrary.h"
#include "platform/Program.h"

namespace zmcraster {
namespace {

constexpr char kVariable[] = "ZMCRASTER_MODULE";

bool IsFile(const std::string& path) { return platform::StatusOf(path).isRegular; }

template <class Function>
void Bind(Function& function, void* library, const char* name) {
    function = reinterpret_cast<Function>(platform::FindSymbol(library, name));
}

LoadedModule Refused(const std::string& path, std::string reason) {
    LoadedModule module;
    module.path = path;
    module.reason = std::move(reason);
    return module;
}

std::string WhyNotLoaded(const std::string& path) {
    return platform::StatusOf(path).exists
               ? "it is no loadable library, or one that it needs is missing"
               : std::string("there is no such file (set ") + kVariable + " to its path)";
}

LoadedModule OpenFile(const std::string& path) {
    LoadedModule module;
    module.path = path;
    // What the module needs stands beside it, and not beside a link to it.
    const std::string file = platform::IsAbsolutePath(path) ? platform::ResolveLinks(path) : path;
    const zelm::String wide(file.c_str());
    if (const char* const narrow = wide.GetUtf8(); !narrow || file != narrow)
        return Refused(path, "its name is not valid UTF-8");
    module.library = platform::LoadLibraryFile(wide.wide);
    if (!module) return Refused(path, WhyNotLoaded(path));
    Bind(module.create, module.library, "CreateDataConnectionFactory");
    Bind(module.destroy, module.library, "DeleteDataConnectionFactory");
    if (module.create && module.destroy) return module;
    CloseModule(module);
    return Refused(path, "its two functions are not in it");
}

}  // namespace

std::string FindModule() {
    if (const std::string named = platform::EnvironmentValue(kVariable); !named.empty())
        return named;
    const std::string name =
        std::string(platform::kLibraryPrefix) + "zmcraster" + platform::kLibrarySuffix;
    const std::string own = platform::FileOfCode(reinterpret_cast<const void*>(&IsFile));
    const std::string configured = platform::JoinPath(ZMC_INSTALLED_MODULE_DIR, name);
    if (own.empty()) return configured;
    const std::string here = platform::FolderOf(own);
    const std::string installed = platform::JoinPath(platform::JoinPath(here, "zmcraster"), name);
    for (const std::string& place : {installed, platform::JoinPath(here, name), configured})
        if (IsFile(place)) return place;
    return installed;
}

LoadedModule OpenModule(const std::string& path) {
    const std::string wanted = path.empty() ? FindModule() : path;
    if (path.empty() && !platform::IsAbsolutePath(wanted))
        return Refused(wanted, std::string(kVariable) + " must hold an absolute path");
    if (const std::string failure = StartXerces(); !failure.empty())
        return Refused(wanted, "Xerces-C++ does not start: " + failure);
    return OpenFile(wanted);
}

void CloseModule(LoadedModule& module) {
    if (module.library) platform::UnloadLibrary(module.library);
    module = {};
}

}  // namespace zmcraster
