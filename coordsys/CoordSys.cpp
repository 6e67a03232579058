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
    // A handle that is bound to nothing may go while another thread loads the engine and makes the
    // section, or holds it; the module's own handle goes inside the loader's lock.
    if (!impl) return;
    const auto lock = HoldLock(CoordSysSection());
    if (impl->ReleaseReference() >= 1) return;
    // The first release of a process can be what loads the engine.
    if (CoordSysFactory::GetInstance() && fp_Esri_Pe_Release && fp_Esri_Pe_Release(impl) != 0)
        impl = nullptr;
}

}  // namespace zelm
