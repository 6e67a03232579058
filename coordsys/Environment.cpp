#include "coordsys/Environment.h"

#include "zmcg/zmcg.h"

namespace zelm {
namespace {

// Drawn for the vocabulary that all modules share; no object of that kind occurs here.
[[maybe_unused]] const std::uint32_t lockedEnvironmentTypeCode =
    GloballyUniqueObjectTypeCode("LockedEnvironment");

}  // namespace

const std::uint32_t Environment::typeCode = GloballyUniqueObjectTypeCode("Environment");

String& Environment::GetSetting(const String& key) const {
    return GetGlobalEnvironmentImpl().settings[key];
}

}  // namespace zelm
