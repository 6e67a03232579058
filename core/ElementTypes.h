// The twelve element types of pixels, in one list.
//
// Every switch over pixel types, every set of template instances and every test over all types is
// made from ZMC_ELEMENT_TYPES. Its order is the order of the readers in RasterReaderDispatch.
//
//     word           C++ type          code   bytes   range
//     Byte           unsigned char        1       1   0 to 255
//     Char           char                99       1   -128 to 127: char is signed on every platform
//     UInt16         unsigned short      12       2   0 to 65,535
//     Int16          short                2       2   -32,768 to 32,767
//     UInt32         unsigned int        13       4   0 to 2^32 - 1
//     Int32          int                  3       4   -2^31 to 2^31 - 1
//     UInt64         std::uint64_t       15       8   0 to 2^64 - 1
//     Int64          std::int64_t        14       8   -2^63 to 2^63 - 1
//     Single         float                4       4   IEEE 754, 32 bits
//     Double         double               5       8   IEEE 754, 64 bits
//     ComplexSingle  Complex<float>       6       8   two of Single, the real part first
//     ComplexDouble  Complex<double>      9      16   two of Double
//
// In memory and in files a sample has the byte order of the processor, least significant byte
// first. Words and codes are read and written by PixelVocabulary.h.
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

// What is known of an element type at compile time: ElementTraits<float>::code is 4, its word is
// "Single". Defined for the twelve types alone, so that any other fails to compile.
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

// Whether T is one of the two complex types.
template <class T>
inline constexpr bool kIsComplex = false;
template <class T>
inline constexpr bool kIsComplex<Complex<T>> = true;

// Calls visit(std::type_identity<T>{}) with the element type of `code`; false, without a call, for
// a code that has no reader. Throws what `visit` throws.
//     std::size_t size = 0;
//     VisitElementType(code, [&]<class T>(std::type_identity<T>) { size = sizeof(T); });
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
