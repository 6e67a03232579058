// BigInteger: signed integers of any size, as few operations as exact statistics need.
//
// Used once per band, never per sample. Operations allocate and throw std::bad_alloc.
#ifndef ZMC_HOST_BASE_BIGINTEGER_H
#define ZMC_HOST_BASE_BIGINTEGER_H

#include <cstdint>
#include <vector>

#include "host/base/Int128.h"

namespace zmchost {

class BigInteger {
public:
    BigInteger() = default;

    // magnitude * 2 to the shift, negated where told.
    explicit BigInteger(UInt128 magnitude, bool isNegative = false, std::uint32_t shift = 0);

    static BigInteger Signed(Int128 value, std::uint32_t shift = 0);

    BigInteger& operator+=(const BigInteger& other);
    BigInteger operator-(const BigInteger& other) const;
    BigInteger operator*(const BigInteger& other) const;

    bool Negative() const { return negative; }
    bool Zero() const { return limbs.empty(); }

    // significand and exponent with the value rounded to 64 bits = significand * 2 to the exponent;
    // the significand is 0, or at least 1/2 and at most 1 by its magnitude.
    long double Split(std::int64_t& exponent) const;

private:
    using Limbs = std::vector<std::uint32_t>;  // least significant first, no zero on top

    static int Compare(const Limbs& a, const Limbs& b);
    static Limbs Sum(const Limbs& a, const Limbs& b);
    static Limbs Difference(const Limbs& larger, const Limbs& smaller);
    static void Trim(Limbs& number);

    Limbs limbs;
    bool negative = false;
};

}  // namespace zmchost

#endif
