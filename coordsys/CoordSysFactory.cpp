#include "coordsys/CoordSysFactory.h"

#include <new>

#include "coordsys/CoordSysLog.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "zmcg/zmcg.h"

namespace zelm {
namespace {

constexpr std::uint32_t kBindLevel = CoordSysLog::kErrorLevel;

String ReadDirectory(const Environment& environment, const String& key) {
    String directory = environment.GetSetting(key);
    if (directory.IsEmpty()) directory = EnvironmentKeys::kNotSet;
    return directory;
}

int InitOrFail(CoordSysFactory& factory) {
    try {
        return factory.Init();
    } catch (...) {
        return 0;
    }
}

}  // namespace

CoordSysFactory* CoordSysFactory::GetInstance() {
    if (gpCoordSysFactoryInstance) return gpCoordSysFactoryInstance;
    gpCoordSysFactoryInstance = new (std::nothrow) CoordSysFactory;
    if (!gpCoordSysFactoryInstance) return nullptr;
    if (InitOrFail(*gpCoordSysFactoryInstance) == 0) {
        // The next factory calls whatever is not null, and would call into a library that is gone.
        if (gpCoordSysFactoryInstance->funcPtrs.module) CoordSysFuncPtrs::ClearEntryPoints();
        delete gpCoordSysFactoryInstance;
        gpCoordSysFactoryInstance = nullptr;
    }
    return gpCoordSysFactoryInstance;
}

int CoordSysFactory::Init() {
    const Environment environment;
    const String binDir = ReadDirectory(environment, EnvironmentKeys::kBinDirectory);
    String peDir = ReadDirectory(environment, EnvironmentKeys::kPeDirectory);
    String gdalDir = ReadDirectory(environment, EnvironmentKeys::kGdalDirectory);
    if (!gpCoordSysLogInstance) CoordSysLog::CreateInstance(peDir);
    CoordSysLog::LogMessage(
        kBindLevel,
        u";-----------------------------------------------------------------------------");
    CoordSysLog::LogMessage(kBindLevel, u"CoordSysFactory::Init - pedata directory (%s).",
                            peDir.wide);
    funcPtrs.LoadFuncPtrs(binDir);
    if (fp_Esri_Pe_Initialize) fp_Esri_Pe_Initialize(peDir, gdalDir);
    return 1;
}

}  // namespace zelm
