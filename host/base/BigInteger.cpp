#include "host/base/BigInteger.h"

#include <bit>
#include <cmath>

namespace zmchost {

BigInteger::BigInteger(UInt128 magnitude, bool isNegative, std::uint32_t shift)
    : negative(isNegative) {
    limbs.assign(shift / 32, 0);
    const std::uint32_t bits = shift % 32;
    std::uint64_t carry = 0;
    for (; magnitude != 0 || carry != 0; magnitude >>= 32) {
        const std::uint64_t low = static_cast<std::uint32_t>(magnitude);
        carry |= low << bits;
        limbs.push_back(static_cast<std::uint32_t>(carry));
        carry >>= 32;
    }
    Trim(limbs);
    if (limbs.empty()) negative = false;
}

BigInteger BigInteger::Signed(Int128 value, std::uint32_t shift) {
    const auto bits = static_cast<UInt128>(value);
    return BigInteger(value < 0 ? UInt128{0} - bits : bits, value < 0, shift);
}

BigInteger& BigInteger::operator+=(const BigInteger& other) {
    if (negative == other.negative) {
        limbs = Sum(limbs, other.limbs);
    } else if (const int order = Compare(limbs, other.limbs); order >= 0) {
        limbs = Difference(limbs, other.limbs);
    } else {
        limbs = Difference(other.limbs, limbs);
        negative = other.negative;
    }
    if (limbs.empty()) negative = false;
    return *this;
}

BigInteger BigInteger::operator-(const BigInteger& other) const {
    BigInteger result = other;
    result.negative = !other.negative && !other.Zero();
    result += *this;
    return result;
}

BigInteger BigInteger::operator*(const BigInteger& other) const {
    BigInteger product;
    product.limbs.assign(limbs.size() + other.limbs.size(), 0);
    for (std::size_t i = 0; i < limbs.size(); ++i) {
        std::uint64_t carry = 0;
        for (std::size_t j = 0; j < other.limbs.size(); ++j) {
            carry += std::uint64_t{limbs[i]} * other.limbs[j] + product.limbs[i + j];
            product.limbs[i + j] = static_cast<std::uint32_t>(carry);
            carry >>= 32;
        }
        product.limbs[i + other.limbs.size()] = static_cast<std::uint32_t>(carry);
    }
    Trim(product.limbs);
    product.negative = negative != other.negative && !product.Zero();
    return product;
}

long double BigInteger::Split(std::int64_t& exponent) const {
    exponent = 0;
    if (limbs.empty()) return 0;
    const auto limb = [this](std::size_t fromTop) -> std::uint64_t {
        return fromTop < limbs.size() ? limbs[limbs.size() - 1 - fromTop] : 0;
    };
    const int unused = std::countl_zero(limbs.back());
    UInt128 top = 0;
    for (std::size_t i = 0; i < 4; ++i) top = top << 32 | limb(i);
    top <<= unused;
    // What lies below 128 bits can only tip a tie: one bit stands for it.
    for (std::size_t i = 4; i < limbs.size(); ++i) {
        if (limb(i) == 0) continue;
        top |= 1;
        break;
    }
    exponent = static_cast<std::int64_t>(limbs.size()) * 32 - unused;
    const long double significand = std::ldexp(static_cast<long double>(top), -128);
    return negative ? -significand : significand;
}

int BigInteger::Compare(const Limbs& a, const Limbs& b) {
    if (a.size() != b.size()) return a.size() < b.size() ? -1 : 1;
    for (std::size_t i = a.size(); i-- > 0;) {
        if (a[i] != b[i]) return a[i] < b[i] ? -1 : 1;
    }
    return 0;
}

BigInteger::Limbs BigInteger::Sum(const Limbs& a, const Limbs& b) {
    const Limbs& longer = a.size() < b.size() ? b : a;
    const Limbs& shorter = a.size() < b.size() ? a : b;
    Limbs sum = longer;
    std::uint64_t carry = 0;
    for (std::size_t i = 0; i < sum.size(); ++i) {
        carry += std::uint64_t{longer[i]} + (i < shorter.size() ? shorter[i] : 0);
        sum[i] = static_cast<std::uint32_t>(carry);
        carry >>= 32;
    }
    if (carry != 0) sum.push_back(static_cast<std::uint32_t>(carry));
    return sum;
}

BigInteger::Limbs BigInteger::Difference(const Limbs& larger, const Limbs& smaller) {
    Limbs difference = larger;
    std::uint64_t borrow = 0;
    for (std::size_t i = 0; i < larger.size(); ++i) {
        const std::uint64_t taken = borrow + (i < smaller.size() ? smaller[i] : 0);
        borrow = taken > larger[i] ? 1 : 0;
        difference[i] = static_cast<std::uint32_t>((borrow << 32) + larger[i] - taken);
    }
    Trim(difference);
    return difference;
}

void BigInteger::Trim(Limbs& number) {
    while (!number.empty() && number.back() == 0) number.pop_back();
}

}  // namespace zmchost
