// WindowParts: a window cut along the borders of tiles, for threads that read a part each.
//
// Parts are runs of tiles that lie beside each other, from the top and from the left; where that
// gives too few and the bands lie apart in the file, each band of such a run is one. Together they
// are the window, and no tile of the file belongs to two of them. A plain value; any thread.
#ifndef ZMC_GDAL_WINDOWPARTS_H
#define ZMC_GDAL_WINDOWPARTS_H

#include <cstdint>

#include "format/Rectangle.h"

namespace zmcgdal {

class WindowParts {
public:
    // The window lies in a level with tiles of that side, and is not empty. `apart` tells how many
    // bands of it are read one by one, 1 where they lie together; `wanted` of how many parts there
    // should not be far fewer, if there are as many tiles.
    WindowParts(const zelm::Rectangle& whole, std::uint32_t tileSide, std::uint32_t apart,
                std::uint64_t wanted);

    std::uint64_t Count() const { return Runs() * bands; }
    // Tiles that the window touches, those of each band that lies apart counted.
    static std::uint64_t Tiles(const zelm::Rectangle& whole, std::uint32_t tileSide,
                               std::uint32_t apart);

    struct Part {
        zelm::Rectangle window;
        std::uint32_t firstBand = 0;  // of those that are read
        std::uint32_t bandCount = 0;  // 0: all that are read
    };
    Part At(std::uint64_t number) const;

private:
    zelm::Rectangle window;
    std::uint32_t side;
    std::uint64_t firstColumn, columns, firstRow, rows;  // of tiles
    std::uint64_t run = 1;                               // tiles of a part
    std::uint32_t bands = 1;                             // parts of a run

    std::uint64_t RunsAcross() const { return (columns + run - 1) / run; }
    std::uint64_t Runs() const { return RunsAcross() * rows; }
};

}  // namespace zmcgdal

#endif
