// Object: root of the value-like classes. A type test by number, a text form for display, and a
// state of health.
#ifndef ZMC_CORE_OBJECT_H
#define ZMC_CORE_OBJECT_H

#include "core/ErrorState.h"
#include "core/String.h"

namespace zelm {

class Object : public ErrorState {
public:
    // Number of the class word "Object". Every class that overrides IsKindOf has one of its own.
    static const std::uint32_t typeCode;

    Object() = default;
    Object(const Object&) = default;
    Object& operator=(const Object&) = default;
    ~Object() override = default;

    // True for the code of the object's own class and for that of Object; classes in between are
    // not walked.
    virtual bool IsKindOf(std::uint32_t code) const { return code == typeCode; }

    // "{Object}@" and the address in hexadecimal: for display, parsed nowhere.
    virtual String ToString() const;

    // False once an error record has been stored.
    virtual bool IsValid() const { return (error.flags & kErrorFlag) == 0; }
};

// "{", the word, "}@" and the address in lower-case hexadecimal without prefix or leading zeros;
// null where memory runs out.
String MakeObjectUrl(const char* word, const void* object);

}  // namespace zelm

#endif
