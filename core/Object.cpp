#include "core/Object.h"

#include <cinttypes>
#include <cstdio>

#include "core/ObjectCodes.h"

namespace zelm {

const std::uint32_t Object::typeCode = GloballyUniqueObjectTypeCode("Object");

String Object::ToString() const { return MakeObjectUrl("Object", this); }

String MakeObjectUrl(const char* word, const void* object) {
    char address[24];
    static_cast<void>(
        std::snprintf(address, sizeof address, "}@%" PRIx64,
                      static_cast<std::uint64_t>(reinterpret_cast<std::uintptr_t>(object))));
    return String("{") + String(word) + String(address);
}

}  // namespace zelm
