// Texts at the start of which a real number stands, or seems to: where readers of numbers part.
#ifndef ZMC_TESTS_SUPPORT_NUMBERTEXTS_H
#define ZMC_TESTS_SUPPORT_NUMBERTEXTS_H

#include <cmath>
#include <cstdlib>
#include <string>
#include <vector>

namespace zmctest {

// None holds a comma or a semicolon, which end a number in parameter strings.
inline std::vector<std::string> RealTexts() {
    const std::string zeros(400, '0');
    return {
        // No number, whatever sign stands in front, and numbers that end early.
        "", " ", "none", "x", "-x", "-", "+", "-.", ".", "-e5", "e5", "--1", "-+1", "+-1", " -abc",
        "- 1",
        "\xC2\xA0"
        "1",
        "1x", "1e", "1e+", "1e+-1", "2e-+1", "1e--1", "1.5.5", "12 7",
        // Decimals, and the ends of their range, which neither the first digit nor the sign of the
        // exponent tells.
        "255|7", "12x", "12e1", "12E1", "12.5", "999999999", "4294967296", "-000000000000000012",
        "1.5", " -2.5e3x", "\n\t 12.5 7", "+4", "-0", "-0.0", "1e999", "-1e999", "-0.1E999",
        "1e-999", "1E-999", "-1e-999", "0." + zeros + "1", "1" + zeros, "0." + zeros + "1e5",
        "-." + zeros + "9e+9", "9" + zeros + "e-5", "-12" + zeros + ".5E-9", "0001e400",
        "1e99999999999999999999", "1e-99999999999999999999", "1.7976931348623157e308",
        "1.7976931348623158e308", "1.7976931348623159e308", "2.2250738585072014e-308",
        "2.2250738585072011e-308", "4.9e-324", "5e-324", "2.4e-324", "2.5e-324", "1e-310",
        // Hexadecimals: a fraction alone, a binary exponent, and values that no double holds.
        "0x10", "0x.8", "0X.8p1", "0x1.8", "0x1.", "0x.", "0x", "-0x", "0xg", "0x.g", "0x-1",
        "0x+1", "0x 1", "0xp1", "0x1p", "0x1p+", "0x1p-", "0x1px", "0x2p+-1", "0X2P-+1",
        "-0x1.8p++4", "0x2p--1", "0x1p4", "0x1P-4", "0x1p0x1", "-0x1", "-0x0", " -0X1.8P+1z",
        "-0X1p-3z", "0x0p99999", "0x1p-2000", "-0x1p-2000", "0x1p2000", "-0x1p2000", "0x1p-1074",
        "0x1p-1075", "0x1.8p-1075", "0x1.8p-1074", "0x1.00000000000008p0",
        "0x1.000000000000080000001p0", "0x1.fffffffffffff8p1023", "0x1.fffffffffffff7p1023",
        "0x1.fffffffffffff7p-1023", "0x123456789abcdef0123456789", "0x0000000000000000000000000001",
        "0x.00000000000000000000000000001p+200", "0x1p99999999999999999999",
        "0x1p-99999999999999999999", "0x0.0000000000000000000000000000000p-99999999999999999999",
        // Words.
        "inf", "INF", "-inf", "-Infinity", "INFINITYx", "infx", "nan", "-nan", "NaN(7)", "nan(1)"};
}

// The sign of a zero counts as well; the sign of what is no number does not.
inline bool SameReal(double a, double b) {
    return (a == b && std::signbit(a) == std::signbit(b)) || (std::isnan(a) && std::isnan(b));
}

// What the C library reads, in the locale that a program starts in.
inline double LibraryReal(const std::string& text) { return std::strtod(text.c_str(), nullptr); }

}  // namespace zmctest

#endif
