#include "gdal/TileReader.h"

#include <algorithm>
#include <cstring>
#include <numeric>

#include "core/Array.h"
#include "core/PixelVocabulary.h"
#include "gdal/SampleType.h"

namespace zmcgdal {
namespace {

zelm::Array<int> ListOf(const int* bands, int bandCount) {
    // The reader only looks at the list; a view needs a pointer that could be written through.
    return zelm::Array<int>(const_cast<int*>(bands),
                            zelm::ArrayShape(static_cast<std::uint32_t>(bandCount)));
}

Window Intersection(const Window& a, const Window& b) {
    const int left = std::max(a.x, b.x);
    const int top = std::max(a.y, b.y);
    const int right = std::min(a.x + a.width, b.x + b.width);
    const int bottom = std::min(a.y + a.height, b.y + b.height);
    return {a.level, left, top, right - left, bottom - top};
}

// Signed bytes to 16 bits.
void Widen(const unsigned char* bytes, std::size_t count, unsigned char* out) {
    const auto* from = reinterpret_cast<const signed char*>(bytes);
    auto* to = reinterpret_cast<std::int16_t*>(out);
    for (std::size_t i = 0; i < count; ++i) to[i] = from[i];
}

}  // namespace

TileReader::TileReader(LazyRaster& pyramid, const zmchost::PyramidFileInfo& info, GDALDataType type)
    : raster(pyramid),
      layout(info),
      sampleType(type),
      rawSampleSize(zelm::PixelSize(info.header.pixelType)),
      sampleSize(static_cast<std::size_t>(GDALGetDataTypeSizeBytes(type))),
      tileSize(static_cast<int>(info.header.tileSize)),
      fileBands(static_cast<int>(info.header.bands)),
      allBands(info.header.bands) {
    std::iota(allBands.begin(), allBands.end(), 0);
}

bool TileReader::IsPixelInterleaved() const {
    return layout.header.tileOrdering != zelm::TileOrder::Morton;
}

Window TileReader::TileAt(std::uint32_t level, int tileX, int tileY) const {
    const zmchost::PyramidLevelInfo& info = *layout.FindLevel(level);
    const int x = tileX * tileSize;
    const int y = tileY * tileSize;
    return {level, x, y, std::min(tileSize, static_cast<int>(info.width) - x),
            std::min(tileSize, static_cast<int>(info.height) - y)};
}

bool TileReader::ReadRaw(const Window& tile, const int* bands, int bandCount, void* buffer) {
    const auto samples = static_cast<std::size_t>(tile.width) *
                         static_cast<std::size_t>(tile.height) *
                         static_cast<std::size_t>(bandCount);
    // A short read leaves the buffer as it was.
    if (!layout.complete) std::memset(buffer, 0, samples * rawSampleSize);
    bool done = false;
    const bool told = raster.Visit([&]<class T>(zelm::RasterReader<T>& reader) {
        done = reader.ReadTile(tile.x, tile.y, static_cast<std::uint32_t>(tile.width),
                               static_cast<std::uint32_t>(tile.height), ListOf(bands, bandCount),
                               static_cast<std::int32_t>(tile.level), static_cast<T*>(buffer),
                               nullptr);
    });
    if (told && !done)
        CPLError(CE_Failure, CPLE_FileIO, "the raster module refuses a tile of level %u",
                 tile.level);
    return told && done;
}

bool TileReader::FitsTarget(const Window& window, const int* bands, int bandCount,
                            const Target& target) const {
    const auto size = static_cast<GSpacing>(sampleSize);
    const GSpacing pixel = size * bandCount;
    return sampleSize == rawSampleSize && target.type == sampleType && target.pixelSpace == pixel &&
           target.lineSpace == pixel * window.width &&
           (bandCount == 1 || target.bandSpace == size) &&
           (!IsPixelInterleaved() ||
            std::equal(bands, bands + bandCount, allBands.begin(), allBands.end())) &&
           window.width == tileSize && window.height == tileSize && window.x % tileSize == 0 &&
           window.y % tileSize == 0;
}

const unsigned char* TileReader::LoadTile(const Window& tile, int band) {
    const bool together = IsPixelInterleaved();
    const TileKey key{tile.level, tile.x, tile.y, together ? 0 : band};
    if (key == held) return scratch.data();
    const int* const bands = together ? allBands.data() : &band;
    const int bandCount = together ? fileBands : 1;
    const auto samples = static_cast<std::size_t>(tileSize) * static_cast<std::size_t>(tileSize) *
                         static_cast<std::size_t>(bandCount);
    scratch.resize(samples * sampleSize);
    held = TileKey();
    if (sampleSize == rawSampleSize) {
        if (!ReadRaw(tile, bands, bandCount, scratch.data())) return nullptr;
    } else {
        raw.resize(samples * rawSampleSize);
        if (!ReadRaw(tile, bands, bandCount, raw.data())) return nullptr;
        Widen(raw.data(), samples, scratch.data());
    }
    held = key;
    return scratch.data();
}

// Who reads one band of a picture mostly goes on to the next, and all bands are taken apart by
// vector code in the time that one takes without it.
bool TileReader::SplitsIntoPlanes(int bandCount) const {
    return bandCount == 1 && fileBands >= 2 && fileBands <= 4;
}

// Takes a tile apart into `planes`; the plane of `band` goes to `out` instead, if that is not null.
bool TileReader::SplitTile(const Window& tile, int band, void* out) {
    heldApart = TileKey();
    if (!LoadTile(tile, 0)) return false;
    const auto samples =
        static_cast<std::size_t>(tile.width) * static_cast<std::size_t>(tile.height);
    planes.resize(scratch.size());
    void* parts[4] = {};
    for (int i = 0; i < fileBands; ++i)
        parts[i] = planes.data() + static_cast<std::size_t>(i) * samples * sampleSize;
    if (out) parts[band] = out;
    GDALDeinterleave(scratch.data(), sampleType, fileBands, parts, sampleType, samples);
    heldApart = held;
    planeAway = out ? band : -1;
    return true;
}

const unsigned char* TileReader::LoadPlane(const Window& tile, int band) {
    if (!IsPixelInterleaved()) return LoadTile(tile, band);
    const TileKey key{tile.level, tile.x, tile.y, 0};
    const bool there = heldApart == key && planeAway != band;
    if (!there && !SplitTile(tile, band, nullptr)) return nullptr;
    const auto samples =
        static_cast<std::size_t>(tile.width) * static_cast<std::size_t>(tile.height);
    return planes.data() + static_cast<std::size_t>(band) * samples * sampleSize;
}

// One band of a whole tile, in the caller's buffer as in a plane.
bool TileReader::IsPlainPlane(const Window& window, int bandCount, const Target& target) const {
    const auto size = static_cast<GSpacing>(sampleSize);
    return SplitsIntoPlanes(bandCount) && IsPixelInterleaved() && target.type == sampleType &&
           target.pixelSpace == size && target.lineSpace == size * window.width &&
           window.width == tileSize && window.height == tileSize && window.x % tileSize == 0 &&
           window.y % tileSize == 0;
}

bool TileReader::Read(const Window& window, const int* bands, int bandCount, const Target& target) {
    if (FitsTarget(window, bands, bandCount, target))
        return ReadRaw(window, bands, bandCount, target.data);
    const TileKey key{window.level, window.x, window.y, 0};
    if (IsPlainPlane(window, bandCount, target) && heldApart != key)
        return SplitTile(window, bands[0], target.data);
    const int lastX = (window.x + window.width - 1) / tileSize;
    const int lastY = (window.y + window.height - 1) / tileSize;
    for (int tileY = window.y / tileSize; tileY <= lastY; ++tileY)
        for (int tileX = window.x / tileSize; tileX <= lastX; ++tileX) {
            const Window tile = TileAt(window.level, tileX, tileY);
            if (IsPixelInterleaved() && !SplitsIntoPlanes(bandCount)) {
                const unsigned char* const samples = LoadTile(tile, 0);
                if (!samples) return false;
                CopyTile(tile, samples, fileBands, window, bands, bandCount, target);
                continue;
            }
            for (int i = 0; i < bandCount; ++i) {
                const unsigned char* const samples = LoadPlane(tile, bands[i]);
                if (!samples) return false;
                Target plane = target;
                plane.data = static_cast<unsigned char*>(target.data) + i * target.bandSpace;
                const int first = 0;
                CopyTile(tile, samples, 1, window, &first, 1, plane);
            }
        }
    return true;
}

// Three and four planes of bytes at once are the usual true-colour request, and GDAL has vector
// code for it.
bool TileReader::CopyAllBandsApart(const Window& tile, const unsigned char* samples,
                                   const Window& part, const Window& window, const int* bands,
                                   int bandCount, const Target& target) const {
    if (bandCount < 2 || bandCount > 4 || target.type != sampleType ||
        target.pixelSpace != static_cast<GSpacing>(sampleSize) ||
        !std::equal(bands, bands + bandCount, allBands.begin(), allBands.end()))
        return false;
    const auto pixelSize = sampleSize * static_cast<std::size_t>(bandCount);
    for (int line = 0; line < part.height; ++line) {
        const auto fromPixel = static_cast<std::size_t>(part.y - tile.y + line) *
                                   static_cast<std::size_t>(tile.width) +
                               static_cast<std::size_t>(part.x - tile.x);
        auto* const to = static_cast<unsigned char*>(target.data) +
                         (part.y - window.y + line) * target.lineSpace +
                         (part.x - window.x) * target.pixelSpace;
        void* parts[4] = {};
        for (int i = 0; i < bandCount; ++i) parts[i] = to + i * target.bandSpace;
        GDALDeinterleave(samples + fromPixel * pixelSize, sampleType, bandCount, parts, sampleType,
                         static_cast<std::size_t>(part.width));
    }
    return true;
}

void TileReader::CopyTile(const Window& tile, const unsigned char* samples, int samplesPerPixel,
                          const Window& window, const int* bands, int bandCount,
                          const Target& target) const {
    const Window part = Intersection(tile, window);
    if (samplesPerPixel == bandCount &&
        CopyAllBandsApart(tile, samples, part, window, bands, bandCount, target))
        return;
    const auto pixelSize = sampleSize * static_cast<std::size_t>(samplesPerPixel);
    const bool wholePixels =
        samplesPerPixel == bandCount && target.type == sampleType &&
        target.pixelSpace == static_cast<GSpacing>(pixelSize) &&
        (bandCount == 1 || target.bandSpace == static_cast<GSpacing>(sampleSize)) &&
        std::equal(bands, bands + bandCount, allBands.begin());
    for (int line = 0; line < part.height; ++line) {
        const auto fromPixel = static_cast<std::size_t>(part.y - tile.y + line) *
                                   static_cast<std::size_t>(tile.width) +
                               static_cast<std::size_t>(part.x - tile.x);
        const unsigned char* const from = samples + fromPixel * pixelSize;
        auto* const to = static_cast<unsigned char*>(target.data) +
                         (part.y - window.y + line) * target.lineSpace +
                         (part.x - window.x) * target.pixelSpace;
        if (wholePixels) {
            std::memcpy(to, from, pixelSize * static_cast<std::size_t>(part.width));
            continue;
        }
        for (int i = 0; i < bandCount; ++i)
            GDALCopyWords64(from + static_cast<std::size_t>(bands[i]) * sampleSize, sampleType,
                            static_cast<int>(pixelSize), to + i * target.bandSpace, target.type,
                            static_cast<int>(target.pixelSpace), part.width);
    }
}

}  // namespace zmcgdal
