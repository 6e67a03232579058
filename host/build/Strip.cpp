#include "host/build/Strip.h"

#include "host/build/BuildPlan.h"

namespace zmchost {

void MemoryMeter::Add(std::uint64_t bytes) {
    const std::uint64_t held = now += bytes;
    std::uint64_t known = peak;
    while (known < held && !peak.compare_exchange_weak(known, held)) {
    }
}

MeteredBytes::MeteredBytes(MemoryMeter& countingMeter, std::size_t byteCount)
    : meter(countingMeter),
      size(byteCount),
      bytes(std::make_unique_for_overwrite<std::byte[]>(byteCount)) {
    meter.Add(size);
}

Strip::Strip(MemoryMeter& meter, std::uint32_t levelNumber, std::size_t pixelCapacity,
             std::uint32_t bytesPerPixel, std::uint32_t maskBytesPerPixel, std::uint32_t maxLines)
    : level(levelNumber),
      pixelBytes(bytesPerPixel),
      maskBytes(maskBytesPerPixel),
      pixels(meter, pixelCapacity * bytesPerPixel),
      masks(meter, pixelCapacity * maskBytesPerPixel),
      marked(maxLines) {}

void Strip::Begin(std::uint32_t first, std::uint32_t lineCount, std::uint32_t pixelsPerLine) {
    firstLine = first;
    lines = lineCount;
    width = pixelsPerLine;
    marked.assign(marked.size(), 0);
}

unsigned char* Strip::MaskRow(std::uint32_t line) const {
    std::byte* const row = masks.Data() + (line - firstLine) * MaskRowBytes();
    return static_cast<unsigned char*>(static_cast<void*>(row));
}

StripStore::StripStore(MemoryMeter& countingMeter, std::uint32_t firstLevel,
                       std::uint32_t lastLevel, std::uint64_t baseWidth,
                       std::uint32_t bytesPerPixel, std::uint32_t maskBytesPerPixel)
    : meter(countingMeter),
      baseLevel(firstLevel),
      width(baseWidth),
      pixelBytes(bytesPerPixel),
      maskBytes(maskBytesPerPixel),
      shelves(lastLevel - firstLevel + 1) {}

StripStore::Loan StripStore::Take(std::uint32_t level) {
    {
        const std::lock_guard<std::mutex> lock(mutex);
        Shelf& shelf = shelves[level - baseLevel];
        if (!shelf.idle.empty()) {
            Loan loan(shelf.idle.back().release(), Return{this});
            shelf.idle.pop_back();
            return loan;
        }
        shelf.idle.reserve(shelf.made + 1);
        ++shelf.made;
    }
    const std::size_t capacity = static_cast<std::size_t>(width >> (level - baseLevel)) * kTileSide;
    auto strip = std::make_unique<Strip>(meter, level, capacity, pixelBytes, maskBytes, kTileSide);
    return Loan(strip.release(), Return{this});
}

void StripStore::Give(Strip* strip) noexcept {
    std::unique_ptr<Strip> returned(strip);
    const std::lock_guard<std::mutex> lock(mutex);
    shelves[returned->level - baseLevel].idle.push_back(std::move(returned));
}

}  // namespace zmchost
