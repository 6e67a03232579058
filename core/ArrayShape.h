// ArrayShape: extent of a multi-dimensional array, up to eight dimensions, slowest first.
//
//     ArrayShape(3)             three elements in a row
//     ArrayShape(480, 640)      480 lines of 640 samples: 2 dimensions, 307,200 elements
//     ArrayShape(480, 640, 3)   the same with three bands in each pixel, interleaved by pixel
//
// A plain value: it allocates nothing, throws nothing and knows of no array.
#ifndef ZMC_CORE_ARRAYSHAPE_H
#define ZMC_CORE_ARRAYSHAPE_H

#include <cstdint>

namespace zelm {

struct ArrayShape {
    static constexpr std::uint32_t kMaxDimensions = 8;

    std::uint32_t extents[kMaxDimensions] = {1, 1, 1, 1, 1, 1, 1, 1};  // 1 where not in use
    std::uint32_t dimensions = 0;                                      // extents in use
    std::uint32_t elements = 0;                                        // product of the extents

    // No dimensions and no elements.
    constexpr ArrayShape() = default;

    // Dimensions reach to the last extent that is not 0; every 0 is stored as 1. The product is
    // taken modulo 2 to the 32, as all counts of elements here.
    constexpr explicit ArrayShape(std::uint32_t e0, std::uint32_t e1 = 0, std::uint32_t e2 = 0,
                                  std::uint32_t e3 = 0, std::uint32_t e4 = 0, std::uint32_t e5 = 0,
                                  std::uint32_t e6 = 0, std::uint32_t e7 = 0) {
        const std::uint32_t given[kMaxDimensions] = {e0, e1, e2, e3, e4, e5, e6, e7};
        std::uint32_t product = 1;
        for (std::uint32_t i = 0; i < kMaxDimensions; ++i) {
            if (given[i] == 0) continue;
            extents[i] = given[i];
            dimensions = i + 1;
            product *= given[i];
        }
        elements = dimensions == 0 ? 0 : product;
    }

    // The shape that Array::Clear and a failed allocation leave behind: one dimension of 0.
    static constexpr ArrayShape Emptied() {
        ArrayShape shape;
        shape.extents[0] = 0;
        shape.dimensions = 1;
        return shape;
    }
};

}  // namespace zelm

#endif
