#include "coordsys/CoordSys.h"

#include <atomic>

#include "coordsys/CoordSysFactory.h"
#include "coordsys/CoordSysMutex.h"
#include "core/Lock.h"
#include "zmcpe/CoordSysImpl.h"

namespace zelm {
namespace {

std::atomic<std::uint32_t> lastId{0};

}  // namespace

CoordSys::CoordSys() : id(++lastId) {}

CoordSys::~CoordSys() { ReleaseImpl(); }

void CoordSys::ReleaseImpl() {
    const auto lock = HoldLock(CoordSysSection());
    if (!impl || impl->ReleaseReference() >= 1) return;
    // The first release of a process can be what loads the engine.
    if (CoordSysFactory::GetInstance() && fp_Esri_Pe_Release && fp_Esri_Pe_Release(impl) != 0)
        impl = nullptr;
}

}  // namespace zelm
