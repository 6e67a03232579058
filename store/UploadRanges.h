// UploadRanges: a file that grows by parts, cut into the ranges that an object store takes as the
// parts of one upload.
//
// A store wants each range but the last to have a least size, and takes ten thousand at the most.
// Most bytes of a range should come from one worker, who can then send all of it alone: ranges
// begin and end where a worker's bytes do wherever these are long enough, and share what is short
// with their neighbours.
//
// Pure arithmetic; no file is touched. Offsets are in bytes from the start of the file.
#ifndef ZMC_STORE_UPLOADRANGES_H
#define ZMC_STORE_UPLOADRANGES_H

#include <cstdint>
#include <span>
#include <vector>

#include "host/build/PartExtents.h"

namespace zmcstore {

inline constexpr std::uint64_t kMostRanges = 10000;
inline constexpr std::uint64_t kUsualLeastRange = std::uint64_t{5} << 20;
inline constexpr std::uint64_t kMostRangeBytes = std::uint64_t{5} << 30;
// The most bytes that so many ranges of at most such a size hold, whatever their bounds.
inline constexpr std::uint64_t kMostFileBytes = (kMostRanges - 1) * (kMostRangeBytes / 2);

// The least size of a range for a file of that many bytes, of kMostFileBytes at the most, so that
// kMostRanges suffice; not below `wanted`, which is kMostRangeBytes / 2 at the most.
std::uint64_t LeastRange(std::uint64_t fileBytes, std::uint64_t wanted);

// Where ranges end, ascending; the first begins at 0, and a last one goes from the last of these to
// the end of the file, wherever that will be. Each but the last has `least` bytes or more, and
// below twice as many or, if that is more, 32 MiB. `runs` are the bytes of one worker each,
// ascending and apart; what lies between them, and from the last to `end`, is nobody's.
std::vector<std::uint64_t> PlanRanges(std::span<const zmchost::Extent> runs, std::uint64_t end,
                                      std::uint64_t least);

// What of a worker's bytes makes whole ranges, and what does not.
struct Share {
    std::vector<std::uint64_t> ranges;    // by number, from 0; never the last one
    std::vector<zmchost::Extent> pieces;  // the rest of its bytes
};
Share ShareOf(std::span<const zmchost::Extent> extents, std::span<const std::uint64_t> bounds);

}  // namespace zmcstore

#endif
