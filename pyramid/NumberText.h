// Numbers as the documents of a pyramid file spell them, whatever the process's locale is.
//
// Reading takes the number at the start of a text, after white space, and ignores what follows; a
// text without one is 0.
#ifndef ZMC_PYRAMID_NUMBERTEXT_H
#define ZMC_PYRAMID_NUMBERTEXT_H

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

double ReadReal(std::string_view text);
// A signed or unsigned decimal, cut to 32 bits.
std::uint32_t ReadInteger(std::string_view text);

}  // namespace zelm

#endif
