// NearestValue: a double of GDAL's as a sample that a record of the file can hold.
//
// Integers are rounded to the nearest, halves away from zero, and clamped to what the type holds; a
// NaN becomes the lowest. What cuts instead is zelm::FromDouble, by which pixels are made.
#ifndef ZMC_GDAL_NEARESTVALUE_H
#define ZMC_GDAL_NEARESTVALUE_H

#include <cmath>
#include <limits>
#include <type_traits>

#include "core/NumericConversion.h"

namespace zmcgdal {

template <class T>
T NearestValue(double value) {
    if constexpr (std::is_integral_v<T>) {
        using Limits = std::numeric_limits<T>;
        // The double next to the largest 64-bit integer lies above it.
        if (!(value > static_cast<double>(Limits::min()))) return Limits::min();
        if (value >= static_cast<double>(Limits::max())) return Limits::max();
        return static_cast<T>(std::round(value));
    } else {
        return zelm::FromDouble<T>(value);
    }
}

}  // namespace zmcgdal

#endif
