// The coordinate system of the module itself: it is bound to nothing, and keeps the handle's
// destruction, and with it the loading of the engine, part of the module.
#include "coordsys/CoordSys.h"

namespace zelm {
namespace {

[[maybe_unused]] const CoordSys moduleCoordSys;

}  // namespace
}  // namespace zelm
