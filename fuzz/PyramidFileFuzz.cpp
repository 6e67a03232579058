// A whole file, as a host meets it: opened through the factory, read at random levels, asked for
// statistics, histograms and palettes, stored to, written to, refreshed, laid out anew, opened
// again.
//
// How a file and its script lie in an input tells fuzz/support/FileAndScript.h.
//
// Files small enough are held against a naive model of the format: every sample that is read, and
// every byte of the file after a write.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "connection/RasterDataConnectionFactory.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/FileAndScript.h"
#include "fuzz/support/Host.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/MemoryFile.h"
#include "fuzz/support/NaiveFile.h"
#include "fuzz/support/Records.h"
#include "fuzz/support/StoreCheck.h"
#include "pyramid/PyramidDataConnection.h"
#include "pyramid/PyramidRasterReader.h"
#include "tests/support/PyramidModel.h"

namespace {

using namespace zelm;
using zmcfuzz::InputBytes;
using zmcfuzz::MemoryFile;
using zmcfuzz::Wide;
using Bytes = std::vector<unsigned char>;

constexpr std::uint64_t kModelBytes = 1u << 20;     // larger files have no model
constexpr std::uint64_t kBufferBytes = 256u << 10;  // a host's buffer, at the most
constexpr std::uint32_t kModelTiles = 1024;
constexpr std::uint64_t kTouchedBytes = 16u << 20;  // of the file, by one request

struct Request {
    std::int32_t x = 0;
    std::int32_t y = 0;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    std::int32_t level = 0;
    std::vector<int> bands;

    Array<int> BandList() const {
        return Array<int>(const_cast<int*>(bands.data()),
                          ArrayShape(static_cast<std::uint32_t>(bands.size())));
    }
    Wide Samples(std::uint32_t bandCount) const {
        return Wide{width} * height * (bands.empty() ? bandCount : bands.size());
    }
};

class Session {
public:
    Session(const MemoryFile& memoryFile, bool writesFail) : file(memoryFile), sealed(writesFail) {
        Open();
    }

    void Run(InputBytes& script) {
        // Inputs stay quick: what takes more steps than this is two inputs.
        for (int steps = 0; dataset && !script.AtEnd() && steps < 6; ++steps) Step(script);
        if (dataset && !forgotten) Reopen();
    }

private:
    void Step(InputBytes& script) {
        switch (script.UpTo(15)) {
            case 0:
            case 1:
            case 2:
            case 3:
            case 4:
                return Read(script);
            case 5:
            case 6:
            case 7:
                return Write(script);
            case 8:
            case 9:
                return Store(script);
            case 10:
                return AskForRecords(script);
            case 11:
                return Refresh();
            case 12:
                return Reopen();
            case 13:
                return SetNoData(script);
            case 14:
                return Describe(script);
            default:
                return LayOutOrDelete(script);
        }
    }

    void Open() {
        static RasterDataConnectionFactory factory;
        Array<String> name;
        ZMC_EXPECT(name.Append("Pyramid") && name.Append(String(file.Name().c_str())));
        connection = factory.Open(name, GeoRefPtr(), MetadataPtr());
        dataset = nullptr;
        dispatch.Reset();
        if (!connection) return;
        auto* const pyramid = static_cast<PyramidDataConnection*>(connection.Get());
        dispatch = pyramid->GetReader();
        dataset = pyramid->GetDataset().Get();
        ZMC_EXPECT(dispatch && dataset);
        addressable = dataset->TileSize != 0 && dataset->TileSize <= PyramidDataset::kMaxTileSize;
        forgotten = false;
        if (addressable) ExpectLayout();
        MakeModel();
    }

    void ExpectLayout() {
        const PyramidHeaderRecord header = zmcfuzz::HeaderOf(*dataset);
        ZMC_EXPECT(zmcfuzz::MayOpen(header));
        ZMC_EXPECT(dataset->TileDataEnd == zmcfuzz::TileDataEnd(header, dataset->TileDataStart));
        ExpectCompleteness();
    }

    void ExpectCompleteness() {
        const bool outdated = dataset->VersionMajor == 0 ||
                              (dataset->VersionMajor == 1 && dataset->VersionMinor == 0);
        ZMC_EXPECT(dataset->HasPyramid == (!outdated && file.Size() >= dataset->TileDataEnd));
    }

    void MakeModel() {
        model.reset();
        const PyramidHeaderRecord header = zmcfuzz::HeaderOf(*dataset);
        if (!addressable || dispatch->pixelType == 0 || header.bandCount == 0 ||
            header.levelMax > 31 || dataset->TileDataEnd > kModelBytes)
            return;
        const Wide across = zmcfuzz::TilesOver(header.width, header.tileSize);
        const Wide down = zmcfuzz::TilesOver(header.height, header.tileSize);
        if (std::max(across, down) > 64 ||
            across * down * header.bandCount * (header.levelMax + 1) > kModelTiles)
            return;
        zmctest::PyramidDescription d;
        d.samples = header.width;
        d.lines = header.height;
        d.bands = header.bandCount;
        d.tile = header.tileSize;
        d.levelMin = header.levelMin;
        d.levelMax = header.levelMax;
        d.type = header.pixelType;
        d.ordering = header.tileOrdering;
        model = std::make_unique<zmctest::PyramidModel>(d, Bytes(), dataset->TileDataStart);
        ZMC_EXPECT(model->tileDataEnd == dataset->TileDataEnd);
    }

    // --- requests for pixels ---

    std::uint32_t Samples(std::uint32_t level) const { return dataset->Samples >> level; }
    std::uint32_t Lines(std::uint32_t level) const { return dataset->Lines >> level; }

    // A rectangle inside a level, of a kind that the module treats in its own way; or any numbers.
    Request TakeRequest(InputBytes& script) const {
        Request r;
        const std::uint8_t kind = script.Byte();
        const std::uint32_t span = std::min(dataset->LevelMax - dataset->LevelMin, 31u);
        const std::uint32_t level = dataset->LevelMin + script.UpTo(span);
        r.level = static_cast<std::int32_t>(kind % 16 == 15 ? script.Size() : level);
        TakeBands(script, r);
        if (kind % 8 == 7 || level > 31 || !addressable || Samples(level) == 0 ||
            Lines(level) == 0) {
            r.x = static_cast<std::int32_t>(script.Size());
            r.y = static_cast<std::int32_t>(script.Size());
            r.width = script.Size();
            r.height = script.Size();
            return r;
        }
        std::uint32_t x, y;
        TakeExtent(script, kind % 8, Samples(level), x, r.width);
        TakeExtent(script, kind / 8 % 8, Lines(level), y, r.height);
        r.x = static_cast<std::int32_t>(x);
        r.y = static_cast<std::int32_t>(y);
        return r;
    }

    void TakeExtent(InputBytes& script, std::uint32_t kind, std::uint32_t whole,
                    std::uint32_t& start, std::uint32_t& extent) const {
        const std::uint32_t side = dataset->TileSize;
        if (kind == 0) {
            start = 0;
            extent = whole;
        } else if (kind < 4) {
            start = script.UpTo((whole - 1u) / side) * side;
            extent = std::min(side, whole - start);
        } else {
            start = script.UpTo(whole - 1u);
            extent = 1u + script.UpTo(std::min(whole - start - 1u, kind == 4 ? 3u : 255u));
        }
    }

    void TakeBands(InputBytes& script, Request& r) const {
        const std::uint32_t kind = script.UpTo(7);
        if (kind < 4 && dataset->BandCount <= 64) {
            for (std::uint32_t band = 0; band < dataset->BandCount; ++band)
                r.bands.push_back(static_cast<int>(band));
        } else if (kind < 7) {
            const std::uint32_t last = dataset->BandCount == 0 ? 0 : dataset->BandCount - 1u;
            for (std::uint32_t count = 1u + script.UpTo(19); count > 0; --count)
                r.bands.push_back(static_cast<int>(kind == 6 ? script.Size() : script.UpTo(last)));
        }
    }

    // Whether the module has to accept the request; nothing where the arithmetic of 32 bits wraps.
    std::optional<bool> Expected(const Request& r) const {
        if (r.width == 0 || r.height == 0) return true;
        if (r.x < 0 || r.y < 0 || r.level < 0 || !addressable || dataset->BandCount == 0)
            return false;
        if (zmcfuzz::TileCountWraps(*dataset)) return std::nullopt;
        const auto level = static_cast<std::uint32_t>(r.level);
        if (level < dataset->LevelMin || level > dataset->LevelMax || level > 31) return false;
        const auto end = [](std::int32_t start, std::uint32_t extent) {
            return Wide{static_cast<std::uint32_t>(start)} + extent;
        };
        if (end(r.x, r.width) > Samples(level) || end(r.y, r.height) > Lines(level)) return false;
        for (const int band : r.bands)
            if (band < 0 || static_cast<std::uint32_t>(band) >= dataset->BandCount) return false;
        const bool planar = dataset->TileOrdering == 2;
        if (planar && (r.bands.empty() || dataset->TileSize >> level == 0)) return false;
        const Wide limit = Wide{1} << 32;
        const Wide listed = std::max<Wide>(r.bands.size(), planar ? 0 : dataset->BandCount);
        const Wide bytes = Wide{r.width} * r.height * listed * dataset->BytesPerSample;
        const Wide tile =
            Wide{dataset->TileSize} * (planar ? 1 : dataset->BandCount) * dataset->BytesPerSample;
        return bytes < limit && tile < limit;
    }

    // A host has a buffer of the size of its request, and a fuzzing run not the memory for all; nor
    // for tile tables as large as the module allows, nor the time for the whole pixels of 4 GiB
    // that one request may touch in the file, whatever bands it lists.
    bool CanTry(const Request& r, std::optional<bool> expected) const {
        if (expected && !*expected) return true;
        const bool planar = dataset->TileOrdering == 2;
        const bool largeTable = planar && zmcfuzz::TileTableBytes(*dataset) > Wide{64u << 20};
        const Wide wholePixels = Wide{r.width} * r.height * dataset->BandCount;
        return !largeTable &&
               r.Samples(dataset->BandCount) * dataset->BytesPerSample <= kBufferBytes &&
               (planar || wholePixels * dataset->BytesPerSample <= kTouchedBytes);
    }

    // What is refused touches no buffer: then one sample will do.
    template <class T>
    std::vector<T> MakeBuffer(const Request& r, std::optional<bool> expected) const {
        const Wide samples = expected.value_or(true) ? r.Samples(dataset->BandCount) : Wide{1};
        std::vector<T> buffer(static_cast<std::size_t>(samples));
        if (samples != 0)
            std::memset(static_cast<void*>(buffer.data()), 0xA5, buffer.size() * sizeof(T));
        return buffer;
    }

    void Read(InputBytes& script) {
        const Request r = TakeRequest(script);
        const std::optional<bool> expected = Expected(r);
        if (!CanTry(r, expected)) return;
        const std::uint8_t maskKind = script.Byte();
        dispatch->Visit([&](auto& reader) { ReadWith(reader, r, expected, maskKind); });
    }

    template <class T>
    void ReadWith(RasterReader<T>& reader, const Request& r, std::optional<bool> expected,
                  std::uint8_t maskKind) {
        std::vector<T> buffer = MakeBuffer<T>(r, expected);
        Bytes mask(maskKind < 64 ? 0 : buffer.size(), maskKind);
        T nothing{};
        const bool done = reader.ReadTile(r.x, r.y, r.width, r.height, r.BandList(), r.level,
                                          buffer.empty() ? &nothing : buffer.data(),
                                          mask.empty() ? nullptr : mask.data());
        ZMC_EXPECT(!expected || done == *expected);
        for (const unsigned char byte : mask) ZMC_EXPECT((byte ^ maskKind) < 2);
        const auto* const bytes = reinterpret_cast<const unsigned char*>(buffer.data());
        if (done && model) CompareWithModel(r, bytes, buffer.size() * sizeof(T));
    }

    // One whole tile with all bands keeps the buffer's bytes where the file has none.
    bool KeepsBuffer(const Request& r) const {
        const std::uint32_t side = dataset->TileSize;
        bool all = true;
        for (std::size_t i = 0; i < r.bands.size(); ++i)
            all = all && r.bands[i] == static_cast<int>(i);
        return dataset->TileOrdering < 2 && all &&
               (r.bands.empty() || r.bands.size() == dataset->BandCount) && r.width == side &&
               r.height == side && static_cast<std::uint32_t>(r.x) % side == 0 &&
               static_cast<std::uint32_t>(r.y) % side == 0;
    }

    void CompareWithModel(const Request& r, const unsigned char* bytes, std::size_t size) {
        if (r.width == 0 || r.height == 0 || !RefreshModel()) return;
        const std::uint64_t known = model->file.size();
        const unsigned char beyond = KeepsBuffer(r) ? 0xA5 : 0;
        const std::uint32_t sampleBytes = dataset->BytesPerSample;
        const auto bands =
            static_cast<std::uint32_t>(r.bands.empty() ? dataset->BandCount : r.bands.size());
        const auto level = static_cast<std::uint32_t>(r.level);
        // Large windows are looked at in steps, so that a model this slow keeps up.
        const std::uint32_t step = 1u + r.width * r.height * bands / 2048u;
        for (std::uint32_t pixel = 0; pixel < r.width * r.height; pixel += step)
            for (std::uint32_t i = 0; i < bands; ++i) {
                const auto band = r.bands.empty() ? i : static_cast<std::uint32_t>(r.bands[i]);
                const std::uint64_t at =
                    model->SampleStart(level, static_cast<std::uint32_t>(r.x) + pixel % r.width,
                                       static_cast<std::uint32_t>(r.y) + pixel / r.width, band);
                const std::size_t place = (std::size_t{pixel} * bands + i) * sampleBytes;
                ZMC_EXPECT(place + sampleBytes <= size);
                for (std::uint32_t b = 0; b < sampleBytes; ++b)
                    ZMC_EXPECT(bytes[place + b] == (at + b < known ? model->file[at + b] : beyond));
            }
    }

    bool RefreshModel() {
        model->file = file.Read(0, kModelBytes + 1);
        return model->file.size() <= kModelBytes;
    }

    void Write(InputBytes& script) {
        const Request r = TakeRequest(script);
        const std::optional<bool> expected = Expected(r);
        if (!CanTry(r, expected)) return;
        const std::uint8_t fill = script.Byte();
        dispatch->Visit([&](auto& reader) { WriteWith(reader, r, expected, fill); });
    }

    template <class T>
    void WriteWith(RasterReader<T>& reader, const Request& r, std::optional<bool> expected,
                   std::uint8_t fill) {
        std::vector<T> buffer = MakeBuffer<T>(r, expected);
        auto* const bytes = reinterpret_cast<unsigned char*>(buffer.data());
        for (std::size_t i = 0; i < buffer.size() * sizeof(T); ++i)
            bytes[i] = static_cast<unsigned char>(fill + 7 * i);
        Bytes mask(buffer.size() + 1, static_cast<unsigned char>(fill & 3));
        const Bytes before = file.Read(0, kModelBytes + 1);
        const std::uint64_t sizeBefore = file.Size();
        T nothing{};
        const bool done = reader.WriteTile(r.x, r.y, r.width, r.height, r.BandList(), r.level,
                                           buffer.empty() ? &nothing : buffer.data(), mask.data());
        ZMC_EXPECT(!expected || done == *expected);
        if (!buffer.empty()) ExpectOtherOrderingRefuses(r, buffer.data());
        const Bytes after = file.Read(0, kModelBytes + 1);
        const bool changes = done && dataset->Writable && !sealed && !buffer.empty();
        if (!changes) {
            ZMC_EXPECT(after == before && sizeBefore == file.Size());
            return;
        }
        if (model && before.size() <= kModelBytes) {
            model->file = before;
            model->WriteTile(static_cast<std::uint32_t>(r.x), static_cast<std::uint32_t>(r.y),
                             r.width, r.height, r.bands, static_cast<std::uint32_t>(r.level),
                             Bytes(bytes, bytes + buffer.size() * sizeof(T)));
            ZMC_EXPECT(model->file == after);
        } else {
            const auto front = static_cast<std::ptrdiff_t>(
                std::min<std::uint64_t>(dataset->TileDataStart, before.size()));
            ZMC_EXPECT(std::equal(before.begin(), before.begin() + front, after.begin()));
        }
        // Some rectangles go behind the tile data, where the document is; by the same rules.
        forgotten = forgotten || file.Size() != sizeBefore || !model ||
                    !SameFrom(dataset->MetaDocumentOffset, before, after);
        if (file.Size() <= dataset->MetaDocumentOffset) forgotten = false;
    }

    template <class T>
    void ExpectOtherOrderingRefuses(const Request& r, const T* buffer) {
        const auto x = static_cast<std::uint32_t>(r.x);
        const auto y = static_cast<std::uint32_t>(r.y);
        if (dataset->TileOrdering < 2)
            ZMC_EXPECT(
                !dataset->WriteTileMorton(x, y, r.width, r.height, r.BandList(), r.level, buffer));
        else
            ZMC_EXPECT(!dataset->WriteTileInterleaved(x, y, r.width, r.height, r.BandList(),
                                                      r.level, buffer));
    }

    static bool SameFrom(std::uint64_t offset, const Bytes& a, const Bytes& b) {
        if (a.size() != b.size()) return false;
        if (offset >= a.size()) return true;
        return std::equal(a.begin() + static_cast<std::ptrdiff_t>(offset), a.end(),
                          b.begin() + static_cast<std::ptrdiff_t>(offset));
    }

    // --- records ---

    void Store(InputBytes& script) {
        if (!addressable) return StoreOnNothing();
        dispatch->Visit([&](auto& reader) { StoreWith(reader, script); });
    }

    template <class T>
    void StoreWith(RasterReader<T>& reader, InputBytes& script) {
        if (forgotten || sealed) {
            ZMC_EXPECT(reader.SetBandStats(Array<RasterBandStats<T>>()));
            ZMC_EXPECT(reader.SetHistograms(Array<RasterBandHistogram<T>>()));
        } else {
            zmcfuzz::StoreCheck<T>(*dataset, file).Run(script);
        }
    }

    // Without a layout nobody knows where the document is.
    void StoreOnNothing() {
        const Bytes before = file.Read(0, kModelBytes);
        const std::uint64_t sizeBefore = file.Size();
        Palette palette;
        dispatch->Visit([&](auto& reader) { reader.SetPalette(0, palette); });
        ZMC_EXPECT(file.Read(0, kModelBytes) == before && file.Size() == sizeBefore);
    }

    void AskForRecords(InputBytes& script) {
        const std::uint32_t band = script.Size();
        dispatch->Visit([&](auto& reader) { AskWith(reader, band); });
    }

    template <class T>
    void AskWith(const RasterReader<T>& reader, std::uint32_t band) {
        zmcfuzz::Records<T> all;
        all.Load(*dataset);
        zmcfuzz::ExpectAnswers(reader, all, band);
    }

    // --- the rest of what a host can ask for ---

    void SetNoData(InputBytes& script) {
        RasterProps props = static_cast<PyramidDataConnection*>(connection.Get())->GetRasterProps();
        props.SetNoDataValue(script.UpTo(3), zmcfuzz::TakeDouble(script));
        dispatch->Visit([&](auto& reader) { reader.SetNoDataValues(props); });
    }

    void Describe(InputBytes& script) {
        const auto level = static_cast<std::int32_t>(script.Size());
        const std::uint32_t band = script.UpTo(4);
        dispatch->Visit([&](auto& reader) {
            ZMC_EXPECT(reader.IsValid() && reader.IsValidLevel(level));
            const bool reduced = level > 0 && dataset->HasPyramid;
            const auto shift = static_cast<std::uint32_t>(level) & 31u;
            ZMC_EXPECT(reader.GetSamples(level) == dataset->Samples >> (reduced ? shift : 0));
            ZMC_EXPECT(reader.GetLines(level) == dataset->Lines >> (reduced ? shift : 0));
            ZMC_EXPECT(static_cast<std::uint32_t>(reader.GetMinLevel()) == dataset->LevelMin);
            ZMC_EXPECT(static_cast<std::uint32_t>(reader.GetMaxLevel()) == dataset->LevelMax);
            const RasterProps props = reader.GetRasterProps();
            ZMC_EXPECT(props.bands == dataset->BandCount && reader.GetBands() == props.bands);
            ZMC_EXPECT(reader.HasNoDataValue(band) == props.HasNoDataValue(band));
            reader.GetNoDataValue(band);
        });
        ZMC_EXPECT(!connection->IsReadable() && connection->IsOpen());
        PyramidRasterReader<unsigned char> unbound(nullptr, GeoRefPtr(), MetadataPtr());
        unsigned char pixel = 0;
        ZMC_EXPECT(!unbound.IsValid() && !unbound.HasPalette(band) &&
                   !unbound.RefreshPyramidState());
        ZMC_EXPECT(!unbound.ReadTile(0, 0, 1, 1, Array<int>(), level, &pixel, nullptr));
    }

    void Refresh() {
        if (!addressable) return;
        dispatch->Visit([&](auto& reader) { ZMC_EXPECT(reader.RefreshPyramidState()); });
        ExpectCompleteness();
    }

    // Another connection finds what this one has left.
    void Reopen() {
        const PyramidHeaderRecord header = zmcfuzz::HeaderOf(*dataset);
        const DataConnectionPtr old = connection;
        PyramidDataset* const oldDataset = dataset;
        const RasterReaderDispatchPtr oldDispatch = dispatch;
        const bool compare = !forgotten && addressable;
        Open();
        ZMC_EXPECT(dataset);
        ZMC_EXPECT(zmcfuzz::HeaderOf(*dataset) == header);
        if (compare) dispatch->Visit([&](auto& reader) { ExpectSameRecords(reader, *oldDataset); });
    }

    template <class T>
    void ExpectSameRecords(RasterReader<T>&, PyramidDataset& old) {
        zmcfuzz::Records<T> before, after;
        before.Load(old);
        after.Load(*dataset);
        ZMC_EXPECT(before == after);
    }

    // Makes the file anew by another connection, which chooses tile size and ordering.
    void Create(InputBytes& script) {
        static RasterDataConnectionFactory factory;
        Array<String> name;
        ZMC_EXPECT(name.Append(String(file.Name().c_str())));
        RasterProps props = static_cast<PyramidDataConnection*>(connection.Get())->GetRasterProps();
        props.formatName = script.UpTo(7) == 0 ? "Unknown" : "Pyramid";
        props.tileLines = script.Byte();
        const DataConnectionPtr made = factory.Create(name, props);
        ZMC_EXPECT(static_cast<bool>(made) == (props.formatName == "Pyramid"));
        PyramidDataConnection unknown;
        if (!made) ZMC_EXPECT(!unknown.Create(name, props));
        if (!made) return;
        const std::int32_t pair[2] = {0, 0};
        const std::int32_t levels = static_cast<std::int32_t>(script.UpTo(4));
        auto* const pyramid = static_cast<PyramidDataConnection*>(made.Get());
        PyramidDataset& fresh = *pyramid->dataset;
        pyramid->GetReader()->Visit(
            [&](auto& reader) { ZMC_EXPECT(reader.BuildPyramid(0, levels, 0, pair)); });
        const PyramidHeaderRecord header = zmcfuzz::HeaderOf(fresh);
        ZMC_EXPECT(header.tileSize == 256 && header.tileOrdering == (props.bands > 8       ? 2u
                                                                     : props.tileLines > 1 ? 1u
                                                                                           : 0u));
        const bool laidOut = static_cast<bool>(fresh.LevelOffsets);
        ZMC_EXPECT(!laidOut || zmcfuzz::MayOpen(header));
        Open();
        ZMC_EXPECT(dataset && (!laidOut || zmcfuzz::HeaderOf(*dataset) == header));
    }

    // Lays the file out for other levels, or deletes it; both end what was known about it.
    void LayOutOrDelete(InputBytes& script) {
        if (!addressable || dispatch->pixelType == 0) return;
        if (script.UpTo(2) == 0) return Create(script);
        const std::int32_t pair[2] = {3, script.UpTo(7) == 0 ? 4 : 3};
        const std::uint32_t levelMin = script.UpTo(3);
        const std::uint32_t levelMax = script.Flag() ? script.Size() : levelMin + script.UpTo(6);
        if (script.UpTo(15) == 0) {
            dispatch->Visit([](auto& reader) { ZMC_EXPECT(reader.DeletePyramid()); });
            ZMC_EXPECT(!dataset->File && !dataset->HasPyramid);
            return Abandon();
        }
        const Bytes before = file.Read(0, kModelBytes);
        PyramidHeaderRecord header = zmcfuzz::HeaderOf(*dataset);
        header.levelMin = levelMin;
        header.levelMax = levelMax;
        header.versionMajor = header.versionMinor = 1;
        bool built = false;
        dispatch->Visit([&](auto& reader) {
            built = reader.BuildPyramid(static_cast<std::int32_t>(levelMin),
                                        static_cast<std::int32_t>(levelMax), 0, pair);
        });
        ZMC_EXPECT(built == (pair[0] == pair[1]));
        if (!built || sealed || !zmcfuzz::MayOpen(header)) {
            ZMC_EXPECT(file.Read(0, kModelBytes) == before);
            return Abandon();
        }
        ZMC_EXPECT(file.Size() == dataset->TileDataStart);
        Open();
        ZMC_EXPECT(dataset && zmcfuzz::HeaderOf(*dataset) == header);
    }

    // The dataset goes on without what is in the file; a new one starts from that.
    void Abandon() {
        Open();
        ZMC_EXPECT(dataset);
    }

    const MemoryFile& file;
    const bool sealed;
    DataConnectionPtr connection;
    RasterReaderDispatchPtr dispatch;
    PyramidDataset* dataset = nullptr;
    bool addressable = false;  // the tile size is one that the module lays out
    bool forgotten = false;    // tiles went over the document, or nobody knows whether they did
    std::unique_ptr<zmctest::PyramidModel> model;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size == 0) return 0;
    const zmcfuzz::FileAndScriptBytes input(data, size);
    InputBytes script = input.Script();
    if (script.UpTo(15) == 15) {
        MemoryFile file(input.file);
        file.Seal();
        Session(file, true).Run(script);
    } else {
        static MemoryFile file;
        file.Assign(input.file);
        Session(file, false).Run(script);
    }
    return 0;
}
