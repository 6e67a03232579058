// PyramidHeader: what a pyramid file says of itself at its start, read without the module.
//
// The module's interface does not tell the ordering, the tile side, the version, or how long the
// file ought to be; a host that writes tiles, or reports on a file, needs them.
#ifndef ZMC_HOST_FILE_PYRAMIDHEADER_H
#define ZMC_HOST_FILE_PYRAMIDHEADER_H

#include <cstdint>
#include <string>
#include <string_view>

namespace zmchost {

struct PyramidHeader {
    std::uint32_t versionMajor = 0;
    std::uint32_t versionMinor = 0;
    std::uint32_t bands = 0;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    std::uint32_t tileSize = 0;
    std::uint32_t minLevel = 0;
    std::uint32_t maxLevel = 0;
    std::uint32_t pixelType = 0;      // code
    std::int32_t interleave = -1;     // code
    std::uint32_t tileOrdering = 0;   // code
    std::uint64_t tileDataStart = 0;  // bytes from the start of the file
    std::uint64_t tileDataEnd = 0;    // where the tiles of a complete file end
    std::uint64_t fileSize = 0;

    // Bytes of tiles that the file still lacks.
    std::uint64_t BytesMissing() const {
        return fileSize < tileDataEnd ? tileDataEnd - fileSize : 0;
    }

    // Bytes of all tiles of a level, and where they start in the orderings Scanline and Blocked,
    // in which the coarsest level stands first.
    std::uint64_t LevelBytes(std::uint32_t level) const;
    std::uint64_t LevelOffset(std::uint32_t level) const;

    // Reads the header of a file. Throws Error if it is no pyramid file or its header is damaged.
    static PyramidHeader Read(const std::string& file);
    // The same from the file's first bytes, which reach to the first tile at least; `file` names it
    // in errors.
    static PyramidHeader Parse(const std::string& file, std::string_view start,
                               std::uint64_t fileSize);
    // Whether these first bytes of a file reach to the first tile.
    static bool IsWhole(std::string_view start);
};

}  // namespace zmchost

#endif
