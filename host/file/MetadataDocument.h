// The metadata document of a pyramid file, as a text: what stands behind the tiles, and whether a
// reader believes it.
//
// The module leaves a document aside that is malformed, stores nothing into it, and tells so by
// lines on the standard error stream alone; a host that wants to know asks here.
#ifndef ZMC_HOST_FILE_METADATADOCUMENT_H
#define ZMC_HOST_FILE_METADATADOCUMENT_H

#include <cstdint>
#include <string>
#include <string_view>

#include "files/ByteSource.h"
#include "host/file/PyramidHeader.h"

namespace zmchost {

// What is wrong with the form of a document, by the same parser and limits as in the module; empty
// if nothing. `text` may be anything.
std::string JudgeMetadataText(std::string text);

// The same in two steps for those who parse the text themselves, for what else it tells: before
// the parse, and behind it by the parser's fault, which is empty if it has none, and by the root.
std::string JudgeMetadataBytes(std::string_view text);
std::string JudgeMetadataParse(const std::string& fault, bool hasOurRoot);
// What is said of a document beyond the limit, which nobody parses.
std::string JudgeMetadataSize(std::uint64_t bytes);

// The text behind the tiles of a file; empty if there is none. Throws Error if it cannot be read or
// is too long. One with a NUL, which is no document, ends shortly behind it.
std::string ReadMetadataText(const std::string& file, const PyramidHeader& header);
// The same from an open source; `name` stands for it in errors.
std::string ReadMetadataText(zelm::files::ByteSource& source, const std::string& name,
                             const PyramidHeader& header);

// What is wrong with the document of a file; empty if nothing, or if it has none. Throws Error if
// the file cannot be read.
std::string JudgeMetadata(const std::string& file, const PyramidHeader& header);
// The same from an open source; `name` stands for it in errors.
std::string JudgeMetadata(zelm::files::ByteSource& source, const std::string& name,
                          const PyramidHeader& header);

}  // namespace zmchost

#endif
