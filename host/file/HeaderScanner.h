// ScanHeaderDocument: the values of a pyramid's header document, by element name.
//
// A strict, small scanner for documents of one known shape: the root DATASET, in it HEADER, in it
// leaves of text. It reads a declaration, comments, processing instructions and the predefined
// entities, and refuses all else (document types, other entities, deeper nesting, text between
// elements), so that no input can make it slow or large: one pass, memory as large as the text.
// Starting a general parser would cost ten times what the rest of opening a file does.
#ifndef ZMC_HOST_FILE_HEADERSCANNER_H
#define ZMC_HOST_FILE_HEADERSCANNER_H

#include <map>
#include <string>
#include <string_view>

namespace zmchost {

// Leaves of HEADER, trimmed; of a name that stands twice, the last. `document` is UTF-8. Throws
// std::runtime_error with what is wrong, where the document is not well formed or has another
// shape.
std::map<std::string, std::string, std::less<>> ScanHeaderDocument(std::string_view document);

}  // namespace zmchost

#endif
