// Which samples a no-data mask marks, in plain words.
#ifndef ZMC_TESTS_DISPATCH_MARKEDSAMPLE_H
#define ZMC_TESTS_DISPATCH_MARKEDSAMPLE_H

#include <limits>
#include <type_traits>

#include "core/ElementTypes.h"

namespace zmctest {

template <class Real>
bool IsFinite(Real x) {
    return std::numeric_limits<Real>::lowest() <= x && x <= std::numeric_limits<Real>::max();
}

// Equal to the value, or, where the type can be so, not finite.
template <class T>
bool IsMarked(const T& x, bool hasValue, const T& value) {
    if constexpr (zelm::kIsComplex<T>)
        return (hasValue && x.re == value.re && x.im == value.im) || !IsFinite(x.re) ||
               !IsFinite(x.im);
    else if constexpr (std::is_floating_point_v<T>)
        return (hasValue && x == value) || !IsFinite(x);
    else
        return hasValue && x == value;
}

}  // namespace zmctest

#endif
