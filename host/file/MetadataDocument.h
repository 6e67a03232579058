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

#include "host/file/PyramidHeader.h"

namespace zmchost {

// These stand in files. A longer document is not read; a text that begins with this byte is one
// whose store did not come to its end (docs/format.md).
inline constexpr std::uint64_t kMaxMetadataDocument = std::uint64_t{256} << 20;
inline constexpr char kUnfinishedStore = 0x1A;

// What is wrong with the form of a document; empty if nothing. `text` may be anything.
std::string JudgeMetadataText(std::string_view text);

// The text behind the tiles of a file; empty if there is none. Throws Error if it cannot be read or
// is too long.
std::string ReadMetadataText(const std::string& file, const PyramidHeader& header);

// What is wrong with the document of a file; empty if nothing, or if it has none. Throws Error if
// the file cannot be read.
std::string JudgeMetadata(const std::string& file, const PyramidHeader& header);

}  // namespace zmchost

#endif
