// No-data values of GDAL bands, whichever of the three forms they have.
#ifndef ZMC_GDAL_NODATAVALUES_H
#define ZMC_GDAL_NODATAVALUES_H

#include <gdal_priv.h>

#include <optional>

namespace zmcgdal {

// The band's value as a double; those of 64-bit integers come rounded to one.
inline std::optional<double> NoDataAsDouble(GDALRasterBand& band) {
    int has = FALSE;
    double value = 0;
    if (band.GetRasterDataType() == GDT_Int64)
        value = static_cast<double>(band.GetNoDataValueAsInt64(&has));
    else if (band.GetRasterDataType() == GDT_UInt64)
        value = static_cast<double>(band.GetNoDataValueAsUInt64(&has));
    else
        value = band.GetNoDataValue(&has);
    if (!has) return std::nullopt;
    return value;
}

// False for a 64-bit value that no double holds.
inline bool NoDataFitsDouble(GDALRasterBand& band) {
    int has = FALSE;
    const auto fits = [](auto value) {
        return static_cast<long double>(value) ==
               static_cast<long double>(static_cast<double>(value));
    };
    if (band.GetRasterDataType() == GDT_Int64) return fits(band.GetNoDataValueAsInt64(&has));
    if (band.GetRasterDataType() == GDT_UInt64) return fits(band.GetNoDataValueAsUInt64(&has));
    return true;
}

}  // namespace zmcgdal

#endif
