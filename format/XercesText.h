// Text between Xerces and us, and the messages of the XML layer.
#ifndef ZMC_FORMAT_XERCESTEXT_H
#define ZMC_FORMAT_XERCESTEXT_H

#include <string>
#include <string_view>

#include <xercesc/util/XercesDefs.hpp>

namespace zelm {

// Widens ASCII.
std::u16string ToWide(std::string_view ascii);
// UTF-8 of a zero-terminated text; empty for null.
std::string ToNarrow(const XMLCh* text);
// The same length, for numbers and words: what is not ASCII becomes '?', which is in neither.
void NarrowAscii(std::u16string_view text, std::string& out);

// Write to the standard error stream as it stands, and flush. Messages of exceptions are printed
// while memory may be out, so these throw nothing; a wide text, zero-terminated, falls away there.
void PrintError(std::string_view text) noexcept;
void PrintError(const XMLCh* text) noexcept;

}  // namespace zelm

#endif
