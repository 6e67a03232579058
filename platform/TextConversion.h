// Conversion between the 16-bit text of the object model and narrow text.
//
// A port provides the functions below; on Windows they are MultiByteToWideChar and
// WideCharToMultiByte with the code pages 65001 and 0. Every function may be called from any
// thread and never throws. Malformed input becomes U+FFFD; a character that the locale's charset
// cannot hold becomes '?'.
#ifndef ZMC_PLATFORM_TEXTCONVERSION_H
#define ZMC_PLATFORM_TEXTCONVERSION_H

#include <cstddef>

namespace platform {

// Result of a conversion that failed as a whole.
inline constexpr std::size_t kConversionFailed = static_cast<std::size_t>(-1);

// Converts `length` bytes of UTF-8 to UTF-16. Writes at most `capacity` units to `out` and no
// terminator; `out` may be null when `capacity` is 0. Returns the units that the whole text needs,
// which never exceed `length`.
std::size_t Utf8ToUtf16(const char* text, std::size_t length, char16_t* out, std::size_t capacity);

// Converts `length` units of UTF-16 to UTF-8, under the same rules: at most three bytes a unit.
std::size_t Utf16ToUtf8(const char16_t* text, std::size_t length, char* out, std::size_t capacity);

// Converts `length` units of UTF-16 to the charset of the process's locale, under the same rules.
std::size_t Utf16ToLocale(const char16_t* text, std::size_t length, char* out,
                          std::size_t capacity);

// Lower case of one code unit, independent of the locale. Surrogates are returned unchanged.
char16_t ToLowerUnit(char16_t unit);

}  // namespace platform

#endif
