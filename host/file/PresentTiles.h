// PresentTiles: which tiles an incomplete file holds: those whose last byte lies before its end.
//
// Pure arithmetic on a header; no file is touched. Any number of threads may look.
#ifndef ZMC_HOST_FILE_PRESENTTILES_H
#define ZMC_HOST_FILE_PRESENTTILES_H

#include <cstdint>
#include <optional>
#include <span>

#include "format/Rectangle.h"
#include "format/TileTable.h"
#include "host/file/PyramidHeader.h"

namespace zmchost {

class PresentTiles {
public:
    explicit PresentTiles(const PyramidHeader& described);

    // Whether a file of that size has every tile that a window of a level touches, of those bands
    // (from 0). The window lies in the level. Levels above the finest count from version 1.1 on.
    bool Have(std::uint32_t level, const zelm::Rectangle& window,
              std::span<const std::uint32_t> bands, std::uint64_t fileSize) const;
    // The same of a whole level with all bands. In the ordering Morton no level is whole before all
    // are: the tiles of the last band come last.
    bool HaveLevel(std::uint32_t level, std::uint64_t fileSize) const;

private:
    PyramidHeader header;
    std::optional<zelm::TilePlaces> places;  // of the ordering Morton

    std::uint64_t EndOf(std::uint32_t level, std::uint32_t tileX, std::uint32_t tileY,
                        std::uint32_t band) const;
};

}  // namespace zmchost

#endif
