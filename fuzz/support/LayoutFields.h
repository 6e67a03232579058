// Header fields out of the bytes of an input.
#ifndef ZMC_FUZZ_SUPPORT_LAYOUTFIELDS_H
#define ZMC_FUZZ_SUPPORT_LAYOUTFIELDS_H

#include <cstdint>

#include "fuzz/support/InputBytes.h"
#include "fuzz/support/NaiveLayout.h"

namespace zmcfuzz {

// All that have a reader, one that has only a word, and none.
inline constexpr std::uint32_t kPixelTypes[] = {1, 99, 12, 2, 13, 3, 15, 14, 4, 5, 6, 9, 95, 0};

// Each field at or near an edge of arithmetic, or any number.
inline HeaderFields HostileFields(InputBytes& input) {
    HeaderFields fields;
    fields.samples = input.Size();
    fields.lines = input.Size();
    fields.bands = input.Size();
    fields.tile = input.Size();
    fields.levelMin = input.Size();
    fields.levelMax = input.Size();
    fields.pixelType = input.OneOf(kPixelTypes);
    fields.ordering = input.UpTo(3);
    return fields;
}

// Layouts of a few tiles, whose parts can all be looked at.
inline HeaderFields SmallFields(InputBytes& input) {
    HeaderFields fields;
    fields.samples = input.UpTo(60);
    fields.lines = input.UpTo(60);
    fields.bands = input.UpTo(20);
    fields.tile = 1 + input.UpTo(31);
    fields.levelMin = input.UpTo(3);
    fields.levelMax = fields.levelMin + input.UpTo(6);
    fields.pixelType = input.OneOf(kPixelTypes);
    fields.ordering = input.UpTo(2);
    return fields;
}

}  // namespace zmcfuzz

#endif
