// Text between Xerces and us, and the messages of the XML layer.
#ifndef ZMC_PYRAMID_XERCESTEXT_H
#define ZMC_PYRAMID_XERCESTEXT_H

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

// Writes to the standard error stream as it stands, and flushes.
void PrintError(const std::string& text);

}  // namespace zelm

#endif
