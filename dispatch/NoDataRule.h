// NoDataRule<T>: which samples of a band hold no valid data. Hosts that look at pixels outside a
// reader use it too, so that they and the masks agree.
//
//     NoDataRule<float> rule{true, -9999.0f};
//     rule.Marks(-9999.0f);                  // true: the band's no-data value
//     rule.Marks(std::nanf(""));             // true: not finite
//     NoDataRule<short>{}.Marks(-32768);     // false: no value is set, and integers are finite
//
// A band's value comes from RasterProps as a double, and is brought to T by
// RasterReader<T>::GetNoDataValue. A plain value without state: any number of threads may use one.
#ifndef ZMC_DISPATCH_NODATARULE_H
#define ZMC_DISPATCH_NODATARULE_H

#include <limits>
#include <type_traits>

#include "core/ElementTypes.h"

namespace zelm {

template <class T>
struct NoDataRule {
    bool hasValue = false;  // the band has a no-data value
    T value{};              // of no meaning while hasValue is false

    // The value matches by an ordered comparison, so a NaN matches nothing; a sample of floating or
    // complex type is marked as well when it is not finite, with or without a no-data value.
    // No branch in it, so that loops over samples become vector code.
    bool Marks(const T& x) const {
        return ((static_cast<unsigned>(hasValue) & static_cast<unsigned>(x == value)) |
                static_cast<unsigned>(NotFinite(x))) != 0;
    }

    // A value that no sample equals, for the types that have one: a NaN, in both parts of a complex
    // number. For loops that compare with a value whether or not there is one.
    static constexpr T Unmatched() {
        if constexpr (kIsComplex<T>) {
            using Part = decltype(T::re);
            constexpr Part nan = std::numeric_limits<Part>::quiet_NaN();
            return T(nan, nan);
        } else {
            static_assert(std::is_floating_point_v<T>);
            return std::numeric_limits<T>::quiet_NaN();
        }
    }

    // Whether a sample is an infinity or a NaN, in either part of a complex one; never true for
    // integers. Zero times a finite number is zero, and times any other is none, which needs no
    // call of a function and no branch.
    static bool NotFinite(const T& x) {
        if constexpr (kIsComplex<T>)
            return (static_cast<unsigned>(x.re * 0 != 0) | static_cast<unsigned>(x.im * 0 != 0)) !=
                   0;
        else if constexpr (std::is_floating_point_v<T>)
            return x * 0 != 0;
        else
            return false;
    }
};

}  // namespace zelm

#endif
