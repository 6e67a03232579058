#include "host/reduce/RootMeanSquare.h"

#include <algorithm>
#include <bit>
#include <cstdint>

#include "core/ElementTypes.h"
#include "host/base/Int128.h"
#include "host/statistics/ExactSums.h"

namespace zmchost {
namespace {

constexpr std::uint64_t kOnce[4] = {1, 1, 1, 1};

// n * term, for comparison with a sum of squares.
WideSum Times(UInt128 term, std::uint64_t n) {
    WideSum product;
    product.AddProduct(term, n);
    return product;
}

// A root rounds to the least k with squares / n < (k + 1/2) squared, which for integers is squares
// < n * k * (k + 1) + n / 4, the last term rounded up.
WideSum BoundAbove(UInt128 term, std::uint64_t n) {
    WideSum bound = Times(term, n);
    bound.Add((n + 3) / 4);
    return bound;
}

UInt128 Square(std::uint64_t value) { return UInt128{value} * value; }

bool Less(const WideSum& a, const WideSum& b) {
    return a.high != b.high ? a.high < b.high : a.low < b.low;
}

template <class T>
std::uint64_t Magnitude(T value) {
    const auto bits = static_cast<std::uint64_t>(static_cast<Int128>(value));
    return value < 0 ? 0 - bits : bits;
}

template <class T>
Rounded<T> IntegerRoot(const T* values, const std::uint64_t* weights, int samples) {
    WideSum squares;
    std::uint64_t count = 0;
    for (int i = 0; i < samples; ++i) {
        squares.AddProduct(Square(Magnitude(values[i])), weights[i]);
        count += weights[i];
    }
    const long double mean = (std::ldexp(static_cast<long double>(squares.high), 128) +
                              static_cast<long double>(squares.low)) /
                             static_cast<long double>(count);
    constexpr auto limit = static_cast<long double>(~std::uint64_t{0});
    auto root = static_cast<std::uint64_t>(std::min(std::sqrt(mean), limit));
    while (root > 0 && Less(squares, BoundAbove(Square(root) - root, count))) --root;
    while (!Less(squares, BoundAbove(Square(root) + root, count))) ++root;
    root = std::min(root, static_cast<std::uint64_t>(std::numeric_limits<T>::max()));
    const WideSum whole = Times(Square(root), count);
    return {static_cast<T>(root), Less(whole, squares) ? 1 : Less(squares, whole) ? -1 : 0};
}

// A sum of long doubles without rounding, as components of growing size that do not overlap.
class Expansion {
public:
    void Add(long double term) {
        int kept = 0;
        for (int i = 0; i < count; ++i) {
            const long double sum = term + parts[i];
            const long double share = sum - term;
            const long double rest = (term - (sum - share)) + (parts[i] - share);
            if (rest != 0) parts[kept++] = rest;
            term = sum;
        }
        if (term != 0) parts[kept++] = term;
        count = kept;
    }
    // factor * value squared, for a value of at most 54 bits and a small factor.
    void AddSquare(long double value, int factor) {
        constexpr std::uint64_t upper = ~std::uint64_t{0} << 27;
        const auto bits = std::bit_cast<std::uint64_t>(static_cast<double>(value));
        const long double high = std::bit_cast<double>(bits & upper);
        const long double low = value - high;
        Add(factor * (high * high));
        Add(factor * (2 * high * low));
        Add(factor * (low * low));
    }
    int Sign() const { return count == 0 ? 0 : SignOf(parts[count - 1]); }

private:
    long double parts[16] = {};
    int count = 0;
};

// The same for types whose four squares fit in 64 bits with room to spare.
template <class T>
Rounded<T> SmallIntegerRoot(const T* values, int count) {
    std::int64_t squares = 0;
    for (int i = 0; i < count; ++i) squares += std::int64_t{values[i]} * values[i];
    auto root = static_cast<std::int64_t>(std::sqrt(static_cast<double>(squares) / count));
    while (root > 0 && squares <= count * (root - 1) * root) --root;
    while (squares > count * root * (root + 1)) ++root;
    root = std::min<std::int64_t>(root, std::numeric_limits<T>::max());
    return {static_cast<T>(root), SignOf(squares - count * root * root)};
}

template <class T>
Rounded<T> FloatRoot(const T* values, int count) {
    static_assert(std::numeric_limits<long double>::digits >= 64);
    long double squares = 0;
    for (int i = 0; i < count; ++i) {
        const long double value = values[i];
        squares += value * value;
    }
    const long double root = std::sqrt(squares / count);
    const Rounded<T> nearest = RoundedFloat<T>(root);
    const T other = std::nextafter(
        nearest.value, nearest.direction < 0 ? T{0} : std::numeric_limits<T>::infinity());
    const long double gap = std::abs(static_cast<long double>(other) - nearest.value);
    const long double distance = std::abs(root - nearest.value);
    // The root's own error is below a few units of 2 to the -63; only beside the middle of two
    // values can it decide, and there the squares are compared exactly.
    const long double doubt = std::ldexp(root, -58);
    if (nearest.direction == 0 || distance < gap / 2 - doubt) return nearest;
    const long double middle = (static_cast<long double>(other) + nearest.value) / 2;
    Expansion difference;
    for (int i = 0; i < count; ++i) difference.AddSquare(values[i], 1);
    difference.AddSquare(middle, -count);
    const int side = difference.Sign();
    if (side == 0) return RoundedFloat<T>(middle);
    const T lower = std::min(nearest.value, other);
    const T higher = std::max(nearest.value, other);
    return side > 0 ? Rounded<T>{higher, -1} : Rounded<T>{lower, 1};
}

}  // namespace

template <class T>
Rounded<T> RootMeanSquare(const T* values, int count) {
    if constexpr (zelm::kIsComplex<T>)
        return {values[0]};
    else if constexpr (std::is_floating_point_v<T>)
        return FloatRoot(values, count);
    else if constexpr (sizeof(T) <= 2)
        return SmallIntegerRoot(values, count);
    else
        return RootMeanSquare(values, kOnce, count);
}

template <class T>
Rounded<T> RootMeanSquare(const T* values, const std::uint64_t* weights, int count) {
    if constexpr (std::is_integral_v<T>)
        return IntegerRoot(values, weights, count);
    else
        return {values[0]};
}

#define ZMC_X(type, name, code)                              \
    template Rounded<type> RootMeanSquare(const type*, int); \
    template Rounded<type> RootMeanSquare(const type*, const std::uint64_t*, int);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
