// The arithmetic of a pyramid file: header fields of any value straight into limits, level sizes,
// tile offsets, the Morton table, the walk over tiles and the moves of samples, each beside a model
// that counts in 128 bits.
//
// An input tells the fields of a header, then a tile, a window of a level and a list of bands.
// Small layouts, and those of few rows that are long, go on to a file of known bytes, through which
// tiles are read and written.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <vector>
#include <xercesc/util/PlatformUtils.hpp>

#include "core/ElementTypes.h"
#include "core/PixelVocabulary.h"
#include "format/LevelGeometry.h"
#include "format/PyramidLimits.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/LayoutFields.h"
#include "fuzz/support/NaiveLayout.h"
#include "fuzz/support/ScratchFolder.h"
#include "platform/File.h"
#include "pyramid/PyramidDataset.h"
#include "pyramid/TileGather.h"
#include "pyramid/TileRequest.h"

namespace {

using zelm::Array;
using zelm::ArrayShape;
using zelm::LevelGeometry;
using zelm::PyramidDataset;
using zelm::PyramidHeaderRecord;
using zelm::TilePart;
using zmcfuzz::HeaderFields;
using zmcfuzz::InputBytes;
using zmcfuzz::NaiveAxis;
using zmcfuzz::NaiveLayout;
using zmcfuzz::NaiveMorton;
using zmcfuzz::Wide;
using Bytes = std::vector<unsigned char>;

namespace PyramidLimits = zelm::PyramidLimits;

constexpr Wide kEnd64 = Wide{1} << 64;

PyramidHeaderRecord RecordOf(const HeaderFields& fields) {
    PyramidHeaderRecord record;
    record.versionMajor = record.versionMinor = 1;
    record.bandCount = fields.bands;
    record.width = fields.samples;
    record.height = fields.lines;
    record.tileSize = fields.tile;
    record.levelMin = fields.levelMin;
    record.levelMax = fields.levelMax;
    record.pixelType = fields.pixelType;
    record.tileOrdering = fields.ordering;
    return record;
}

void ExpectLimits(const NaiveLayout& layout) {
    const HeaderFields& f = layout.fields;
    ZMC_EXPECT(PyramidLimits::Allow(RecordOf(f)) == layout.IsAllowed());
    ZMC_EXPECT(zelm::PixelSize(f.pixelType) == layout.sampleBytes);
    const std::uint64_t bytes =
        PyramidLimits::TileTableBytes(std::uint64_t{f.samples} * f.lines, f.bands, f.levelMax);
    const Wide entries = std::max<Wide>(Wide{f.samples} * f.lines, 1) * std::max<Wide>(f.bands, 1) *
                         (Wide{f.levelMax} + 1);
    if (entries < kEnd64 / 8)
        ZMC_EXPECT(bytes == entries * 8);
    else
        ZMC_EXPECT(bytes > PyramidLimits::kMaxTableBytes);
}

void ExpectAxis(const NaiveAxis& axis, std::uint32_t tiles, std::uint32_t lastExtent) {
    ZMC_EXPECT(tiles == axis.tiles);
    if (axis.tiles != 0) ZMC_EXPECT(lastExtent == axis.TileExtent(axis.tiles - 1));
}

// Any level, laid out or not.
void ExpectGeometry(const NaiveLayout& layout, std::uint32_t level) {
    const HeaderFields& f = layout.fields;
    const LevelGeometry geometry(f.samples, f.lines, f.tile, level);
    const NaiveAxis across = layout.Across(level & 31u);  // level 32 looks like level 0
    const NaiveAxis down = layout.Down(level & 31u);
    ZMC_EXPECT(geometry.samples == across.extent && geometry.lines == down.extent);
    ExpectAxis(across, geometry.tilesAcross, geometry.lastWidth);
    ExpectAxis(down, geometry.tilesDown, geometry.lastHeight);
    ZMC_EXPECT(LevelGeometry::LevelPixels(f.samples, f.lines, level) ==
               NaiveLayout::Halved(f.samples, level) * NaiveLayout::Halved(f.lines, level));
}

void ExpectTile(const NaiveLayout& layout, std::uint32_t level, std::uint32_t tileX,
                std::uint32_t tileY) {
    const HeaderFields& f = layout.fields;
    if (level >= 32 || !layout.IsAllowed() || level < f.levelMin || level > f.levelMax) return;
    const LevelGeometry geometry(f.samples, f.lines, f.tile, level);
    const NaiveAxis across = layout.Across(level);
    const NaiveAxis down = layout.Down(level);
    const bool exists = tileX < across.tiles && tileY < down.tiles;
    ZMC_EXPECT(geometry.HasTile(tileX, tileY) == exists);
    if (!exists) return;
    ZMC_EXPECT(geometry.TileWidth(tileX) == across.TileExtent(tileX));
    ZMC_EXPECT(geometry.TileHeight(tileY) == down.TileExtent(tileY));
    const auto pixelBytes = static_cast<std::uint64_t>(layout.sampleBytes * f.bands);
    ZMC_EXPECT(geometry.TileOffset(tileX, tileY, pixelBytes) ==
               layout.TileOffset(level, tileX, tileY));
}

// A window as a host may ask for it: negative places arrive here as very large ones.
struct Window {
    std::uint32_t x, y, width, height;
    std::int32_t level;
    std::vector<int> bands;
};

// Within `extent` where that can be had, or anything.
std::uint32_t Place(InputBytes& input, Wide extent, bool inside) {
    const std::uint32_t raw = input.Size();
    if (!inside || extent == 0) return raw;
    return static_cast<std::uint32_t>(raw % extent);
}

Window TakeWindow(InputBytes& input, const NaiveLayout& layout) {
    Window window{};
    const std::uint8_t kind = input.Byte();
    const bool inside = (kind & 3) != 0;
    const bool aligned = (kind & 4) != 0;
    const std::uint32_t levels = layout.fields.levelMax - layout.fields.levelMin;
    window.level = static_cast<std::int32_t>(
        (kind & 8) != 0 ? input.Size()
                        : layout.fields.levelMin + input.UpTo(std::min(levels, 40u)));
    const auto level = static_cast<std::uint32_t>(window.level) & 31u;
    const NaiveAxis across = layout.Across(level);
    const NaiveAxis down = layout.Down(level);
    window.x = Place(input, across.extent, inside);
    window.y = Place(input, down.extent, inside);
    if (aligned && inside && layout.fields.tile != 0) {
        window.x -= window.x % layout.fields.tile;
        window.y -= window.y % layout.fields.tile;
        window.width = static_cast<std::uint32_t>(
            std::min<Wide>(layout.fields.tile, across.extent - window.x));
        window.height =
            static_cast<std::uint32_t>(std::min<Wide>(layout.fields.tile, down.extent - window.y));
    } else {
        window.width = Place(input, across.extent - window.x + 1, inside);
        window.height = Place(input, down.extent - window.y + 1, inside);
    }
    const std::uint8_t list = input.Byte();
    if ((list & 3) == 1) {  // all of them
        for (int band = 0; band < static_cast<int>(std::min(layout.fields.bands, 300u)); ++band)
            window.bands.push_back(band);
    } else if ((list & 3) != 0) {
        for (int i = list >> 2 & 15; i > 0; --i)
            window.bands.push_back(
                static_cast<int>(Place(input, layout.fields.bands, (list & 3) == 2)));
    }
    return window;
}

bool Inside(const NaiveAxis& axis, std::uint32_t start, std::uint32_t extent) {
    return axis.tiles != 0 && Wide{start} + extent <= axis.extent;
}

// The rule by which a transfer of something is taken on.
bool IsAccepted(const NaiveLayout& layout, const Window& window) {
    const HeaderFields& f = layout.fields;
    if (window.width == 0 || window.height == 0) return true;
    if (f.bands == 0 || f.tile == 0 || f.tile > 2048 || window.level < 0 || window.level >= 32)
        return false;
    const auto level = static_cast<std::uint32_t>(window.level);
    if (level < f.levelMin || level > f.levelMax) return false;
    if (layout.IsPlanar() && (f.tile >> level == 0 || window.bands.empty())) return false;
    for (const int band : window.bands)
        if (band < 0 || static_cast<std::uint32_t>(band) >= f.bands) return false;
    if (layout.Tiles(0) == 0) return false;
    const Wide samples = std::max<Wide>(window.bands.size(), layout.IsPlanar() ? 0 : Wide{f.bands});
    return Inside(layout.Across(level), window.x, window.width) &&
           Inside(layout.Down(level), window.y, window.height) &&
           Wide{window.width} * window.height * samples * layout.sampleBytes < Wide{1} << 32 &&
           f.tile * layout.TilePixelBytes() < Wide{1} << 32;
}

// The pieces of a window, held against what each tile has of it.
class Pieces {
public:
    Pieces(const NaiveLayout& naive, const Window& asked)
        : window(asked),
          across(naive.Across(static_cast<std::uint32_t>(asked.level))),
          down(naive.Down(static_cast<std::uint32_t>(asked.level))),
          nextX(window.x / across.tile),
          nextY(window.y / down.tile) {}

    Wide Count() const {
        return (LastTile(window.x, window.width) - window.x / across.tile + 1) *
               (LastTile(window.y, window.height) - window.y / down.tile + 1);
    }

    // Pieces come tile row by tile row, so none can be missing or come twice.
    void Take(const TilePart& piece) {
        const zelm::Rectangle &tile = piece.tile, &part = piece.part;
        ZMC_EXPECT(piece.column == nextX && piece.row == nextY);
        ZMC_EXPECT(tile.x == nextX * across.tile && tile.width == across.TileExtent(nextX));
        ZMC_EXPECT(tile.y == nextY * down.tile && tile.height == down.TileExtent(nextY));
        ExpectSpan(window.x, window.width, tile.x, tile.width, piece.FirstColumn(), part.width,
                   part.x - window.x);
        ExpectSpan(window.y, window.height, tile.y, tile.height, piece.FirstLine(), part.height,
                   part.y - window.y);
        pixels += Wide{part.width} * part.height;
        ++taken;
        if (nextX++ != LastTile(window.x, window.width)) return;
        nextX = window.x / across.tile;
        ++nextY;
    }

    void ExpectAll() const {
        ZMC_EXPECT(taken == Count() && pixels == Wide{window.width} * window.height);
    }

private:
    Wide LastTile(std::uint32_t start, std::uint32_t extent) const {
        return (Wide{start} + extent - 1) / across.tile;
    }

    static void ExpectSpan(Wide start, Wide extent, Wide tileStart, Wide tileExtent, Wide first,
                           Wide count, Wide out) {
        const Wide from = std::max(start, tileStart);
        const Wide to = std::min(start + extent, tileStart + tileExtent);
        ZMC_EXPECT(from < to);
        ZMC_EXPECT(first == from - tileStart && count == to - from && out == from - start);
    }

    const Window& window;
    const NaiveAxis across;
    const NaiveAxis down;
    Wide nextX;
    Wide nextY;
    Wide pixels = 0;
    Wide taken = 0;
};

constexpr Wide kMostPieces = 300;

void ExpectWalk(const NaiveLayout& layout, const Window& window, std::uint32_t stopAfter) {
    Pieces pieces(layout, window);
    if (pieces.Count() > kMostPieces) return;
    const HeaderFields& f = layout.fields;
    const LevelGeometry geometry(f.samples, f.lines, f.tile,
                                 static_cast<std::uint32_t>(window.level));
    const zelm::Rectangle rect{window.x, window.y, window.width, window.height};
    ZMC_EXPECT(zelm::VisitTiles(geometry, rect, [&](const TilePart& piece) {
        pieces.Take(piece);
        return true;
    }));
    pieces.ExpectAll();
    std::uint32_t visits = 0;
    const bool all =
        zelm::VisitTiles(geometry, rect, [&](const TilePart&) { return visits++ != stopAfter; });
    ZMC_EXPECT(all == (stopAfter >= pieces.Count()));
    ZMC_EXPECT(visits == std::min<Wide>(pieces.Count(), Wide{stopAfter} + 1));
}

Array<int> ListOf(const std::vector<int>& bands) {
    Array<int> list;
    if (bands.empty()) return list;
    list.SetShape(ArrayShape(static_cast<std::uint32_t>(bands.size())));
    std::copy(bands.begin(), bands.end(), list.data);
    return list;
}

// A file whose bytes are known, for the layouts of all inputs in turn.
class KnownFile {
public:
    KnownFile(const std::string& path, std::size_t size) : name(path.c_str()), bytes(size) {
        for (std::size_t i = 0; i < bytes.size(); ++i)
            bytes[i] = static_cast<unsigned char>(i * 31 + (i >> 8) * 7 + 1);
        const auto file = platform::File::Open(name.wide, platform::File::Mode::Create);
        ZMC_EXPECT(file && file->WriteAt(0, bytes.data(), bytes.size()) == bytes.size());
    }

    // An open dataset whose work space is no larger than it need be.
    std::unique_ptr<PyramidDataset> Open() const {
        auto dataset = std::make_unique<PyramidDataset>(name);
        dataset->OpenFile(false);
        return dataset;
    }

    const zelm::String name;
    Bytes bytes;
};

constexpr std::uint64_t kTileDataStart = 100;

// What all inputs share.
struct World {
    static constexpr std::size_t kSmallBytes = std::size_t{1} << 15;
    static constexpr std::size_t kLargeBytes = std::size_t{1} << 22;

    World() {
        xercesc::XMLPlatformUtils::Initialize();
        dataset = small.Open();
    }

    const zmcfuzz::ScratchFolder scratch;
    const KnownFile small{scratch / "small", kSmallBytes};
    const KnownFile large{scratch / "large", kLargeBytes};
    std::unique_ptr<PyramidDataset> dataset;  // of the small file; for all that moves no tiles, too
};

World& TheWorld() {
    static World world;
    return world;
}

// A dataset of any fields, without the file that would hold them.
class LaidOut {
public:
    LaidOut(const NaiveLayout& naive, PyramidDataset& target) : layout(naive), dataset(target) {
        const HeaderFields& f = layout.fields;
        dataset.BandCount = f.bands;
        dataset.Samples = f.samples;
        dataset.Lines = f.lines;
        dataset.TileSize = f.tile;
        dataset.LevelMin = f.levelMin;
        dataset.LevelMax = f.levelMax;
        dataset.PixelType = f.pixelType;
        dataset.TileOrdering = f.ordering;
        dataset.BytesPerSample = zelm::PixelSize(f.pixelType);
        dataset.TileDataStart = kTileDataStart;
        dataset.TileOffsets.Clear();
        dataset.LevelOffsets.reset();
        if (!layout.IsAllowed()) return;
        dataset.LevelOffsets.reset(new std::uint64_t[f.levelMax + 1u]());
        Wide offset = kTileDataStart;
        for (std::uint32_t above = f.levelMax + 1u; above > f.levelMin; --above) {
            dataset.LevelOffsets[above - 1u] = static_cast<std::uint64_t>(offset);
            offset += layout.LevelBytes(above - 1u);
        }
    }

    void ExpectAcceptance(const Window& window) const {
        const Array<int> list = ListOf(window.bands);
        const bool accepted = dataset.AcceptsTile(window.x, window.y, window.width, window.height,
                                                  list, window.level);
        const bool empty = window.width == 0 || window.height == 0;
        ZMC_EXPECT(accepted == (empty || (dataset.LevelOffsets && IsAccepted(layout, window))));
    }

    void ExpectTileOffset(std::uint32_t level, std::uint32_t tileX, std::uint32_t tileY) const {
        if (!layout.IsAllowed() || level >= 32 || level < layout.fields.levelMin ||
            level > layout.fields.levelMax || tileX >= layout.Across(level).tiles ||
            tileY >= layout.Down(level).tiles)
            return;
        ZMC_EXPECT(dataset.GetTileOffset(tileX, tileY, level) ==
                   layout.TileOffset(level, tileX, tileY));
    }

    const NaiveLayout& layout;
    PyramidDataset& dataset;
};

// Where the samples of one level of a small layout lie, by the letter.
class SampleMap {
public:
    SampleMap(const NaiveLayout& naive, std::uint32_t atLevel)
        : layout(naive), level(atLevel), levelStart(kTileDataStart + layout.BytesAbove(level)) {
        if (layout.IsPlanar()) morton.emplace(layout, kTileDataStart);
    }

    std::size_t TileStart(Wide tileX, Wide tileY, int band) const {
        if (!layout.IsPlanar())
            return static_cast<std::size_t>(levelStart + layout.TileOffset(level, tileX, tileY));
        const Wide place = morton->Offset(level, static_cast<std::uint32_t>(band), tileX, tileY);
        ZMC_EXPECT(place != NaiveMorton::kNoPlace);
        return static_cast<std::size_t>(place);
    }

    std::size_t SampleStart(std::uint32_t x, std::uint32_t y, int band) const {
        const NaiveAxis across = layout.Across(level);
        const Wide tileX = x / across.tile;
        const Wide tileY = y / across.tile;
        const Wide pixel = (y % across.tile) * across.TileExtent(tileX) + x % across.tile;
        const Wide sample =
            layout.IsPlanar() ? pixel : pixel * layout.fields.bands + static_cast<Wide>(band);
        return TileStart(tileX, tileY, band) +
               static_cast<std::size_t>(sample * layout.sampleBytes);
    }

private:
    const NaiveLayout& layout;
    const std::uint32_t level;
    const Wide levelStart;
    std::optional<NaiveMorton> morton;
};

// Tiles of a small layout, read from and written to a file of known bytes.
class Transfers {
public:
    Transfers(LaidOut& laidOut, const Window& asked, const KnownFile& file)
        : layout(laidOut.layout),
          known(file.bytes),
          dataset(laidOut.dataset),
          window(asked),
          level(static_cast<std::uint32_t>(asked.level)),
          map(layout, level),
          list(ListOf(asked.bands)),
          bands(asked.bands),
          sampleBytes(static_cast<std::size_t>(layout.sampleBytes)) {
        if (bands.empty())
            for (std::uint32_t band = 0; band < layout.fields.bands; ++band)
                bands.push_back(static_cast<int>(band));
    }

    void Read() {
        Bytes buffer(BufferBytes(), 0xEE);
        ZMC_EXPECT(Move(buffer, false));
        ForEachSample([&](std::size_t inBuffer, std::size_t inFile) {
            ZMC_EXPECT(
                std::equal(&buffer[inBuffer], &buffer[inBuffer] + sampleBytes, &known.at(inFile)));
        });
    }

    void Write(std::uint8_t seed) {
        Bytes buffer(BufferBytes());
        for (std::size_t i = 0; i < buffer.size(); ++i)
            buffer[i] = static_cast<unsigned char>(seed + i * 13);
        Bytes expected = known;
        WriteModel(buffer, expected);
        ZMC_EXPECT(Move(buffer, true));
        Bytes found(expected.size());
        ZMC_EXPECT(dataset.File->Size() == expected.size());
        ZMC_EXPECT(dataset.File->ReadAt(0, found.data(), found.size()) == found.size());
        ZMC_EXPECT(found == expected);
        dataset.File->WriteAt(0, known.data(), known.size());
    }

    // An element of another size than the file's samples moves nothing.
    void ExpectRefusalOfOtherTypes() {
        Bytes buffer(BufferBytes(), 0xEE);
        if (sampleBytes != 16) {
            auto* const wrong = reinterpret_cast<zelm::Complex<double>*>(buffer.data());
            ZMC_EXPECT(!dataset.ReadTile(window.x, window.y, window.width, window.height, list,
                                         window.level, wrong));
        }
        char* const nothing = nullptr;
        ZMC_EXPECT(!dataset.ReadTile(window.x, window.y, window.width, window.height, list,
                                     window.level, nothing));
        ZMC_EXPECT(std::count(buffer.begin(), buffer.end(), 0xEE) ==
                   static_cast<std::ptrdiff_t>(buffer.size()));
    }

private:
    std::size_t BufferBytes() const {
        return std::size_t{window.width} * window.height * bands.size() * sampleBytes;
    }

    template <class T>
    bool MoveAs(T* buffer, bool write) {
        if (!write)
            return dataset.ReadTile(window.x, window.y, window.width, window.height, list,
                                    window.level, buffer);
        const bool other =
            layout.IsPlanar()
                ? dataset.WriteTileInterleaved(window.x, window.y, window.width, window.height,
                                               list, window.level, buffer)
                : dataset.WriteTileMorton(window.x, window.y, window.width, window.height, list,
                                          window.level, buffer);
        ZMC_EXPECT(!other);
        return layout.IsPlanar()
                   ? dataset.WriteTileMorton(window.x, window.y, window.width, window.height, list,
                                             window.level, buffer)
                   : dataset.WriteTileInterleaved(window.x, window.y, window.width, window.height,
                                                  list, window.level, buffer);
    }

    bool Move(Bytes& buffer, bool write) {
        bool done = false;
        const bool named = zelm::VisitElementType(layout.fields.pixelType, [&](auto type) {
            using T = typename decltype(type)::type;
            done = MoveAs(reinterpret_cast<T*>(buffer.data()), write);
        });
        return named ? done : MoveAs(buffer.data(), write);
    }

    template <class Visit>
    void ForEachSample(Visit&& visit) const {
        std::size_t inBuffer = 0;
        for (std::uint32_t row = 0; row < window.height; ++row)
            for (std::uint32_t column = 0; column < window.width; ++column)
                for (const int band : bands) {
                    visit(inBuffer, map.SampleStart(window.x + column, window.y + row, band));
                    inBuffer += sampleBytes;
                }
    }

    bool AllInOrder() const {
        if (bands.size() != layout.fields.bands) return false;
        for (std::size_t i = 0; i < bands.size(); ++i)
            if (bands[i] != static_cast<int>(i)) return false;
        return true;
    }

    // The kinds of rectangles that go out in one piece, wherever they lie in their tile.
    bool IsDirect() const {
        const NaiveAxis across = layout.Across(level);
        const NaiveAxis down = layout.Down(level);
        const std::uint32_t t = layout.fields.tile;
        const bool whole =
            window.width == t && window.height == t && window.x % t == 0 && window.y % t == 0;
        const bool right =
            window.x / t == across.tiles - 1 && window.width == across.TileExtent(across.tiles - 1);
        const bool bottom =
            window.y / t == down.tiles - 1 && window.height == down.TileExtent(down.tiles - 1);
        const bool strip = !layout.IsPlanar() && window.x == 0 && window.width == across.extent &&
                           window.height == t;
        return whole || right || bottom || strip;
    }
    bool IsOneTile() const {
        const std::uint32_t t = layout.fields.tile;
        return window.x / t == (window.x + window.width - 1) / t &&
               window.y / t == (window.y + window.height - 1) / t;
    }

    // What a write does to the bytes of the file.
    void WriteModel(const Bytes& buffer, Bytes& file) const {
        const std::uint32_t t = layout.fields.tile;
        const std::size_t pixels = std::size_t{window.width} * window.height;
        if (layout.IsPlanar()) {
            if (!IsDirect() || !IsOneTile()) return;
            for (std::size_t i = 0; i < bands.size(); ++i) {
                const std::size_t start = map.TileStart(window.x / t, window.y / t, bands[i]);
                for (std::size_t p = 0; p < pixels; ++p)
                    std::copy_n(&buffer[(p * bands.size() + i) * sampleBytes], sampleBytes,
                                &file.at(start + p * sampleBytes));
            }
            return;
        }
        if (!IsDirect()) {
            ForEachSample([&](std::size_t inBuffer, std::size_t inFile) {
                std::copy_n(&buffer[inBuffer], sampleBytes, &file.at(inFile));
            });
            return;
        }
        const std::size_t start = map.TileStart(window.x / t, window.y / t, 0);
        if (AllInOrder()) {
            std::copy(buffer.begin(), buffer.end(), &file.at(start));
            return;
        }
        // Some of the bands: the tile with their new samples arrives behind the tile.
        const std::size_t pixelBytes = layout.fields.bands * sampleBytes;
        Bytes tile(&file.at(start), &file.at(start) + pixels * pixelBytes);
        for (std::size_t p = 0; p < pixels; ++p)
            for (std::size_t i = 0; i < bands.size(); ++i)
                std::copy_n(
                    &buffer[(p * bands.size() + i) * sampleBytes], sampleBytes,
                    &tile[p * pixelBytes + static_cast<std::size_t>(bands[i]) * sampleBytes]);
        std::copy(tile.begin(), tile.end(), &file.at(start + tile.size()));
    }

    const NaiveLayout& layout;
    const Bytes& known;
    PyramidDataset& dataset;
    const Window& window;
    const std::uint32_t level;
    const SampleMap map;
    const Array<int> list;
    std::vector<int> bands;
    const std::size_t sampleBytes;
};

constexpr Wide kMostEntries = 400;

// The table of the ordering Morton for any fields: every entry, or none beyond the limits.
void ExpectTable(LaidOut& laidOut, std::uint32_t tileHeight, std::uint64_t start) {
    const NaiveLayout& layout = laidOut.layout;
    const HeaderFields& f = layout.fields;
    PyramidDataset& dataset = laidOut.dataset;
    const Wide entries = layout.TableBytes() / 8;
    const bool refused = f.tile == 0 || tileHeight != f.tile || f.levelMax > 1023 ||
                         layout.Across(0).tiles > 65536 || layout.Down(0).tiles > 65536 ||
                         layout.TableBytes() > PyramidLimits::kMaxTableBytes;
    if (!refused && (entries > kMostEntries || f.tile > 2048)) return;
    dataset.TileCursor = start;
    dataset.BuildTileTable(f.samples, f.lines, f.tile, tileHeight, f.bands, dataset.BytesPerSample);
    ZMC_EXPECT((dataset.TileOffsets.data == nullptr) == refused);
    if (refused) {
        ZMC_EXPECT(dataset.TileCursor == start);
        return;
    }
    const NaiveMorton morton(layout, start);
    ZMC_EXPECT(dataset.TileCursor == morton.cursor);
    ZMC_EXPECT(dataset.TileOffsets.shape.elements == entries);
    for (std::size_t i = 0; i < morton.offsets.size(); ++i) {
        const Wide offset = morton.offsets[i];
        ZMC_EXPECT(dataset.TileOffsets.data[i] == (offset == NaiveMorton::kNoPlace ? 0 : offset));
    }
    dataset.TileOffsets.Clear();
}

// Small enough for the small file, with room behind for what is written there.
bool IsSmall(const NaiveLayout& layout) {
    return layout.TileDataBytes() <= World::kSmallBytes / 8 &&
           (!layout.IsPlanar() || layout.TableBytes() / 8 <= kMostEntries);
}

// A tile row is longer than what the module moves at once, and the large file holds the tiles
// with room behind.
bool IsLong(const NaiveLayout& layout) {
    constexpr Wide kRunBytes = 128 << 10;
    const Wide pixels =
        std::min<Wide>(layout.fields.tile, layout.Across(layout.fields.levelMin).extent);
    return !layout.IsPlanar() && pixels * layout.TilePixelBytes() > kRunBytes &&
           layout.TileDataBytes() <= World::kLargeBytes / 4;
}

// Blocks of samples of any layout, moved between rooms of their very sizes.
class Block {
public:
    Block(InputBytes& input, std::uint32_t rowCount, std::uint32_t columnCount,
          std::uint32_t bandCount, std::size_t size)
        : planar(input.Flag()), sample(size) {
        const bool listed = input.Flag();
        std::size_t places = bandCount;
        if (listed) {
            places = bandCount + input.UpTo(3);
            for (std::uint32_t i = 0; i < bandCount; ++i)
                list.push_back(
                    static_cast<int>(input.UpTo(static_cast<std::uint32_t>(places - 1))));
        }
        const std::size_t gap = input.UpTo(2) * sample;
        pixelStep = planar ? sample : places * sample;
        const std::size_t planeRow = columnCount * pixelStep + gap;
        rowStep = planar && input.Flag() ? planeRow * places : planeRow;
        bandStep = !planar ? sample : rowStep != planeRow ? planeRow : planeRow * rowCount;
        bytes.resize((rowCount - 1) * rowStep + (columnCount - 1) * pixelStep +
                     (places - 1) * bandStep + sample);
    }

    std::size_t At(std::uint32_t row, std::uint32_t column, std::uint32_t i) const {
        const std::size_t band = list.empty() ? i : static_cast<std::size_t>(list[i]);
        return row * rowStep + column * pixelStep + band * bandStep;
    }
    template <class Byte>
    zelm::SampleBlock<Byte> View() {
        return {bytes.data(), rowStep, pixelStep, bandStep, list.empty() ? nullptr : list.data()};
    }

    const bool planar;
    const std::size_t sample;
    std::size_t rowStep, pixelStep, bandStep;
    std::vector<int> list;
    Bytes bytes;
};

void ExpectMove(InputBytes& input) {
    const std::uint32_t rows = 1 + input.UpTo(3);
    const std::uint32_t columns = 1 + input.UpTo(40);
    const std::uint32_t bands = 1 + input.UpTo(19);
    const std::uint32_t sample = 1u << input.UpTo(4);
    Block from(input, rows, columns, bands, sample);
    Block to(input, rows, columns, bands, sample);
    for (std::size_t i = 0; i < from.bytes.size(); ++i)
        from.bytes[i] = static_cast<unsigned char>(i * 7 + 3);
    Bytes expected = to.bytes;
    for (std::uint32_t row = 0; row < rows; ++row)
        for (std::uint32_t i = 0; i < bands; ++i)
            for (std::uint32_t column = 0; column < columns; ++column)
                std::copy_n(&from.bytes[from.At(row, column, i)], sample,
                            &expected[to.At(row, column, i)]);
    zelm::MoveSamples(from.View<const unsigned char>(), to.View<unsigned char>(), rows, columns,
                      bands, sample);
    ZMC_EXPECT(to.bytes == expected);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    InputBytes input(data, size);
    const std::uint8_t kind = input.Byte();
    if (kind < 32) {
        ExpectMove(input);
        return 0;
    }
    const NaiveLayout layout(kind < 128 ? zmcfuzz::HostileFields(input)
                                        : zmcfuzz::SmallFields(input));
    ExpectLimits(layout);
    const std::uint32_t level = input.Size();
    for (const std::uint32_t each : {level, layout.fields.levelMin, layout.fields.levelMax})
        ExpectGeometry(layout, each);
    const std::uint32_t tileX = input.Size();
    const std::uint32_t tileY = input.Size();
    ExpectTile(layout, layout.fields.levelMin, tileX, tileY);
    ExpectTile(layout, layout.fields.levelMax, tileX, tileY);
    const Window window = TakeWindow(input, layout);
    LaidOut laidOut(layout, *TheWorld().dataset);
    laidOut.ExpectAcceptance(window);
    laidOut.ExpectTileOffset(layout.fields.levelMin, tileX, tileY);
    ExpectTable(laidOut, (kind & 15) == 0 ? tileX : layout.fields.tile, std::uint64_t{level} << 20);
    const bool empty = window.width == 0 || window.height == 0;
    if (!empty && layout.IsAllowed() && IsAccepted(layout, window)) {
        ExpectWalk(layout, window, input.UpTo(255));
        const bool small = IsSmall(layout);
        if (!small && !IsLong(layout)) return 0;
        const KnownFile& file = small ? TheWorld().small : TheWorld().large;
        // Now and then a dataset of its own for small layouts as well.
        std::unique_ptr<PyramidDataset> own;
        if (input.UpTo(15) == 15 || !small) own = file.Open();
        LaidOut withFile(layout, own ? *own : *TheWorld().dataset);
        Transfers transfers(withFile, window, file);
        transfers.Read();
        if (input.Flag()) transfers.Write(input.Byte());
        if (input.Flag()) transfers.ExpectRefusalOfOtherTypes();
    }
    return 0;
}
