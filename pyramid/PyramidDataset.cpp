#include "pyramid/PyramidDataset.h"

#include <algorithm>
#include <iterator>
#include <new>
#include <utility>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/parsers/SAXParser.hpp>

#include "core/CheckedArithmetic.h"
#include "core/PixelVocabulary.h"
#include "pyramid/BoundedParser.h"
#include "pyramid/LevelGeometry.h"

namespace zelm {
namespace {

// These stand in files: the magic, then two offsets of 8 bytes, then the header document.
constexpr unsigned char kMagic[4] = {'K', 'O', 'B', 'T'};
constexpr std::uint64_t kOffsetsOffset = sizeof kMagic;
constexpr std::size_t kOffsetsSize = 16;
constexpr std::uint64_t kHeaderOffset = kOffsetsOffset + kOffsetsSize;

// Integers in files are little-endian, whatever the machine.
std::uint64_t DecodeUint64(const unsigned char* bytes) {
    std::uint64_t value = 0;
    for (int i = 7; i >= 0; --i) value = value << 8 | bytes[i];
    return value;
}

void EncodeUint64(std::uint64_t value, unsigned char* bytes) {
    for (int i = 0; i < 8; ++i) bytes[i] = static_cast<unsigned char>(value >> (8 * i));
}

std::uint32_t OrderingFor(const RasterProps& props) {
    if (props.bands > 8) return TileOrder::Morton;
    return props.tileLines > 1 ? TileOrder::Blocked : TileOrder::Scanline;
}

}  // namespace

// cppcheck-suppress passedByValue ; hosts call this form
PyramidDataset::PyramidDataset(String fileName, RasterProps props)
    : BandCount(props.bands),
      Samples(props.samples),
      Lines(props.lines),
      TileSize(256),
      PixelType(props.pixelType),
      Interleave(props.interleave),
      TileOrdering(OrderingFor(props)),
      FileName(fileName),
      BytesPerSample(PixelSize(props.pixelType)),
      Parser(MakeDocumentParser()) {}

// cppcheck-suppress passedByValue ; likewise
PyramidDataset::PyramidDataset(String fileName)
    : FileName(fileName), SourceName(fileName), Parser(MakeDocumentParser()) {}

PyramidDataset::~PyramidDataset() = default;

bool PyramidDataset::OpenFile(bool create) {
    File.reset();
    Writable = false;
    using Mode = platform::File::Mode;
    File = platform::File::Open(FileName.wide, create ? Mode::Create : Mode::Update);
    Writable = File != nullptr;
    if (!File) File = platform::File::Open(FileName.wide, Mode::Read);
    return File != nullptr;
}

// False for a file of another kind, or one too short for the header that it announces.
bool PyramidDataset::ReadFixedFields() {
    unsigned char fields[kHeaderOffset] = {};
    const std::size_t read = File->ReadAt(0, fields, sizeof fields);
    if (!std::equal(std::begin(kMagic), std::end(kMagic), fields) || read != sizeof fields)
        return false;
    TileDataStart = DecodeUint64(fields + kOffsetsOffset);
    MetaDocumentOffset = DecodeUint64(fields + kOffsetsOffset + 8);
    const std::uint64_t size = File->Size();
    return TileDataStart >= kHeaderOffset && TileDataStart <= size &&
           size != platform::File::kUnknownSize;
}

bool PyramidDataset::ReadHeader() {
    if (!OpenFile(false) || !ReadFixedFields()) return true;
    PyramidHeaderRecord header;
    if (!ParseHeaderDocument(header)) return true;
    TakeHeaderRecord(header);
    // Not a failure, by the rules of the format: such a file opens, and refuses its tiles.
    if (TileSize > kMaxTileSize) return false;
    if (!PyramidLimits::Allow(header) || !LayOutLevels()) return true;
    // The file was opened a moment ago: CheckPyramidComplete would open it once more.
    const std::uint64_t size = File->Size();
    HasPyramid = CountsAsComplete(size);
    if (size > MetaDocumentOffset) ReadMetaTree();
    return false;
}

void PyramidDataset::CreateFile(std::uint32_t levelMin, std::uint32_t levelMax) {
    VersionMajor = VersionMinor = 1;
    PyramidHeaderRecord header = MakeHeaderRecord();
    header.levelMin = levelMin;
    header.levelMax = levelMax;
    if (!PyramidLimits::Allow(header)) return;
    if (!OpenFile(true) || !Writable) return;
    LevelMin = levelMin;
    LevelMax = levelMax;
    if (!WriteHeader() || !LayOutLevels()) return;
    unsigned char offsets[kOffsetsSize];
    EncodeUint64(TileDataStart, offsets);
    EncodeUint64(MetaDocumentOffset, offsets + 8);
    File->WriteAt(kOffsetsOffset, offsets, sizeof offsets);
    HasPyramid = CheckPyramidComplete();
    TileScratch.reset();
    tileScratchBytes = 0;
}

// Writes everything in front of the tile data, with offsets that are not known yet; the file then
// ends with its header document. What a failure leaves is refused by everybody who opens it.
bool PyramidDataset::WriteHeader() {
    TileDataStart = MetaDocumentOffset = 0;
    const unsigned char noOffsets[kOffsetsSize] = {};
    HeaderDocument = PyramidXMLDocument::Make();
    const bool written = File->WriteAt(0, kMagic, sizeof kMagic) == sizeof kMagic &&
                         File->WriteAt(kOffsetsOffset, noOffsets, kOffsetsSize) == kOffsetsSize &&
                         HeaderDocument && HeaderDocument->CreateDocument() &&
                         HeaderDocument->WriteHeaderElement(MakeHeaderRecord()) &&
                         HeaderDocument->SerializeDocument(*File, kHeaderOffset);
    HeaderDocument.reset();
    const std::uint64_t end = File->Size();
    if (!written || end == platform::File::kUnknownSize) return false;
    TileDataStart = end;
    return true;
}

bool PyramidDataset::RefreshPyramidState() {
    HasPyramid = CheckPyramidComplete();
    return true;
}

bool PyramidDataset::CheckPyramidComplete() {
    return OpenFile(false) && CountsAsComplete(File->Size());
}

// Files of version 1.0 never do, however long they are.
bool PyramidDataset::CountsAsComplete(std::uint64_t fileSize) const {
    const bool outdated = VersionMajor == 0 || (VersionMajor == 1 && VersionMinor == 0);
    return !outdated && fileSize >= TileDataEnd && fileSize != platform::File::kUnknownSize;
}

void PyramidDataset::DeleteFile() {
    File.reset();
    platform::RemoveFile(FileName.wide);
    HasPyramid = false;
}

PyramidHeaderRecord PyramidDataset::MakeHeaderRecord() const {
    PyramidHeaderRecord header;
    header.versionMajor = VersionMajor;
    header.versionMinor = VersionMinor;
    header.bandCount = BandCount;
    header.width = Samples;
    header.height = Lines;
    header.tileSize = TileSize;
    header.levelMin = LevelMin;
    header.levelMax = LevelMax;
    header.pixelType = PixelType;
    header.interleave = Interleave;
    header.tileOrdering = TileOrdering;
    return header;
}

void PyramidDataset::TakeHeaderRecord(const PyramidHeaderRecord& header) {
    VersionMajor = header.versionMajor;
    VersionMinor = header.versionMinor;
    BandCount = header.bandCount;
    Samples = header.width;
    Lines = header.height;
    TileSize = header.tileSize;
    LevelMin = header.levelMin;
    LevelMax = header.levelMax;
    PixelType = header.pixelType;
    Interleave = header.interleave;
    TileOrdering = header.tileOrdering;
    BytesPerSample = PixelSize(PixelType);
}

// Needs a header that PyramidLimits allow. The coarsest level comes first in the file.
bool PyramidDataset::LayOutLevels() {
    LevelCount = LevelMax - LevelMin + 1u;
    TileOffsets.Clear();
    LevelOffsets.reset(new (std::nothrow) std::uint64_t[LevelMax + 1u]());
    if (!LevelOffsets) return false;
    const std::uint64_t tileDataStart = TileDataStart;
    std::uint64_t cursor = tileDataStart;
    for (std::uint32_t above = LevelMax + 1u; above > LevelMin; --above) {
        const std::uint32_t level = above - 1u;
        LevelOffsets[level] = cursor;
        cursor += LevelGeometry::LevelPixels(Samples, Lines, level) * BytesPerSample * BandCount;
    }
    TileDataEnd = MetaDocumentOffset = cursor;
    if (TileOrdering < TileOrder::Morton) return true;

    const LevelGeometry grid(Samples, Lines, TileSize, 0);
    const std::uint64_t tiles = std::uint64_t{grid.tilesAcross} * grid.tilesDown;
    const bool small = PyramidLimits::TileTableBytes(tiles, BandCount, LevelMax) <=
                       PyramidLimits::kMaxEagerTableBytes;
    return !small || EnsureTileTable();
}

bool PyramidDataset::EnsureTileTable() {
    if (TileOffsets.data) return true;
    TileCursor = TileDataStart;
    BuildTileTable(Samples, Lines, TileSize, TileSize, BandCount, BytesPerSample);
    return TileOffsets.data != nullptr;
}

void PyramidDataset::AllocateTileScratch() {
    if (TileScratch || TileOrdering >= TileOrder::Morton) return;
    const auto bytes = CheckedProduct({BytesPerSample, TileSize, TileSize, BandCount, 4});
    if (!FitsWithin(bytes, PyramidLimits::kMaxScratchBytes)) return;
    TileScratch.reset(new (std::nothrow) unsigned char[*bytes]);
    if (TileScratch) tileScratchBytes = *bytes;
}

unsigned char* PyramidDataset::WorkSpace(std::uint64_t bytes) {
    AllocateTileScratch();
    if (bytes <= tileScratchBytes) return TileScratch.get();
    if (bytes > workBufferBytes) {
        workBuffer.reset(new (std::nothrow) unsigned char[bytes]);
        workBufferBytes = workBuffer ? bytes : 0;
    }
    return workBuffer.get();
}

}  // namespace zelm
