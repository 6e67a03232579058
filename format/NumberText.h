// Numbers as the documents of a pyramid file spell them, whatever the process's locale is.
//
// Reading takes the number at the start of a text, after white space, and ignores what follows; a
// text without one is 0. Numbers are those of the C library's atof and atoi in its own locale:
// hexadecimal reals, `inf` and `nan` as well.
#ifndef ZMC_FORMAT_NUMBERTEXT_H
#define ZMC_FORMAT_NUMBERTEXT_H

#include <charconv>
#include <concepts>
#include <cstdint>
#include <string>
#include <string_view>

#include "core/ElementTypes.h"

namespace zelm {

// Digits of reals: statistics and double pixels, and all other floating pixels.
inline constexpr int kRealDigits = 15;
inline constexpr int kShortRealDigits = 6;

template <std::integral T>
std::string FormatDecimal(T value) {
    char text[24];
    // A plain char is a number here, and never a character.
    return std::string(text, std::to_chars(text, text + sizeof text, value).ptr);
}

// Default notation with that many significant digits, as "%.15g" gives it.
std::string FormatReal(double value, int digits);

template <class T>
std::string FormatPixel(const T& value) {
    if constexpr (kIsComplex<T>)
        return FormatReal(value.re, kShortRealDigits) + ' ' +
               FormatReal(value.im, kShortRealDigits);
    else if constexpr (std::is_same_v<T, float>)
        return FormatReal(value, kShortRealDigits);
    else if constexpr (std::is_same_v<T, double>)
        return FormatReal(value, kRealDigits);
    else
        return FormatDecimal(value);
}

// Beyond the range of a double: infinity, or the nearest to nothing.
double ReadReal(std::string_view text);
// A decimal with or without a sign, which ends at the numbers of 64 bits and is then cut to 32.
std::uint32_t ReadInteger(std::string_view text);

}  // namespace zelm

#endif
