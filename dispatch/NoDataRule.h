// NoDataRule<T>: which samples of a band hold no valid data. Hosts that look at pixels outside a
// reader use it too, so that they and the masks agree.
#ifndef ZMC_DISPATCH_NODATARULE_H
#define ZMC_DISPATCH_NODATARULE_H

#include <type_traits>

#include "core/ElementTypes.h"

namespace zelm {

template <class T>
struct NoDataRule {
    bool hasValue = false;  // the band has a no-data value
    T value{};

    // The value matches by an ordered comparison, so a NaN matches nothing; a sample of floating or
    // complex type is marked as well when it is not finite, with or without a no-data value.
    bool Marks(const T& x) const { return (hasValue && x == value) || NotFinite(x); }

    static bool NotFinite(const T& x) {
        if constexpr (kIsComplex<T>)
            return x.re * 0 != 0 || x.im * 0 != 0;
        else if constexpr (std::is_floating_point_v<T>)
            return x * 0 != 0;
        else
            return false;
    }
};

}  // namespace zelm

#endif
