// ArrayOf: a list as the module takes one.
#ifndef ZMC_HOST_RASTER_ARRAYOF_H
#define ZMC_HOST_RASTER_ARRAYOF_H

#include <algorithm>
#include <cstdint>
#include <new>
#include <vector>

#include "core/Array.h"

namespace zmchost {

// A copy, as deep as copying an element is. Throws std::bad_alloc.
template <class Element>
zelm::Array<Element> ArrayOf(const std::vector<Element>& elements) {
    zelm::Array<Element> array;
    if (!array.SetShape(zelm::ArrayShape(static_cast<std::uint32_t>(elements.size()))))
        throw std::bad_alloc();
    std::copy(elements.begin(), elements.end(), array.data);
    return array;
}

}  // namespace zmchost

#endif
