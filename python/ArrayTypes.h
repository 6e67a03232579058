// Types of samples as those of NumPy's arrays.
//
// With Python's lock held.
#ifndef ZMC_PYTHON_ARRAYTYPES_H
#define ZMC_PYTHON_ARRAYTYPES_H

#include <gdal.h>
#include <pybind11/numpy.h>

#include <cstdint>
#include <string>
#include <type_traits>

#include "core/ElementTypes.h"
#include "gdal/SampleType.h"

namespace zmcpython {

// NumPy's letter of a kind, and the bytes of a sample: "u1", "f8", "c16".
template <class T>
std::string ArrayTypeName() {
    const std::string size = std::to_string(sizeof(T));
    if (zelm::kIsComplex<T>) return 'c' + size;
    if (std::is_floating_point_v<T>) return 'f' + size;
    constexpr bool isSigned = std::is_signed_v<T>;
    return (isSigned ? 'i' : 'u') + size;
}

inline pybind11::dtype DtypeOf(std::uint32_t pixelType) {
    std::string name;
    zelm::VisitElementType(pixelType,
                           [&]<class T>(std::type_identity<T>) { name = ArrayTypeName<T>(); });
    return pybind11::dtype(name);
}

// 0 where no pyramid has such samples. Samples of another order of bytes are none.
inline std::uint32_t PixelTypeOf(const pybind11::dtype& type) {
    std::uint32_t found = 0;
#define ZMC_X(element, word, code) \
    if (type.equal(pybind11::dtype(ArrayTypeName<element>()))) found = code;
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    return found;
}

// As what GDAL shows samples of that type in its buffers.
inline pybind11::dtype ShownDtypeOf(std::uint32_t pixelType, GDALDataType shown) {
    if (zmcgdal::IsWidened(pixelType, shown)) return DtypeOf(zelm::PixelTypeCode::Int16);
    if (pixelType == zelm::PixelTypeCode::Char && shown == GDT_Byte)
        return DtypeOf(zelm::PixelTypeCode::Byte);
    return DtypeOf(pixelType);
}

}  // namespace zmcpython

#endif
