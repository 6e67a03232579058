// PyramidHeader: what a pyramid file says of itself at its start, read without the module.
//
// The module's interface does not tell the ordering, the tile side, the version, or how long the
// file ought to be; a host that writes tiles, or reports on a file, needs them. Module and hosts
// read a header by one parser (format/), so that what is told here is what the module goes by.
//
// A header describes one moment of a file. All of it may run on several threads.
#ifndef ZMC_HOST_FILE_PYRAMIDHEADER_H
#define ZMC_HOST_FILE_PYRAMIDHEADER_H

#include <cstdint>
#include <string>
#include <string_view>

#include "files/ByteSource.h"
#include "format/PyramidHeaderRecord.h"

namespace zmchost {

struct PyramidHeader : zelm::PyramidHeaderRecord {
    std::uint64_t tileDataStart = 0;  // bytes from the start of the file
    std::uint64_t tileDataEnd = 0;    // where the tiles of a complete file end
    std::uint64_t fileSize = 0;       // when the header was read

    // Bytes of tiles that the file still lacks.
    std::uint64_t BytesMissing() const {
        return fileSize < tileDataEnd ? tileDataEnd - fileSize : 0;
    }

    // Where the tiles of a level start in the orderings Scanline and Blocked, in bytes from the
    // start of the file: the coarsest level stands first.
    std::uint64_t LevelOffset(std::uint32_t level) const {
        return tileDataStart + LevelStart(level);
    }

    // Reads the header of the file of that UTF-8 name. Throws Error if it is no pyramid file, its
    // header is damaged, or nobody could read samples by it: a tile size of 0 or above 2048, no
    // level, a level or sizes beyond the limits of the format, a pixel type without a reader, more
    // bands than are taken on (Limits.h).
    static PyramidHeader Read(const std::string& file);
    // The same from an open source; `name` stands for it in errors.
    static PyramidHeader Read(zelm::files::ByteSource& source, const std::string& name);
    // The same from the file's first bytes, which reach to the first tile at least.
    static PyramidHeader Parse(const std::string& name, std::string_view start,
                               std::uint64_t fileSize);
    // Whether these are the first bytes of a pyramid and reach to the first tile.
    static bool IsWhole(std::string_view start);
};

}  // namespace zmchost

#endif
