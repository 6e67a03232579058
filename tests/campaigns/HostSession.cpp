#include "tests/campaigns/HostSession.h"

#include <cstring>
#include <filesystem>
#include <new>
#include <stdexcept>
#include <utility>

#include "files/FileSource.h"
#include "tests/support/MemorySource.h"
#include "tests/support/PyramidFiles.h"

namespace zmctest {
namespace {

using Sample = unsigned char;
using Reader = zelm::RasterReader<Sample>;

struct Rectangle {
    std::int32_t level;
    std::uint32_t x, y, width, height;
};

constexpr std::uint32_t kTile = 256;
constexpr std::int32_t kMaxLevel = 1;
constexpr std::size_t kHeaderOffset = 20;

std::vector<Rectangle> Tiles() {
    std::vector<Rectangle> tiles;
    for (std::int32_t level = 0; level <= kMaxLevel; ++level)
        for (std::uint32_t y = 0; y < HostSession::kLines >> level; y += kTile)
            for (std::uint32_t x = 0; x < HostSession::kSamples >> level; x += kTile)
                tiles.push_back({level, x, y, std::min(kTile, (HostSession::kSamples >> level) - x),
                                 std::min(kTile, (HostSession::kLines >> level) - y)});
    return tiles;
}

// A host looks whether its lists took what it gave them.
template <class T>
void AppendTo(zelm::Array<T>& list, const T& value) {
    if (!list.Append(value)) throw std::bad_alloc();
}

zelm::Array<int> BandList(std::uint32_t bands) {
    zelm::Array<int> list;
    for (std::uint32_t band = 0; band < bands; ++band) AppendTo(list, static_cast<int>(band));
    return list;
}

std::size_t throws = 0;

// A call of the module, out of which nothing may be thrown.
template <class Call>
auto Calling(Call&& call) {
    try {
        return call();
    } catch (...) {
        ++throws;
        throw;
    }
}

// Calls use(reader) if the connection has one.
template <class Use>
void WithReader(const zelm::RasterDataConnectionPtr& connection, Use use) {
    if (!connection) return;
    const zelm::RasterReaderDispatchPtr dispatch = Calling([&] { return connection->GetReader(); });
    if (!dispatch || !dispatch->readerByte) return;
    use(*dispatch->readerByte);
}

void ReadTile(Reader& reader, const zelm::Array<int>& list, const Rectangle& tile) {
    const std::size_t samples = std::size_t{tile.width} * tile.height * list.shape.elements;
    if (samples == 0) return;
    std::vector<Sample> pixels(samples), mask(samples);
    Calling([&] {
        return reader.ReadTile(static_cast<int>(tile.x), static_cast<int>(tile.y), tile.width,
                               tile.height, list, tile.level, pixels.data(), mask.data());
    });
}

void WriteTile(Reader& reader, const zelm::Array<int>& list, const Rectangle& tile,
               unsigned generation) {
    const std::size_t samples = std::size_t{tile.width} * tile.height * list.shape.elements;
    if (samples == 0) return;
    std::vector<Sample> pixels(samples), mask(samples);
    for (std::size_t i = 0; i < samples; ++i)
        pixels[i] = static_cast<Sample>(1 + (i * 7 + tile.x + tile.y + generation * 101) % 250);
    Calling([&] {
        return reader.WriteTile(static_cast<int>(tile.x), static_cast<int>(tile.y), tile.width,
                                tile.height, list, tile.level, pixels.data(), mask.data());
    });
}

void StoreStatistics(Reader& reader, std::uint32_t bands, double mean) {
    zelm::Array<zelm::RasterBandStats<Sample>> records;
    for (std::uint32_t band = 0; band < bands; ++band) {
        zelm::RasterBandStats<Sample> record;
        record.band = band;
        record.flags = zelm::StatsFlag::Mean;
        record.mean = mean;
        AppendTo(records, record);
    }
    Calling([&] { return reader.SetBandStats(records); });
}

void StoreHistograms(Reader& reader) {
    zelm::RasterBandHistogram<Sample> histogram;
    zelm::Array<zelm::RasterBandHistogram<Sample>> records;
    histogram.binSize = 64;
    histogram.maximum = 255;
    histogram.binCount = 4;
    for (std::uint64_t bin = 0; bin < 4; ++bin) AppendTo(histogram.counts, bin * 1000);
    AppendTo(records, histogram);
    // The copy of a list that found no memory is empty.
    if (records.data[0].counts.shape.elements != 4) throw std::bad_alloc();
    Calling([&] { return reader.SetHistograms(records); });
}

void StorePalette(Reader& reader) {
    zelm::Palette palette;
    zelm::Color color;
    for (std::uint32_t i = 0; i < 40; ++i) palette.AddColor(color);
    if (palette.nextIndex != 40) throw std::bad_alloc();
    Calling([&] { return reader.SetPalette(0, palette); });
}

std::string Stripped(std::string text) {
    const std::size_t last = text.find_last_not_of("\r\n ");
    text.resize(last == std::string::npos ? 0 : last + 1);
    return text;
}

}  // namespace

HostSession::HostSession(const Layout& ofFile)
    : layout(ofFile),
      module(zmctest::TestModule()),
      folderName(folder.String()),
      path(folder / "scene.pyr") {
    Create();
    createdFile = Take();
    if (createdFile.size() < 20) throw std::runtime_error("no pyramid was made");
    std::memcpy(&documentOffset, createdFile.data() + 12, sizeof documentOffset);
    oldFile = createdFile;
    for (unsigned stores = 0; stores <= kAllStores; ++stores) {
        Put(oldFile);
        Update(stores);
        newFile = Take();
        documents.emplace(Stripped(DocumentOf(newFile)), stores);
    }
    if (documents.size() != kAllStores + 1) throw std::runtime_error("stores leave no trace");
}

HostSession::Way::Way(const HostSession& session, zelm::files::OpenMode mode) : name(session.path) {
    if (!session.layout.lent) return;
    lent = zelm::files::Lend(zelm::files::FileSource::Open(name.c_str(), mode));
    name = lent ? lent.Utf8() : std::string(zelm::files::kLentPrefix);
}

void HostSession::Create() const {
    const Way way(*this, zelm::files::OpenMode::Create);
    zelm::RasterDataConnectionPtr connection = module->CreatePyramid(
        way.name, zmctest::PyramidProps(kSamples, kLines, layout.bands, 1, layout.tileLines));
    WithReader(connection, [&](Reader& reader) {
        const std::int32_t pair[] = {2, 2};
        if (!Calling([&] { return reader.BuildPyramid(0, kMaxLevel, 0, pair); })) return;
        const zelm::Array<int> list = BandList(layout.bands);
        for (const Rectangle& tile : Tiles()) WriteTile(reader, list, tile, 0);
        StoreStatistics(reader, layout.bands, 1);
        Calling([&] { return reader.RefreshPyramidState(); });
    });
}

void HostSession::Update(unsigned stores) const {
    const Way way(*this, zelm::files::OpenMode::Update);
    WithReader(module->OpenPyramid(way.name), [&](Reader& reader) {
        const zelm::Array<int> list = BandList(layout.bands);
        for (const Rectangle& tile : Tiles()) ReadTile(reader, list, tile);
        WriteTile(reader, list, Tiles()[0], 1);
        if (stores & kStatistics) StoreStatistics(reader, layout.bands, 2);
        if (stores & kHistograms) StoreHistograms(reader);
        if (stores & kPalette) StorePalette(reader);
        Calling([&] { return reader.HasBandStats(0); });
        Calling([&] { return reader.GetBandStats(0); });
        Calling([&] { return reader.GetHistograms(); });
        Calling([&] { return reader.GetPalette(0); });
        Calling([&] { return reader.RefreshPyramidState(); });
        Calling([&] { return reader.HasPyramid(); });
    });
}

void HostSession::Delete() const {
    const Way way(*this, zelm::files::OpenMode::Update);
    WithReader(module->OpenPyramid(way.name),
               [](Reader& reader) { Calling([&] { return reader.DeletePyramid(); }); });
}

std::size_t HostSession::TakeThrows() const { return std::exchange(throws, 0); }

std::string HostSession::DocumentOf(const std::string& file) const {
    return file.size() > documentOffset ? file.substr(documentOffset) : std::string();
}

bool HostSession::TellsOfRecords() const {
    bool tells = false;
    WithReader(module->OpenPyramid(path), [&](Reader& reader) {
        tells = reader.HasBandStats(0) || reader.GetHistograms().shape.elements != 0;
    });
    return tells;
}

std::string HostSession::FaultAfterUpdate(std::string& outcome) const {
    const std::string file = Take();
    if (file.size() < documentOffset) return "the file was cut";
    for (std::size_t i = 0; i < documentOffset; ++i)
        if (file[i] != oldFile[i] && file[i] != newFile[i])
            return "byte " + std::to_string(i) + " is neither the old nor the new one";
    if (!module->OpenPyramid(path)) return "the file does not open";
    const auto known = documents.find(Stripped(DocumentOf(file)));
    if (known == documents.end()) {
        outcome = "damaged";
        return TellsOfRecords() ? "a mixture of documents is believed" : "";
    }
    outcome = known->second == 0 ? "old" : known->second == kAllStores ? "new" : "part";
    return TellsOfRecords() ? "" : "a whole document is not believed";
}

std::string HostSession::FaultAfterCreate(std::string& outcome) const {
    if (!std::filesystem::exists(path)) {
        outcome = "absent";
        return "";
    }
    const std::string file = Take();
    const std::size_t pixels =
        static_cast<std::size_t>(std::min<std::uint64_t>(file.size(), documentOffset));
    // The header document begins with a mark until it is whole.
    const auto isMark = [&](std::size_t i) { return i == kHeaderOffset && file[i] == '\x1A'; };
    for (std::size_t i = 0; i < pixels; ++i)
        if (file[i] != createdFile[i] && file[i] != '\0' && !isMark(i))
            return "byte " + std::to_string(i) + " is neither nothing nor what was written";
    const bool whole = Stripped(file) == Stripped(createdFile);
    outcome = whole ? "complete" : "unfinished";
    const bool sound = Stripped(DocumentOf(file)) == Stripped(DocumentOf(createdFile));
    if (TellsOfRecords() && !sound) return "a torn document is believed";
    return "";
}

std::size_t OpenDescriptors() {
    const std::filesystem::directory_iterator entries("/proc/self/fd");
    return static_cast<std::size_t>(std::distance(begin(entries), end(entries)));
}

std::string Figures(const std::map<std::string, std::size_t>& outcomes) {
    std::string text;
    for (const auto& [outcome, times] : outcomes)
        text += (text.empty() ? "" : ", ") + outcome + ' ' + std::to_string(times);
    return text;
}

}  // namespace zmctest
