// Rectangles of pixels between a caller's buffer and the file.
//
// The typed operations at the end are thin: below them a sample is a number of bytes. A request is
// judged, and its segments (TileRequest.h) are read or written one after the other; those that are
// not straight go through work space that stays in the cache. What the disk does is not reported.
#include <cstring>
#include <optional>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "pyramid/PyramidDataset.h"
#include "pyramid/TileGather.h"
#include "pyramid/TileRequest.h"

namespace zelm {

// What reading and writing share: where the planes of a request lie in the file, and how the
// samples of a segment lie on either side. Lives for the length of a call.
class TileTransfer {
protected:
    TileTransfer(PyramidDataset& owner, const TileRequest& accepted)
        : dataset(owner), request(accepted), file(*owner.File) {
        if (request.planar && !owner.TileOffsets.data)
            places.emplace(owner.DescribeTileTable(), owner.TileDataStart);
    }

    // Absolute offset of a tile's plane, the i-th of the list; only the ordering Morton has more
    // than one.
    std::uint64_t PlaneStart(std::uint32_t i, std::uint32_t tileX, std::uint32_t tileY) const {
        if (!request.planar)
            return dataset.LevelOffsets[request.level] +
                   request.geometry.TileOffset(tileX, tileY, request.tilePixelBytes);
        return TableEntry(static_cast<std::uint32_t>(request.list[i]), tileX, tileY);
    }

    std::uint64_t TableEntry(std::uint32_t band, std::uint32_t tileX, std::uint32_t tileY) const {
        if (places) return PlaceOf(tileX, tileY) + band * places->BandBytes();
        const auto& table = dataset.TileOffsets;
        const std::uint64_t row = std::uint64_t{request.level} * dataset.BandCount + band;
        return table.data[row * table.shape.extents[2] +
                          std::uint64_t{request.geometry.tilesAcross} * tileY + tileX];
    }

    // Where the run of a segment starts in the i-th of its planes.
    std::uint64_t RunStart(const TilePart& piece, const TileSegment& segment,
                           std::uint32_t i = 0) const {
        return PlaneStart(segment.plane + i, piece.column, piece.row) + segment.offset;
    }

    // From plane to plane of a segment in the work space.
    static std::uint64_t PlaneStep(const TileSegment& segment) {
        return segment.bytes + TileRequest::kPlaneGap;
    }

    // Moves the samples of a segment between the work space, where its planes lie one after the
    // other, and the buffer.
    void MoveToBuffer(const TileSegment& segment, const unsigned char* work,
                      unsigned char* buffer) const {
        Move(segment, WorkSide(work, segment), BufferSide(buffer, segment));
    }
    void MoveToWork(const TileSegment& segment, const unsigned char* buffer,
                    unsigned char* work) const {
        Move(segment, BufferSide(buffer, segment), WorkSide(work, segment));
    }

    PyramidDataset& dataset;
    const TileRequest& request;
    files::ByteSource& file;
    std::optional<TilePlaces> places;  // in place of a table that is too large

    // That of the first band, computed once for all bands of a tile.
    std::uint64_t PlaceOf(std::uint32_t tileX, std::uint32_t tileY) const {
        if (!known.any || known.tileX != tileX || known.tileY != tileY)
            known = {true, tileX, tileY, places->At(0, request.level, tileX, tileY)};
        return known.place;
    }
    struct Place {
        bool any = false;
        std::uint32_t tileX = 0, tileY = 0;
        std::uint64_t place = 0;
    };
    mutable Place known;

    // At least `bytes`; null if memory ran out.
    unsigned char* WorkSpace(std::uint64_t bytes) const { return dataset.WorkSpace(bytes); }

private:
    template <class Byte>
    SampleBlock<Byte> WorkSide(Byte* work, const TileSegment& segment) const {
        const bool asTheyLie = request.planar || request.allInOrder;
        return {work + segment.firstPixel, segment.rowBytes, request.tilePixelBytes,
                request.planar ? PlaneStep(segment) : request.sampleBytes,
                asTheyLie ? nullptr : request.list};
    }
    template <class Byte>
    SampleBlock<Byte> BufferSide(Byte* buffer, const TileSegment& segment) const {
        return {buffer + segment.inBuffer, request.rect.width * request.bufferPixelBytes,
                request.bufferPixelBytes, request.sampleBytes};
    }
    void Move(const TileSegment& segment, const SampleBlock<const unsigned char>& from,
              const SampleBlock<unsigned char>& to) const {
        MoveSamples(from, to, segment.rows, segment.columns,
                    request.planar ? segment.planes : request.bands, request.sampleBytes);
    }
};

class TileReading : TileTransfer {
public:
    TileReading(PyramidDataset& owner, const TileRequest& accepted)
        : TileTransfer(owner, accepted) {}

    // False, with the buffer as it was, if memory ran out.
    bool Read(unsigned char* buffer) const {
        if (request.LiesAlike() && request.IsWholeTile()) {
            ReadWholeTile(buffer);
            return true;
        }
        const std::uint64_t runBytes = request.RunBytes();
        unsigned char* const work = runBytes == 0 ? nullptr : WorkSpace(runBytes);
        if (runBytes != 0 && !work) return false;
        request.VisitSegments([&](const TilePart& piece, const TileSegment& segment) {
            ReadSegment(piece, segment, work, buffer);
        });
        return true;
    }

private:
    // A whole tile as it lies. Where it holds all bands, what cannot be read stays as it was.
    void ReadWholeTile(unsigned char* buffer) const {
        const std::uint64_t start = PlaneStart(0, request.FirstTileX(), request.FirstTileY());
        if (request.planar)
            ReadOrZero(start, buffer, request.PlaneBytes());
        else
            file.ReadAt(start, buffer, request.PlaneBytes());
    }

    void ReadSegment(const TilePart& piece, const TileSegment& segment, unsigned char* work,
                     unsigned char* buffer) const {
        if (segment.straight)
            return ReadOrZero(RunStart(piece, segment), buffer + segment.inBuffer, segment.bytes);
        for (std::uint32_t i = 0; i < segment.planes; ++i)
            ReadOrZero(RunStart(piece, segment, i), work + i * PlaneStep(segment), segment.bytes);
        MoveToBuffer(segment, work, buffer);
    }

    void ReadOrZero(std::uint64_t offset, unsigned char* target, std::uint64_t size) const {
        const std::size_t got = file.ReadAt(offset, target, size);
        std::memset(target + got, 0, size - got);
    }
};

class TileWriting : TileTransfer {
public:
    // `accepted` may be changed to what the writing makes of it.
    TileWriting(PyramidDataset& owner, TileRequest& accepted)
        : TileTransfer(owner, accepted), plan(accepted) {}

    // False, with nothing written, if memory ran out.
    bool WriteInterleaved(const unsigned char* buffer) {
        plan.block = plan.IsDirect() || plan.IsStrip();
        // A list of some bands on the direct path: the tile's pixels take the new samples, and the
        // result goes behind the range that was read and not back to it. The tile stays as it was.
        if (plan.block && !plan.allInOrder) shift = plan.PlaneBytes();
        return Write(buffer);
    }

    // Whatever is not one tile in its exact place is dropped: in this ordering merging never
    // reached the file, and clients fill it tile by tile.
    bool WriteMorton(const unsigned char* buffer) {
        if (!plan.IsDirect() || !plan.IsOneTile()) return true;
        plan.block = true;
        // Bands that overlap go one after the other, each whole; for all others no order shows.
        if (PlanesOverlap()) plan.planesTogether = 1;
        return Write(buffer);
    }

private:
    // Bands lie a constant apart. Where 2^L does not divide the tile size, the curve may leave less
    // room than that for a tile.
    bool PlanesOverlap() const {
        if (dataset.BandCount < 2) return false;
        const std::uint32_t tileX = plan.FirstTileX(), tileY = plan.FirstTileY();
        return TableEntry(1, tileX, tileY) - TableEntry(0, tileX, tileY) < plan.PlaneBytes();
    }

    // All old samples that stay beside new ones are read before anything is written.
    bool Write(const unsigned char* buffer) {
        const std::uint64_t oldBytes = OldBytes();
        const std::uint64_t workBytes = oldBytes + plan.RunBytes();
        if (workBytes > kMostWork) return false;
        unsigned char* const work = workBytes == 0 ? nullptr : WorkSpace(workBytes);
        if (workBytes != 0 && !work) return false;
        if (!ReadOld(work) || !CopyBehind(work)) return true;
        unsigned char* old = work;
        plan.VisitSegments([&](const TilePart& piece, const TileSegment& segment) {
            unsigned char* const run = NeedsOld(segment) ? old : work + oldBytes;
            if (NeedsOld(segment)) old += segment.bytes;
            WriteSegment(piece, segment, run, buffer);
        });
        if (!plan.block) ExtendFile();
        return true;
    }

    static bool NeedsOld(const TileSegment& segment) { return !segment.replaced; }

    std::uint64_t OldBytes() const {
        std::uint64_t bytes = 0;
        plan.VisitSegments([&](const TilePart&, const TileSegment& segment) {
            if (NeedsOld(segment)) bytes += segment.bytes;
        });
        return bytes;
    }

    bool ReadOld(unsigned char* old) const {
        bool read = true;
        std::uint64_t done = 0;
        plan.VisitSegments([&](const TilePart& piece, const TileSegment& segment) {
            if (!read || !NeedsOld(segment)) return;
            read = ReadExisting(RunStart(piece, segment), old + done, segment.bytes);
            done += segment.bytes;
        });
        return read;
    }

    // False if the disk did not give what the file has; what lies behind its end is zeros.
    bool ReadExisting(std::uint64_t offset, unsigned char* target, std::uint64_t size) const {
        const std::size_t got = file.ReadAt(offset, target, size);
        std::memset(target + got, 0, size - got);
        return got == size || offset + got >= file.Size();
    }

    // Pixels that are too long to be held go behind by themselves, before the new samples. They are
    // read through first, so that a disk that fails is met before anything is written.
    bool CopyBehind(unsigned char* work) const {
        if (shift == 0 || !plan.HasLongPixels()) return true;
        const std::uint64_t start = PlaneStart(0, plan.FirstTileX(), plan.FirstTileY());
        for (const bool copies : {false, true})
            for (std::uint64_t done = 0; done < shift; done += TileRequest::kRunBytes) {
                const std::uint64_t size = std::min(shift - done, TileRequest::kRunBytes);
                if (!ReadExisting(start + done, work, size)) return false;
                if (copies) file.WriteAt(start + shift + done, work, size);
            }
        return true;
    }

    void WriteSegment(const TilePart& piece, const TileSegment& segment, unsigned char* run,
                      const unsigned char* buffer) const {
        if (segment.straight) {
            file.WriteAt(RunStart(piece, segment) + shift, buffer + segment.inBuffer,
                         segment.bytes);
            return;
        }
        MoveToWork(segment, buffer, run);
        for (std::uint32_t i = 0; i < segment.planes; ++i)
            file.WriteAt(RunStart(piece, segment, i) + shift, run + i * PlaneStep(segment),
                         segment.bytes);
    }

    // A merged tile exists as a whole: where the file was shorter, the rest of it reads as zeros.
    void ExtendFile() const {
        const std::uint32_t lastX = plan.LastTileX(), lastY = plan.LastTileY();
        const std::uint64_t end =
            PlaneStart(0, lastX, lastY) + std::uint64_t{plan.geometry.TileWidth(lastX)} *
                                              plan.geometry.TileHeight(lastY) * plan.tilePixelBytes;
        const unsigned char zero = 0;
        if (file.Size() < end) file.WriteAt(end - 1u, &zero, 1);
    }

    static constexpr std::uint64_t kMostWork = (std::uint64_t{1} << 32) - 1u;

    TileRequest& plan;        // the request of the base
    std::uint64_t shift = 0;  // from where a run was read to where it is written
};

bool PyramidDataset::AcceptsTile(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                                 std::uint32_t height, const Array<int>& bandList,
                                 std::int32_t level) const {
    if (!File || width == 0 || height == 0) return true;
    return LevelOffsets &&
           TileRequest::IsServed(MakeHeaderRecord(), {x, y, width, height}, bandList, level);
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
    if (!PrepareTransfer(x, y, width, height, bandList, level, sizeof(T), buffer)) return false;
    const TileRequest request(MakeHeaderRecord(), {x, y, width, height}, bandList,
                              static_cast<std::uint32_t>(level));
    return TileReading(*this, request).Read(reinterpret_cast<unsigned char*>(buffer));
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
    TileRequest request(MakeHeaderRecord(), {x, y, width, height}, bandList,
                        static_cast<std::uint32_t>(level));
    return TileWriting(*this, request)
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
    TileRequest request(MakeHeaderRecord(), {x, y, width, height}, bandList,
                        static_cast<std::uint32_t>(level));
    return TileWriting(*this, request).WriteMorton(reinterpret_cast<const unsigned char*>(buffer));
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
