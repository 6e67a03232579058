#include "coordsys/BindCoordSys.h"

#include <new>

#include "coordsys/CoordSysFactory.h"
#include "platform/Mutex.h"
#include "zmcg/zmcg.h"
#include "zmcpe/CoordSysImpl.h"

namespace zelm {
namespace {

// The factory does not guard its first call. The mutex guards what that call settles: the factory
// itself, the log and the entry points, which every caller reads only after passing here.
bool LoadEngine() {
    static platform::Mutex mutex;
    const platform::MutexHolder lock(mutex);
    return CoordSysFactory::GetInstance() != nullptr;
}

void DescribeUnit(const CoordSysImpl& impl, CoordSysInfo& info) {
    impl.GetUnitName(info.unitName);
    info.unitFactor = impl.GetUnitFactor();
    info.unitKind = impl.GetUnitKind();
    info.unitCode = impl.GetUnitCode();
}

// Takes over the reference on `impl`.
std::unique_ptr<CoordSys> Bind(CoordSysImpl* impl) {
    if (!impl) return nullptr;
    std::unique_ptr<CoordSys> bound(new (std::nothrow) CoordSys);
    if (!bound) {
        if (impl->ReleaseReference() < 1 && fp_Esri_Pe_Release) fp_Esri_Pe_Release(impl);
        return nullptr;
    }
    bound->impl = impl;
    bound->info = DescribeCoordSys(*impl);
    return bound;
}

}  // namespace

CoordSysInfo DescribeCoordSys(const CoordSysImpl& impl) {
    CoordSysInfo info;
    String datum;
    impl.GetDatumName(datum);
    if (!datum.IsEmpty()) info.datumName = datum;
    DescribeUnit(impl, info);
    return info;
}

std::unique_ptr<CoordSys> BindCoordSys(const String& definition) {
    if (!LoadEngine() || !fp_Esri_Pe_CreateFromString) return nullptr;
    return Bind(fp_Esri_Pe_CreateFromString(definition));
}

std::unique_ptr<CoordSys> BindCoordSys(int epsgCode) {
    if (!LoadEngine() || !fp_Esri_Pe_CreateFromCode) return nullptr;
    return Bind(fp_Esri_Pe_CreateFromCode(epsgCode));
}

}  // namespace zelm
