// Conversion of a double to an element type: truncated toward zero, then cut to the width of the
// type, without clamping. It is how no-data values and the numbers of documents become pixels.
#ifndef ZMC_CORE_NUMERICCONVERSION_H
#define ZMC_CORE_NUMERICCONVERSION_H

#include <cstdint>
#include <limits>
#include <type_traits>

#include "core/ElementTypes.h"

namespace zelm {

// Truncation to a signed integer; what lies outside it, NaN included, gives its lowest value. The
// language leaves these conversions undefined, and a no-data value of a file has to become the same
// pixel in every build.
template <class Signed>
Signed TruncateToSigned(double value) {
    constexpr double lowest = static_cast<double>(std::numeric_limits<Signed>::min());
    constexpr double end = -lowest;
    // Values between lowest - 1 and lowest still truncate to lowest, so they need no case.
    if (!(value >= lowest && value < end)) return std::numeric_limits<Signed>::min();
    return static_cast<Signed>(value);
}

// A value above 2 to the 63 is reduced by that number before, and takes the top bit after.
inline std::uint64_t TruncateToUint64(double value) {
    constexpr double top = 9223372036854775808.0;
    if (value > top) {
        const auto rest = static_cast<std::uint64_t>(TruncateToSigned<std::int64_t>(value - top));
        return rest ^ (std::uint64_t{1} << 63);
    }
    return static_cast<std::uint64_t>(TruncateToSigned<std::int64_t>(value));
}

// `Wide` is the signed integer through which the smaller integers are cut.
template <class T, class Wide = std::int64_t>
T FromDouble(double value) {
    if constexpr (kIsComplex<T>) {
        return T(static_cast<decltype(T::re)>(value), 0);
    } else if constexpr (std::is_floating_point_v<T>) {
        return static_cast<T>(value);
    } else if constexpr (std::is_same_v<T, std::uint64_t>) {
        return TruncateToUint64(value);
    } else {
        return static_cast<T>(TruncateToSigned<Wide>(value));
    }
}

}  // namespace zelm

#endif
