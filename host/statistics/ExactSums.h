// ExactSums<T>: the sum and the sum of squares of samples, without any rounding.
//
// Integers are summed in 128 bits, squares of 64-bit types in 192. Floating samples are mantissas
// times a power of two: the mantissas of each exponent are summed as integers. Adding is therefore
// associative and commutative, and merging gives what one object alone would have found.
// Sum() and SumOfSquares() are in units of 2 to the kSumExponent and kSquaresExponent.
#ifndef ZMC_HOST_STATISTICS_EXACTSUMS_H
#define ZMC_HOST_STATISTICS_EXACTSUMS_H

#include <algorithm>
#include <bit>
#include <cstdint>
#include <type_traits>
#include <vector>

#include "core/ElementTypes.h"
#include "host/base/BigInteger.h"
#include "host/base/Int128.h"
#include "host/base/PackedNumbers.h"

namespace zmchost {

// An unsigned sum of up to 2 to the 64 terms of 128 bits.
struct WideSum {
    UInt128 low = 0;
    std::uint64_t high = 0;

    void Add(UInt128 term) {
        low += term;
        high += low < term ? 1 : 0;
    }
    void AddProduct(UInt128 term, std::uint64_t times) {
        const UInt128 lower = UInt128{static_cast<std::uint64_t>(term)} * times;
        const UInt128 upper = (term >> 64) * times;
        Add(lower);
        Add(upper << 64);
        high += static_cast<std::uint64_t>(upper >> 64);
    }
    void Merge(const WideSum& other) {
        Add(other.low);
        high += other.high;
    }
    void Save(NumberPacker& packer) const {
        packer.Put(low);
        packer.Put(high);
    }
    void Load(NumberUnpacker& numbers) {
        low = numbers.TakeLong();
        high = numbers.Take();
    }
    BigInteger Value(std::uint32_t shift = 0) const {
        BigInteger value(low, false, shift);
        value += BigInteger(high, false, shift + 128);
        return value;
    }
};

// Integers.
template <class T>
class ExactSums {
public:
    static constexpr std::int64_t kSumExponent = 0;
    static constexpr std::int64_t kSquaresExponent = 0;

    void Add(T value, std::uint64_t times = 1) {
        sum += static_cast<Int128>(value) * times;
        const UInt128 magnitude =
            value < 0 ? UInt128{0} - static_cast<UInt128>(value) : static_cast<UInt128>(value);
        squares.AddProduct(magnitude * magnitude, times);
    }
    // Sums that the caller has taken himself.
    void AddSums(std::int64_t furtherSum, UInt128 furtherSquares) {
        sum += furtherSum;
        squares.Add(furtherSquares);
    }
    void Merge(const ExactSums& other) {
        sum += other.sum;
        squares.Merge(other.squares);
    }
    // As numbers, and back; what is loaded replaces what was there.
    void Save(NumberPacker& packer) const {
        packer.Put(static_cast<UInt128>(sum));
        squares.Save(packer);
    }
    void Load(NumberUnpacker& numbers) {
        sum = static_cast<Int128>(numbers.TakeLong());
        squares.Load(numbers);
    }
    BigInteger Sum() const { return BigInteger::Signed(sum); }
    BigInteger SumOfSquares() const { return squares.Value(); }

private:
    Int128 sum = 0;
    WideSum squares;
};

// float and double. Samples are finite.
template <class T>
requires std::is_floating_point_v<T>
class ExactSums<T> {
    using Bits = std::conditional_t<sizeof(T) == 4, std::uint32_t, std::uint64_t>;
    static constexpr int kFraction = sizeof(T) == 4 ? 23 : 52;
    static constexpr std::uint32_t kExponents = sizeof(T) == 4 ? 255 : 2047;

public:
    static constexpr std::int64_t kSumExponent = sizeof(T) == 4 ? -149 : -1074;
    static constexpr std::int64_t kSquaresExponent = 2 * kSumExponent;

    void Add(T value, std::uint64_t times = 1) {
        Reserve();
        const auto bits = std::bit_cast<Bits>(value);
        Slot& slot = slots[Exponent(bits)];
        const Int128 mantissa = static_cast<Int128>(Mantissa(bits)) * times;
        slot.sum += (bits & kSign) != 0 ? -mantissa : mantissa;
        slot.squares.AddProduct(UInt128{Mantissa(bits)} * Mantissa(bits), times);
    }

    // Makes room, so that AddOne may follow.
    void Reserve() {
        if (slots.empty()) slots.resize(kExponents);
    }

    // The sample's bits stand for its value; the caller has looked whether it is finite.
    void AddOne(Bits bits) {
        Slot& slot = slots[Exponent(bits)];
        const std::uint64_t mantissa = Mantissa(bits);
        const auto sign = static_cast<std::int64_t>((bits & kSign) != 0 ? ~std::uint64_t{0} : 0);
        slot.sum += (static_cast<std::int64_t>(mantissa) ^ sign) - sign;
        slot.squares.Add(UInt128{mantissa} * mantissa);
    }

    static bool Finite(Bits bits) { return Exponent(bits) < kExponents; }

    void Merge(const ExactSums& other) {
        if (other.slots.empty()) return;
        Reserve();
        for (std::size_t i = 0; i < slots.size(); ++i) {
            slots[i].sum += other.slots[i].sum;
            slots[i].squares.Merge(other.slots[i].squares);
        }
    }

    // As numbers, and back; of the exponents that occur alone.
    void Save(NumberPacker& packer) const {
        const auto used = [](const Slot& slot) { return !slot.Empty(); };
        packer.Put(static_cast<std::uint64_t>(std::count_if(slots.begin(), slots.end(), used)));
        for (std::uint32_t i = 0; i < slots.size(); ++i) {
            if (slots[i].Empty()) continue;
            packer.Put(std::uint64_t{i});
            packer.Put(static_cast<UInt128>(slots[i].sum));
            slots[i].squares.Save(packer);
        }
    }
    void Load(NumberUnpacker& numbers) {
        slots.assign(kExponents, Slot());
        for (std::uint64_t left = numbers.Take(); left > 0 && numbers.Good(); --left) {
            const std::uint64_t exponent = numbers.Take();
            if (exponent >= kExponents) return numbers.Refuse();
            slots[exponent].sum = static_cast<Int128>(numbers.TakeLong());
            slots[exponent].squares.Load(numbers);
        }
    }

    BigInteger Sum() const {
        BigInteger total;
        for (std::uint32_t i = 0; i < slots.size(); ++i) {
            if (slots[i].sum != 0) total += BigInteger::Signed(slots[i].sum, Shift(i));
        }
        return total;
    }
    BigInteger SumOfSquares() const {
        BigInteger total;
        for (std::uint32_t i = 0; i < slots.size(); ++i) {
            const WideSum& squares = slots[i].squares;
            if (squares.low != 0 || squares.high != 0) total += squares.Value(2 * Shift(i));
        }
        return total;
    }

private:
    struct Slot {
        Int128 sum = 0;
        WideSum squares;

        bool Empty() const { return sum == 0 && squares.low == 0 && squares.high == 0; }
    };
    static constexpr Bits kSign = Bits{1} << (8 * sizeof(T) - 1);

    static std::uint32_t Exponent(Bits bits) {
        return static_cast<std::uint32_t>((bits & ~kSign) >> kFraction);
    }
    static std::uint64_t Mantissa(Bits bits) {
        const std::uint64_t fraction = bits & ((Bits{1} << kFraction) - 1);
        return Exponent(bits) == 0 ? fraction : fraction | std::uint64_t{1} << kFraction;
    }
    // Subnormal numbers have the unit of the smallest normal exponent.
    static std::uint32_t Shift(std::uint32_t exponent) { return exponent == 0 ? 0 : exponent - 1; }

    std::vector<Slot> slots;
};

// Complex samples have no sums that a record could hold.
template <class P>
class ExactSums<zelm::Complex<P>> {};

}  // namespace zmchost

#endif
