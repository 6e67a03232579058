#include "coordsys/CoordSysFuncPtrs.h"

#include "coordsys/CoordSysLog.h"
#include "coordsys/CoordSysMutex.h"
#include "coordsys/EnvironmentKeys.h"
#include "platform/Directory.h"
#include "zmcg/zmcg.h"

namespace zelm {
namespace {

constexpr std::uint32_t kLevel = CoordSysLog::kErrorLevel;

template <class Function>
bool Fetch(platform::LibraryHandle library, const char* name, Function*& function) {
    function = reinterpret_cast<Function*>(platform::FindSymbol(library, name));
    return function != nullptr;
}

}  // namespace

CoordSysFuncPtrs::~CoordSysFuncPtrs() {
    if (module) platform::UnloadLibrary(module);
}

void CoordSysFuncPtrs::ClearEntryPoints() {
    fp_Esri_Pe_Initialize = nullptr;
    fp_Esri_Pe_CreateFromString = nullptr;
    fp_Esri_Pe_CreateFromCode = nullptr;
    fp_Esri_Pe_Release = nullptr;
}

String CoordSysFuncPtrs::EngineFileName() {
    return String(platform::kLibraryPrefix) + "zmcpe" + platform::kLibrarySuffix;
}

int CoordSysFuncPtrs::LoadFuncPtrs(const String& binDirectory) {
    const String path = binDirectory + platform::kPathSeparator + EngineFileName();
    const bool isSet = binDirectory != EnvironmentKeys::kNotSet;
    if (!isSet || path.length == 0 || !platform::PathExists(path.GetAnsi())) {
        CoordSysLog::LogMessage(kLevel, u"CoordSysFuncPtrs::LoadFuncPtrs - error invalid path.");
        return 0;
    }
    if (!module) {
        module = platform::LoadLibraryFile(path.wide);
        if (!module) {
            CoordSysLog::LogMessage(kLevel,
                                    u"CoordSysFuncPtrs::LoadFuncPtrs - error loading zmcpe dll.");
            return 0;
        }
        if (!FetchEntryPoints()) {
            CoordSysLog::LogMessage(
                kLevel, u"CoordSysFuncPtrs::LoadFuncPtrs - error did not find zmcpe function.");
            return 0;
        }
    }
    EnsureCoordSysSection();
    CoordSysLog::LogMessage(kLevel, u"CoordSysFuncPtrs::LoadFuncPtrs - %s loaded.", path.wide);
    return 1;
}

bool CoordSysFuncPtrs::FetchEntryPoints() {
    return Fetch(module, "Esri_Pe_Initialize", fp_Esri_Pe_Initialize) &&
           Fetch(module, "Esri_Pe_CreateFromString", fp_Esri_Pe_CreateFromString) &&
           Fetch(module, "Esri_Pe_CreateFromCode", fp_Esri_Pe_CreateFromCode) &&
           Fetch(module, "Esri_Pe_Release", fp_Esri_Pe_Release);
}

}  // namespace zelm
