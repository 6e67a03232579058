// Products and sums of sizes in 64 bits that tell when they do not fit.
//
// Every size that comes out of a file or from a caller passes through these before anything is
// allocated, looped over or addressed with it.
#ifndef ZMC_CORE_CHECKEDARITHMETIC_H
#define ZMC_CORE_CHECKEDARITHMETIC_H

#include <cstdint>
#include <initializer_list>
#include <limits>
#include <optional>

namespace zelm {

// The product of all factors, or nothing if it does not fit in 64 bits. A factor of 0 makes it 0,
// whatever the others are.
constexpr std::optional<std::uint64_t> CheckedProduct(
    std::initializer_list<std::uint64_t> factors) {
    for (const std::uint64_t factor : factors)
        if (factor == 0) return 0;
    std::uint64_t product = 1;
    for (const std::uint64_t factor : factors) {
        if (product > std::numeric_limits<std::uint64_t>::max() / factor) return std::nullopt;
        product *= factor;
    }
    return product;
}

// The sum of both, or nothing if it does not fit or one of them is missing.
constexpr std::optional<std::uint64_t> CheckedSum(std::optional<std::uint64_t> a,
                                                  std::optional<std::uint64_t> b) {
    if (!a || !b || *a > std::numeric_limits<std::uint64_t>::max() - *b) return std::nullopt;
    return *a + *b;
}

// A size that is known and at most `limit`.
constexpr bool FitsWithin(std::optional<std::uint64_t> size, std::uint64_t limit) {
    return size && *size <= limit;
}

}  // namespace zelm

#endif
