#include "host/statistics/HistogramBins.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <type_traits>

#include "host/base/Int128.h"

namespace zmchost {
namespace {

// maximum - minimum + 1: the width of an integer band, up to 2 to the 64.
template <class T>
UInt128 IntegerWidth(T minimum, T maximum) {
    if (maximum < minimum) return 1;
    return static_cast<UInt128>(static_cast<Int128>(maximum) - static_cast<Int128>(minimum) + 1);
}

// The distance as double, of values that a factor has brought into range.
template <class T>
double Distance(T from, T to, double factor) {
    return static_cast<double>(to) * factor - static_cast<double>(from) * factor;
}

}  // namespace

template <class T>
HistogramBins<T>::HistogramBins(T lowest, T highest, std::uint32_t binCount)
    : minimum(lowest), maximum(highest), count(std::max<std::uint32_t>(binCount, 1)) {
    if constexpr (std::is_integral_v<T>) {
        size =
            static_cast<double>(static_cast<long double>(IntegerWidth(minimum, maximum)) / count);
    } else if constexpr (std::is_floating_point_v<T>) {
        constexpr double kLarge = 1e300;
        constexpr double kSmall = 1e-290;
        double width = Distance(minimum, maximum, 0.5);
        if (width > kLarge)
            factor = 0.5;
        else if (width > 0 && width < kSmall)
            factor = std::ldexp(1.0, 600);
        width = maximum > minimum ? Distance(minimum, maximum, factor) : factor;
        size = width / count / factor;
        scale = count / width;
    }
}

template <class T>
HistogramBins<T> HistogramBins<T>::ForBand(T lowest, T highest, std::uint32_t binCount) {
    if constexpr (sizeof(T) == 1)
        return HistogramBins(std::numeric_limits<T>::min(), std::numeric_limits<T>::max(),
                             std::uint32_t{std::numeric_limits<unsigned char>::max()} + 1u);
    else
        return HistogramBins(lowest, highest, binCount);
}

template <class T>
std::uint32_t HistogramBins<T>::Index(T value) const {
    if constexpr (zelm::kIsComplex<T>) {
        return kOutside;
    } else {
        if (!(value >= minimum && value <= maximum)) return kOutside;
        if constexpr (std::is_floating_point_v<T>) {
            const double bin = Distance(minimum, value, factor) * scale;
            return bin < count ? static_cast<std::uint32_t>(bin) : count - 1;
        } else if constexpr (sizeof(T) <= 4) {
            const std::int64_t low = minimum;
            const auto offset = static_cast<std::uint64_t>(value - low);
            const auto width = static_cast<std::uint64_t>(maximum - low) + 1;
            return static_cast<std::uint32_t>(offset * count / width);
        } else {
            const auto offset = static_cast<UInt128>(static_cast<Int128>(value) - minimum);
            return static_cast<std::uint32_t>(offset * count / IntegerWidth(minimum, maximum));
        }
    }
}

#define ZMC_X(type, name, code) template class HistogramBins<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
