#include "tests/campaigns/FileOracle.h"

#include <algorithm>
#include <cstring>
#include <string_view>

namespace zmctest {
namespace {

// Where the walk of the model would take too long, nothing is said about places in the file.
constexpr std::uint64_t kMaxModelSteps = 20000;

std::uint64_t Get64(const Bytes& bytes, std::size_t at) {
    std::uint64_t value = 0;
    for (std::size_t i = 8; i-- > 0;) value = value << 8 | bytes[at + i];
    return value;
}

std::string_view TextOf(const Bytes& bytes, std::uint64_t start, std::uint64_t end) {
    return {reinterpret_cast<const char*>(bytes.data()) + start, end - start};
}

// Saturating, with what is too large for anything.
std::uint64_t Product(std::initializer_list<std::uint64_t> factors) {
    std::uint64_t product = 1;
    for (const std::uint64_t factor : factors)
        if (__builtin_mul_overflow(product, factor, &product)) return UINT64_MAX;
    return product;
}

bool IsIdentity(const std::vector<int>& list, std::uint32_t bands) {
    if (list.size() != bands) return false;
    for (std::size_t i = 0; i < list.size(); ++i)
        if (list[i] != static_cast<int>(i)) return false;
    return true;
}

}  // namespace

FileOracle::FileOracle(const Bytes& file) : bytes(file) {
    if (bytes.size() < 20 || std::memcmp(bytes.data(), "KOBT", 4) != 0) return;
    tileDataStart = Get64(bytes, 4);
    if (tileDataStart <= 20 || tileDataStart > bytes.size()) return;
    headerBytes = tileDataStart - 20;
    const DocumentOracle document(TextOf(bytes, 20, tileDataStart));
    if (document.trust == Trust::Malformed) return;
    header = document.header;
    const bool sure = document.trust == Trust::Sound && document.values == Trust::Sound;
    for (const zmctest::ModelType& type : zmctest::ModelTypes())
        if (type.code == header.pixelType) {
            hasReader = true;
            sampleBytes = type.bytes;
        }
    hasTiles = header.tileSize <= 2048;
    if (hasTiles && sure && !WithinLimits()) return;
    opening = sure ? Opening::Open : Opening::Unsure;
    if (!sure || !hasTiles) return;
    tileDataEnd = tileDataStart;
    for (std::uint64_t level = header.levelMin; level <= header.levelMax; ++level)
        tileDataEnd += LevelBytes(static_cast<std::uint32_t>(level));
    const bool old =
        header.versionMajor == 0 || (header.versionMajor == 1 && header.versionMinor == 0);
    complete = !old && bytes.size() >= tileDataEnd;
    ReadDocument();
    if (header.ordering != 2) return;
    const std::uint64_t across = Across(0), down = Down(0);
    const std::uint64_t side = std::max(across, down);
    if (Product({side, side, header.bands, header.levelMax + 1u}) > kMaxModelSteps) return;
    zmctest::PyramidDescription d;
    d.samples = header.width;
    d.lines = header.height;
    d.bands = header.bands;
    d.tile = header.tileSize;
    d.levelMin = header.levelMin;
    d.levelMax = std::min(header.levelMax, 30u);  // nothing is placed so far up
    morton = std::make_unique<zmctest::MortonModel>(d, sampleBytes, tileDataStart);
}

void FileOracle::ReadDocument() {
    hasDocument = bytes.size() > tileDataEnd;
    if (!hasDocument) return;
    DocumentOracle document(TextOf(bytes, tileDataEnd, bytes.size()));
    documentTrust = document.trust;
    documentValues = document.values;
    if (documentTrust != Trust::Malformed) meta = std::move(document.meta);
}

std::uint64_t FileOracle::LevelBytes(std::uint32_t level) const {
    if (level >= 32) return 0;
    return Product({header.width >> level, header.height >> level, sampleBytes, header.bands});
}

std::uint64_t FileOracle::TableBytes() const {
    if (header.ordering != 2) return 0;
    const std::uint64_t tiles = std::uint64_t{Across(0)} * Down(0);
    return Product({std::max<std::uint64_t>(tiles, 1), std::max(header.bands, 1u),
                    header.levelMax + std::uint64_t{1}, 8});
}

bool FileOracle::WithinLimits() const {
    if (header.tileSize == 0 || header.levelMax > 1023) return false;
    std::uint64_t total = 0;
    for (std::uint64_t level = header.levelMin; level <= header.levelMax; ++level) {
        const std::uint64_t size = LevelBytes(static_cast<std::uint32_t>(level));
        if (__builtin_add_overflow(total, size, &total)) return false;
    }
    if (total > std::uint64_t{1} << 62) return false;
    if (header.ordering != 2) return true;
    return Across(0) <= 65536 && Down(0) <= 65536 &&
           TableBytes() <= kMaxTable - (header.levelMax + std::uint64_t{1}) * 8;
}

std::uint64_t FileOracle::AllowedBytes() const {
    if (opening == Opening::Refused) return headerBytes * 75;
    const std::uint64_t text =
        headerBytes + (bytes.size() > tileDataEnd ? bytes.size() - tileDataEnd : 0);
    // A tree takes up to 75 times its text; histograms may claim so many bins, and are copied.
    std::uint64_t allowed = text * 75 + 3 * 8 * std::uint64_t{1048576};
    if (!hasTiles) return allowed;
    const std::uint64_t square =
        Product({4, header.tileSize, header.tileSize, sampleBytes, header.bands});
    // Work space of two by two tiles, where it is not too large.
    if (header.ordering != 2 && square <= std::uint64_t{256} << 20) allowed += square;
    return allowed + TableBytes() + (header.levelMax + std::uint64_t{1}) * 8;
}

bool FileOracle::Accepts(const Rect& rect, const std::vector<int>& list, std::int64_t level) const {
    const HeaderFields& h = header;
    if (!hasTiles || level < h.levelMin || level > h.levelMax || level > 31) return false;
    const auto at = static_cast<std::uint32_t>(level);
    const bool planar = h.ordering == 2;
    if (h.bands == 0 || (planar && (list.empty() || h.tileSize >> at == 0))) return false;
    for (const int band : list)
        if (band < 0 || static_cast<std::uint32_t>(band) >= h.bands) return false;
    if (std::uint64_t{rect.x} + rect.width > Width(at) ||
        std::uint64_t{rect.y} + rect.height > Height(at))
        return false;
    const std::uint64_t lastX = (rect.x + rect.width - 1u) / h.tileSize;
    const std::uint64_t lastY = (rect.y + rect.height - 1u) / h.tileSize;
    if (lastX >= Across(at) || lastY >= Down(at) || Across(0) == 0 || Down(0) == 0) return false;
    const std::uint64_t wide = std::max<std::uint64_t>(list.size(), planar ? 0 : h.bands);
    const std::uint64_t limit = std::uint64_t{1} << 32;
    return Product({rect.width, rect.height, wide, sampleBytes}) < limit &&
           Product({h.tileSize, planar ? 1 : h.bands, sampleBytes}) < limit;
}

bool FileOracle::TileAt(std::uint32_t level, std::uint64_t tx, std::uint64_t ty, std::uint32_t band,
                        Tile& tile) const {
    const std::uint64_t side = header.tileSize, width = Width(level), height = Height(level);
    tile.width = std::min(side, width - tx * side);
    const std::uint64_t tileHeight = std::min(side, height - ty * side);
    if (header.ordering != 2) {
        tile.pixelBytes = std::uint64_t{sampleBytes} * header.bands;
        tile.start = tileDataStart;
        for (std::uint32_t above = header.levelMax; above > level; --above)
            tile.start += LevelBytes(above);
        tile.start += (width * ty * side + tx * side * tileHeight) * tile.pixelBytes +
                      std::uint64_t{band} * sampleBytes;
        return true;
    }
    tile.pixelBytes = sampleBytes;
    // The first tile of all comes first.
    tile.start = tileDataStart;
    if (level == 0 && tx == 0 && ty == 0 && band == 0) return true;
    if (!morton) return false;
    const std::uint64_t row = (std::uint64_t{level} * header.bands + band) * morton->tiles;
    const auto start = morton->offsets.find(row + Across(level) * ty + tx);
    if (start == morton->offsets.end()) return false;
    tile.start = start->second;
    return true;
}

bool FileOracle::SampleAt(std::uint32_t level, std::uint32_t x, std::uint32_t y, std::uint32_t band,
                          std::uint64_t& offset) const {
    const std::uint64_t side = header.tileSize, tx = x / side, ty = y / side;
    Tile tile;
    if (!TileAt(level, tx, ty, band, tile)) return false;
    offset = tile.start + ((y - ty * side) * tile.width + (x - tx * side)) * tile.pixelBytes;
    return true;
}

FileOracle::Answer FileOracle::Read(const Rect& rect, const std::vector<int>& list,
                                    std::int64_t level, Bytes& buffer) const {
    if (rect.width == 0 || rect.height == 0) return Answer::Given;
    if (!Accepts(rect, list, level)) return Answer::Refused;
    const auto at = static_cast<std::uint32_t>(level);
    const std::uint64_t side = header.tileSize;
    // Of one whole tile with all bands, what the file does not hold stays as it was.
    const bool keeps = header.ordering != 2 && rect.width == side && rect.height == side &&
                       rect.x % side == 0 && rect.y % side == 0 &&
                       (list.empty() || IsIdentity(list, header.bands));
    const std::size_t count = list.empty() ? header.bands : list.size();
    const std::uint64_t endX = std::uint64_t{rect.x} + rect.width;
    const std::uint64_t endY = std::uint64_t{rect.y} + rect.height;
    for (std::uint64_t ty = rect.y / side; ty * side < endY; ++ty)
        for (std::uint64_t tx = rect.x / side; tx * side < endX; ++tx)
            for (std::size_t i = 0; i < count; ++i) {
                Tile tile;
                const auto band = list.empty() ? static_cast<std::uint32_t>(i)
                                               : static_cast<std::uint32_t>(list[i]);
                if (!TileAt(at, tx, ty, band, tile)) return Answer::Unknown;
                for (std::uint64_t y = std::max<std::uint64_t>(rect.y, ty * side);
                     y < std::min(endY, (ty + 1) * side); ++y)
                    for (std::uint64_t x = std::max<std::uint64_t>(rect.x, tx * side);
                         x < std::min(endX, (tx + 1) * side); ++x) {
                        const std::uint64_t pixel = (y - rect.y) * rect.width + (x - rect.x);
                        Copy(tile.start +
                                 ((y - ty * side) * tile.width + (x - tx * side)) * tile.pixelBytes,
                             buffer.data() + (pixel * count + i) * sampleBytes, keeps);
                    }
            }
    return Answer::Given;
}

void FileOracle::Copy(std::uint64_t offset, unsigned char* sample, bool keeps) const {
    const std::uint64_t held = bytes.size() > offset ? bytes.size() - offset : 0;
    const auto known = static_cast<std::size_t>(std::min<std::uint64_t>(held, sampleBytes));
    if (known != 0) std::memcpy(sample, bytes.data() + offset, known);
    if (!keeps && known < sampleBytes) std::memset(sample + known, 0, sampleBytes - known);
}

}  // namespace zmctest
