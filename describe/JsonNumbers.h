// Numbers in JSON documents, exact: what a reader that knows doubles only would change stands as a
// string: integers beyond 2^53, "NaN", "Infinity" and "-Infinity". Complex numbers are a pair. Long
// doubles are rounded to doubles, but for those beyond 2^53 that no double is.
#ifndef ZMC_DESCRIBE_JSONNUMBERS_H
#define ZMC_DESCRIBE_JSONNUMBERS_H

#include <cmath>
#include <cstdio>
#include <limits>
#include <nlohmann/json.hpp>
#include <string>
#include <type_traits>

#include "core/ElementTypes.h"

namespace zmcdescribe {

using Json = nlohmann::ordered_json;

// Of finite numbers.
inline bool IsBeyondDoubles(long double value) {
    if (std::fabs(value) > std::numeric_limits<double>::max()) return true;
    return std::fabs(value) > 0x1p53L && static_cast<double>(value) != value;
}

// Those of an integer of 64 bits all.
inline std::string LongDigits(long double value) {
    char text[48];
    static_cast<void>(std::snprintf(text, sizeof text, "%.21Lg", value));
    return text;
}

template <class T>
Json JsonNumber(const T& value) {
    if constexpr (zelm::kIsComplex<T>) {
        return Json::array({JsonNumber(value.re), JsonNumber(value.im)});
    } else if constexpr (std::is_floating_point_v<T>) {
        if (std::isnan(value)) return "NaN";
        if (std::isinf(value)) return value > 0 ? "Infinity" : "-Infinity";
        if constexpr (std::is_same_v<T, long double>)
            if (IsBeyondDoubles(value)) return LongDigits(value);
        return static_cast<double>(value);
    } else if constexpr (std::is_signed_v<T>) {
        const long long wide = value;
        constexpr long long kExact = 1LL << 53;
        if (wide > kExact || wide < -kExact) return std::to_string(wide);
        return wide;
    } else {
        const unsigned long long wide = value;
        if (wide > 1ULL << 53) return std::to_string(wide);
        return wide;
    }
}

}  // namespace zmcdescribe

#endif
