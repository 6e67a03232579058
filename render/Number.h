// Number: a value of a raster as a text or a record tells it, without what a double would lose.
//
// Whole numbers of up to 64 bits, with or without a sign, are kept as they are; `real` is the
// nearest double of every number. A plain value; any number of threads may use one.
#ifndef ZMC_RENDER_NUMBER_H
#define ZMC_RENDER_NUMBER_H

#include <concepts>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace zmcrender {

struct Number {
    double real = 0;
    bool whole = false;           // magnitude and negative tell it exactly
    bool negative = false;        // of a whole number
    std::uint64_t magnitude = 0;  // likewise

    Number() = default;
    // Whole where `value` is, below 2^64.
    explicit Number(double value);
    template <std::integral T>
    explicit Number(T value)
        : real(static_cast<double>(value)),
          whole(true),
          negative(value < 0),
          magnitude(negative ? std::uint64_t{0} - static_cast<std::uint64_t>(value)
                             : static_cast<std::uint64_t>(value)) {}

    // A decimal number with "." for the point, with or without a sign and an exponent, and nothing
    // around it; no number for anything else, infinities and what no double can hold included.
    static std::optional<Number> Parse(std::string_view text);
    // The shortest text that Parse makes the same number of.
    std::string Text() const;

    friend bool operator==(const Number&, const Number&) = default;
};

}  // namespace zmcrender

#endif
