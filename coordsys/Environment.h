// Environment: handle on the process-wide table of directory settings.
//
// The host fills the table at start-up, before any reader runs; there is no lock. The handle has
// no state: make one on the stack where it is wanted.
#ifndef ZMC_COORDSYS_ENVIRONMENT_H
#define ZMC_COORDSYS_ENVIRONMENT_H

#include "core/Object.h"

namespace zelm {

class Environment : public Object {
public:
    // cppcheck-suppress duplInheritedMember ; each class has a code of its own by this name
    static const std::uint32_t typeCode;

    bool IsKindOf(std::uint32_t code) const override {
        return code == typeCode || code == Object::typeCode;
    }

    // The value of `key`, which stays good while the table stands. A key that is not in the table
    // is inserted with an empty value: even reading may change the table. Throws std::bad_alloc.
    String& GetSetting(const String& key) const;
};

}  // namespace zelm

#endif
