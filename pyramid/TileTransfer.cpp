// Rectangles of pixels between a caller's buffer and the file.
//
// The typed operations at the end are thin: below them a sample is a number of bytes. A tile's
// data is one plane of whole pixels in the orderings Scanline and Blocked, and one plane for each
// band in the ordering Morton; that is the only difference that reading knows. Of a tile, only the
// rows that a rectangle needs are read, in runs that stay in the cache until they are gathered.
#include <algorithm>
#include <cstring>

#include "core/CheckedArithmetic.h"
#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "pyramid/LevelGeometry.h"
#include "pyramid/PyramidDataset.h"
#include "pyramid/TileGather.h"

namespace zelm {
namespace {

// Work space of one run of rows, small enough for the second-level cache.
constexpr std::uint64_t kRunBytes = std::uint64_t{128} << 10;
// Planes that are gathered together: more of them would make their runs too short to read.
constexpr std::uint32_t kPlanesTogether = 16;
constexpr std::uint64_t kTransferLimit = std::uint64_t{1} << 32;

bool IsIdentity(const Array<int>& bandList, std::uint32_t bandCount) {
    if (bandList.shape.elements != bandCount) return false;
    for (std::uint32_t i = 0; i < bandCount; ++i)
        if (bandList.data[i] != static_cast<int>(i)) return false;
    return true;
}

bool HoldsBands(const Array<int>& bandList, std::uint32_t bandCount) {
    if (bandList.shape.elements == 0) return true;
    if (!bandList.data) return false;
    const auto outside = [&](int band) {
        return band < 0 || static_cast<std::uint32_t>(band) >= bandCount;
    };
    return std::none_of(bandList.data, bandList.data + bandList.shape.elements, outside);
}

bool Contains(const LevelGeometry& level, const TileRect& rect) {
    const auto inside = [](std::uint64_t start, std::uint64_t extent, std::uint64_t whole) {
        return start + extent <= whole;
    };
    // The second test is for sizes so close to 2^32 that the tile count wraps.
    return inside(rect.x, rect.width, level.samples) && inside(rect.y, rect.height, level.lines) &&
           level.HasTile((rect.x + rect.width - 1u) / level.tileSize,
                         (rect.y + rect.height - 1u) / level.tileSize);
}

bool StaysInRange(std::initializer_list<std::uint64_t> factors) {
    return FitsWithin(CheckedProduct(factors), kTransferLimit - 1u);
}

}  // namespace

// One accepted request with everything derived from it. Lives for the length of a call.
class TileTransfer {
public:
    TileTransfer(PyramidDataset& owner, const TileRect& rectangle, const Array<int>& bandList,
                 std::uint32_t atLevel)
        : dataset(owner),
          rect(rectangle),
          geometry(owner.Samples, owner.Lines, owner.TileSize, atLevel),
          level(atLevel),
          planar(owner.TileOrdering >= TileOrder::Morton),
          list(bandList.data),
          allInOrder(bandList.shape.elements == 0 || IsIdentity(bandList, owner.BandCount)),
          bands(allInOrder ? owner.BandCount : bandList.shape.elements),
          sampleBytes(owner.BytesPerSample),
          tilePixelBytes(std::uint64_t{planar ? 1 : owner.BandCount} * sampleBytes),
          bufferPixelBytes(std::uint64_t{bands} * sampleBytes),
          planes(planar ? bands : 1) {}

    bool Read(unsigned char* buffer) {
        if (!planar && allInOrder && IsWholeTile()) {
            std::uint64_t got = 0;
            return Read(DirectStart(), buffer, PixelCount() * tilePixelBytes, got);
        }
        return VisitPieces(geometry, rect,
                           [&](const TilePiece& piece) { return ReadPiece(piece, buffer); });
    }

    bool WriteInterleaved(const unsigned char* buffer) {
        if (IsDirect() || IsStrip())
            return allInOrder ? WriteAsItLies(buffer) : WriteBehind(buffer);
        const bool merged = VisitPieces(
            geometry, rect, [&](const TilePiece& piece) { return MergePiece(piece, buffer); });
        if (merged) ExtendFile();
        return merged;
    }

    // Whatever is not one tile in its exact place is dropped: in this ordering merging never
    // reached the file, and clients fill it tile by tile.
    bool WriteMorton(const unsigned char* buffer) {
        return !IsDirect() || !IsOneTile() || WritePlanes(buffer);
    }

private:
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

    // Absolute offset of a tile's plane; only the ordering Morton has more than one.
    std::uint64_t PlaneStart(std::uint32_t plane, std::uint32_t tileX, std::uint32_t tileY) const {
        if (!planar)
            return dataset.LevelOffsets[level] + geometry.TileOffset(tileX, tileY, tilePixelBytes);
        const auto& table = dataset.TileOffsets;
        const auto band = static_cast<std::uint64_t>(list[plane]);
        const std::uint64_t row = std::uint64_t{level} * dataset.BandCount + band;
        return table.data[row * table.shape.extents[2] +
                          std::uint64_t{geometry.tilesAcross} * tileY + tileX];
    }

    // False if the disk did not give what the file has; what lies behind its end is no failure.
    bool Read(std::uint64_t offset, unsigned char* target, std::uint64_t size,
              std::uint64_t& got) const {
        got = dataset.File->ReadAt(offset, target, size);
        return got == size || offset + got >= dataset.File->Size();
    }

    bool ReadOrZero(std::uint64_t offset, unsigned char* target, std::uint64_t size) const {
        std::uint64_t got = 0;
        const bool read = Read(offset, target, size, got);
        std::memset(target + got, 0, size - got);
        return read;
    }

    std::uint64_t BufferOffset(const TilePiece& piece, std::uint32_t row) const {
        const std::uint64_t line = std::uint64_t{piece.outRow} + row;
        return (line * rect.width + piece.outColumn) * bufferPixelBytes;
    }

    // The samples of `count` planes in a run of rows, as they lie in the work space.
    template <class Byte>
    SampleBlock<Byte> TileSide(Byte* work, const TilePiece& piece, std::uint32_t runRows) const {
        const std::uint64_t rowBytes = piece.tileWidth * tilePixelBytes;
        return {work + piece.firstColumn * tilePixelBytes, rowBytes, tilePixelBytes,
                planar ? runRows * rowBytes : sampleBytes, planar || allInOrder ? nullptr : list};
    }

    template <class Byte>
    SampleBlock<Byte> BufferSide(Byte* buffer) const {
        return {buffer, rect.width * bufferPixelBytes, bufferPixelBytes, sampleBytes};
    }

    // Calls run(firstRow, rows, work) for runs of a piece's rows whose data, of `count` planes, fit
    // in the work space, until one gives false.
    template <class Run>
    bool VisitRuns(std::uint32_t rows, std::uint64_t rowBytes, std::uint32_t count,
                   Run&& run) const {
        const std::uint64_t fit = std::max<std::uint64_t>(kRunBytes / (rowBytes * count), 1);
        const auto step = static_cast<std::uint32_t>(std::min<std::uint64_t>(fit, rows));
        unsigned char* const work = dataset.WorkSpace(step * rowBytes * count);
        if (!work) return false;
        for (std::uint32_t row = 0; row < rows; row += step)
            if (!run(row, std::min(step, rows - row), work)) return false;
        return true;
    }

    // Rows of the tile are rows of the buffer, byte for byte.
    bool LiesAlike(const TilePiece& piece) const {
        return piece.columns == piece.tileWidth && piece.columns == rect.width &&
               (planar ? bands == 1 : allInOrder);
    }

    bool ReadPiece(const TilePiece& piece, unsigned char* buffer) {
        const std::uint64_t rowBytes = piece.tileWidth * tilePixelBytes;
        if (LiesAlike(piece))
            return ReadOrZero(PlaneStart(0, piece.tileX, piece.tileY) + piece.firstRow * rowBytes,
                              buffer + BufferOffset(piece, 0), piece.rows * rowBytes);
        if (HasLongRows(piece)) return ReadLongRows(piece, buffer);
        for (std::uint32_t first = 0; first < planes; first += kPlanesTogether) {
            const std::uint32_t count = std::min(planes - first, kPlanesTogether);
            const bool done =
                VisitRuns(piece.rows, rowBytes, count,
                          [&](std::uint32_t row, std::uint32_t rows, unsigned char* work) {
                              if (!ReadRun(piece, first, count, row, rows, work)) return false;
                              unsigned char* const target = buffer + BufferOffset(piece, row) +
                                                            first * std::uint64_t{sampleBytes};
                              MoveSamples(TileSide<const unsigned char>(work, piece, rows),
                                          BufferSide(target), rows, piece.columns,
                                          planar ? count : bands, sampleBytes);
                              return true;
                          });
            if (!done) return false;
        }
        return true;
    }

    // Rows that no run can hold: a header may claim any number of bands, and a row is not to cost
    // more than what is asked of it. In the ordering Morton rows are short.
    bool HasLongRows(const TilePiece& piece) const {
        return !planar && piece.tileWidth * tilePixelBytes > kRunBytes;
    }

    // Calls run(offset in the file, offset in the buffer, pixels) for runs of a piece's pixels, of
    // one row each and at most as many as given, until one gives false.
    template <class Run>
    bool VisitPixels(const TilePiece& piece, std::uint64_t most, Run&& run) const {
        const std::uint64_t tile = PlaneStart(0, piece.tileX, piece.tileY);
        const auto step = static_cast<std::uint32_t>(std::min<std::uint64_t>(most, piece.columns));
        for (std::uint32_t row = 0; row < piece.rows; ++row) {
            const std::uint64_t line = std::uint64_t{piece.firstRow} + row;
            const std::uint64_t first = line * piece.tileWidth + piece.firstColumn;
            for (std::uint32_t column = 0; column < piece.columns; column += step)
                if (!run(tile + (first + column) * tilePixelBytes,
                         BufferOffset(piece, row) + column * bufferPixelBytes,
                         std::min(step, piece.columns - column)))
                    return false;
        }
        return true;
    }

    // Calls move(offset in the file, offset in the buffer) for each listed sample of a piece, until
    // one gives false.
    template <class Move>
    bool VisitSamples(const TilePiece& piece, Move&& move) const {
        return VisitPixels(
            piece, 1, [&](std::uint64_t pixel, std::uint64_t inBuffer, std::uint32_t) {
                for (std::uint32_t i = 0; i < bands; ++i)
                    if (!move(pixel + static_cast<std::uint64_t>(list[i]) * sampleBytes,
                              inBuffer + std::uint64_t{i} * sampleBytes))
                        return false;
                return true;
            });
    }

    bool ReadLongRows(const TilePiece& piece, unsigned char* buffer) const {
        if (allInOrder)
            return VisitPixels(
                piece, piece.columns,
                [&](std::uint64_t start, std::uint64_t inBuffer, std::uint32_t pixels) {
                    return ReadOrZero(start, buffer + inBuffer, pixels * tilePixelBytes);
                });
        if (tilePixelBytes > kRunBytes)
            return VisitSamples(piece, [&](std::uint64_t sample, std::uint64_t inBuffer) {
                return ReadOrZero(sample, buffer + inBuffer, sampleBytes);
            });
        unsigned char* const work = dataset.WorkSpace(kRunBytes);
        return work &&
               VisitPixels(piece, kRunBytes / tilePixelBytes,
                           [&](std::uint64_t start, std::uint64_t inBuffer, std::uint32_t pixels) {
                               if (!ReadOrZero(start, work, pixels * tilePixelBytes)) return false;
                               MoveSamples({work, 0, tilePixelBytes, sampleBytes, list},
                                           BufferSide(buffer + inBuffer), 1, pixels, bands,
                                           sampleBytes);
                               return true;
                           });
    }

    bool ReadRun(const TilePiece& piece, std::uint32_t first, std::uint32_t count,
                 std::uint32_t row, std::uint32_t rows, unsigned char* work) const {
        const std::uint64_t rowBytes = piece.tileWidth * tilePixelBytes;
        const std::uint64_t start = (std::uint64_t{piece.firstRow} + row) * rowBytes;
        for (std::uint32_t i = 0; i < count; ++i)
            if (!ReadOrZero(PlaneStart(first + i, piece.tileX, piece.tileY) + start,
                            work + std::uint64_t{i} * rows * rowBytes, rows * rowBytes))
                return false;
        return true;
    }

    std::uint64_t DirectStart() const { return PlaneStart(0, FirstTileX(), FirstTileY()); }
    std::uint64_t PixelCount() const { return std::uint64_t{rect.width} * rect.height; }

    bool WriteAsItLies(const unsigned char* buffer) {
        dataset.File->WriteAt(DirectStart(), buffer, PixelCount() * tilePixelBytes);
        return true;
    }

    // A list of some bands on the direct path: the tile's pixels take the new samples, and the
    // result goes behind the range that was read and not back to it. The tile stays as it was.
    bool WriteBehind(const unsigned char* buffer) {
        const std::uint64_t start = DirectStart();
        const std::uint64_t behind = start + PixelCount() * tilePixelBytes;
        if (tilePixelBytes > kRunBytes) return WriteLongPixelsBehind(start, behind, buffer);
        return VisitPixelRuns(
            tilePixelBytes, [&](std::uint64_t pixel, std::uint32_t count, unsigned char* work) {
                const std::uint64_t offset = pixel * tilePixelBytes;
                if (!ReadOrZero(start + offset, work, count * tilePixelBytes)) return false;
                const unsigned char* const source = buffer + pixel * bufferPixelBytes;
                MoveSamples(BufferSide(source), {work, 0, tilePixelBytes, sampleBytes, list}, 1,
                            count, bands, sampleBytes);
                dataset.File->WriteAt(behind + offset, work, count * tilePixelBytes);
                return true;
            });
    }

    // The same for pixels that no run can hold: all bytes go over, then the new samples.
    bool WriteLongPixelsBehind(std::uint64_t start, std::uint64_t behind,
                               const unsigned char* buffer) {
        unsigned char* const work = dataset.WorkSpace(kRunBytes);
        if (!work) return false;
        for (std::uint64_t offset = start; offset < behind; offset += kRunBytes) {
            const std::uint64_t size = std::min(behind - offset, kRunBytes);
            if (!ReadOrZero(offset, work, size)) return false;
            dataset.File->WriteAt(behind + (offset - start), work, size);
        }
        for (std::uint64_t pixel = 0; pixel < PixelCount(); ++pixel)
            for (std::uint32_t i = 0; i < bands; ++i)
                dataset.File->WriteAt(
                    behind + pixel * tilePixelBytes +
                        static_cast<std::uint64_t>(list[i]) * sampleBytes,
                    buffer + pixel * bufferPixelBytes + std::uint64_t{i} * sampleBytes,
                    sampleBytes);
        return true;
    }

    // All pixels of the rectangle in buffer order, in runs that fit in the work space, until one
    // gives false.
    template <class Run>
    bool VisitPixelRuns(std::uint64_t workBytesPerPixel, Run&& run) {
        const std::uint64_t total = PixelCount();
        const std::uint64_t fit = std::max<std::uint64_t>(kRunBytes / workBytesPerPixel, 1);
        const std::uint64_t step = std::min(fit, total);
        unsigned char* const work = dataset.WorkSpace(step * workBytesPerPixel);
        if (!work) return false;
        for (std::uint64_t pixel = 0; pixel < total; pixel += step)
            if (!run(pixel, static_cast<std::uint32_t>(std::min(step, total - pixel)), work))
                return false;
        return true;
    }

    bool WritePlanes(const unsigned char* buffer) {
        for (std::uint32_t first = 0; first < planes; first += kPlanesTogether) {
            const std::uint32_t count = std::min(planes - first, kPlanesTogether);
            const bool done = VisitPixelRuns(
                std::uint64_t{count} * sampleBytes,
                [&](std::uint64_t pixel, std::uint32_t pixels, unsigned char* work) {
                    const unsigned char* const source =
                        buffer + pixel * bufferPixelBytes + first * std::uint64_t{sampleBytes};
                    const std::uint64_t planeBytes = std::uint64_t{pixels} * sampleBytes;
                    MoveSamples(BufferSide(source), {work, 0, sampleBytes, planeBytes}, 1, pixels,
                                count, sampleBytes);
                    WriteRun(first, count, pixel * sampleBytes, planeBytes, work);
                    return true;
                });
            if (!done) return false;
        }
        return true;
    }

    void WriteRun(std::uint32_t first, std::uint32_t count, std::uint64_t offset,
                  std::uint64_t planeBytes, const unsigned char* work) {
        for (std::uint32_t i = 0; i < count; ++i)
            dataset.File->WriteAt(PlaneStart(first + i, FirstTileX(), FirstTileY()) + offset,
                                  work + i * planeBytes, planeBytes);
    }

    // Old samples are read where the piece does not replace all of the rows' bytes.
    bool MergePiece(const TilePiece& piece, const unsigned char* buffer) {
        const std::uint64_t rowBytes = piece.tileWidth * tilePixelBytes;
        const std::uint64_t tile = PlaneStart(0, piece.tileX, piece.tileY);
        const bool replaced = allInOrder && piece.columns == piece.tileWidth;
        if (HasLongRows(piece)) return MergeLongRows(piece, buffer);
        return VisitRuns(
            piece.rows, rowBytes, 1,
            [&](std::uint32_t row, std::uint32_t rows, unsigned char* work) {
                // Without the old samples around the new ones these would be lost.
                if (!replaced && !ReadRun(piece, 0, 1, row, rows, work)) return false;
                MoveSamples(BufferSide(buffer + BufferOffset(piece, row)),
                            TileSide(work, piece, rows), rows, piece.columns, bands, sampleBytes);
                const std::uint64_t start = (std::uint64_t{piece.firstRow} + row) * rowBytes;
                dataset.File->WriteAt(tile + start, work, rows * rowBytes);
                return true;
            });
    }

    bool MergeLongRows(const TilePiece& piece, const unsigned char* buffer) {
        platform::File& file = *dataset.File;
        if (allInOrder)
            return VisitPixels(
                piece, piece.columns,
                [&](std::uint64_t start, std::uint64_t inBuffer, std::uint32_t pixels) {
                    file.WriteAt(start, buffer + inBuffer, pixels * tilePixelBytes);
                    return true;
                });
        if (tilePixelBytes > kRunBytes)
            return VisitSamples(piece, [&](std::uint64_t sample, std::uint64_t inBuffer) {
                file.WriteAt(sample, buffer + inBuffer, sampleBytes);
                return true;
            });
        unsigned char* const work = dataset.WorkSpace(kRunBytes);
        return work &&
               VisitPixels(piece, kRunBytes / tilePixelBytes,
                           [&](std::uint64_t start, std::uint64_t inBuffer, std::uint32_t pixels) {
                               if (!ReadOrZero(start, work, pixels * tilePixelBytes)) return false;
                               MoveSamples(BufferSide(buffer + inBuffer),
                                           {work, 0, tilePixelBytes, sampleBytes, list}, 1, pixels,
                                           bands, sampleBytes);
                               file.WriteAt(start, work, pixels * tilePixelBytes);
                               return true;
                           });
    }

    // A merged tile exists as a whole: where the file was shorter, the rest of it reads as zeros.
    void ExtendFile() {
        const std::uint64_t end = PlaneStart(0, LastTileX(), LastTileY()) +
                                  std::uint64_t{geometry.TileWidth(LastTileX())} *
                                      geometry.TileHeight(LastTileY()) * tilePixelBytes;
        const unsigned char zero = 0;
        if (dataset.File->Size() < end) dataset.File->WriteAt(end - 1u, &zero, 1);
    }

    PyramidDataset& dataset;
    const TileRect rect;
    const LevelGeometry geometry;
    const std::uint32_t level;
    const bool planar;
    const int* const list;
    const bool allInOrder;
    const std::uint32_t bands;  // samples of a pixel in the buffer
    const std::uint32_t sampleBytes;
    const std::uint64_t tilePixelBytes;
    const std::uint64_t bufferPixelBytes;
    const std::uint32_t planes;  // of a tile that take part
};

bool PyramidDataset::AcceptsTile(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                                 std::uint32_t height, const Array<int>& bandList,
                                 std::int32_t level) const {
    if (!File || width == 0 || height == 0) return true;
    const auto at = static_cast<std::uint32_t>(level);
    const bool planar = TileOrdering >= TileOrder::Morton;
    if (!LevelOffsets || BandCount == 0 || TileSize == 0 || TileSize > kMaxTileSize || level < 0 ||
        at < LevelMin || at > LevelMax || at >= LevelGeometry::kLevelsWithPixels)
        return false;
    // In the ordering Morton tiles that shrink to nothing have no address.
    if (planar && (TileSize >> at == 0 || bandList.shape.elements == 0)) return false;
    const std::uint64_t listed = bandList.shape.elements;
    const std::uint64_t wide = std::max<std::uint64_t>(listed, planar ? 0 : BandCount);
    const LevelGeometry base(Samples, Lines, TileSize, 0);
    return Contains(LevelGeometry(Samples, Lines, TileSize, at), {x, y, width, height}) &&
           base.tilesAcross != 0 && base.tilesDown != 0 && HoldsBands(bandList, BandCount) &&
           StaysInRange({width, height, wide, BytesPerSample}) &&
           StaysInRange({TileSize, planar ? 1 : BandCount, BytesPerSample});
}

bool PyramidDataset::PrepareTransfer(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                                     std::uint32_t height, const Array<int>& bandList,
                                     std::int32_t level, std::size_t elementBytes,
                                     const void* buffer) {
    return AcceptsTile(x, y, width, height, bandList, level) && elementBytes == BytesPerSample &&
           buffer && (TileOrdering < TileOrder::Morton || EnsureTileTable());
}

template <class T>
bool PyramidDataset::ReadTile(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                              std::uint32_t height, const Array<int>& bandList, std::int32_t level,
                              T* buffer) {
    if (!File || width == 0 || height == 0) return true;
    return PrepareTransfer(x, y, width, height, bandList, level, sizeof(T), buffer) &&
           TileTransfer(*this, {x, y, width, height}, bandList, static_cast<std::uint32_t>(level))
               .Read(reinterpret_cast<unsigned char*>(buffer));
}

template <class T>
bool PyramidDataset::WriteTileInterleaved(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                                          std::uint32_t height, const Array<int>& bandList,
                                          std::int32_t level, const T* buffer) {
    if (!File || width == 0 || height == 0) return true;
    if (TileOrdering >= TileOrder::Morton ||
        !PrepareTransfer(x, y, width, height, bandList, level, sizeof(T), buffer))
        return false;
    if (!Writable) return true;
    return TileTransfer(*this, {x, y, width, height}, bandList, static_cast<std::uint32_t>(level))
        .WriteInterleaved(reinterpret_cast<const unsigned char*>(buffer));
}

template <class T>
bool PyramidDataset::WriteTileMorton(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                                     std::uint32_t height, const Array<int>& bandList,
                                     std::int32_t level, const T* buffer) {
    if (!File || width == 0 || height == 0) return true;
    if (TileOrdering < TileOrder::Morton ||
        !PrepareTransfer(x, y, width, height, bandList, level, sizeof(T), buffer))
        return false;
    if (!Writable) return true;
    return TileTransfer(*this, {x, y, width, height}, bandList, static_cast<std::uint32_t>(level))
        .WriteMorton(reinterpret_cast<const unsigned char*>(buffer));
}

#define ZMC_X(type, name, code)                                                                  \
    template bool PyramidDataset::ReadTile<type>(std::uint32_t, std::uint32_t, std::uint32_t,    \
                                                 std::uint32_t, const Array<int>&, std::int32_t, \
                                                 type*);                                         \
    template bool PyramidDataset::WriteTileInterleaved<type>(                                    \
        std::uint32_t, std::uint32_t, std::uint32_t, std::uint32_t, const Array<int>&,           \
        std::int32_t, const type*);                                                              \
    template bool PyramidDataset::WriteTileMorton<type>(                                         \
        std::uint32_t, std::uint32_t, std::uint32_t, std::uint32_t, const Array<int>&,           \
        std::int32_t, const type*);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zelm
