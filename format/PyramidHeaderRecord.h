// The front of a pyramid file: where its fixed fields stand, and the eleven values of its header
// document.
#ifndef ZMC_FORMAT_PYRAMIDHEADERRECORD_H
#define ZMC_FORMAT_PYRAMIDHEADERRECORD_H

#include <cstddef>
#include <cstdint>

namespace zelm {

// These stand in files: the magic, then two offsets of 8 bytes (where the tile data begin, where
// the metadata document does), then the header document.
namespace PyramidFront {
inline constexpr unsigned char kMagic[4] = {'K', 'O', 'B', 'T'};
inline constexpr std::uint64_t kOffsetsOffset = sizeof kMagic;
inline constexpr std::size_t kOffsetsSize = 2 * sizeof(std::uint64_t);
inline constexpr std::uint64_t kHeaderOffset = kOffsetsOffset + kOffsetsSize;
}  // namespace PyramidFront

struct PyramidHeaderRecord {
    std::uint32_t versionMajor = 0;
    std::uint32_t versionMinor = 0;
    std::uint32_t bandCount = 0;
    std::uint32_t width = 0;   // of level 0, in pixels
    std::uint32_t height = 0;  // of level 0, in pixels
    std::uint32_t tileSize = 0;
    std::uint32_t levelMin = 0;
    std::uint32_t levelMax = 0;
    std::uint32_t pixelType = 0;
    std::int32_t interleave = 0;
    std::uint32_t tileOrdering = 0;
};

}  // namespace zelm

#endif
