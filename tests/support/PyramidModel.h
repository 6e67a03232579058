// PyramidModel: a pyramid file in memory, written and read by the letter of its format.
//
// Slow and plain on purpose, and sharing no code with the module: its own header text, its own walk
// along the Morton curve (code by code), its own tile layout, its own transfers. Bytes beyond the
// end of the file read as zeros.
#ifndef ZMC_TESTS_SUPPORT_PYRAMIDMODEL_H
#define ZMC_TESTS_SUPPORT_PYRAMIDMODEL_H

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <map>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "tests/support/ScratchDirectory.h"

namespace zmctest {

using Bytes = std::vector<unsigned char>;

struct ModelType {
    std::uint32_t code;
    const char* word;
    std::uint32_t bytes;
};
inline const std::vector<ModelType>& ModelTypes() {
    static const std::vector<ModelType> types{
        {1, "Byte", 1},    {2, "Int16", 2},         {3, "Int32", 4},          {4, "Single", 4},
        {5, "Double", 8},  {6, "ComplexSingle", 8}, {9, "ComplexDouble", 16}, {12, "UInt16", 2},
        {13, "UInt32", 4}, {14, "Int64", 8},        {15, "UInt64", 8},        {99, "Char", 1}};
    return types;
}
inline const ModelType& FindModelType(std::uint32_t code) {
    for (const ModelType& type : ModelTypes())
        if (type.code == code) return type;
    throw std::invalid_argument("no such type");
}

struct PyramidDescription {
    std::uint32_t samples = 1;
    std::uint32_t lines = 1;
    std::uint32_t bands = 1;
    std::uint32_t tile = 256;
    std::uint32_t levelMin = 0;
    std::uint32_t levelMax = 0;
    std::uint32_t type = 1;
    std::uint32_t ordering = 0;
    std::uint32_t versionMajor = 1;
    std::uint32_t versionMinor = 1;
};

// The walk that places the tiles of the ordering Morton, state by state.
class MortonModel {
public:
    // Offsets by (level * bands + band) * tiles + index of the tile in its level.
    std::map<std::uint64_t, std::uint64_t> offsets;
    std::uint64_t cursor;
    std::uint64_t tiles = 0;
    std::uint64_t visits = 0;

    MortonModel(const PyramidDescription& d, std::uint32_t sampleBytes, std::uint64_t start)
        : cursor(start), bands(d.bands) {
        const std::uint32_t across = (d.samples + d.tile - 1) / d.tile;
        const std::uint32_t down = (d.lines + d.tile - 1) / d.tile;
        tiles = std::uint64_t{across} * down;
        if (tiles == 0) return;
        std::vector<State> states;
        for (std::uint32_t level = 0; level <= d.levelMax; ++level) {
            State s;
            s.level = level;
            s.samples = d.samples;
            s.lines = d.lines;
            s.tileSize = d.tile;
            s.levelTilesAcross = ((d.samples >> level) + d.tile - 1) / d.tile;
            s.bytesPerSample = sampleBytes;
            states.push_back(s);
        }
        const int bits =
            static_cast<int>(std::ceil(std::log(std::max(across, down)) / std::log(2.0)));
        for (std::uint32_t band = 0; band < d.bands; ++band) {
            std::uint64_t visited = 0;
            for (std::uint64_t code = 0; visited < tiles; ++code) {
                std::uint32_t x = 0;
                std::uint32_t y = 0;
                for (int i = 0; i < bits; ++i) {
                    x |= static_cast<std::uint32_t>(code >> (2 * i) & 1) << i;
                    y |= static_cast<std::uint32_t>(code >> (2 * i + 1) & 1) << i;
                }
                if (y >= down || x >= across) continue;
                ++visited;
                ++visits;
                for (std::uint32_t level = d.levelMin; level <= d.levelMax; ++level)
                    PlaceTile(states[level], x, y);
            }
        }
    }

private:
    struct State {
        std::uint32_t level = 0, samples = 0, lines = 0, tilesAcross = 0, tilesDown = 0;
        std::uint32_t tileSize = 0, levelTilesAcross = 0;
        std::uint32_t blockX = 0, blockY = 0, blockLastX = 0, blockLastY = 0;
        std::uint32_t blockWidth = 0, blockHeight = 0;
        bool started = false;
        std::uint32_t planes = 1, band = 0, bytesPerSample = 1;
    };

    void Set(const State& s, std::uint64_t index) {
        offsets[(std::uint64_t{s.level} * bands + s.band) * tiles + index] = cursor;
    }
    static void Begin(State& s, std::uint32_t x, std::uint32_t y) {
        s.blockX = x;
        s.blockY = y;
        s.blockWidth = s.blockHeight = 0;
        s.blockLastX = x + (1u << s.level) - 1;
        s.blockLastY = y + (1u << s.level) - 1;
    }
    void Emit(const State& s) {
        if (s.blockWidth == 0 || s.blockHeight == 0) return;
        Set(s, std::uint64_t{s.blockY >> s.level} * s.levelTilesAcross + (s.blockX >> s.level));
        cursor += std::uint64_t{s.bytesPerSample} * s.planes * s.blockHeight * s.blockWidth;
    }
    void PlaceTile(State& s, std::uint32_t x, std::uint32_t y) {
        const bool wasStarted = s.started;
        if (!wasStarted) {
            s.tilesAcross = (s.samples + s.tileSize - 1) / s.tileSize;
            s.tilesDown = (s.lines + s.tileSize - 1) / s.tileSize;
        }
        std::uint32_t w = s.tileSize;
        std::uint32_t h = s.tileSize;
        if (x == s.tilesAcross - 1) w = s.samples + (1 - s.tilesAcross) * s.tileSize;
        if (y == s.tilesDown - 1) h = s.lines + (1 - s.tilesDown) * s.tileSize;
        const bool last = x == s.tilesAcross - 1 && y == s.tilesDown - 1;
        if (s.level == 0) {
            Set(s, std::uint64_t{s.levelTilesAcross} * y + x);
            s.started = true;
            if (last) {
                ++s.band;
                s.started = false;
            }
            cursor += std::uint64_t{s.bytesPerSample} * s.planes * h * w;
            return;
        }
        if (!wasStarted) {
            Begin(s, x, y);
            s.started = true;
        }
        if (x > s.blockLastX || y > s.blockLastY) {
            Emit(s);
            Begin(s, x, y);
        }
        if (y == s.blockY) s.blockWidth += w >> s.level;
        if (x == s.blockX) s.blockHeight += h >> s.level;
        if (last) {
            Emit(s);
            Begin(s, x, y);
            s.started = false;
            ++s.band;
        }
    }

    std::uint32_t bands;
};

class PyramidModel {
public:
    PyramidDescription d;
    Bytes file;
    std::uint64_t tileDataStart = 0;
    std::uint64_t tileDataEnd = 0;

    // A file that ends with its header, as yet.
    explicit PyramidModel(const PyramidDescription& description) : d(description) {
        const std::string header = HeaderText();
        file.assign({'K', 'O', 'B', 'T'});
        file.resize(20);
        file.insert(file.end(), header.begin(), header.end());
        LayOut(file.size());
        Put64(4, tileDataStart);
        Put64(12, tileDataEnd);
    }

    // A file of these bytes, with this header and tile data from `start` on.
    PyramidModel(const PyramidDescription& description, Bytes bytes, std::uint64_t start)
        : d(description), file(std::move(bytes)) {
        LayOut(start);
    }

    // A file that somebody else wrote.
    explicit PyramidModel(const std::filesystem::path& path) {
        const std::string bytes = zmctest::ReadText(path);
        file.assign(bytes.begin(), bytes.end());
        if (file.size() < 20 || std::memcmp(file.data(), "KOBT", 4) != 0)
            throw std::runtime_error("not a pyramid");
        const std::uint64_t start = Get64(4);
        const std::string text(file.begin() + 20,
                               file.begin() + static_cast<std::ptrdiff_t>(start));
        d.versionMajor = Number(text, "HEADER_VERSION_MAJOR");
        d.versionMinor = Number(text, "HEADER_VERSION_MINOR");
        d.bands = Number(text, "HEADER_BANDS");
        d.samples = Number(text, "HEADER_PIXEL_WIDTH");
        d.lines = Number(text, "HEADER_PIXEL_HEIGHT");
        d.tile = Number(text, "HEADER_TILESIZE");
        d.levelMin = Number(text, "HEADER_LEVELMIN");
        d.levelMax = Number(text, "HEADER_LEVELMAX");
        const std::string order = Element(text, "HEADER_BUILD_METHOD");
        d.ordering = order == "Morton" ? 2 : order == "Blocked" ? 1 : 0;
        for (const ModelType& type : ModelTypes())
            if (Element(text, "HEADER_PIXEL_TYPE") == type.word) d.type = type.code;
        LayOut(start);
    }

    void Save(const std::filesystem::path& path) const {
        std::ofstream stream(path, std::ios::binary | std::ios::trunc);
        stream.write(reinterpret_cast<const char*>(file.data()),
                     static_cast<std::streamsize>(file.size()));
    }

    std::string HeaderText() const {
        static const char* const orders[] = {"Scanline", "Blocked", "Morton"};
        const auto element = [](const char* name, const std::string& text) {
            return std::string("<") + name + ">" + text + "</" + name + ">\n";
        };
        const auto number = [&](const char* name, std::uint32_t value) {
            return element(name, std::to_string(value));
        };
        return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<DATASET>\n<HEADER>\n" +
               number("HEADER_VERSION_MAJOR", d.versionMajor) +
               number("HEADER_VERSION_MINOR", d.versionMinor) + number("HEADER_BANDS", d.bands) +
               number("HEADER_PIXEL_HEIGHT", d.lines) + number("HEADER_PIXEL_WIDTH", d.samples) +
               number("HEADER_LEVELMIN", d.levelMin) + number("HEADER_LEVELMAX", d.levelMax) +
               number("HEADER_TILESIZE", d.tile) + element("HEADER_INTERLEAVE", "BIP") +
               element("HEADER_BUILD_METHOD", d.ordering < 3 ? orders[d.ordering] : "Hilbert") +
               element("HEADER_PIXEL_TYPE", FindModelType(d.type).word) + "</HEADER>\n</DATASET>\n";
    }

    std::uint32_t SampleBytes() const { return FindModelType(d.type).bytes; }
    std::uint32_t Width(std::uint32_t level) const { return d.samples >> level; }
    std::uint32_t Height(std::uint32_t level) const { return d.lines >> level; }
    std::uint32_t Across(std::uint32_t level) const { return (Width(level) + d.tile - 1) / d.tile; }
    std::uint32_t Down(std::uint32_t level) const { return (Height(level) + d.tile - 1) / d.tile; }
    std::uint32_t TileWidth(std::uint32_t level, std::uint32_t tx) const {
        return std::min(d.tile, Width(level) - tx * d.tile);
    }
    std::uint32_t TileHeight(std::uint32_t level, std::uint32_t ty) const {
        return std::min(d.tile, Height(level) - ty * d.tile);
    }
    std::uint64_t LevelStart(std::uint32_t level) const { return levelStarts.at(level); }

    // Absolute offset of a tile, and in the ordering Morton of one band of it.
    std::uint64_t TileStart(std::uint32_t level, std::uint32_t tx, std::uint32_t ty,
                            std::uint32_t band = 0) const {
        if (d.ordering == 2) {
            const std::uint64_t row = (std::uint64_t{level} * d.bands + band) * mortonTiles;
            return morton.at(row + std::uint64_t{Across(level)} * ty + tx);
        }
        std::uint64_t offset = LevelStart(level);
        for (std::uint32_t y = 0; y < ty; ++y)
            offset += std::uint64_t{Width(level)} * TileHeight(level, y) * PixelBytes();
        for (std::uint32_t x = 0; x < tx; ++x)
            offset += std::uint64_t{TileWidth(level, x)} * TileHeight(level, ty) * PixelBytes();
        return offset;
    }

    // Where one sample of the image lies.
    std::uint64_t SampleStart(std::uint32_t level, std::uint32_t x, std::uint32_t y,
                              std::uint32_t band) const {
        const std::uint32_t tx = x / d.tile;
        const std::uint32_t ty = y / d.tile;
        const std::uint64_t pixel =
            std::uint64_t{y - ty * d.tile} * TileWidth(level, tx) + (x - tx * d.tile);
        if (d.ordering == 2) return TileStart(level, tx, ty, band) + pixel * SampleBytes();
        return TileStart(level, tx, ty) + (pixel * d.bands + band) * SampleBytes();
    }

    // Made-up samples of a level, pixel-interleaved; neighbours differ in every byte.
    Bytes Image(std::uint32_t level) const {
        Bytes image(std::size_t{Width(level)} * Height(level) * PixelBytes());
        std::uint32_t state = 12345u + level;
        for (unsigned char& byte : image) {
            state = state * 1664525u + 1013904223u;
            byte = static_cast<unsigned char>(state >> 24);
        }
        return image;
    }

    void StoreImage(std::uint32_t level, const Bytes& image) {
        MoveImage(level, [&](std::uint64_t at, std::size_t inImage, std::size_t size) {
            if (file.size() < at + size) file.resize(at + size);
            std::copy_n(image.data() + inImage, size, file.data() + at);
        });
    }
    Bytes LoadImage(std::uint32_t level) const {
        Bytes image(std::size_t{Width(level)} * Height(level) * PixelBytes());
        MoveImage(level, [&](std::uint64_t at, std::size_t inImage, std::size_t size) {
            for (std::size_t i = 0; i < size; ++i)
                image[inImage + i] = at + i < file.size() ? file[at + i] : 0;
        });
        return image;
    }
    void StoreAllImages() {
        for (std::uint32_t level = d.levelMin; level <= d.levelMax; ++level)
            StoreImage(level, Image(level));
    }

    // --- transfers, as the format's rules tell them ---

    Bytes ReadTile(std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height,
                   const std::vector<int>& list, std::uint32_t level) const {
        const std::size_t n = list.empty() ? d.bands : list.size();
        Bytes out(std::size_t{width} * height * n * SampleBytes());
        unsigned char* next = out.data();
        for (std::uint32_t row = 0; row < height; ++row)
            for (std::uint32_t column = 0; column < width; ++column)
                for (std::size_t i = 0; i < n; ++i, next += SampleBytes()) {
                    const auto band =
                        static_cast<std::uint32_t>(list.empty() ? static_cast<int>(i) : list[i]);
                    const Bytes sample =
                        Read(SampleStart(level, x + column, y + row, band), SampleBytes());
                    std::copy(sample.begin(), sample.end(), next);
                }
        return out;
    }

    void WriteTile(std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height,
                   const std::vector<int>& list, std::uint32_t level, const Bytes& buffer) {
        if (d.ordering == 2)
            WriteMorton(x, y, width, height, list, level, buffer);
        else
            WriteInterleaved(x, y, width, height, list, level, buffer);
    }

    Bytes Read(std::uint64_t at, std::size_t size) const {
        Bytes bytes(size);
        if (at < file.size())
            std::copy_n(file.data() + at, std::min<std::size_t>(size, file.size() - at),
                        bytes.data());
        return bytes;
    }
    void Write(std::uint64_t at, const unsigned char* bytes, std::size_t size) {
        if (file.size() < at + size) file.resize(at + size);
        std::copy_n(bytes, size, file.data() + at);
    }

private:
    std::size_t PixelBytes() const { return std::size_t{SampleBytes()} * d.bands; }

    bool IsIdentity(const std::vector<int>& list) const {
        if (list.empty()) return true;
        if (list.size() != d.bands) return false;
        for (std::size_t i = 0; i < list.size(); ++i)
            if (list[i] != static_cast<int>(i)) return false;
        return true;
    }

    // Whether a rectangle is written straight to its first tile.
    bool Direct(std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height,
                std::uint32_t level) const {
        const std::uint32_t t = d.tile;
        bool merge = !(width == t && height == t && x % t == 0 && y % t == 0);
        if (x / t == Across(level) - 1 && width == TileWidth(level, Across(level) - 1))
            merge = false;
        if (y / t == Down(level) - 1 && height == TileHeight(level, Down(level) - 1)) merge = false;
        if (d.ordering != 2) {
            if (width == Width(level) && x == 0 && height == t) merge = false;
        } else if ((x + width - 1) / t != x / t || (y + height - 1) / t != y / t) {
            merge = true;
        }
        return !merge;
    }

    void WriteInterleaved(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                          std::uint32_t height, const std::vector<int>& list, std::uint32_t level,
                          const Bytes& buffer) {
        const std::size_t size = SampleBytes();
        const std::size_t n = list.empty() ? d.bands : list.size();
        const std::size_t m = std::size_t{width} * height * PixelBytes();
        if (Direct(x, y, width, height, level)) {
            const std::uint64_t tile = TileStart(level, x / d.tile, y / d.tile);
            if (IsIdentity(list)) return Write(tile, buffer.data(), m);
            Bytes temporary = Read(tile, m);
            const unsigned char* next = buffer.data();
            for (std::size_t pixel = 0; pixel < std::size_t{width} * height; ++pixel)
                for (std::size_t i = 0; i < n; ++i, next += size)
                    std::copy_n(next, size,
                                temporary.data() + pixel * PixelBytes() +
                                    static_cast<std::size_t>(list[i]) * size);
            return Write(tile + m, temporary.data(), m);
        }
        // All touched tiles come to exist as a whole, then the rectangle's samples are set.
        for (std::uint32_t ty = y / d.tile; ty <= (y + height - 1) / d.tile; ++ty)
            for (std::uint32_t tx = x / d.tile; tx <= (x + width - 1) / d.tile; ++tx) {
                const std::uint64_t start = TileStart(level, tx, ty);
                const Bytes old = Read(start, std::size_t{TileWidth(level, tx)} *
                                                  TileHeight(level, ty) * PixelBytes());
                Write(start, old.data(), old.size());
            }
        const unsigned char* next = buffer.data();
        for (std::uint32_t row = 0; row < height; ++row)
            for (std::uint32_t column = 0; column < width; ++column)
                for (std::size_t i = 0; i < n; ++i, next += size)
                    Write(SampleStart(level, x + column, y + row,
                                      static_cast<std::uint32_t>(list.empty() ? static_cast<int>(i)
                                                                              : list[i])),
                          next, size);
    }

    void WriteMorton(std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height,
                     const std::vector<int>& list, std::uint32_t level, const Bytes& buffer) {
        if (!Direct(x, y, width, height, level)) return;
        const std::size_t size = SampleBytes();
        for (std::size_t i = 0; i < list.size(); ++i) {
            Bytes plane(std::size_t{width} * height * size);
            for (std::size_t pixel = 0; pixel < std::size_t{width} * height; ++pixel)
                std::copy_n(buffer.data() + (pixel * list.size() + i) * size, size,
                            plane.data() + pixel * size);
            Write(TileStart(level, x / d.tile, y / d.tile, static_cast<std::uint32_t>(list[i])),
                  plane.data(), plane.size());
        }
    }

    // Calls move(offset in the file, offset in the image, size) for runs of samples.
    template <class Move>
    void MoveImage(std::uint32_t level, Move&& move) const {
        const std::size_t size = SampleBytes();
        const std::uint32_t planes = d.ordering == 2 ? d.bands : 1;
        const std::uint32_t step = d.ordering == 2 ? 1 : d.tile;
        for (std::uint32_t plane = 0; plane < planes; ++plane)
            for (std::uint32_t ty = 0; ty < Down(level); ++ty)
                for (std::uint32_t tx = 0; tx < Across(level); ++tx) {
                    std::uint64_t at = TileStart(level, tx, ty, plane);
                    for (std::uint32_t row = 0; row < TileHeight(level, ty); ++row)
                        for (std::uint32_t column = 0; column < TileWidth(level, tx);
                             column += step) {
                            const std::size_t pixel =
                                (std::size_t{ty} * d.tile + row) * Width(level) +
                                std::size_t{tx} * d.tile + column;
                            const std::size_t run =
                                d.ordering == 2 ? size : TileWidth(level, tx) * PixelBytes();
                            move(at, pixel * PixelBytes() + plane * size, run);
                            at += run;
                        }
                }
    }

    void LayOut(std::uint64_t start) {
        tileDataStart = start;
        std::uint64_t cursor = start;
        for (std::int64_t level = d.levelMax; level >= std::int64_t{d.levelMin}; --level) {
            levelStarts[static_cast<std::uint32_t>(level)] = cursor;
            if (level >= 32) continue;
            const auto l = static_cast<std::uint32_t>(level);
            cursor += std::uint64_t{Width(l)} * Height(l) * PixelBytes();
        }
        tileDataEnd = cursor;
        if (d.ordering != 2) return;
        MortonModel walk(d, SampleBytes(), start);
        morton = walk.offsets;
        mortonTiles = walk.tiles;
    }

    static std::string Element(const std::string& text, const std::string& name) {
        const std::size_t open = text.find("<" + name + ">");
        if (open == std::string::npos) throw std::runtime_error("no " + name);
        const std::size_t start = open + name.size() + 2;
        return text.substr(start, text.find("</" + name + ">", start) - start);
    }
    static std::uint32_t Number(const std::string& text, const std::string& name) {
        return static_cast<std::uint32_t>(std::stoul(Element(text, name)));
    }
    void Put64(std::size_t at, std::uint64_t value) {
        for (std::size_t i = 0; i < 8; ++i)
            file[at + i] = static_cast<unsigned char>(value >> (8 * i));
    }
    std::uint64_t Get64(std::size_t at) const {
        std::uint64_t value = 0;
        for (std::size_t i = 8; i-- > 0;) value = value * 256 + file[at + i];
        return value;
    }

    std::map<std::uint32_t, std::uint64_t> levelStarts;
    std::map<std::uint64_t, std::uint64_t> morton;
    std::uint64_t mortonTiles = 0;
};

}  // namespace zmctest

#endif
