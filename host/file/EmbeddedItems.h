// EmbeddedItems: what a sidecar tells of a pyramid, kept in the file itself, so that it is not lost
// where the file is moved without its companions.
//
// The items are one text, which means nothing here. It stands in the metadata document, as an
// element SIDECAR in front of all records (docs/format.md). The readers of the format pass over an
// element of that name, and whoever stores records keeps it where it is: what a reader answers does
// not change by it. A file without items is found out by its document's first bytes.
#ifndef ZMC_HOST_FILE_EMBEDDEDITEMS_H
#define ZMC_HOST_FILE_EMBEDDEDITEMS_H

#include <string>
#include <string_view>

#include "files/ByteSource.h"
#include "host/file/PyramidHeader.h"

namespace zmchost {

// Puts `items` into a complete file that is open for writing and that nobody else reads or writes,
// and waits until they are on the disk; a document is made where there is none. A character that no
// document may have stands as "&#N;", which the items of a sidecar, being XML, mean it by. Throws
// Error, of the file that the user calls `name`, where they are no UTF-8, the document would be
// beyond the limits, is not one of this project's, or has items already, with the file as it was;
// and where it could not be written, with a document that counts as malformed.
void EmbedItems(zelm::files::ByteSource& file, const std::string& name, std::string_view items);

// The items of a file; empty if it has none, or its document is malformed. Throws Error for a
// document of more bytes than are taken on. `header` is the one in `file`.
std::string ReadEmbeddedItems(zelm::files::ByteSource& file, const std::string& name,
                              const PyramidHeader& header);

}  // namespace zmchost

#endif
