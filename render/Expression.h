// Expression: arithmetic of a raster's bands, in doubles, a run of pixels at a time.
//
//     expression = term   { ("+" | "-") term }
//     term       = factor { ("*" | "/") factor }
//     factor     = { "+" | "-" } ( number | band | call | "(" expression ")" )
//     band       = "b" and a number from 1: "b4"
//     call       = ("abs" | "sqrt" | "log") "(" expression ")"
//                | ("min" | "max") "(" expression "," expression ")"
// Numbers are decimal, with "." for the point and an exponent if wanted; blanks may stand between
// words; log is the natural logarithm. A value that is not a number makes all that is computed from
// it none, min and max included.
//
// What is parsed is bounded: nesting, operations, and different bands. Does not change once it is
// parsed; any number of threads may evaluate one.
#ifndef ZMC_RENDER_EXPRESSION_H
#define ZMC_RENDER_EXPRESSION_H

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

namespace zmcrender {

class Expression {
public:
    static constexpr std::size_t kDeepest = 32;    // parentheses, calls and signs within another
    static constexpr std::size_t kMostBands = 64;  // different ones
    static constexpr std::size_t kAtOnce = 512;    // pixels

    // Throws StyleError of the key "expression".
    static Expression Parse(std::string_view text);

    // The bands that it names, counted from 1, in their order and each once.
    std::span<const std::uint32_t> Bands() const { return bands; }

    // values[i] for `count` pixels, up to kAtOnce; samples[k] are those of Bands()[k].
    void Evaluate(std::span<const double* const> samples, std::size_t count, double* values) const;

private:
    friend class ExpressionParser;
    enum class Code {
        Number,
        Band,
        Add,
        Subtract,
        Multiply,
        Divide,
        Negate,
        Abs,
        Sqrt,
        Log,
        Min,
        Max
    };
    // Of a program that pushes values and replaces those on top by their result.
    struct Step {
        Code code;
        double number = 0;      // of Number
        std::size_t place = 0;  // of Band, in Bands()
    };

    std::vector<Step> steps;
    std::vector<std::uint32_t> bands;
    std::size_t deepest = 0;  // values at once

    static void Apply(Code code, double* left, const double* right, std::size_t count);
};

}  // namespace zmcrender

#endif
