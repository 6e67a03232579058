// Rounded<T>: a result in the raster's type, and on which side of it the exact one lies.
#ifndef ZMC_HOST_REDUCE_ROUNDED_H
#define ZMC_HOST_REDUCE_ROUNDED_H

#include <cmath>
#include <limits>
#include <type_traits>

#include "dispatch/NoDataRule.h"

namespace zmchost {

// direction: the sign of exact minus value, 0 where they agree; of complex results that of the real
// parts, and of the imaginary ones beside it. In floating types, as far as the wider type that was
// computed in can tell.
template <class T>
struct Rounded {
    T value{};
    int direction = 0;
    int imaginary = 0;
};

template <class Number>
constexpr int SignOf(Number x) {
    return (x > 0) - (x < 0);
}

// dividend / divisor in an integer type T, half away from zero, clamped to what T holds. Wide is
// signed and holds divisor * (any T) as well; divisor > 0.
template <class T, class Wide>
Rounded<T> RoundedQuotient(Wide dividend, Wide divisor) {
    Wide quotient = dividend / divisor;
    const Wide rest = dividend % divisor;
    const Wide magnitude = rest < 0 ? -rest : rest;
    if (magnitude >= divisor - magnitude) quotient += dividend < 0 ? -1 : 1;
    constexpr Wide low = std::numeric_limits<T>::min();
    constexpr Wide high = std::numeric_limits<T>::max();
    const Wide held = quotient < low ? low : quotient > high ? high : quotient;
    return {static_cast<T>(held), SignOf(dividend - held * divisor)};
}

// A wider result in a floating type T; what is finite stays finite.
template <class T, class Wide>
Rounded<T> RoundedFloat(Wide exact) {
    constexpr Wide high = std::numeric_limits<T>::max();
    const Wide held = exact > high ? high : exact < -high ? -high : exact;
    const auto value = static_cast<T>(held);
    return {value, SignOf(exact - static_cast<Wide>(value))};
}

template <class P>
Rounded<zelm::Complex<P>> Joined(const Rounded<P>& re, const Rounded<P>& im) {
    return {{re.value, im.value}, re.direction, im.direction};
}

// The next value of the type on the side of `direction`, upwards for 0, and on the other side where
// the type ends.
template <class T>
T Neighbour(T value, int direction) {
    constexpr T high = std::numeric_limits<T>::max();
    constexpr T low = std::numeric_limits<T>::lowest();
    const bool up = direction >= 0 ? value != high : value == low;
    if constexpr (std::is_floating_point_v<T>)
        return std::nextafter(value, up ? high : low);
    else
        return static_cast<T>(up ? value + 1 : value - 1);
}

// What a cell gets that has valid samples: its result, moved aside if it would read as no data.
template <class T>
T KeptValid(const Rounded<T>& result, const zelm::NoDataRule<T>& rule) {
    if (!rule.hasValue || !(result.value == rule.value)) return result.value;
    if constexpr (zelm::kIsComplex<T>) {
        if (result.direction == 0 && result.imaginary != 0)
            return {result.value.re, Neighbour(result.value.im, result.imaginary)};
        return {Neighbour(result.value.re, result.direction), result.value.im};
    } else {
        return Neighbour(result.value, result.direction);
    }
}

// What a cell gets that has none.
template <class T>
T InvalidValue(const zelm::NoDataRule<T>& rule) {
    if (rule.hasValue) return rule.value;
    if constexpr (zelm::kIsComplex<T>) {
        constexpr auto nan = std::numeric_limits<decltype(T::re)>::quiet_NaN();
        return {nan, nan};
    } else if constexpr (std::is_floating_point_v<T>) {
        return std::numeric_limits<T>::quiet_NaN();
    } else {
        return 0;
    }
}

}  // namespace zmchost

#endif
