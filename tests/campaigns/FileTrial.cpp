#include "tests/campaigns/FileTrial.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <numeric>
#include <set>
#include <sstream>
#include <stdexcept>

#include "connection/RasterDataConnection.h"
#include "files/FileSource.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/Sanitizers.h"

namespace zmctest {
namespace {

// Rectangles up to this size are read; of larger ones the corners.
constexpr std::uint64_t kMaxRead = std::uint64_t{64} << 10;
constexpr std::uint32_t kMaxTiles = 32;
// A file is looked at as a whole up to this size, and grown up to that.
constexpr std::uint64_t kNear = std::uint64_t{1} << 20;
constexpr std::uint64_t kTaken = std::uint64_t{16} << 20;
constexpr std::uint64_t kFar = std::uint64_t{1} << 40;
// Tables beyond this size are left to the campaign that asks for them.
constexpr std::uint64_t kMaxTable = std::uint64_t{32} << 20;
constexpr unsigned char kUntouched = 0xA5;

std::string Show(double value) { return std::to_string(value); }
std::string Show(const Rect& rect, const std::vector<int>& list, std::int64_t level) {
    std::ostringstream text;
    text << "column " << rect.x << ", row " << rect.y << ", " << rect.width << " x " << rect.height
         << ", " << list.size() << " bands listed, level " << level;
    return text.str();
}

bool Same(double a, double b) { return a == b || (std::isnan(a) && std::isnan(b)); }

bool SamePixel(const AnyReader& reader, double expected, double actual) {
    return !reader.AsPixel(expected) || Same(expected, actual);
}

bool SameStats(const AnyReader& reader, const StatsRecord& a, const StatsRecord& b) {
    return a.band == b.band && a.flags == b.flags && SamePixel(reader, a.minimum, b.minimum) &&
           SamePixel(reader, a.maximum, b.maximum) && Same(a.mean, b.mean) &&
           Same(a.deviation, b.deviation) && Same(a.sum, b.sum) && Same(a.squares, b.squares) &&
           Same(a.rms, b.rms);
}

bool SameHistogram(const AnyReader& reader, const HistogramRecord& a, const HistogramRecord& b) {
    return a.band == b.band && a.level == b.level && a.source == b.source &&
           a.binCount == b.binCount && Same(a.binSize, b.binSize) &&
           SamePixel(reader, a.minimum, b.minimum) && SamePixel(reader, a.maximum, b.maximum) &&
           (!a.sure || a.counts == b.counts);
}

std::vector<int> AllBands(std::uint32_t bands) {
    std::vector<int> list;
    for (std::uint32_t i = 0; i < bands && i < 64; ++i) list.push_back(static_cast<int>(i));
    return list;
}

// One that no reader takes for a refusal.
Rect Clip(std::uint64_t x, std::uint64_t y, std::uint64_t width, std::uint64_t height) {
    return {static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y),
            static_cast<std::uint32_t>(width), static_cast<std::uint32_t>(height)};
}

}  // namespace

LoadedModule::LoadedModule() {
    void* const handle = dlopen(ZMC_MODULE_PATH, RTLD_NOW | RTLD_LOCAL);
    if (!handle) throw std::runtime_error(dlerror());
    using Create = zelm::DataConnectionFactory* (*)(const zelm::String&);
    const auto create = reinterpret_cast<Create>(dlsym(handle, "CreateDataConnectionFactory"));
    destroy = reinterpret_cast<decltype(destroy)>(dlsym(handle, "DeleteDataConnectionFactory"));
    if (!create || !destroy) throw std::runtime_error("not the module");
    factory = create("Pyramid");
}

LoadedModule::~LoadedModule() { destroy(factory); }

zelm::DataConnectionPtr LoadedModule::Open(const std::string& path) const {
    zelm::Array<zelm::String> argument;
    argument.Append("Pyramid");
    argument.Append(path.c_str());
    return factory->Open(argument, zelm::GeoRefPtr(), zelm::MetadataPtr());
}

struct FileTrial::Session {
    Session(const LoadedModule& module, const std::string& path, Cost& cost) {
        cost.Of([&] {
            connection = module.Open(path);
            if (!connection) return;
            auto* raster = static_cast<zelm::RasterDataConnection*>(connection.Get());
            dispatch = raster->GetReader();
        });
        reader = AnyReader::Over(dispatch);
    }
    void End(Cost& cost) {
        reader.reset();
        cost.Of([&] {
            dispatch.Reset();
            connection.Reset();
        });
    }

    zelm::DataConnectionPtr connection;
    zelm::RasterReaderDispatchPtr dispatch;
    std::unique_ptr<AnyReader> reader;
};

FileTrial::FileTrial() : path(folder / "damaged.pyr") {
    descriptor = open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
    if (descriptor < 0) throw std::runtime_error("no file at " + path);
    lent = zelm::files::Lend(
        zelm::files::FileSource::Open(path.c_str(), zelm::files::OpenMode::Update));
    if (!lent) throw std::runtime_error("no source for " + path);
}

FileTrial::~FileTrial() { close(descriptor); }

void FileTrial::Put(const Bytes& file) {
    if (ftruncate(descriptor, 0) != 0 ||
        pwrite(descriptor, file.data(), file.size(), 0) != static_cast<ssize_t>(file.size()))
        throw std::runtime_error("no room for a file");
}

// The start of the file, up to a size that is at hand.
Bytes FileTrial::Take() const {
    struct stat status {};
    fstat(descriptor, &status);
    Bytes file(static_cast<std::size_t>(
        std::min<std::uint64_t>(static_cast<std::uint64_t>(status.st_size), kTaken)));
    if (pread(descriptor, file.data(), file.size(), 0) != static_cast<ssize_t>(file.size()))
        throw std::runtime_error("a file cannot be read back");
    return file;
}

Verdict FileTrial::Try(const Bytes& file, const Depth& depth) {
    if (Campaign::Only()) zmctest::WriteText("damaged.pyr", std::string(file.begin(), file.end()));
    const bool both = zmctest::IsFullCampaign() || Campaign::Only();
    const bool lentAlone = std::accumulate(file.begin(), file.end(), 0u) % 2 != 0;
    Verdict verdict;
    for (const std::string& way : {path, std::string(lent.Utf8())}) {
        if (!both && lentAlone == (way == path)) continue;
        name = way;
        verdict = TryOnce(file, depth);
        if (verdict.complaints.empty()) continue;
        verdict.Complain(way == path ? "by its name" : "from a lent source");
        break;
    }
    return verdict;
}

Verdict FileTrial::TryOnce(const Bytes& file, const Depth& depth) {
    Put(file);
    const FileOracle oracle(file);
    Verdict verdict;
    verdict.allowedBytes += static_cast<std::int64_t>(oracle.AllowedBytes());
    // The system clears the table's memory, then it is filled.
    verdict.allowedSeconds +=
        (zmctest::IsSanitized() ? 60 : 10) * static_cast<double>(oracle.TableBytes()) / (1u << 30);
    Look(oracle, depth, verdict);
    const Bytes now = Take();
    if (now.size() != std::min<std::size_t>(file.size(), kTaken) ||
        !std::equal(now.begin(), now.end(), file.begin()))
        verdict.Complain("the file has been changed by reading");
    if (depth.stores && verdict.complaints.empty() && oracle.opening == FileOracle::Opening::Open &&
        oracle.hasReader && oracle.hasTiles) {
        Store(file, oracle, verdict);
        if (oracle.tileDataEnd <= kNear) {
            Put(file);
            WriteTile(file, oracle, verdict);
        }
    }
    return verdict;
}

void FileTrial::Look(const FileOracle& oracle, const Depth& depth, Verdict& verdict) {
    Session session(module, name, verdict.cost);
    using Opening = FileOracle::Opening;
    if (!session.connection) {
        if (oracle.opening == Opening::Open) verdict.Complain("does not open");
        verdict.Count("refused");
        return;
    }
    if (oracle.opening == Opening::Refused) {
        verdict.Complain("opens, and should not");
        return session.End(verdict.cost);
    }
    if (oracle.opening == Opening::Unsure) {
        verdict.Count("open with a header of open meaning");
        return session.End(verdict.cost);
    }
    LookAtFields(oracle, session, verdict);
    const bool deferred = oracle.TableBytes() > kMaxTable && !depth.tables;
    if (deferred) verdict.Count("with a table too large to ask for here");
    if (session.reader && depth.pixels && !deferred) LookAtPixels(oracle, session, verdict);
    if (session.reader && depth.records) LookAtRecords(oracle, session, verdict);
    session.End(verdict.cost);
}

void FileTrial::LookAtFields(const FileOracle& oracle, Session& session, Verdict& verdict) {
    const HeaderFields& h = oracle.header;
    const auto want = [&](const char* what, double expected, double actual) {
        if (expected != actual)
            verdict.Complain(std::string(what) + " is " + Show(actual) + " and not " +
                             Show(expected));
    };
    std::uint32_t pixelType = 0;
    verdict.cost.Of([&] { pixelType = session.connection->GetPixelType(); });
    want("the pixel type", h.pixelType, pixelType);
    want("the reader", oracle.hasReader, session.reader != nullptr);
    if (!session.reader) {
        verdict.Count("open without a reader");
        return;
    }
    zelm::BasicRasterReader& reader = session.reader->Basic();
    verdict.cost.Of([&] {
        const zelm::RasterProps props = reader.GetRasterProps();
        want("the width", h.width, props.samples);
        want("the height", h.height, props.lines);
        want("the number of bands", h.bands, props.bands);
        want("the interleave", h.interleave, props.interleave);
        want("the least level", static_cast<std::int32_t>(h.levelMin), reader.GetMinLevel());
        want("the greatest level", static_cast<std::int32_t>(h.levelMax), reader.GetMaxLevel());
        want("being complete", oracle.complete, reader.HasPyramid());
        for (const std::int32_t level : {-1, 0, 1, 2, 31, 33}) {
            const bool reduced = oracle.complete && level > 0;
            const auto at = static_cast<std::uint32_t>(level);
            want("the width of a level", reduced ? oracle.Width(at) : h.width,
                 reader.GetSamples(level));
            want("the height of a level", reduced ? oracle.Height(at) : h.height,
                 reader.GetLines(level));
        }
    });
    verdict.Count(!oracle.hasTiles  ? "open without tiles"
                  : oracle.complete ? "open and complete"
                                    : "open and incomplete");
}

void FileTrial::LookAtPixels(const FileOracle& oracle, Session& session, Verdict& verdict) {
    const HeaderFields& h = oracle.header;
    std::set<std::int64_t> levels{
        -1, 0, 1, 2, 31, 32, std::int64_t{h.levelMin} - 1, h.levelMin, h.levelMin + 1, h.levelMax};
    levels.insert(std::int64_t{h.levelMax} + 1);
    for (const std::int64_t level : levels) {
        if (level < INT32_MIN || level > INT32_MAX) continue;
        if (level >= 0 && level < 32)
            LookAtLevel(oracle, session, verdict, static_cast<std::uint32_t>(level));
        else
            LookAtRect(oracle, session, verdict, {0, 0, 1, 1}, {0},
                       static_cast<std::int32_t>(level));
    }
    for (const std::vector<int>& list : {std::vector<int>{-1}, {static_cast<int>(h.bands)}})
        LookAtRect(oracle, session, verdict, {0, 0, 1, 1}, list,
                   static_cast<std::int32_t>(h.levelMin));
}

void FileTrial::LookAtLevel(const FileOracle& oracle, Session& session, Verdict& verdict,
                            std::uint32_t level) {
    const HeaderFields& h = oracle.header;
    const auto at = static_cast<std::int32_t>(level);
    const std::uint64_t width = oracle.Width(level), height = oracle.Height(level);
    const std::vector<int> all = AllBands(h.bands);
    const int last = static_cast<int>(std::min(h.bands, 1u << 30)) - 1;
    const auto look = [&](const Rect& rect, const std::vector<int>& list) {
        LookAtRect(oracle, session, verdict, rect, list, at);
    };
    // Corners, and what sticks out.
    look({0, 0, 1, 1}, {0});
    look(Clip(width - 1, height - 1, 1, 1), {last, 0});
    look(Clip(width, 0, 1, 1), {0});
    look(Clip(0, height, 1, 1), {0});
    look({0, 0, 0, 5}, {0});
    look(Clip(width - 1, 0, 2, 1), {});
    if (h.bands > 64 || width == 0 || height == 0) return;
    look(Clip(0, 0, width, height), all);
    look(Clip(0, 0, width, height), {last});
    look(Clip(width / 3, height / 3, (width + 1) / 2, (height + 1) / 2), {last, 0});
    if (h.ordering != 2) look(Clip(0, 0, width, height), {});
    const std::uint64_t side = h.tileSize;
    if (side == 0 || width * height / side / side > kMaxTiles) return;
    if (((width + side - 1) / side) * ((height + side - 1) / side) > kMaxTiles) return;
    for (std::uint64_t y = 0; y < height; y += side)
        for (std::uint64_t x = 0; x < width; x += side)
            look(Clip(x, y, std::min(side, width - x), std::min(side, height - y)), all);
}

void FileTrial::LookAtRect(const FileOracle& oracle, Session& session, Verdict& verdict,
                           const Rect& rect, const std::vector<int>& list, std::int32_t level) {
    const std::uint64_t bands = list.empty() ? oracle.header.bands : list.size();
    // By division, since the sizes may be anything.
    const std::uint64_t pixels = std::uint64_t{rect.width} * rect.height;
    if (bands > kMaxRead || pixels > kMaxRead / std::max<std::uint64_t>(bands, 1)) return;
    const std::size_t size = pixels * bands * oracle.sampleBytes;
    Bytes expected(size + 16, kUntouched), actual(size + 16, kUntouched);
    FileOracle::Answer answer = oracle.Read(rect, list, level, expected);
    if (pixels != 0 && (rect.x > INT32_MAX || rect.y > INT32_MAX)) {
        answer = FileOracle::Answer::Refused;
        std::fill(expected.begin(), expected.end(), kUntouched);
    }
    bool given = false;
    verdict.cost.Of([&] { given = session.reader->Read(rect, list, level, actual); });
    if (given != (answer != FileOracle::Answer::Refused))
        verdict.Complain((given ? "reads " : "refuses ") + Show(rect, list, level));
    else if (answer != FileOracle::Answer::Unknown && expected != actual)
        verdict.Complain("other pixels at " + Show(rect, list, level));
}

void FileTrial::LookAtRecords(const FileOracle& oracle, Session& session, Verdict& verdict) {
    AnyReader& reader = *session.reader;
    if (!oracle.hasTiles) return;
    std::vector<StatsRecord> stats;
    std::vector<HistogramRecord> histograms;
    std::map<std::uint32_t, PaletteRecord> palettes;
    std::map<std::uint32_t, bool> has;
    const std::size_t asked = std::min<std::size_t>(oracle.meta.stats.size(), 3) + 1;
    std::set<std::uint32_t> bands{0, 1, 7};
    for (const auto& [band, palette] : oracle.meta.palettes)
        if (bands.size() < 6) bands.insert(band);
    Cost& cost = verdict.cost;
    for (std::uint32_t i = 0; i < asked; ++i) cost.Of([&] { stats.push_back(reader.Stats(i)); });
    cost.Of([&] { histograms = reader.Histograms(); });
    for (const std::uint32_t band : bands) {
        cost.Of([&] { palettes[band] = reader.PaletteOf(band); });
        cost.Of([&] { has[band] = reader.Basic().HasBandStats(band); });
    }
    if (!oracle.hasDocument)
        verdict.Count("without a document");
    else if (oracle.documentTrust == Trust::Malformed)
        verdict.Count("with a malformed document");
    else
        verdict.Count("with a document");
    if (oracle.documentTrust == Trust::Unsure || oracle.documentValues == Trust::Unsure) return;
    const MetaRecords& meta = oracle.meta;
    for (std::uint32_t i = 0; i < asked; ++i)
        if (!SameStats(reader, i < meta.stats.size() ? meta.stats[i] : StatsRecord(), stats[i]))
            verdict.Complain("other statistics at position " + std::to_string(i));
    if (histograms.size() != meta.histograms.size())
        verdict.Complain(std::to_string(histograms.size()) + " histograms and not " +
                         std::to_string(meta.histograms.size()));
    for (std::size_t i = 0; i < std::min(histograms.size(), meta.histograms.size()); ++i)
        if (!SameHistogram(reader, meta.histograms[i], histograms[i]))
            verdict.Complain("another histogram at position " + std::to_string(i));
    for (const std::uint32_t band : bands) {
        const auto found = meta.palettes.find(band);
        const PaletteRecord expected =
            found == meta.palettes.end() ? PaletteRecord() : found->second;
        if (expected.sure && expected.colors != palettes[band].colors)
            verdict.Complain("another palette of band " + std::to_string(band));
        const bool known =
            std::any_of(meta.stats.begin(), meta.stats.end(),
                        [&](const StatsRecord& record) { return record.band == band; });
        if (known != has[band])
            verdict.Complain("other answer to statistics of band " + std::to_string(band));
    }
}

// What is stored goes behind the tile data or nowhere, and comes back with what was there.
void FileTrial::Store(const Bytes& before, const FileOracle& oracle, Verdict& verdict) {
    if (oracle.tileDataEnd > kFar) return;
    StatsRecord stats;
    stats.band = 1;
    stats.flags = 5;
    stats.minimum = 7;
    stats.mean = 2.5;
    PaletteRecord palette;
    palette.colors = {{1, 2, 3, 4}, {250, 251, 252, 253}};
    Session session(module, name, verdict.cost);
    if (!session.reader) return verdict.Complain("does not open again");
    bool stored = false, refreshed = false;
    verdict.cost.Of([&] { stored = session.reader->StoreStats(stats); });
    verdict.cost.Of([&] { stored = session.reader->StorePalette(1, palette) && stored; });
    verdict.cost.Of([&] { refreshed = session.reader->Basic().RefreshPyramidState(); });
    if (!stored || !refreshed) verdict.Complain("a store or the refresh has another answer");
    if (oracle.tileDataEnd > kNear) {
        StoreFar(before, session, verdict);
        return session.End(verdict.cost);
    }
    const Bytes after = Take();
    const FileOracle stores(after);
    const HeaderFields& h = oracle.header;
    const bool old = h.versionMajor == 0 || (h.versionMajor == 1 && h.versionMinor == 0);
    bool complete = false;
    verdict.cost.Of([&] { complete = session.reader->Basic().HasPyramid(); });
    if (complete != (!old && after.size() >= oracle.tileDataEnd))
        verdict.Complain("another state after the refresh");
    session.End(verdict.cost);

    const std::size_t kept = std::min<std::size_t>(before.size(), oracle.tileDataEnd);
    if (after.size() < before.size() || std::memcmp(after.data(), before.data(), kept) != 0)
        return verdict.Complain("a store has changed what lies before the document");
    if (std::any_of(after.begin() + static_cast<std::ptrdiff_t>(kept),
                    after.begin() + static_cast<std::ptrdiff_t>(
                                        std::min<std::size_t>(after.size(), oracle.tileDataEnd)),
                    [](unsigned char byte) { return byte != 0; }))
        verdict.Complain("a store has put something into the tile data");
    if (oracle.documentTrust == Trust::Malformed) {
        if (after != before) verdict.Complain("a malformed document has been written to");
        return;
    }
    if (oracle.documentTrust == Trust::Unsure || after == before) {
        // Beyond the limits nothing is stored; the records then tell nothing new.
        if (oracle.documentTrust == Trust::Sound && oracle.meta.stats.size() < 1000)
            verdict.Complain("nothing has been stored");
        return;
    }
    verdict.Count("with a store");
    if (stores.documentTrust != Trust::Sound)
        return verdict.Complain("a store has left a malformed document");
    if (oracle.documentValues == Trust::Sound) {
        const std::vector<StatsRecord>& told = stores.meta.stats;
        if (told.size() != oracle.meta.stats.size() + 1 || told.back().mean != 2.5 ||
            told.back().band != 1)
            verdict.Complain("a store has not added its record");
        if (stores.meta.histograms.size() != oracle.meta.histograms.size())
            verdict.Complain("a store has changed the number of histograms");
    }
    Verdict repeated;
    repeated.cost = verdict.cost;
    Look(stores, {.stores = false}, repeated);
    verdict.cost = repeated.cost;
    for (const std::string& complaint : repeated.complaints)
        verdict.Complain("after a store: " + complaint);
}

void FileTrial::StoreFar(const Bytes& before, Session& session, Verdict& verdict) {
    verdict.Count("with a store far behind the end");
    const Bytes after = Take();
    if (after.size() < before.size() ||
        std::memcmp(after.data(), before.data(), before.size()) != 0)
        verdict.Complain("a store far behind the end has changed the file");
    StatsRecord stats;
    verdict.cost.Of([&] { stats = session.reader->Stats(0); });
    if (stats.mean != 2.5) verdict.Complain("a store far behind the end does not come back");
}

// A whole tile is written: its bytes change and no others.
void FileTrial::WriteTile(const Bytes& before, const FileOracle& oracle, Verdict& verdict) {
    const HeaderFields& h = oracle.header;
    const std::uint32_t level = h.levelMin;
    if (h.bands == 0 || h.bands > 64 || level > std::min(h.levelMax, 31u)) return;
    // Along the curve, tiles of sides that a level does not divide lie partly over each other.
    if (h.ordering == 2 && h.tileSize % (1u << level) != 0) return;
    const std::uint32_t width = std::min(h.tileSize, oracle.Width(level));
    const std::uint32_t height = std::min(h.tileSize, oracle.Height(level));
    const Rect rect{0, 0, width, height};
    const std::vector<int> list = AllBands(h.bands);
    const std::uint64_t size = std::uint64_t{width} * height * h.bands * oracle.sampleBytes;
    Bytes buffer(size);
    if (size == 0 || size > kMaxRead || oracle.TableBytes() > kMaxTable ||
        oracle.Read(rect, list, level, buffer) != FileOracle::Answer::Given)
        return;
    for (std::size_t i = 0; i < size; ++i) buffer[i] = static_cast<unsigned char>(i * 7 + 3);
    Bytes expected = before;
    const unsigned char* next = buffer.data();
    for (std::uint32_t y = 0; y < height; ++y)
        for (std::uint32_t x = 0; x < width; ++x)
            for (std::uint32_t band = 0; band < h.bands; ++band, next += oracle.sampleBytes) {
                std::uint64_t offset = 0;
                oracle.SampleAt(level, x, y, band, offset);
                if (expected.size() < offset + oracle.sampleBytes)
                    expected.resize(offset + oracle.sampleBytes);
                std::memcpy(expected.data() + offset, next, oracle.sampleBytes);
            }
    Session session(module, name, verdict.cost);
    if (!session.reader) return verdict.Complain("does not open for writing");
    // A writer without a mask byte set changes nothing of what it is given.
    verdict.cost.Of(
        [&] { session.reader->Write(rect, list, static_cast<std::int32_t>(level), buffer); });
    session.End(verdict.cost);
    verdict.Count("with a tile written");
    if (Take() != expected) verdict.Complain("writing a tile has not changed that tile alone");
}

}  // namespace zmctest
