// PNG as its standard has it (ISO/IEC 15948), with libdeflate, which is several times as fast as
// zlib at the same size: a signature and three chunks.
#include <libdeflate.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <stdexcept>

#include "render/Codecs.h"

namespace zmcrender {
namespace {

using Bytes = std::vector<unsigned char>;

constexpr int kLevel = 1;               // of libdeflate: pictures are made while somebody waits
constexpr std::size_t kChunkEnds = 12;  // length, name, checksum

struct Free {
    void operator()(libdeflate_compressor* compressor) const {
        libdeflate_free_compressor(compressor);
    }
};

// Of the thread: it is larger than most pictures.
libdeflate_compressor* Compressor() {
    thread_local const std::unique_ptr<libdeflate_compressor, Free> compressor(
        libdeflate_alloc_compressor(kLevel));
    if (!compressor) throw std::bad_alloc();
    return compressor.get();
}

void Put32(unsigned char* to, std::uint32_t value) {
    for (int i = 0; i < 4; ++i) to[i] = static_cast<unsigned char>(value >> (24 - 8 * i));
}

// Length and name in front of the data that is there, and the checksum behind it.
void CloseChunk(unsigned char* chunk, const char* name, std::size_t size) {
    Put32(chunk, static_cast<std::uint32_t>(size));
    std::memcpy(chunk + 4, name, 4);
    Put32(chunk + 8 + size, libdeflate_crc32(0, chunk + 4, size + 4));
}

// The samples of a line with the most significant byte first.
void PutLine(const Picture& picture, std::uint32_t y, unsigned char* to) {
    const unsigned char* const from = &picture.bytes[y * picture.LineBytes()];
    if (picture.depth == 8) {
        std::memcpy(to, from, picture.LineBytes());
        return;
    }
    for (std::size_t i = 0; i < picture.LineBytes(); i += 2) {
        std::uint16_t value = 0;
        std::memcpy(&value, from + i, sizeof value);
        to[i] = static_cast<unsigned char>(value >> 8);
        to[i + 1] = static_cast<unsigned char>(value);
    }
}

unsigned char Paeth(int left, int up, int corner) {
    const int toLeft = std::abs(up - corner), toUp = std::abs(left - corner),
              toCorner = std::abs(left + up - 2 * corner);
    if (toLeft <= toUp && toLeft <= toCorner) return static_cast<unsigned char>(left);
    return static_cast<unsigned char>(toUp <= toCorner ? up : corner);
}

// The filters of the standard by their numbers. `line` and `above` have `unit` zeros in front.
void Filter(int kind, const unsigned char* line, const unsigned char* above, std::size_t size,
            std::size_t unit, unsigned char* to) {
    const auto each = [&](auto&& guess) {
        for (std::size_t i = 0; i < size; ++i)
            to[i] = static_cast<unsigned char>(line[i] - guess(line + i - unit, above + i));
    };
    if (kind == 1)
        each([](const unsigned char* left, const unsigned char*) { return *left; });
    else if (kind == 2)
        each([](const unsigned char*, const unsigned char* up) { return *up; });
    else
        each([unit](const unsigned char* left, const unsigned char* up) {
            return Paeth(*left, *up, *(up - unit));
        });
}

// How far its bytes are from 0, taken with a sign: the standard's own measure of a good filter.
std::uint64_t Cost(const unsigned char* bytes, std::size_t size) {
    std::uint64_t sum = 0;
    for (std::size_t i = 0; i < size; ++i)
        sum += static_cast<unsigned>(std::min<int>(bytes[i], 256 - bytes[i]));
    return sum;
}

// All lines with the filter that suits each: a byte that tells it, and the line.
Bytes Filtered(const Picture& picture) {
    const std::size_t size = picture.LineBytes();
    const std::size_t unit = std::size_t{picture.channels} * picture.depth / 8;
    Bytes all((size + 1) * picture.height), line(size + unit), above(size + unit), tried(size);
    unsigned char* to = all.data();
    for (std::uint32_t y = 0; y < picture.height; ++y, to += size + 1) {
        PutLine(picture, y, &line[unit]);
        to[0] = 0;
        std::memcpy(to + 1, &line[unit], size);
        std::uint64_t least = Cost(to + 1, size);
        for (const int kind : {1, 2, 4}) {
            Filter(kind, &line[unit], &above[unit], size, unit, tried.data());
            const std::uint64_t cost = Cost(tried.data(), size);
            if (cost >= least) continue;
            least = cost;
            to[0] = static_cast<unsigned char>(kind);
            std::memcpy(to + 1, tried.data(), size);
        }
        std::swap(line, above);
    }
    return all;
}

}  // namespace

Bytes EncodePng(const Picture& picture) {
    static constexpr unsigned char kSignature[] = {0x89, 'P', 'N', 'G', '\r', '\n', 0x1a, '\n'};
    static constexpr unsigned char kColourTypes[] = {0, 4, 2, 6};
    const Bytes lines = Filtered(picture);
    const std::size_t most = libdeflate_zlib_compress_bound(Compressor(), lines.size());
    Bytes file(sizeof kSignature + 3 * kChunkEnds + 13 + most);
    unsigned char* at = std::copy(std::begin(kSignature), std::end(kSignature), file.data());
    Put32(at + 8, picture.width);
    Put32(at + 12, picture.height);
    at[16] = static_cast<unsigned char>(picture.depth);
    at[17] = kColourTypes[picture.channels - 1];
    CloseChunk(at, "IHDR", 13);
    at += kChunkEnds + 13;
    const std::size_t size =
        libdeflate_zlib_compress(Compressor(), lines.data(), lines.size(), at + 8, most);
    if (size == 0 || size > 0x7fffffff) throw std::runtime_error("PNG: too large");
    CloseChunk(at, "IDAT", size);
    at += kChunkEnds + size;
    CloseChunk(at, "IEND", 0);
    file.resize(static_cast<std::size_t>(at + kChunkEnds - file.data()));
    return file;
}

}  // namespace zmcrender
