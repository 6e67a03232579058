// Ramp: where a value lies between two bounds, as t in [0, 1].
//
// Of 64-bit integers differences are taken in integers, and become doubles then: values that no
// double tells apart from each other are told apart where the bounds lie close together.
#ifndef ZMC_RENDER_RAMP_H
#define ZMC_RENDER_RAMP_H

#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <type_traits>

#include "render/Style.h"

namespace zmcrender {

template <class T>
inline constexpr bool kIsWide = std::is_integral_v<T> && sizeof(T) == 8;

// The whole number as a T; none where it is none, or T does not hold it.
template <class T>
std::optional<T> AsWhole(const Number& number) {
    static_assert(std::is_integral_v<T>);
    constexpr auto most = static_cast<std::uint64_t>(std::numeric_limits<T>::max());
    constexpr std::uint64_t least = std::is_signed_v<T> ? most + 1 : 0;
    if (!number.whole || number.magnitude > (number.negative ? least : most)) return std::nullopt;
    return static_cast<T>(number.negative ? std::uint64_t{0} - number.magnitude : number.magnitude);
}

// A number as a value of T that is exact, and a double for what T does not hold of it.
template <class T>
struct Bound {
    T base{};
    double rest = 0;

    explicit Bound(const Number& number) {
        using Limits = std::numeric_limits<T>;
        if (const auto exact = AsWhole<T>(number)) {
            base = *exact;
        } else if (const auto floor = AsWhole<T>(Number(std::floor(number.real)))) {
            base = *floor;
            rest = number.real - std::floor(number.real);
        } else {
            base = number.real < 0 ? Limits::min() : Limits::max();
            rest = number.real - static_cast<double>(base);
        }
    }

    // a - b, rounded once.
    static double Difference(T a, T b) {
        const auto distance = [](T above, T below) {
            return static_cast<double>(static_cast<std::uint64_t>(above) -
                                       static_cast<std::uint64_t>(below));
        };
        return a >= b ? distance(a, b) : -distance(b, a);
    }
    double Below(T value) const { return Difference(value, base) - rest; }
};

// For all types but 64-bit integers, whose values a double holds.
class RealRamp {
public:
    explicit RealRamp(const Range& range) {
        // Of bounds so far apart that their distance is beyond a double halves are as good.
        if (std::isinf(range.maximum.real - range.minimum.real)) scale = 0.5;
        minimum = range.minimum.real * scale;
        maximum = range.maximum.real * scale;
        width = maximum - minimum;
    }
    double operator()(double value) const {
        if (width == 0) return value >= maximum ? 1 : 0;
        const double t = (value * scale - minimum) / width;
        return t > 0 ? (t < 1 ? t : 1) : 0;
    }

private:
    double scale = 1, minimum, maximum, width;
};

template <class T>
class WideRamp {
public:
    explicit WideRamp(const Range& range)
        : minimum(range.minimum),
          maximum(range.maximum),
          width(Bound<T>::Difference(maximum.base, minimum.base) + (maximum.rest - minimum.rest)) {}
    double operator()(T value) const {
        if (width == 0) return maximum.Below(value) >= 0 ? 1 : 0;
        const double t = minimum.Below(value) / width;
        return t > 0 ? (t < 1 ? t : 1) : 0;
    }

private:
    Bound<T> minimum, maximum;
    double width;
};

template <class T>
using Ramp = std::conditional_t<kIsWide<T>, WideRamp<T>, RealRamp>;

}  // namespace zmcrender

#endif
