// TileRequest: a rectangle of one level with a list of bands, and the segments of the file that
// hold it.
//
// Pure arithmetic: no file and no samples. A tile's data is one plane of whole pixels in the
// orderings Scanline and Blocked, and one plane for each band in the ordering Morton. A rectangle
// falls apart into pieces, one for each tile that it touches (TileWalk.h), and a piece into
// segments: runs of bytes that are contiguous in the plane and move in one step. Reading and
// writing both walk the same segments, and know no other case.
#ifndef ZMC_PYRAMID_TILEREQUEST_H
#define ZMC_PYRAMID_TILEREQUEST_H

#include <algorithm>
#include <cstdint>

#include "core/Array.h"
#include "format/LevelGeometry.h"
#include "format/PyramidHeaderRecord.h"
#include "format/TileWalk.h"

namespace zelm {

// A run of bytes of a tile's plane, or the same run of several planes, and the block of samples of
// the caller's buffer that it holds.
struct TileSegment {
    std::uint64_t offset;      // from the start of the plane
    std::uint64_t bytes;       // in each plane
    std::uint64_t inBuffer;    // offset of the block's first sample in the buffer
    bool straight;             // the bytes are those of the buffer from there on; else a block:
    std::uint64_t firstPixel;  // offset of the block's first pixel in the run
    std::uint64_t rowBytes;    // from row to row of the run
    std::uint32_t rows;        // of the block
    std::uint32_t columns;
    std::uint32_t plane;  // list position of the first plane
    std::uint32_t planes;
    bool replaced;  // the block is all that the run holds
};

struct TileRequest {
    // Longest run that is not straight, small enough for the second-level cache. A run of rows has
    // one row at least.
    static constexpr std::uint64_t kRunBytes = std::uint64_t{128} << 10;
    // The same of several planes together. Longer, as each plane's share is a call of its own.
    static constexpr std::uint64_t kPlanesRunBytes = std::uint64_t{384} << 10;
    // Planes that move together: more of them would make their runs too short to read.
    static constexpr std::uint32_t kPlanesTogether = 16;
    // Behind each plane's share of a run. Shares of a power of two of bytes would lie in the same
    // few places of the nearest cache otherwise, where they push each other out.
    static constexpr std::uint64_t kPlaneGap = 64;

    LevelGeometry geometry;
    Rectangle rect;
    std::uint32_t level;
    bool planar;           // a plane for each band
    const int* list;       // the caller's band list, which outlives the request
    bool allInOrder;       // all bands in their order, so that the list may be missing
    std::uint32_t bands;   // samples of a pixel in the buffer
    std::uint32_t planes;  // of a tile that take part
    std::uint32_t sampleBytes;
    std::uint64_t tilePixelBytes;
    std::uint64_t bufferPixelBytes;
    std::uint32_t planesTogether = kPlanesTogether;
    bool block = false;  // the rectangle lies in its first tile's place as if it were that tile

    // Whether a file with this header can serve a request: the rectangle inside the level, the
    // level laid out and addressable, every band in the file, and less than 4 GiB in all. In the
    // ordering Morton the list has to name its bands.
    static bool IsServed(const PyramidHeaderRecord& header, const Rectangle& rect,
                         const Array<int>& bandList, std::int32_t level);

    // Needs a request that is served.
    TileRequest(const PyramidHeaderRecord& header, const Rectangle& rectangle,
                const Array<int>& bandList, std::uint32_t atLevel);

    std::uint32_t FirstTileX() const { return rect.x / geometry.tileSize; }
    std::uint32_t FirstTileY() const { return rect.y / geometry.tileSize; }
    std::uint32_t LastTileX() const { return (rect.x + rect.width - 1u) / geometry.tileSize; }
    std::uint32_t LastTileY() const { return (rect.y + rect.height - 1u) / geometry.tileSize; }
    bool IsOneTile() const { return FirstTileX() == LastTileX() && FirstTileY() == LastTileY(); }
    bool IsWholeTile() const {
        const std::uint32_t side = geometry.tileSize;
        return rect.width == side && rect.height == side && rect.x % side == 0 &&
               rect.y % side == 0;
    }
    // Bytes that the rectangle has in each of its planes.
    std::uint64_t PlaneBytes() const {
        return std::uint64_t{rect.width} * rect.height * tilePixelBytes;
    }
    // The bands of a plane's pixels are those of the buffer's.
    bool LiesAlike() const { return planar ? bands == 1 : allInOrder; }

    // Pixels that no run can hold: of some of their bands, each sample is a segment.
    bool HasLongPixels() const { return tilePixelBytes > kRunBytes; }

    // Written straight to the start of its first tile. For the last tile column the width alone
    // decides, and for the last tile row the height alone, whatever the other extent and the place
    // in the tile: files have been filled by these rules, so they stay.
    bool IsDirect() const {
        return IsWholeTile() ||
               (FirstTileX() == geometry.tilesAcross - 1u && rect.width == geometry.lastWidth) ||
               (FirstTileY() == geometry.tilesDown - 1u && rect.height == geometry.lastHeight);
    }
    // A strip over the full width goes out in its own row order, which is the order of the file
    // only where one tile is as wide as the image. Kept for the same reason.
    bool IsStrip() const {
        return rect.x == 0 && rect.width == geometry.samples && rect.height == geometry.tileSize;
    }

    // Room for the longest run of any segment; 0 where all of them are straight.
    std::uint64_t RunBytes() const;

    // Calls visit(const TilePart&, const TileSegment&) for all segments: pieces as VisitTiles has
    // them, the planes of a piece in list order, those of a group from its top.
    template <class Visit>
    void VisitSegments(Visit&& visit) const {
        if (block) return VisitPiece(AsPiece(), visit);
        VisitTiles(geometry, rect, [&](const TilePart& piece) { VisitPiece(piece, visit); });
    }

private:
    // The rectangle as if it were its first tile.
    TilePart AsPiece() const { return {FirstTileX(), FirstTileY(), rect, rect}; }

    std::uint64_t BufferOffset(const TilePart& piece, std::uint32_t row) const {
        const std::uint64_t line = std::uint64_t{piece.part.y - rect.y} + row;
        return (line * rect.width + (piece.part.x - rect.x)) * bufferPixelBytes;
    }

    static TileSegment Straight(std::uint64_t offset, std::uint64_t bytes, std::uint64_t inBuffer) {
        return {offset, bytes, inBuffer, true, 0, 0, 0, 0, 0, 1, true};
    }

    // Rows of the plane are rows of the buffer; or they fit in a run; or they are cut in parts.
    template <class Visit>
    void VisitPiece(const TilePart& piece, Visit& visit) const {
        const std::uint64_t rowBytes = piece.tile.width * tilePixelBytes;
        if (LiesAlike() && piece.part.width == piece.tile.width && piece.part.width == rect.width)
            return visit(piece, Straight(piece.FirstLine() * rowBytes, piece.part.height * rowBytes,
                                         BufferOffset(piece, 0)));
        // In the ordering Morton rows are short.
        if (planar || rowBytes <= kRunBytes) return VisitRows(piece, rowBytes, visit);
        VisitRowParts(piece, visit);
    }

    template <class Visit>
    void VisitRows(const TilePart& piece, std::uint64_t rowBytes, Visit& visit) const {
        for (std::uint32_t first = 0; first < planes; first += planesTogether) {
            const std::uint32_t count = std::min(planes - first, planesTogether);
            const std::uint64_t limit = planar ? kPlanesRunBytes : kRunBytes;
            const std::uint64_t fit = std::max<std::uint64_t>(limit / (rowBytes * count), 1);
            const auto step =
                static_cast<std::uint32_t>(std::min<std::uint64_t>(fit, piece.part.height));
            for (std::uint32_t row = 0; row < piece.part.height; row += step) {
                const std::uint32_t rows = std::min(step, piece.part.height - row);
                const TileSegment segment{
                    (std::uint64_t{piece.FirstLine()} + row) * rowBytes,
                    rows * rowBytes,
                    BufferOffset(piece, row) + first * std::uint64_t{sampleBytes},
                    false,
                    piece.FirstColumn() * tilePixelBytes,
                    rowBytes,
                    rows,
                    piece.part.width,
                    first,
                    count,
                    (planar || allInOrder) && piece.part.width == piece.tile.width};
                visit(piece, segment);
            }
        }
    }

    // Rows that no run can hold: a header may claim any number of bands, and a row is not to cost
    // more than what is asked of it. With all bands the part of a row that is asked for is
    // straight.
    template <class Visit>
    void VisitRowParts(const TilePart& piece, Visit& visit) const {
        const std::uint64_t fit = allInOrder ? piece.part.width : kRunBytes / tilePixelBytes;
        const auto step =
            static_cast<std::uint32_t>(std::clamp<std::uint64_t>(fit, 1, piece.part.width));
        for (std::uint32_t row = 0; row < piece.part.height; ++row)
            for (std::uint32_t column = 0; column < piece.part.width; column += step)
                VisitRowPart(piece, row, column, std::min(step, piece.part.width - column), visit);
    }

    template <class Visit>
    void VisitRowPart(const TilePart& piece, std::uint32_t row, std::uint32_t column,
                      std::uint32_t pixels, Visit& visit) const {
        const std::uint64_t line = std::uint64_t{piece.FirstLine()} + row;
        const std::uint64_t offset =
            (line * piece.tile.width + piece.FirstColumn() + column) * tilePixelBytes;
        const std::uint64_t bytes = pixels * tilePixelBytes;
        const std::uint64_t inBuffer = BufferOffset(piece, row) + column * bufferPixelBytes;
        if (allInOrder) return visit(piece, Straight(offset, bytes, inBuffer));
        if (!HasLongPixels())
            return visit(piece, TileSegment{offset, bytes, inBuffer, false, 0, bytes, 1, pixels, 0,
                                            1, false});
        for (std::uint32_t i = 0; i < bands; ++i)
            visit(piece, Straight(offset + static_cast<std::uint64_t>(list[i]) * sampleBytes,
                                  sampleBytes, inBuffer + std::uint64_t{i} * sampleBytes));
    }
};

}  // namespace zelm

#endif
