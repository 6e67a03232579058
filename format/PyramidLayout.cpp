#include "format/PyramidLayout.h"

#include <new>

#include "core/PixelVocabulary.h"
#include "format/PyramidLimits.h"
#include "format/TileTable.h"

namespace zelm {

bool PyramidLayout::LayOut() {
    levelOffsets.reset(new (std::nothrow) std::uint64_t[header.levelMax + 1u]());
    if (!levelOffsets) return false;
    std::uint64_t cursor = tileDataStart;
    for (std::uint32_t above = header.levelMax + 1u; above > header.levelMin; --above) {
        const std::uint32_t level = above - 1u;
        levelOffsets[level] = cursor;
        cursor += header.LevelBytes(level);
    }
    tileDataEnd = metaDocumentOffset = cursor;
    if (!header.IsPlanar()) return true;

    const TileTable table{header.Geometry(0), header.levelMin, header.levelMax, header.bandCount,
                          PixelSize(header.pixelType)};
    if (PyramidLimits::TileTableBytes(table.Tiles(), header.bandCount, header.levelMax) >
        PyramidLimits::kMaxEagerTableBytes)
        return true;
    tileCursor = tileDataStart;
    table.Place(tileOffsets, tileCursor);
    return tileOffsets.data != nullptr;
}

}  // namespace zelm
