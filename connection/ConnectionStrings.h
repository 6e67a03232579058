// The texts that name a dataset: connection arguments and the parameter strings in them.
//
// A connection argument is an array of strings, format words and parameters mixed. A parameter
// string is "KEY=value;KEY=value", without quoting, escapes or trimming. Keys are found as plain
// text, so that "NAME" is found in "FILENAME=x" as well, and the first occurrence counts. Numbers
// are read as far as they go: what is no number is 0, and only a missing key or an empty value is
// refused. Out arguments keep their value on false unless told otherwise.
//
// Nothing here throws. Memory that runs out shows as false, never as another number, or as an empty
// text. One thread at a time for each text, since texts cache their narrow forms.
#ifndef ZMC_CONNECTION_CONNECTIONSTRINGS_H
#define ZMC_CONNECTION_CONNECTIONSTRINGS_H

#include <cstdint>

#include "core/Array.h"
#include "core/String.h"

namespace zelm {

// The text behind "KEY=" up to the next ";". Sets `value` to the empty text on false: no such key,
// nothing behind it, or an empty source or key.
bool FindParameterValue(const String& source, const String& key, String& value);

// Whole numbers: "0x" introduces hexadecimal, a leading "0" octal. The fields that they fill have
// 32 bits, and so have the numbers on every platform: what lies beyond takes the highest value, or
// the lowest of a signed one, and a minus sign in front of an unsigned number wraps it.
bool ReadUnsignedParameter(const String& source, const String& key, std::uint32_t& value);
bool ReadSignedParameter(const String& source, const String& key, std::int32_t& value);

// The number of a pixel type that has a reader; false for any other.
bool ReadPixelTypeParameter(const String& source, const String& key, std::uint32_t& code);

// Exactly two numbers, separated by ","; empty ones do not count. They are decimal or "0x"
// hexadecimal, with an exponent or without, and the point is ".".
bool ReadDoublePairParameter(const String& source, const String& key, double& first,
                             double& second);

// An address as "%p" prints it. A text that is none gives null and true; false gives null too. An
// address that is a number cannot be told from one that is the caller's memory.
bool ReadPointerParameter(const String& source, const String& key, void** pointer);

// Cuts `source` at each unit that equals the first of `delimiter`, skipping the delimiter's whole
// length there; empty stretches are dropped. False for an empty source or delimiter. A view takes
// no elements.
bool SplitString(const String& source, const String& delimiter, Array<String>& out);

// The first element that is in the table of formats; the empty text if there is none.
String ExtractFormatName(const Array<String>& connection);

// The elements that are not in the table of formats. Always true; a view takes no elements.
bool ExtractConnectionParameters(const Array<String>& connection, Array<String>& out);

// Both of the above.
void SplitConnection(const Array<String>& connection, String& kind, Array<String>& parameters);

}  // namespace zelm

#endif
