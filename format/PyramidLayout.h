// PyramidLayout: all that a header settles about a pyramid file, as one value: the header's own
// numbers, the tables, where tile data begin and end, whether the file is complete.
//
// Pure arithmetic: no file. A layout is built aside, and a dataset takes it over whole once nothing
// can fail any more. One without `levelOffsets` has no place for any tile.
#ifndef ZMC_FORMAT_PYRAMIDLAYOUT_H
#define ZMC_FORMAT_PYRAMIDLAYOUT_H

#include <cstdint>
#include <memory>
#include <optional>

#include "core/Array.h"
#include "format/PyramidHeaderRecord.h"

namespace zelm {

struct PyramidLayout {
    PyramidHeaderRecord header;
    std::uint64_t tileDataStart = 0;
    std::uint64_t tileDataEnd = 0;
    // Follows from the other values; the one in the file counts only where nothing is laid out.
    std::uint64_t metaDocumentOffset = 0;
    std::unique_ptr<std::uint64_t[]> levelOffsets;  // levelMax + 1 entries, 0 below levelMin
    Array<std::uint64_t> tileOffsets;  // the table of TileTable, or empty until it is needed
    std::uint64_t tileCursor = 0;
    bool complete = false;

    // The levels that a laid-out header counts; wraps where no level is laid out.
    std::uint32_t LevelCount() const {
        return levelOffsets ? header.levelMax - header.levelMin + 1u : 0;
    }

    // Gives the levels their places, the coarsest first, from `tileDataStart` on, and the tiles
    // theirs where the table is small. Needs a header that PyramidLimits allow. False, with nothing
    // of use in the tables, if memory ran out.
    bool LayOut();

    // Whether files of that version can be complete: those of 1.1 and later.
    static bool MayHaveLevels(std::uint32_t versionMajor, std::uint32_t versionMinor) {
        return versionMajor > 1 || (versionMajor == 1 && versionMinor > 0);
    }

    // Whether a file of that size counts as complete: it reaches the end of its tile data, and its
    // version is 1.1 or later. Files of version 1.0 never do, however long they are, and none that
    // does not tell its size.
    static bool IsComplete(std::uint32_t versionMajor, std::uint32_t versionMinor,
                           std::uint64_t tileDataEnd, std::optional<std::uint64_t> fileSize) {
        return MayHaveLevels(versionMajor, versionMinor) && fileSize && *fileSize >= tileDataEnd;
    }
};

}  // namespace zelm

#endif
