// Strip: lines of one level in memory, at most one row of tiles high, and the store from which
// strips are taken and to which they return.
#ifndef ZMC_HOST_BUILD_STRIP_H
#define ZMC_HOST_BUILD_STRIP_H

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

namespace zmchost {

// Counts the bytes that a build holds, on any thread.
class MemoryMeter {
public:
    void Add(std::uint64_t bytes);
    void Remove(std::uint64_t bytes) { now -= bytes; }
    std::uint64_t Peak() const { return peak; }

private:
    std::atomic<std::uint64_t> now{0};
    std::atomic<std::uint64_t> peak{0};
};

// Uninitialised bytes that a meter knows of.
class MeteredBytes {
public:
    MeteredBytes(MemoryMeter& countingMeter, std::size_t byteCount);
    ~MeteredBytes() { meter.Remove(size); }
    MeteredBytes(const MeteredBytes&) = delete;
    MeteredBytes& operator=(const MeteredBytes&) = delete;

    std::byte* Data() const { return bytes.get(); }
    std::size_t Size() const { return size; }

private:
    MemoryMeter& meter;
    std::size_t size;
    std::unique_ptr<std::byte[]> bytes;
};

// Lines [firstLine, firstLine + lines) of a level, pixel-interleaved, without gaps.
class Strip {
public:
    Strip(MemoryMeter& meter, std::uint32_t levelNumber, std::size_t pixelCapacity,
          std::uint32_t bytesPerPixel, std::uint32_t maskBytesPerPixel, std::uint32_t maxLines);

    // Makes it empty lines of a level, to be filled.
    void Begin(std::uint32_t first, std::uint32_t lineCount, std::uint32_t pixelsPerLine);

    std::byte* Row(std::uint32_t line) const {
        return pixels.Data() + (line - firstLine) * RowBytes();
    }
    // Where the mask of a line is; only for strips with masks.
    unsigned char* MaskRow(std::uint32_t line) const;
    // The mask of a line, or null if all its samples are valid.
    unsigned char* MaskIfMarked(std::uint32_t line) const {
        return marked[line - firstLine] ? MaskRow(line) : nullptr;
    }
    void SetMarked(std::uint32_t line, bool any) { marked[line - firstLine] = any ? 1 : 0; }

    std::size_t RowBytes() const { return std::size_t{width} * pixelBytes; }
    std::size_t MaskRowBytes() const { return std::size_t{width} * maskBytes; }
    std::uint32_t End() const { return firstLine + lines; }

    const std::uint32_t level;
    const std::uint32_t pixelBytes;
    const std::uint32_t maskBytes;  // 0 in strips without masks
    std::uint32_t firstLine = 0;
    std::uint32_t lines = 0;
    std::uint32_t width = 0;

private:
    MeteredBytes pixels;
    MeteredBytes masks;
    std::vector<unsigned char> marked;  // by line; one byte each, as threads write them
};

// Strips of the levels of a pass, used again and again: fresh memory costs more than a copy.
class StripStore {
public:
    StripStore(MemoryMeter& countingMeter, std::uint32_t firstLevel, std::uint32_t lastLevel,
               std::uint64_t baseWidth, std::uint32_t bytesPerPixel,
               std::uint32_t maskBytesPerPixel);

    // Whether its strips do for such levels and pixels.
    bool Serves(std::uint32_t firstLevel, std::uint32_t lastLevel, std::uint64_t baseWidth) const {
        return firstLevel == baseLevel && lastLevel - firstLevel + 1 == shelves.size() &&
               baseWidth <= width;
    }

    struct Return {
        StripStore* store = nullptr;
        void operator()(Strip* strip) const { store->Give(strip); }
    };
    using Loan = std::unique_ptr<Strip, Return>;

    // A strip of the level, with room for a row of tiles. Any thread may take and give.
    Loan Take(std::uint32_t level);

private:
    struct Shelf {
        std::vector<std::unique_ptr<Strip>> idle;  // with room for all that were made
        std::size_t made = 0;
    };

    // Takes no memory: strips come back while a failure is under way too.
    void Give(Strip* strip) noexcept;

    MemoryMeter& meter;
    std::uint32_t baseLevel;
    std::uint64_t width;
    std::uint32_t pixelBytes;
    std::uint32_t maskBytes;
    std::mutex mutex;
    std::vector<Shelf> shelves;  // by level above the base
};

}  // namespace zmchost

#endif
