// printf for wide texts, meaning the same on every platform.
//
// "%s" and "%c" take a text and a unit of the format's own width, "%hs", "%hc", "%S" and "%C"
// narrow ones, whose bytes are widened one by one. Numbers, pointers, flags, widths and precisions
// are those of printf. A null text prints as "(null)"; "%n" writes nothing. One number takes at
// most 4095 units.
#ifndef ZMC_PLATFORM_WIDEFORMAT_H
#define ZMC_PLATFORM_WIDEFORMAT_H

#include <cstdarg>
#include <cstddef>

namespace platform {

// Writes at most `capacity` - 1 units and a terminator, and returns the units written: a text
// that is longer is cut there, not lost. `capacity` must not be 0. Never throws; uses the C locale
// of the process for numbers.
std::size_t FormatWideV(wchar_t* buffer, std::size_t capacity, const wchar_t* format,
                        std::va_list arguments);
std::size_t FormatWideV(char16_t* buffer, std::size_t capacity, const char16_t* format,
                        std::va_list arguments);

// The same with the arguments in place.
std::size_t FormatWide(wchar_t* buffer, std::size_t capacity, const wchar_t* format, ...);
std::size_t FormatWide(char16_t* buffer, std::size_t capacity, const char16_t* format, ...);

}  // namespace platform

#endif
