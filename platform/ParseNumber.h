// Numbers at the start of a narrow text, read as far as they go.
//
// The grammar is that of strtod and strtoul: white space and a sign in front, "0x" for
// hexadecimals, and whatever follows the number is not looked at. A text that begins with no number
// is 0. The locale of the process has no say in the decimal point. Texts are zero-terminated.
// Nothing throws and nothing is allocated; any thread may call.
#ifndef ZMC_PLATFORM_PARSENUMBER_H
#define ZMC_PLATFORM_PARSENUMBER_H

#include <cstdint>

namespace platform {

// The double nearest to a decimal or hexadecimal number, with "." for the point; "inf", "infinity"
// and "nan" in any case as well. What no double can hold is an infinity or nearest to nothing, with
// its sign.
double ParseReal(const char* text);

// Whole numbers, decimal, "0x" hexadecimal or "0" octal, in a world whose `long` has 32 bits: what
// lies beyond them is the highest, or the lowest signed, number. A minus in front of an unsigned
// number that has 32 bits wraps it.
std::uint32_t ParseUnsigned32(const char* text);
std::int32_t ParseSigned32(const char* text);

}  // namespace platform

#endif
