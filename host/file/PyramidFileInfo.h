// PyramidFileInfo: how a pyramid file is laid out: its header, the places of its levels, and how
// much of it is there.
//
// No tile is touched and the file is never written. Sizes are in pixels, offsets and sizes of data
// in bytes from the start of the file; level 0 is the finest. All of it may run on several threads.
#ifndef ZMC_HOST_FILE_PYRAMIDFILEINFO_H
#define ZMC_HOST_FILE_PYRAMIDFILEINFO_H

#include <cstdint>
#include <string>
#include <vector>

#include "format/PyramidFront.h"
#include "host/file/PyramidHeader.h"

namespace zmchost {

// Levels from 32 on hold nothing, and neither do those that have shrunk to it: no pixel and no
// byte.
struct PyramidLevelInfo {
    std::uint32_t level = 0;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    std::uint32_t tilesAcross = 0;
    std::uint32_t tilesDown = 0;
    // Where the level begins in the orderings Scanline and Blocked. In the ordering Morton the
    // levels are woven into each other, and only `bytes` means something.
    std::uint64_t offset = 0;
    std::uint64_t bytes = 0;
};

struct PyramidFileInfo {
    PyramidHeader header;
    std::vector<PyramidLevelInfo> levels;  // from header.levelMin to header.levelMax
    // The file reaches the end of its tiles and its version is 1.1 or later.
    bool complete = false;
    std::uint64_t bytesMissing = 0;  // up to the end of the tiles

    // The level, or null if the file has no room for it.
    const PyramidLevelInfo* FindLevel(std::uint32_t level) const;
    // Where the metadata document stands, if there is one: right behind the tiles.
    std::uint64_t MetaDocumentOffset() const { return header.tileDataEnd; }
    bool HasMetadataDocument() const { return header.fileSize > header.tileDataEnd; }
};

// Reads the layout of the file of that UTF-8 name. Throws Error for a file that cannot be read or
// is no pyramid.
PyramidFileInfo ReadPyramidFileInfo(const std::string& file);

// The same from a header that is known already.
PyramidFileInfo DescribePyramidFile(const PyramidHeader& header);

// True if some bytes from the beginning of a file, of which 32 are enough, look like a pyramid.
using zelm::LooksLikePyramid;

}  // namespace zmchost

#endif
