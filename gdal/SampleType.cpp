#include "gdal/SampleType.h"

namespace zmcgdal {

GDALDataType GdalTypeOf(std::uint32_t pixelType, SignedByteAs signedByteAs) {
    if (pixelType == zelm::PixelTypeCode::Char && signedByteAs != SignedByteAs::Own)
        return signedByteAs == SignedByteAs::Int16 ? GDT_Int16 : GDT_Byte;
    GDALDataType type = GDT_Unknown;
    zelm::VisitElementType(pixelType,
                           [&]<class T>(std::type_identity<T>) { type = GdalTypeOf<T>(); });
    return type;
}

std::uint32_t PixelTypeFor(GDALDataType type, bool signedByte) {
    if (type == GDT_Byte && signedByte) return zelm::PixelTypeCode::Char;
    if (type == GDT_Int16) return zelm::PixelTypeCode::Int16;
    if (type == GDT_CInt16) return zelm::PixelTypeCode::ComplexSingle;
    if (type == GDT_CInt32) return zelm::PixelTypeCode::ComplexDouble;
    std::uint32_t found = 0;
#define ZMC_X(element, name, code) \
    if (GdalTypeOf<element>() == type) found = code;
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    return found;
}

}  // namespace zmcgdal
