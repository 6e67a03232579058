// PartExtents: which bytes of the file a part of a build fills.
//
// Pure arithmetic on a header; no file is touched. Extents are half-open, [begin, end), in bytes
// from the start of the file, in ascending order, and none touches the next.
#ifndef ZMC_HOST_BUILD_PARTEXTENTS_H
#define ZMC_HOST_BUILD_PARTEXTENTS_H

#include <cstdint>
#include <vector>

#include "host/build/PartGrid.h"
#include "host/file/PyramidHeader.h"

namespace zmchost {

struct Extent {
    std::uint64_t begin = 0;
    std::uint64_t end = 0;

    bool operator==(const Extent&) const = default;
    std::uint64_t Size() const { return end - begin; }
};

// Sorts them, and makes one of those that touch or overlap.
std::vector<Extent> Merged(std::vector<Extent> extents);

// The tiles of a part at the levels from `finest` to the grid's own. No two parts share a byte. The
// header is that of the file for which the grid was planned.
std::vector<Extent> PartExtents(const PyramidHeader& header, const PartGrid& grid,
                                std::uint64_t part, std::uint32_t finest = 0);

}  // namespace zmchost

#endif
