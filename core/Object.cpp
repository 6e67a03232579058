#include "core/Object.h"

#include <cinttypes>
#include <cstdio>
#include <cstring>
#include <memory>
#include <new>

#include "core/ObjectCodes.h"

namespace zelm {

const std::uint32_t Object::typeCode = GloballyUniqueObjectTypeCode("Object");

String Object::ToString() const { return MakeObjectUrl("Object", this); }

String MakeObjectUrl(const char* word, const void* object) {
    constexpr std::size_t kRest = sizeof "{}@" + 16;  // an address has at most sixteen digits
    const std::size_t size = std::strlen(word) + kRest;
    const std::unique_ptr<char[]> text(new (std::nothrow) char[size]);
    if (!text) return String();
    static_cast<void>(
        std::snprintf(text.get(), size, "{%s}@%" PRIx64, word,
                      static_cast<std::uint64_t>(reinterpret_cast<std::uintptr_t>(object))));
    return String(text.get());
}

}  // namespace zelm
