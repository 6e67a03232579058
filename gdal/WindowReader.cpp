#include "gdal/WindowReader.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <new>
#include <utility>

#include "gdal/JobCrew.h"
#include "gdal/WindowParts.h"

namespace zmcgdal {
namespace {

using zelm::Rectangle;

// Readers that wait for the next window; each keeps its last tile.
constexpr std::size_t kMostIdle = 16;
// To begin a thread and its reader takes as long as some tiles.
constexpr std::uint64_t kTilesPerThread = 4;
constexpr std::uint64_t kLeastBytes = std::uint64_t{1} << 20;
// Of tiles that threads hold at once: as the file has one, taken apart, and widened.
constexpr std::uint64_t kMostHeldTogether = std::uint64_t{512} << 20;
constexpr std::uint64_t kCopiesOfTile = 3;
// More parts than threads, so that one that has come late has not the whole rest to do.
constexpr std::uint64_t kPartsPerThread = 16;

// One way through a buffer: so many steps of so many bytes.
struct Stride {
    std::uint64_t bytes;
    std::uint64_t count;
};

// Whether no two samples share a byte, as far as that can be seen of strides that are nested.
bool SamplesLieApart(const Rectangle& window, int bandCount, const Target& target) {
    const auto length = [](GSpacing space) {
        return static_cast<std::uint64_t>(std::llabs(space));
    };
    std::array<Stride, 3> strides{
        Stride{length(target.pixelSpace), window.width},
        Stride{length(target.lineSpace), window.height},
        Stride{length(target.bandSpace), static_cast<std::uint64_t>(bandCount)}};
    std::sort(strides.begin(), strides.end(),
              [](const Stride& a, const Stride& b) { return a.bytes < b.bytes; });
    auto extent = static_cast<std::uint64_t>(GDALGetDataTypeSizeBytes(target.type));
    for (const Stride& stride : strides) {
        if (stride.count == 1) continue;
        if (stride.bytes < extent) return false;
        extent += stride.bytes * (stride.count - 1);
    }
    return true;
}

}  // namespace

WindowReader::WindowReader(LazyRaster& pyramid, const zmchost::PyramidFileInfo& info,
                           const Manner& manner)
    : raster(pyramid), layout(info), how(manner), shape(Over(raster)) {
    idle.reserve(kMostIdle);
    if (!how.leavesRaster) first.reset(new Reader{nullptr, Over(raster)});
}

TileReader WindowReader::Over(LazyRaster& pyramid) const {
    return {pyramid, layout, how.type, how.missingAsZeros, how.keepsTiles};
}

WindowReader::ReaderPtr WindowReader::MakeReader() const {
    auto own = std::make_unique<LazyRaster>(raster.Again());
    LazyRaster& pyramid = *own;
    return ReaderPtr(new Reader{std::move(own), Over(pyramid)});
}

WindowReader::ReaderPtr WindowReader::Take() {
    {
        const std::lock_guard lock(mutex);
        if (first) return std::move(first);
        if (!idle.empty()) {
            ReaderPtr reader = std::move(idle.back());
            idle.pop_back();
            return reader;
        }
    }
    return MakeReader();
}

// There is room for as many.
void WindowReader::GiveBack(ReaderPtr reader) noexcept {
    const std::lock_guard lock(mutex);
    if (!reader->own)
        first = std::move(reader);
    else if (idle.size() < kMostIdle)
        idle.push_back(std::move(reader));
}

void WindowReader::Forget() {
    const std::lock_guard lock(mutex);
    if (first) first->tiles.Forget();
    idle.clear();
}

bool WindowReader::Read(std::uint32_t level, const Rectangle& window, const int* bands,
                        int bandCount, const Target& target) {
    return Lease(*this).Tiles().Read(level, window, bands, bandCount, target);
}

bool WindowReader::Read(std::uint32_t level, const Rectangle& window, const int* bands,
                        int bandCount, const Target& target, const GDALRasterIOExtraArg* extra) {
    const std::uint32_t threads = ThreadsFor(window, bandCount);
    if (threads > 1 && SamplesLieApart(window, bandCount, target)) {
        try {
            return ReadTogether({level, window, bands, bandCount, target}, threads, extra);
        } catch (const std::bad_alloc&) {
            CPLDebug("ZMCPyramid", "no memory for threads, a window is read by one");
        }
    }
    return Lease(*this).Tiles().Read(level, window, bands, bandCount, target, extra);
}

std::uint32_t WindowReader::BandsApart(int bandCount) const {
    return IsPixelInterleaved() ? 1 : static_cast<std::uint32_t>(bandCount);
}

std::uint32_t WindowReader::ThreadsFor(const Rectangle& window, int bandCount) const {
    if (how.threads < 2 || raster.Remote() || window.IsEmpty()) return 1;
    const zmchost::PyramidHeader& header = layout.header;
    const auto sampleBytes = static_cast<std::uint64_t>(GDALGetDataTypeSizeBytes(how.type));
    const auto bands = static_cast<std::uint64_t>(bandCount);
    if (window.Pixels() * bands * sampleBytes < kLeastBytes) return 1;
    const std::uint64_t tiles = WindowParts::Tiles(window, header.tileSize, BandsApart(bandCount));
    const std::uint64_t tileBytes = std::uint64_t{header.tileSize} * header.tileSize * sampleBytes *
                                    (IsPixelInterleaved() ? header.bandCount : 1);
    const std::uint64_t held = kMostHeldTogether / (tileBytes * kCopiesOfTile);
    return static_cast<std::uint32_t>(std::clamp<std::uint64_t>(
        std::min({std::uint64_t{how.threads}, tiles / kTilesPerThread, held}), 1, how.threads));
}

bool WindowReader::ReadTogether(const Request& request, std::uint32_t threads,
                                const GDALRasterIOExtraArg* extra) {
    const WindowParts parts(request.window, layout.header.tileSize, BandsApart(request.bandCount),
                            threads * kPartsPerThread);
    const auto read = [&](TileReader& tiles, std::uint64_t number) {
        const WindowParts::Part part = parts.At(number);
        Target place = request.target;
        place.data = static_cast<unsigned char*>(place.data) +
                     (part.window.x - request.window.x) * place.pixelSpace +
                     (part.window.y - request.window.y) * place.lineSpace +
                     part.firstBand * place.bandSpace;
        const int count =
            part.bandCount == 0 ? request.bandCount : static_cast<int>(part.bandCount);
        return tiles.Read(request.level, part.window, request.bands + part.firstBand, count, place);
    };
    ShareDone shareDone;
    if (extra && extra->pfnProgress)
        shareDone = [extra](double share) {
            return extra->pfnProgress(share, "", extra->pProgressData) != FALSE;
        };
    const auto makeWorker = [&, this]() -> Worker {
        return [&read, lease = std::make_shared<Lease>(*this)](std::uint64_t number) {
            return read(lease->Tiles(), number);
        };
    };
    return RunJobs(parts.Count(), threads, makeWorker, shareDone);
}

}  // namespace zmcgdal
