// The twelve element types of pixels, in one list.
//
// Every switch over pixel types, every set of template instances and every test over all types is
// made from ZMC_ELEMENT_TYPES. Its order is the order of the readers in RasterReaderDispatch.
#ifndef ZMC_CORE_ELEMENTTYPES_H
#define ZMC_CORE_ELEMENTTYPES_H

#include <cstdint>
#include <type_traits>
#include <utility>

#include "core/Complex.h"

// X(type, name, code): C++ type, word in documents, pixel type code in files and strings.
#define ZMC_ELEMENT_TYPES(X)                  \
    X(unsigned char, Byte, 1)                 \
    X(char, Char, 99)                         \
    X(unsigned short, UInt16, 12)             \
    X(short, Int16, 2)                        \
    X(unsigned int, UInt32, 13)               \
    X(int, Int32, 3)                          \
    X(std::uint64_t, UInt64, 15)              \
    X(std::int64_t, Int64, 14)                \
    X(float, Single, 4)                       \
    X(double, Double, 5)                      \
    X(zelm::Complex<float>, ComplexSingle, 6) \
    X(zelm::Complex<double>, ComplexDouble, 9)

namespace zelm {

// Pixel type code of an element type, by its word.
namespace PixelTypeCode {
#define ZMC_X(type, name, code) inline constexpr std::uint32_t name = code;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
}  // namespace PixelTypeCode

template <class T>
struct ElementTraits;
#define ZMC_X(type, name, typeCode)                     \
    template <>                                         \
    struct ElementTraits<type> {                        \
        static constexpr std::uint32_t code = typeCode; \
        static constexpr const char* word = #name;      \
    };
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

template <class T>
inline constexpr bool kIsComplex = false;
template <class T>
inline constexpr bool kIsComplex<Complex<T>> = true;

// Calls visit(std::type_identity<T>{}) with the element type of `code`; false, without a call, for
// a code that has no reader.
template <class Visitor>
constexpr bool VisitElementType(std::uint32_t code, Visitor&& visit) {
    switch (code) {
#define ZMC_X(type, name, typeCode)                               \
    case typeCode:                                                \
        std::forward<Visitor>(visit)(std::type_identity<type>{}); \
        return true;
        ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
        default:
            return false;
    }
}

}  // namespace zelm

#endif
