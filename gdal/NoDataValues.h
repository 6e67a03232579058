// No-data values of GDAL bands, whichever of the three forms they have.
#ifndef ZMC_GDAL_NODATAVALUES_H
#define ZMC_GDAL_NODATAVALUES_H

#include <gdal_priv.h>

#include <optional>

namespace zmcgdal {

// What visit(value, form) answers: the band's value in the one form that holds all values of its
// type, std::int64_t, std::uint64_t or double, as a std::optional, and what GDAL calls that form.
template <class Visitor>
auto VisitNoData(GDALRasterBand& band, Visitor&& visit) {
    int has = FALSE;
    const auto tell = [&](auto value, GDALDataType form) {
        return visit(has ? std::optional(value) : std::nullopt, form);
    };
    if (band.GetRasterDataType() == GDT_Int64)
        return tell(band.GetNoDataValueAsInt64(&has), GDT_Int64);
    if (band.GetRasterDataType() == GDT_UInt64)
        return tell(band.GetNoDataValueAsUInt64(&has), GDT_UInt64);
    return tell(band.GetNoDataValue(&has), GDT_Float64);
}

// The band's value as a double; those of 64-bit integers come rounded to one.
inline std::optional<double> NoDataAsDouble(GDALRasterBand& band) {
    return VisitNoData(band, [](auto value, GDALDataType) {
        return value ? std::optional(static_cast<double>(*value)) : std::nullopt;
    });
}

// False for a 64-bit value that no double holds.
inline bool NoDataFitsDouble(GDALRasterBand& band) {
    return VisitNoData(band, [](auto value, GDALDataType form) {
        return form == GDT_Float64 || !value ||
               static_cast<long double>(*value) ==
                   static_cast<long double>(static_cast<double>(*value));
    });
}

}  // namespace zmcgdal

#endif
