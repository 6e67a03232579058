#include "format/PyramidLayout.h"

#include <new>

#include "core/PixelVocabulary.h"
#include "format/LevelGeometry.h"
#include "format/PyramidLimits.h"
#include "format/TileTable.h"

namespace zelm {

bool PyramidLayout::LayOut() {
    const std::uint32_t sampleBytes = PixelSize(header.pixelType);
    levelOffsets.reset(new (std::nothrow) std::uint64_t[header.levelMax + 1u]());
    if (!levelOffsets) return false;
    std::uint64_t cursor = tileDataStart;
    for (std::uint32_t above = header.levelMax + 1u; above > header.levelMin; --above) {
        const std::uint32_t level = above - 1u;
        levelOffsets[level] = cursor;
        cursor += LevelGeometry::LevelPixels(header.width, header.height, level) * sampleBytes *
                  header.bandCount;
    }
    tileDataEnd = metaDocumentOffset = cursor;
    if (header.tileOrdering < TileOrder::Morton) return true;

    const TileTable table{LevelGeometry(header.width, header.height, header.tileSize, 0),
                          header.levelMin, header.levelMax, header.bandCount, sampleBytes};
    if (PyramidLimits::TileTableBytes(table.Tiles(), header.bandCount, header.levelMax) >
        PyramidLimits::kMaxEagerTableBytes)
        return true;
    tileCursor = tileDataStart;
    table.Place(tileOffsets, tileCursor);
    return tileOffsets.data != nullptr;
}

}  // namespace zelm
