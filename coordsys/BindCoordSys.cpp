#include "coordsys/BindCoordSys.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <mutex>
#include <new>

#include "coordsys/CoordSysFactory.h"
#include "coordsys/CoordSysUnit.h"
#include "zmcg/zmcg.h"
#include "zmcpe/CoordSysImpl.h"

namespace zelm {
namespace {

// The factory does not guard its first call.
bool LoadEngine() {
    static std::mutex mutex;
    const std::lock_guard<std::mutex> lock(mutex);
    return CoordSysFactory::GetInstance() != nullptr;
}

template <class Test>
const CoordSysUnit* FindRow(Test test) {
    const CoordSysUnit* const end = std::end(kCoordSysUnits) - 1;  // without the end mark
    const CoordSysUnit* const row = std::find_if(std::begin(kCoordSysUnits), end, test);
    return row == end ? nullptr : row;
}

bool SameName(String a, String b) {
    a.ToLower();
    b.ToLower();
    return a == b;
}

// A code is the surest sign. Names and factors serve the many systems whose unit has none, or has
// one of the several codes of the degree.
const CoordSysUnit* FindUnit(const String& name, double factor, std::uint32_t kind,
                             std::int32_t code) {
    if (const auto* row = FindRow([&](const CoordSysUnit& unit) { return unit.code == code; }))
        return row;
    if (const auto* row = FindRow([&](const CoordSysUnit& unit) {
            return unit.kind == kind && SameName(unit.name, name);
        }))
        return row;
    return FindRow([&](const CoordSysUnit& unit) {
        return unit.kind == kind && std::abs(unit.factor - factor) <= 1e-12 * unit.factor;
    });
}

void DescribeUnit(const CoordSysImpl& impl, CoordSysInfo& info) {
    impl.GetUnitName(info.unitName);
    info.unitFactor = impl.GetUnitFactor();
    info.unitKind = impl.GetUnitKind();
    info.unitCode = impl.GetUnitCode();
    const CoordSysUnit* row =
        FindUnit(info.unitName, info.unitFactor, info.unitKind, info.unitCode);
    if (!row) return;
    info.unitName = row->name;
    info.unitFactor = row->factor;
    info.unitKind = row->kind;
    info.unitCode = row->code;
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
