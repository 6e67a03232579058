#include "gdal/TileReader.h"

#include <algorithm>
#include <cstring>
#include <numeric>

#include "core/Array.h"
#include "core/PixelVocabulary.h"
#include "format/TileWalk.h"
#include "gdal/SampleType.h"

namespace zmcgdal {

using zelm::Rectangle;

namespace {

zelm::Array<int> ListOf(const int* bands, int bandCount) {
    // The reader only looks at the list; a view needs a pointer that could be written through.
    return zelm::Array<int>(const_cast<int*>(bands),
                            zelm::ArrayShape(static_cast<std::uint32_t>(bandCount)));
}

// Signed bytes to 16 bits.
void Widen(const unsigned char* bytes, std::size_t count, unsigned char* out) {
    const auto* from = reinterpret_cast<const signed char*>(bytes);
    auto* to = reinterpret_cast<std::int16_t*>(out);
    for (std::size_t i = 0; i < count; ++i) to[i] = from[i];
}

}  // namespace

TileReader::TileReader(LazyRaster& pyramid, const zmchost::PyramidFileInfo& info, GDALDataType type,
                       bool missingAsZeros, bool keepsTiles)
    : raster(pyramid),
      layout(info),
      sampleType(type),
      rawSampleSize(zelm::PixelSize(info.header.pixelType)),
      sampleSize(static_cast<std::size_t>(GDALGetDataTypeSizeBytes(type))),
      tileSize(info.header.tileSize),
      fileBands(static_cast<int>(info.header.bandCount)),
      allBands(info.header.bandCount),
      readsMissing(missingAsZeros),
      keeps(keepsTiles),
      present(info.header) {
    std::iota(allBands.begin(), allBands.end(), 0);
}

bool TileReader::IsPixelInterleaved() const { return !layout.header.IsPlanar(); }

Rectangle TileReader::TileAt(std::uint32_t level, int tileX, int tileY) const {
    return layout.header.Geometry(level).Tile(static_cast<std::uint32_t>(tileX),
                                              static_cast<std::uint32_t>(tileY));
}

bool TileReader::IsThere(std::uint32_t level, const Rectangle& tile, const int* bands,
                         int bandCount) const {
    if (layout.complete || readsMissing) return true;
    const std::vector<std::uint32_t> list(bands, bands + bandCount);
    if (present.Have(level, tile, list, raster.FileSize())) return true;
    CPLError(CE_Failure, CPLE_FileIO,
             "%s: the pyramid is incomplete: its file ends before the pixels at %u, %u of level %u",
             raster.Name().c_str(), tile.x, tile.y, level);
    return false;
}

bool TileReader::ReadRaw(std::uint32_t level, const Rectangle& tile, const int* bands,
                         int bandCount, std::span<unsigned char> buffer) {
    const std::size_t samples = tile.Pixels() * static_cast<std::size_t>(bandCount);
    if (!IsThere(level, tile, bands, bandCount)) return false;
    // A short read leaves the buffer as it was.
    if (!layout.complete) std::fill(buffer.begin(), buffer.end(), 0);
    bool done = false;
    const bool told = raster.Visit([&]<class T>(zelm::RasterReader<T>& reader) {
        if (sizeof(T) != rawSampleSize || samples > buffer.size() / sizeof(T)) return;
        done = reader.ReadTile(static_cast<std::int32_t>(tile.x), static_cast<std::int32_t>(tile.y),
                               tile.width, tile.height, ListOf(bands, bandCount),
                               static_cast<std::int32_t>(level),
                               static_cast<T*>(static_cast<void*>(buffer.data())), nullptr);
    });
    if (told && !done)
        CPLError(CE_Failure, CPLE_FileIO, "the raster module refuses a tile of level %u", level);
    return told && done;
}

bool TileReader::FitsTarget(const Rectangle& window, const int* bands, int bandCount,
                            const Target& target) const {
    const auto size = static_cast<GSpacing>(sampleSize);
    const GSpacing pixel = size * bandCount;
    return sampleSize == rawSampleSize && target.type == sampleType && target.pixelSpace == pixel &&
           target.lineSpace == pixel * window.width &&
           (bandCount == 1 || target.bandSpace == size) &&
           (!IsPixelInterleaved() ||
            std::equal(bands, bands + bandCount, allBands.begin(), allBands.end())) &&
           IsWholeTile(window);
}

bool TileReader::IsWholeTile(const Rectangle& window) const {
    return window.width == tileSize && window.height == tileSize && window.x % tileSize == 0 &&
           window.y % tileSize == 0;
}

const unsigned char* TileReader::LoadTile(std::uint32_t level, const Rectangle& tile, int band) {
    const bool together = IsPixelInterleaved();
    const TileKey key{level, tile.x, tile.y, together ? 0 : band};
    if (key == held) return scratch.data();
    if (!LoadSamples(level, tile, together ? allBands.data() : &band, together ? fileBands : 1))
        return nullptr;
    held = key;
    return scratch.data();
}

bool TileReader::LoadSamples(std::uint32_t level, const Rectangle& area, const int* bands,
                             int bandCount) {
    const std::size_t samples = area.Pixels() * static_cast<std::size_t>(bandCount);
    held = TileKey();
    const auto room = [samples](std::vector<unsigned char>& buffer, std::size_t size) {
        // What would be cut off now and made anew for the next part would be filled with zeros.
        buffer.resize(std::max(buffer.size(), samples * size));
        return std::span(buffer).first(samples * size);
    };
    const std::span<unsigned char> shown = room(scratch, sampleSize);
    if (sampleSize == rawSampleSize) return ReadRaw(level, area, bands, bandCount, shown);
    if (!ReadRaw(level, area, bands, bandCount, room(raw, rawSampleSize))) return false;
    Widen(raw.data(), samples, scratch.data());
    return true;
}

bool TileReader::IsHeld(const Rectangle& tile) const {
    const auto together = static_cast<std::uint64_t>(IsPixelInterleaved() ? fileBands : 1);
    return tile.Pixels() * together * sampleSize <= kMostHeld;
}

// What the window has of a tile that is not held, by as many bands and rows as make a piece.
bool TileReader::CopyPieces(std::uint32_t level, const Rectangle& part, const Rectangle& window,
                            const int* bands, int bandCount, const Target& target) {
    const std::uint64_t rowBytes = std::max<std::uint64_t>(part.width * sampleSize, 1);
    const auto most = static_cast<int>(std::clamp<std::uint64_t>(
        kPieceBytes / rowBytes, 1, static_cast<std::uint64_t>(fileBands)));
    for (int first = 0; first < bandCount; first += most) {
        const int count = std::min(most, bandCount - first);
        const auto rows = static_cast<std::uint32_t>(std::clamp<std::uint64_t>(
            kPieceBytes / (rowBytes * static_cast<std::uint64_t>(count)), 1, part.height));
        Target group = target;
        group.data = static_cast<unsigned char*>(target.data) + first * target.bandSpace;
        for (std::uint32_t row = 0; row < part.height; row += rows) {
            const Rectangle piece{part.x, part.y + row, part.width,
                                  std::min(rows, part.height - row)};
            if (!LoadSamples(level, piece, bands + first, count)) return false;
            CopyTile(piece, scratch.data(), count, window, allBands.data(), count, group);
        }
    }
    return true;
}

// Who reads one band of a picture mostly goes on to the next, and all bands are taken apart by
// vector code in the time that one takes without it.
bool TileReader::SplitsIntoPlanes(int bandCount) const {
    return bandCount == 1 && fileBands >= 2 && fileBands <= kMostPlanes;
}

// Takes a tile apart into `planes`; the plane of `band` goes to `out` instead, if that is not null.
bool TileReader::SplitTile(std::uint32_t level, const Rectangle& tile, int band, void* out) {
    heldApart = TileKey();
    if (!LoadTile(level, tile, 0)) return false;
    const std::size_t samples = tile.Pixels();
    planes.resize(scratch.size());
    void* parts[kMostPlanes] = {};
    for (int i = 0; i < fileBands; ++i)
        parts[i] = planes.data() + static_cast<std::size_t>(i) * samples * sampleSize;
    if (out) parts[band] = out;
    GDALDeinterleave(scratch.data(), sampleType, fileBands, parts, sampleType, samples);
    heldApart = held;
    planeAway = out ? band : -1;
    return true;
}

const unsigned char* TileReader::LoadPlane(std::uint32_t level, const Rectangle& tile, int band) {
    if (!IsPixelInterleaved()) return LoadTile(level, tile, band);
    const TileKey key{level, tile.x, tile.y, 0};
    const bool there = heldApart == key && planeAway != band;
    if (!there && !SplitTile(level, tile, band, nullptr)) return nullptr;
    const std::size_t samples = tile.Pixels();
    return planes.data() + static_cast<std::size_t>(band) * samples * sampleSize;
}

// One band of a whole tile, in the caller's buffer as in a plane.
bool TileReader::IsPlainPlane(const Rectangle& window, int bandCount, const Target& target) const {
    const auto size = static_cast<GSpacing>(sampleSize);
    return SplitsIntoPlanes(bandCount) && IsPixelInterleaved() && target.type == sampleType &&
           target.pixelSpace == size && target.lineSpace == size * window.width &&
           IsWholeTile(window);
}

bool TileReader::Read(std::uint32_t level, const Rectangle& window, const int* bands, int bandCount,
                      const Target& target) {
    if (FitsTarget(window, bands, bandCount, target))
        return ReadRaw(level, window, bands, bandCount,
                       {static_cast<unsigned char*>(target.data),
                        static_cast<std::size_t>(target.lineSpace) * window.height});
    const TileKey key{level, window.x, window.y, 0};
    if (IsPlainPlane(window, bandCount, target) && heldApart != key && IsHeld(window))
        return SplitTile(level, window, bands[0], target.data);
    const bool byTiles = keeps || bandCount != fileBands;
    return zelm::VisitTiles(layout.header.Geometry(level), window, [&](const zelm::TilePart& part) {
        return byTiles && IsHeld(part.tile)
                   ? CopyPart(level, part.tile, window, bands, bandCount, target)
                   : CopyPieces(level, part.part, window, bands, bandCount, target);
    });
}

bool TileReader::Read(std::uint32_t level, const Rectangle& window, const int* bands, int bandCount,
                      const Target& target, const GDALRasterIOExtraArg* extra) {
    if (!extra || !extra->pfnProgress) return Read(level, window, bands, bandCount, target);
    for (std::uint32_t done = 0; done < window.height;) {
        const std::uint32_t y = window.y + done;
        const std::uint32_t height = std::min(tileSize - y % tileSize, window.height - done);
        Target part = target;
        part.data = static_cast<unsigned char*>(target.data) + done * target.lineSpace;
        if (!Read(level, {window.x, y, window.width, height}, bands, bandCount, part)) return false;
        done += height;
        if (extra->pfnProgress(static_cast<double>(done) / window.height, "", extra->pProgressData))
            continue;
        CPLError(CE_Failure, CPLE_UserInterrupt, "cancelled");
        return false;
    }
    return true;
}

bool TileReader::CopyPart(std::uint32_t level, const Rectangle& tile, const Rectangle& window,
                          const int* bands, int bandCount, const Target& target) {
    if (IsPixelInterleaved() && !SplitsIntoPlanes(bandCount)) {
        const unsigned char* const samples = LoadTile(level, tile, 0);
        if (!samples) return false;
        CopyTile(tile, samples, fileBands, window, bands, bandCount, target);
        return true;
    }
    for (int i = 0; i < bandCount; ++i) {
        const unsigned char* const samples = LoadPlane(level, tile, bands[i]);
        if (!samples) return false;
        Target plane = target;
        plane.data = static_cast<unsigned char*>(target.data) + i * target.bandSpace;
        const int first = 0;
        CopyTile(tile, samples, 1, window, &first, 1, plane);
    }
    return true;
}

// Three and four planes of bytes at once are the usual true-colour request, and GDAL has vector
// code for it.
bool TileReader::CopyAllBandsApart(const Rectangle& tile, const unsigned char* samples,
                                   const Rectangle& part, const Rectangle& window, const int* bands,
                                   int bandCount, const Target& target) const {
    if (bandCount < 2 || bandCount > kMostPlanes || target.type != sampleType ||
        target.pixelSpace != static_cast<GSpacing>(sampleSize) ||
        !std::equal(bands, bands + bandCount, allBands.begin(), allBands.end()))
        return false;
    const auto pixelSize = sampleSize * static_cast<std::size_t>(bandCount);
    for (std::uint32_t line = 0; line < part.height; ++line) {
        const std::size_t fromPixel =
            std::size_t{part.y - tile.y + line} * tile.width + (part.x - tile.x);
        auto* const to = static_cast<unsigned char*>(target.data) +
                         (part.y - window.y + line) * target.lineSpace +
                         (part.x - window.x) * target.pixelSpace;
        void* parts[kMostPlanes] = {};
        for (int i = 0; i < bandCount; ++i) parts[i] = to + i * target.bandSpace;
        GDALDeinterleave(samples + fromPixel * pixelSize, sampleType, bandCount, parts, sampleType,
                         part.width);
    }
    return true;
}

void TileReader::CopyTile(const Rectangle& tile, const unsigned char* samples, int samplesPerPixel,
                          const Rectangle& window, const int* bands, int bandCount,
                          const Target& target) const {
    const Rectangle part = Intersection(tile, window);
    if (samplesPerPixel == bandCount &&
        CopyAllBandsApart(tile, samples, part, window, bands, bandCount, target))
        return;
    const auto pixelSize = sampleSize * static_cast<std::size_t>(samplesPerPixel);
    const bool wholePixels =
        samplesPerPixel == bandCount && target.type == sampleType &&
        target.pixelSpace == static_cast<GSpacing>(pixelSize) &&
        (bandCount == 1 || target.bandSpace == static_cast<GSpacing>(sampleSize)) &&
        std::equal(bands, bands + bandCount, allBands.begin());
    for (std::uint32_t line = 0; line < part.height; ++line) {
        const std::size_t fromPixel =
            std::size_t{part.y - tile.y + line} * tile.width + (part.x - tile.x);
        const unsigned char* const from = samples + fromPixel * pixelSize;
        auto* const to = static_cast<unsigned char*>(target.data) +
                         (part.y - window.y + line) * target.lineSpace +
                         (part.x - window.x) * target.pixelSpace;
        if (wholePixels) {
            std::memcpy(to, from, pixelSize * part.width);
            continue;
        }
        for (int i = 0; i < bandCount; ++i)
            GDALCopyWords64(from + static_cast<std::size_t>(bands[i]) * sampleSize, sampleType,
                            static_cast<int>(pixelSize), to + i * target.bandSpace, target.type,
                            static_cast<int>(target.pixelSpace), part.width);
    }
}

}  // namespace zmcgdal
