// The no-data values of a RasterProps as rules about samples.
#ifndef ZMC_HOST_RASTER_NODATA_H
#define ZMC_HOST_RASTER_NODATA_H

#include <cmath>
#include <limits>
#include <type_traits>

#include "core/ElementTypes.h"
#include "core/NumericConversion.h"
#include "dispatch/NoDataRule.h"
#include "raster/RasterProps.h"

namespace zmchost {

// Whether a sample can have the value: in integers as it is, in reals and in the real part of
// complex numbers rounded to the type. A file of a narrow type often names a value that none of its
// samples can have; such a value marks nothing, rather than what is left of it when it is cut.
template <class T>
bool HoldsValue(double value) {
    if constexpr (std::is_integral_v<T>) {
        const double end = std::ldexp(1.0, std::numeric_limits<T>::digits);
        const double begin = std::is_signed_v<T> ? -end : 0.0;
        return value >= begin && value < end && value == std::trunc(value);
    } else if constexpr (std::is_same_v<T, float>) {
        // From halfway behind the largest number on a real is rounded to infinity.
        constexpr double half = 0x1p103;
        return !std::isfinite(value) ||
               std::fabs(value) < static_cast<double>(std::numeric_limits<float>::max()) + half;
    } else if constexpr (zelm::kIsComplex<T>) {
        return HoldsValue<decltype(T::re)>(value);
    } else {
        return true;
    }
}

// The rule by which masks of that band are made: by the band's value, and in floating and complex
// types by whether a sample is finite.
template <class T>
zelm::NoDataRule<T> RuleOfBand(const zelm::RasterProps& props, std::uint32_t band) {
    if (!props.HasNoDataValue(band)) return {};
    const double value = props.GetNoDataValue(band);
    if (!HoldsValue<T>(value)) return {};
    return {true, zelm::FromDouble<T>(value)};
}

}  // namespace zmchost

#endif
