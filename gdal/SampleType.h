// Pixel types of pyramids as data types of GDAL, and back.
//
// The one type without a counterpart before GDAL 3.7 is the signed byte: there, or when asked for,
// it is shown as Int16, whose values convert rightly everywhere. Also when asked for, it is Byte
// with the flag SIGNEDBYTE, which keeps the bits but is taken for unsigned by conversions.
#ifndef ZMC_GDAL_SAMPLETYPE_H
#define ZMC_GDAL_SAMPLETYPE_H

#include <gdal.h>
#include <gdal_version.h>

#include <cstdint>
#include <type_traits>

#include "core/ElementTypes.h"

namespace zmcgdal {

// `Own`: as Int8 where GDAL has it.
enum class SignedByteAs { Own, Int16, FlaggedByte };

template <class T>
constexpr GDALDataType GdalTypeOf() {
    constexpr bool isSigned = std::is_signed_v<T>;
    if constexpr (zelm::kIsComplex<T>)
        return sizeof(T) == 8 ? GDT_CFloat32 : GDT_CFloat64;
    else if constexpr (std::is_floating_point_v<T>)
        return sizeof(T) == 4 ? GDT_Float32 : GDT_Float64;
    else if constexpr (std::is_same_v<T, char>)
#if GDAL_VERSION_NUM >= GDAL_COMPUTE_VERSION(3, 7, 0)
        return GDT_Int8;
#else
        return GDT_Int16;
#endif
    else if constexpr (sizeof(T) == 1)
        return GDT_Byte;
    else if constexpr (sizeof(T) == 2)
        return isSigned ? GDT_Int16 : GDT_UInt16;
    else if constexpr (sizeof(T) == 4)
        return isSigned ? GDT_Int32 : GDT_UInt32;
    else
        return isSigned ? GDT_Int64 : GDT_UInt64;
}

// GDT_Unknown for a code that has no reader.
GDALDataType GdalTypeOf(std::uint32_t pixelType, SignedByteAs signedByteAs);

// Pixel type code that holds every value of `type`: the complex integers of a source go to the
// complex float of the next size up. 0 for a type that no pyramid holds.
std::uint32_t PixelTypeFor(GDALDataType type, bool signedByte);

// Samples of this pixel type stand as Int16 in GDAL's buffers and as one byte in the file.
constexpr bool IsWidened(std::uint32_t pixelType, GDALDataType type) {
    return pixelType == zelm::PixelTypeCode::Char && type == GDT_Int16;
}

}  // namespace zmcgdal

#endif
