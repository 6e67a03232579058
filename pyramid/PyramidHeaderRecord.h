// The eleven values of a pyramid's header document.
#ifndef ZMC_PYRAMID_PYRAMIDHEADERRECORD_H
#define ZMC_PYRAMID_PYRAMIDHEADERRECORD_H

#include <cstdint>

namespace zelm {

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
