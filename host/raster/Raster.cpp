#include "host/raster/Raster.h"

#include <algorithm>
#include <cstring>
#include <functional>
#include <sstream>

#include "core/PixelVocabulary.h"
#include "format/TileWalk.h"
#include "host/base/Text.h"
#include "host/file/PresentTiles.h"
#include "host/file/StoredRecords.h"
#include "host/journal/MetadataJournal.h"
#include "host/raster/ArrayOf.h"
#include "host/raster/LentFile.h"
#include "host/raster/NoData.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

zelm::Array<int> BandList(std::span<const std::uint32_t> bands) {
    zelm::Array<int> list;
    if (!list.SetShape(zelm::ArrayShape(static_cast<std::uint32_t>(bands.size()))))
        throw std::bad_alloc();
    std::transform(bands.begin(), bands.end(), list.data,
                   [](std::uint32_t band) { return static_cast<int>(band); });
    return list;
}

std::string Describe(const Window& window) {
    std::ostringstream text;
    text << window.width << " x " << window.height << " pixels at (" << window.x << ", " << window.y
         << ")";
    return text.str();
}

// Byte offset of the first sample of `part` in a buffer that holds `whole`.
std::size_t OffsetIn(const Window& whole, const Window& part, std::size_t pixelBytes) {
    return (std::size_t{part.y - whole.y} * whole.width + (part.x - whole.x)) * pixelBytes;
}

// Once for all samples: a rule is looked up in a map.
template <class T>
std::vector<zelm::NoDataRule<T>> RulesOf(const zelm::RasterProps& props,
                                         std::span<const std::uint32_t> bands) {
    std::vector<zelm::NoDataRule<T>> rules;
    for (const std::uint32_t band : bands) rules.push_back(RuleOfBand<T>(props, band));
    return rules;
}

// A sample of floating type is marked without a no-data value too, if it is not finite.
template <class T>
void MarkSamples(const zelm::RasterProps& props, std::span<const std::uint32_t> bands,
                 std::uint64_t pixels, const T* samples, unsigned char* mask) {
    const auto rules = RulesOf<T>(props, bands);
    const auto mark = [](const zelm::NoDataRule<T>& rule, const T& sample, unsigned char& byte) {
        byte = static_cast<unsigned char>((byte & 0xFE) | (rule.Marks(sample) ? 1 : 0));
    };
    const zelm::NoDataRule<T> rule = rules.front();
    const bool alike = std::all_of(rules.begin(), rules.end(), [&](const auto& other) {
        return other.hasValue == rule.hasValue && (!rule.hasValue || other.value == rule.value);
    });
    if (alike) {  // as a rule; a loop that becomes vector code
        const std::uint64_t count = pixels * rules.size();
        for (std::uint64_t i = 0; i < count; ++i) mark(rule, samples[i], mask[i]);
        return;
    }
    for (std::uint64_t i = 0; i < pixels; ++i)
        for (const auto& each : rules) mark(each, *samples++, *mask++);
}

template <class T>
void StampSamples(const zelm::RasterProps& props, std::span<const std::uint32_t> bands,
                  std::uint64_t pixels, const unsigned char* mask, T* samples) {
    const auto rules = RulesOf<T>(props, bands);
    for (std::uint64_t i = 0; i < pixels; ++i)
        for (const auto& rule : rules) {
            if ((*mask++ & 1) != 0 && rule.hasValue) *samples = rule.value;
            ++samples;
        }
}

// Whatever a store does, it may have changed the document.
struct Forgetting {
    std::shared_ptr<const DocumentRecords>& records;
    ~Forgetting() { records.reset(); }
};

// Whatever becomes of a change, what the file is afterwards is not the doing of others. Made before
// all that may still change the file when it goes.
struct OwnChange {
    LentFile& file;
    std::uint64_t least;  // bytes that the change leaves
    ~OwnChange() { file.AcceptOwnChange(least); }
};

// Without memory the copy of a list is empty, and the module takes the counts that are not there
// for zeros.
template <class T>
bool HaveSameCounts(const zelm::RasterBandHistogram<T>& histogram,
                    const zelm::RasterBandHistogram<T>& given) {
    const zelm::Array<std::uint64_t>& counts = given.counts;
    return counts.shape.elements == given.binCount && histogram.binCount == given.binCount &&
           histogram.counts.shape.elements == given.binCount &&
           std::equal(counts.data, counts.data + given.binCount, histogram.counts.data);
}

std::string MemoryParameters(const void* samples, const zelm::RasterProps& props) {
    std::ostringstream text;
    text << "SAMPLES=" << props.samples << ";LINES=" << props.lines << ";BANDS=" << props.bands
         << ";INTERLEAVE=" << props.interleave << ";PIXELTYPE=" << props.pixelType
         << ";PIXELSIZE=1,1;TIEPTMAP=0,0;NAME=memory;PIXELDATA=" << samples;
    return text.str();
}

}  // namespace

Raster::Raster(ModulePtr holder, std::string rasterName, zelm::RasterDataConnectionPtr opened)
    : module(std::move(holder)), name(std::move(rasterName)), connection(std::move(opened)) {}

void Raster::TakeReader() {
    reader = connection->GetReader();
    if (!reader || reader->pixelType == 0)
        throw Error(name, "open the raster", "the module gives no reader for it");
    Visit([this](auto& typed) { props = typed.GetRasterProps(); });
    // The tree is the module's, and copies of the record must be able to outlive it.
    props.metadata = zelm::Metadata();
}

// Here and below the caller's hold on the module outlasts the connection, whatever is thrown.
Raster Raster::Open(ModulePtr module, const std::string& file, Access access) {
    const auto opened =
        std::make_shared<LentFile>(OpenPlainFile(file, access == Access::Update), file);
    const Recovery recovery = opened->IsWritable() ? RecoverMetadata(file) : LookForCopy(file);
    opened->Accept();
    Raster raster = OpenLent(std::move(module), file, opened);
    raster.recoveryNote = recovery.text;
    return raster;
}

Raster Raster::Open(ModulePtr module, std::shared_ptr<zelm::files::ByteSource> source,
                    const std::string& name) {
    if (!source) throw Error(name, "open the raster", "there is no source");
    return OpenLent(std::move(module), name, std::make_shared<LentFile>(std::move(source), name));
}

Raster Raster::Another() const {
    if (!file) throw Error(name, "open the raster", "it has no file");
    Raster other = OpenLent(module, name, std::make_shared<LentFile>(file->Lent(), name), header);
    other.SetNoDataValues(props.noDataValues);
    other.records = records;
    other.recordsExpire = recordsExpire;
    return other;
}

Raster Raster::OpenLent(ModulePtr module, const std::string& name, std::shared_ptr<LentFile> file,
                        const std::optional<PyramidHeader>& known) {
    const PyramidHeader header = known ? *known : file->ReadHeader();
    const zelm::RasterDataConnectionPtr connection = module->OpenPyramid(file->Name());
    const std::string failure = file->TakeFailure();
    if (!connection || !failure.empty())
        throw Error(name, "open the raster", failure.empty() ? "the module refuses it" : failure);
    Raster raster(module, name, connection);
    raster.TakeReader();
    // Whoever uses both reads samples by the one and sizes by the other.
    if (header.pixelType != raster.props.pixelType || header.bandCount != raster.props.bands ||
        header.width != raster.props.samples || header.height != raster.props.lines)
        throw Error(name, "open the raster", "it has changed while it was opened");
    raster.file = std::move(file);
    raster.header = header;
    raster.minLevel = header.levelMin;
    raster.maxLevel = header.levelMax;
    return raster;
}

Raster Raster::Create(ModulePtr module, const std::string& file, zelm::RasterProps props,
                      std::uint32_t maxLevel) {
    props.interleave = zelm::Interleave::BIP;
    const auto noData = props.noDataValues;
    const platform::FileStatus status = platform::StatusOf(file);
    if (status.exists && (status.readOnly || !status.isRegular))
        throw Error(file, "create the raster",
                    status.isRegular ? "the file is read-only" : "it is not a file");
    const std::shared_ptr<LentFile> opened = LentFile::Create(file);
    const zelm::RasterDataConnectionPtr connection = module->CreatePyramid(opened->Name(), props);
    if (!connection) throw Error(file, "create the raster", "the module refuses it");
    Raster raster(module, file, connection);
    raster.TakeReader();
    raster.file = opened;
    bool built = false;
    const std::int32_t pair[] = {2, 2};
    raster.Visit([&](auto& typed) {
        built = typed.BuildPyramid(0, static_cast<std::int32_t>(maxLevel), 0, pair);
    });
    if (!built) throw Error(file, "lay out the raster", "the module refuses it");
    raster.CheckDisk("lay out the raster");
    // The module says so too where it makes no such file, so the file is looked at.
    raster.header = opened->ReadHeader();
    raster.maxLevel = maxLevel;
    if (raster.header->levelMax != maxLevel || raster.header->width != props.samples ||
        raster.header->height != props.lines || raster.header->bandCount != props.bands ||
        raster.header->pixelType != raster.props.pixelType)
        throw Error(file, "lay out the raster", "an older file stands in its place");
    platform::RemoveEntry(MetadataJournal::PathFor(file));
    opened->Accept();
    raster.SetNoDataValues(noData);
    return raster;
}

Raster Raster::OfMemory(ModulePtr module, void* samples, const zelm::RasterProps& props) {
    const std::string name = "memory raster";
    if (!samples) throw Error(name, "open the raster", "it has no samples");
    const zelm::RasterDataConnectionPtr connection =
        module->OpenMemoryRaster(MemoryParameters(samples, props));
    if (!connection) throw Error(name, "open the raster", "the module refuses its description");
    Raster raster(module, name, connection);
    raster.TakeReader();
    raster.SetNoDataValues(props.noDataValues);
    return raster;
}

std::uint32_t Raster::SampleSize() const { return zelm::PixelSize(props.pixelType); }

// The module's own sizes ignore the level as long as a file is incomplete.
std::uint32_t Raster::Width(std::uint32_t level) const {
    CheckLevel(level);
    return zelm::LevelGeometry::Extent(props.samples, level);
}

std::uint32_t Raster::Height(std::uint32_t level) const {
    CheckLevel(level);
    return zelm::LevelGeometry::Extent(props.lines, level);
}

const PyramidHeader& Raster::Header() const {
    if (!header) throw Error(name, "tell the header", "it is no pyramid file");
    return *header;
}

std::uint32_t Raster::TileSide() const {
    return header ? header->tileSize : std::max({props.samples, props.lines, 1u});
}

zelm::LevelGeometry Raster::Geometry(std::uint32_t level) const {
    return {Width(level), Height(level), TileSide(), 0};
}

std::uint32_t Raster::TilesAcross(std::uint32_t level) const {
    return static_cast<std::uint32_t>((std::uint64_t{Width(level)} + TileSide() - 1) / TileSide());
}

std::uint32_t Raster::TilesDown(std::uint32_t level) const {
    return static_cast<std::uint32_t>((std::uint64_t{Height(level)} + TileSide() - 1) / TileSide());
}

Window Raster::Tile(std::uint32_t level, std::uint32_t column, std::uint32_t row) const {
    if (column >= TilesAcross(level) || row >= TilesDown(level))
        throw Error(name, "find a tile", "the level has no such tile");
    return Geometry(level).Tile(column, row);
}

bool Raster::IsComplete() {
    if (!header) return true;
    bool complete = false;
    Visit([&](auto& typed) {
        typed.RefreshPyramidState();
        complete = typed.HasPyramid();
    });
    const std::uint64_t size = file->Size();
    CheckDisk("look at its size");
    header->fileSize = size;
    return complete;
}

bool Raster::IsWritable() const { return !file || file->IsWritable(); }

std::string Raster::Change() const { return file ? file->Change() : ""; }

std::string Raster::ContentChange() const { return file ? file->ContentChange() : ""; }

zelm::files::Identity Raster::OpenedAs() const {
    return file ? file->Accepted() : zelm::files::Identity{};
}

std::string Raster::TakeFailure() const { return file ? file->TakeFailure() : ""; }

void Raster::CheckDisk(const std::string& operation) const {
    if (const std::string failure = TakeFailure(); !failure.empty())
        throw Error(name, operation, failure);
}

std::optional<double> Raster::NoDataValue(std::uint32_t band) const {
    if (!props.HasNoDataValue(band)) return std::nullopt;
    return props.GetNoDataValue(band);
}

void Raster::SetNoDataValues(const std::map<std::uint32_t, double>& values) {
    zelm::RasterProps changed = props;
    changed.noDataValues = values;
    Visit([&](auto& typed) { typed.SetNoDataValues(changed); });
    props.noDataValues.swap(changed.noDataValues);
}

std::vector<std::uint32_t> Raster::AllBands() const {
    std::vector<std::uint32_t> bands(Bands());
    for (std::uint32_t band = 0; band < Bands(); ++band) bands[band] = band;
    return bands;
}

void Raster::CheckType(std::uint32_t pixelType) const {
    if (pixelType != props.pixelType)
        throw Error(name, "move samples",
                    std::string("they are ") + zelm::PixelTypeName(pixelType) +
                        ", and those of the raster " + zelm::PixelTypeName(props.pixelType));
}

void Raster::CheckLevel(std::uint32_t level) const {
    if (level < minLevel || level > maxLevel)
        throw Error(
            name, "use level " + std::to_string(level),
            "it has the levels " + std::to_string(minLevel) + " to " + std::to_string(maxLevel));
}

void Raster::CheckWindow(const char* operation, std::uint32_t level, const Window& window,
                         std::span<const std::uint32_t> bands) const {
    if (!Window{0, 0, Width(level), Height(level)}.Contains(window))
        throw Error(name, operation + (' ' + Describe(window)),
                    "level " + std::to_string(level) + " has " + std::to_string(Width(level)) +
                        " x " + std::to_string(Height(level)));
    for (const std::uint32_t band : bands)
        if (band >= Bands())
            throw Error(name, std::string(operation) + " band " + std::to_string(band),
                        "it has " + std::to_string(Bands()) + " bands");
}

void Raster::CheckWritable(const char* operation) const {
    if (!IsWritable()) throw Error(name, operation, "the file is read-only");
    const std::string loss = file ? file->LossOfName() : "";
    if (!loss.empty()) throw Error(name, operation, loss);
}

void Raster::ReadTile(std::uint32_t level, const Window& window,
                      std::span<const std::uint32_t> bands, void* pixels) const {
    const zelm::Array<int> list = BandList(bands);
    bool read = false;
    Visit([&]<class T>(zelm::RasterReader<T>& typed) {
        read =
            typed.ReadTile(static_cast<std::int32_t>(window.x), static_cast<std::int32_t>(window.y),
                           window.width, window.height, list, static_cast<std::int32_t>(level),
                           static_cast<T*>(pixels), nullptr);
    });
    CheckMoved("read", window, read);
}

// The words for an error are made where there is one.
void Raster::CheckMoved(const char* verb, const Window& window, bool taken) const {
    const std::string failure = TakeFailure();
    if (taken && failure.empty()) return;
    throw Error(name, std::string(verb) + " " + Describe(window),
                failure.empty() ? "the module refuses" : failure);
}

// Tile by tile, so that the module's 32-bit sizes and its work memory stay small.
void Raster::ReadTiles(std::uint32_t level, const Window& window,
                       std::span<const std::uint32_t> bands, unsigned char* pixels) const {
    const std::size_t pixelBytes = bands.size() * SampleSize();
    std::vector<unsigned char> samples;
    zelm::VisitTiles(Geometry(level), window, [&](const zelm::TilePart& tile) {
        const Window& part = tile.part;
        if (part == window) return ReadTile(level, window, bands, pixels);
        const std::size_t rowBytes = part.width * pixelBytes;
        samples.resize(rowBytes * part.height);
        ReadTile(level, part, bands, samples.data());
        unsigned char* to = pixels + OffsetIn(window, part, pixelBytes);
        for (std::uint32_t line = 0; line < part.height; ++line)
            std::memcpy(to + std::size_t{line} * window.width * pixelBytes,
                        samples.data() + line * rowBytes, rowBytes);
    });
}

void Raster::CheckComplete(const std::string& operation) {
    if (!IsComplete())
        throw Error(name, operation,
                    "the file is incomplete, " + std::to_string(Header().BytesMissing()) +
                        " bytes are missing");
}

// What is not in the file would come as whatever was in the buffer.
void Raster::CheckThere(std::uint32_t level, const Window& window,
                        std::span<const std::uint32_t> bands) {
    if (IsComplete() || PresentTiles(*header).Have(level, window, bands, header->fileSize)) return;
    throw Error(name, "read " + Describe(window) + " of level " + std::to_string(level),
                "the file is incomplete, " + std::to_string(Header().BytesMissing()) +
                    " bytes are missing, of these pixels too");
}

void Raster::Read(std::uint32_t level, const Window& window, std::span<const std::uint32_t> bands,
                  void* pixels, unsigned char* mask) {
    CheckWindow("read", level, window, bands);
    if (window.width == 0 || window.height == 0 || bands.empty()) return;
    CheckThere(level, window, bands);
    if (!header) {
        bool read = false;
        const zelm::Array<int> list = BandList(bands);
        Visit([&]<class T>(zelm::RasterReader<T>& typed) {
            read = typed.ReadTile(static_cast<std::int32_t>(window.x),
                                  static_cast<std::int32_t>(window.y), window.width, window.height,
                                  list, 0, static_cast<T*>(pixels), mask);
        });
        if (!read) throw Error(name, "read " + Describe(window), "the module refuses");
        return;
    }
    ReadTiles(level, window, bands, static_cast<unsigned char*>(pixels));
    if (!mask) return;
    // The module's masks go by a band's place in the list and by an interleave that its tiles do
    // not have; these go by the band.
    Visit([&]<class T>(zelm::RasterReader<T>&) {
        MarkSamples(props, bands, std::uint64_t{window.width} * window.height,
                    static_cast<const T*>(pixels), mask);
    });
}

// The module's buffers can be written to, which it does where the mask says so alone.
void Raster::WriteTile(std::uint32_t level, const Window& window,
                       std::span<const std::uint32_t> bands, const void* pixels) {
    const zelm::Array<int> list = BandList(bands);
    const std::size_t samples = std::size_t{window.width} * window.height * bands.size();
    if (cleanMask.size() < samples) cleanMask.resize(samples);
    bool written = false;
    Visit([&]<class T>(zelm::RasterReader<T>& typed) {
        written = typed.WriteTile(static_cast<std::int32_t>(window.x),
                                  static_cast<std::int32_t>(window.y), window.width, window.height,
                                  list, static_cast<std::int32_t>(level),
                                  static_cast<T*>(const_cast<void*>(pixels)), cleanMask.data());
    });
    CheckMoved("write", window, written);
}

// Whether samples of these bands fill all that a tile has in the file, or whole planes of it.
bool Raster::FillsTiles(std::span<const std::uint32_t> bands) const {
    const bool rises =
        std::adjacent_find(bands.begin(), bands.end(), std::greater_equal<>()) == bands.end();
    return rises && (bands.size() == Bands() || header->IsPlanar());
}

void Raster::MergeTile(std::uint32_t level, const Window& tile, const Window& window,
                       std::span<const std::uint32_t> bands, const unsigned char* pixels) {
    const std::size_t size = SampleSize();
    const std::size_t tilePixel = Bands() * size;
    const std::size_t windowPixel = bands.size() * size;
    std::vector<unsigned char> whole(std::size_t{tile.width} * tile.height * tilePixel);
    const Window piece = Intersection(tile, window);
    if (piece != tile || bands.size() != Bands()) ReadTile(level, tile, AllBands(), whole.data());
    for (std::uint32_t line = 0; line < piece.height; ++line) {
        const Window row{piece.x, piece.y + line, piece.width, 1};
        unsigned char* to = whole.data() + OffsetIn(tile, row, tilePixel);
        const unsigned char* from = pixels + OffsetIn(window, row, windowPixel);
        for (std::uint32_t i = 0; i < piece.width; ++i, to += tilePixel)
            for (const std::uint32_t band : bands) {
                std::memcpy(to + band * size, from, size);
                from += size;
            }
    }
    WriteTile(level, tile, AllBands(), whole.data());
}

void Raster::Write(std::uint32_t level, const Window& window, std::span<const std::uint32_t> bands,
                   const void* pixels, const unsigned char* mask) {
    CheckWindow("write", level, window, bands);
    CheckWritable("write pixels");
    if (window.width == 0 || window.height == 0 || bands.empty()) return;
    const std::size_t count = std::size_t{window.width} * window.height;
    const auto* given = static_cast<const unsigned char*>(pixels);
    std::vector<unsigned char> samples;
    if (mask || !header) {
        samples.assign(given, given + count * bands.size() * SampleSize());
        given = samples.data();
    }
    if (mask)
        zelm::VisitElementType(props.pixelType, [&]<class T>(std::type_identity<T>) {
            StampSamples(props, bands, count, mask,
                         static_cast<T*>(static_cast<void*>(samples.data())));
        });
    if (!header) {
        std::vector<unsigned char> none(count * bands.size());
        Visit([&]<class T>(zelm::RasterReader<T>& typed) {
            typed.WriteTile(static_cast<std::int32_t>(window.x),
                            static_cast<std::int32_t>(window.y), window.width, window.height,
                            BandList(bands), 0, static_cast<T*>(static_cast<void*>(samples.data())),
                            none.data());
        });
        return;
    }
    const OwnChange change{*file, file->AcceptedSize()};
    const bool fills = FillsTiles(bands);
    zelm::VisitTiles(Geometry(level), window, [&](const zelm::TilePart& part) {
        if (fills && part.tile == window)
            WriteTile(level, window, bands, given);
        else
            MergeTile(level, part.tile, window, bands, given);
    });
}

template <class T>
std::shared_ptr<const StoredRecords<T>> Raster::Records() const {
    CheckType(zelm::ElementTraits<T>::code);
    return std::static_pointer_cast<const StoredRecords<T>>(AnyRecords());
}

// What is not settled is looked at again: a few times at once, and then, as a long text always is,
// after a rest, so that ten thousand bands do not each take a look.
std::shared_ptr<const DocumentRecords> Raster::AnyRecords() const {
    using Clock = std::chrono::steady_clock;
    if (records && !records->IsSettled() && Clock::now() >= recordsExpire) records.reset();
    if (!file || records) return records;
    const Clock::time_point begin = Clock::now();
    std::shared_ptr<const DocumentRecords> read;
    zelm::VisitElementType(props.pixelType, [&]<class T>(std::type_identity<T>) {
        read = StoredRecords<T>::Read(file->Source(), header->tileDataEnd);
    });
    CheckDisk("read its metadata document");
    constexpr int kRest = 20;  // times as long as the look has taken
    constexpr std::chrono::milliseconds kQuick(5);
    constexpr std::uint32_t kLooksAtOnce = 16;
    const auto took = Clock::now() - begin;
    recordsExpire = Clock::now() + took * kRest;
    unsettledLooks = read->IsSettled() ? 0 : unsettledLooks + 1;
    if (read->IsSettled() || took > kQuick || unsettledLooks > kLooksAtOnce) records = read;
    return read;
}

std::string Raster::DocumentFault() const {
    const auto stored = AnyRecords();
    return stored ? stored->Fault() : "";
}

std::uint64_t Raster::DocumentElements() const {
    const auto stored = AnyRecords();
    return stored ? stored->Elements() : 0;
}

bool Raster::HasStatistics(std::uint32_t band) const {
    const auto stored = AnyRecords();
    return stored && stored->HasStatistics(band);
}

template <class T>
zelm::RasterReader<T>& Raster::Typed() const {
    CheckType(zelm::ElementTraits<T>::code);
    return *reader->template As<T>();
}

// The module fetches by the place of the record in the file: what stands at a band's own place is
// what any host gets for it. A file that was written band by band, or some bands twice, has them in
// another order: then the first record of the band counts, wherever it stands.
template <class T>
zelm::RasterBandStats<T> Raster::Statistics(std::uint32_t band) const {
    const auto stored = Records<T>();
    if (!stored || !stored->HasStatistics(band))
        throw Error(name, "read the statistics of band " + std::to_string(band),
                    "the file has none");
    const auto all = stored->Statistics();
    if (band < all.size() && all[band].band == band) return all[band];
    return *stored->FirstStatistics(band);
}

void Raster::Store(const std::function<void()>& action) {
    if (!file) return action();
    CheckWritable("store into its metadata document");
    const OwnChange change{*file, std::min(file->AcceptedSize(), header->tileDataEnd)};
    std::optional<MetadataJournal> copy;
    if (keepsCopies)
        if (const std::string plain = file->PlainName(); !plain.empty()) copy.emplace(plain);
    const Forgetting after{records};
    records.reset();
    action();
    CheckDisk("store into its metadata document");
    if (copy) copy->Finish();
}

template <class T>
void Raster::SetStatistics(const std::vector<zelm::RasterBandStats<T>>& given) {
    zelm::RasterReader<T>& typed = Typed<T>();
    CheckWritable("store statistics");
    for (std::uint32_t band = 0; band < given.size(); ++band)
        if (given[band].band != band || given.size() != Bands())
            throw Error(name, "store statistics", "they are not those of all bands in order");
    if (HasStatistics(0))
        throw Error(name, "store statistics", "it has some already, and a file keeps the oldest");
    Store([&] {
        typed.SetBandStats(ArrayOf(given));
        CheckDisk("store statistics");
        bool has = true;
        for (std::uint32_t band = 0; has && band < Bands(); ++band) has = HasStatistics(band);
        if (!has) throw Error(name, "store statistics", "the module did not store them");
    });
}

template <class T>
std::vector<zelm::RasterBandHistogram<T>> Raster::Histograms() const {
    const auto stored = Records<T>();
    if (!stored) return {};
    const auto histograms = stored->Histograms();
    return {histograms.begin(), histograms.end()};
}

template <class T>
void Raster::SetHistograms(const std::vector<zelm::RasterBandHistogram<T>>& histograms) {
    zelm::RasterReader<T>& typed = Typed<T>();
    CheckWritable("store histograms");
    const zelm::Array<zelm::RasterBandHistogram<T>> given = ArrayOf(histograms);
    for (std::size_t i = 0; i < histograms.size(); ++i)
        if (!given.data || !HaveSameCounts(given.data[i], histograms[i])) throw std::bad_alloc();
    const auto old = Records<T>();
    const std::size_t before = old ? old->Histograms().size() : 0;
    Store([&] {
        typed.SetHistograms(given);
        CheckDisk("store histograms");
        const auto now = Records<T>();
        const auto stored =
            now ? now->Histograms() : std::span<const zelm::RasterBandHistogram<T>>();
        bool same = stored.size() == before + histograms.size();
        for (std::size_t i = 0; same && i < histograms.size(); ++i)
            same = HaveSameCounts(stored[before + i], histograms[i]);
        if (!same) throw Error(name, "store histograms", "the module did not store them");
    });
}

bool Raster::HasPalette(std::uint32_t band) const {
    const auto stored = AnyRecords();
    return stored && stored->BandPalette(band);
}

// Made anew, for whatever its holder does with it. No memory raster has one.
zelm::PalettePtr Raster::BandPalette(std::uint32_t band) const {
    zelm::PalettePtr palette;
    const auto stored = AnyRecords();
    const zelm::ColorList* const found = stored ? stored->BandPalette(band) : nullptr;
    if (!found) return palette;
    palette.Reset(new zelm::Palette);
    if (!palette) throw std::bad_alloc();
    found->CopyTo(*palette);
    return palette;
}

void Raster::SetBandPalette(std::uint32_t band, const zelm::Palette& palette) {
    CheckWritable("store a palette");
    if (band >= Bands()) throw Error(name, "store a palette", "there is no such band");
    Store([&] {
        Visit([&](auto& typed) { typed.SetPalette(band, palette); });
        CheckDisk("store a palette");
        const auto stored = AnyRecords();
        const zelm::ColorList* const found = stored ? stored->BandPalette(band) : nullptr;
        if ((found ? found->Colors().size() : 0) != palette.nextIndex)
            throw Error(name, "store a palette", "the module did not store it");
    });
}

#define ZMC_X(type, word, code)                                                           \
    template std::shared_ptr<const StoredRecords<type>> Raster::Records() const;          \
    template zelm::RasterBandStats<type> Raster::Statistics(std::uint32_t) const;         \
    template void Raster::SetStatistics(const std::vector<zelm::RasterBandStats<type>>&); \
    template std::vector<zelm::RasterBandHistogram<type>> Raster::Histograms() const;     \
    template void Raster::SetHistograms(const std::vector<zelm::RasterBandHistogram<type>>&);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
