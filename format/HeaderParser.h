// HeaderParser: the values of a pyramid's header document. Whoever reads a header reads it here:
// what two parsers read differently would be a buffer of the wrong size.
//
// As lenient as readers of the format have to be (docs/format.md, "What a reader must tolerate"):
// the names of the elements that hold texts count, wherever they stand, and nothing else; a value
// that is missing is 0; of a number the beginning counts, and of two the last. What is malformed,
// or beyond DocumentLimits, is refused as a whole.
#ifndef ZMC_FORMAT_HEADERPARSER_H
#define ZMC_FORMAT_HEADERPARSER_H

#include <string>
#include <string_view>

#include "format/ElementNames.h"
#include "format/PyramidHeaderRecord.h"

namespace zelm {

// Takes the text of an element, or a piece of it, into the record. Elements that are none of a
// header's change nothing.
void TakeHeaderText(PyramidHeaderRecord& record, ElementName name, std::string_view text);

// Reads the values of a header document. What is wrong with it, for people, with `record` as it
// was; empty if nothing. A text may be anything. Throws std::bad_alloc. Xerces-C++ has been started
// by the caller; any thread.
std::string ParseHeaderText(std::string_view text, PyramidHeaderRecord& record);

}  // namespace zelm

#endif
