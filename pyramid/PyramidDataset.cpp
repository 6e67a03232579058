#include "pyramid/PyramidDataset.h"

#include <new>
#include <optional>
#include <utility>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/parsers/SAXParser.hpp>

#include "core/CheckedArithmetic.h"
#include "core/PixelVocabulary.h"
#include "files/OpenSource.h"
#include "format/DocumentParse.h"
#include "format/LevelGeometry.h"
#include "format/PyramidFront.h"

namespace zelm {
namespace {

std::optional<std::uint64_t> SizeOf(const files::ByteSource& file) {
    const std::uint64_t size = file.Size();
    if (size == files::ByteSource::kUnknownSize) return std::nullopt;
    return size;
}

template <class Value>
void TakeArray(Array<Value>& from, Array<Value>& to) noexcept {
    std::swap(to.data, from.data);
    std::swap(to.shape, from.shape);
    std::swap(to.capacity, from.capacity);
}

}  // namespace

// cppcheck-suppress passedByValue ; hosts call this form
PyramidDataset::PyramidDataset(String fileName, RasterProps props)
    : BandCount(props.bands),
      Samples(props.samples),
      Lines(props.lines),
      TileSize(kWrittenTileSize),
      PixelType(props.pixelType),
      Interleave(props.interleave),
      TileOrdering(TileOrderFor(props.bands, props.tileLines)),
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
    using files::OpenMode;
    File = files::OpenSource(FileName, create ? OpenMode::Create : OpenMode::Update);
    Writable = File != nullptr;
    if (!File) File = files::OpenSource(FileName, OpenMode::Read);
    return File != nullptr;
}

// False for a file of another kind, or one too short for the header that it announces.
bool PyramidDataset::ReadFixedFields(PyramidLayout& layout) const {
    char start[PyramidFront::kHeaderOffset];
    const std::size_t read = File->ReadAt(0, start, sizeof start);
    PyramidFront front;
    if (DecodeFront({start, read}, SizeOf(*File), front) != FrontFault::None) return false;
    layout.tileDataStart = front.tileDataStart;
    layout.metaDocumentOffset = front.metaDocumentOffset;
    return true;
}

bool PyramidDataset::ReadHeader() {
    PyramidLayout layout;
    DocumentSource text;
    if (!OpenFile(false) || !ReadFixedFields(layout) || !ReadHeaderText(layout, text)) return true;
    // Not a failure, by the rules of the format: such a file opens, and refuses its tiles.
    const bool served = layout.header.tileSize <= kMaxTileSize;
    if (served && (!PyramidLimits::Allow(layout.header) || !layout.LayOut())) return true;
    // The file was opened a moment ago: CheckPyramidComplete would open it once more.
    const auto size = SizeOf(*File);
    layout.complete =
        served && PyramidLayout::IsComplete(layout.header.versionMajor, layout.header.versionMinor,
                                            layout.tileDataEnd, size);
    Settle(std::move(layout));
    HeaderSource = std::move(text);
    HeaderLoaded = true;
    MetaLoaded = false;
    if (served && (!size || *size > MetaDocumentOffset)) ReadMetaTree();
    return false;
}

void PyramidDataset::CreateFile(std::uint32_t levelMin, std::uint32_t levelMax) {
    VersionMajor = VersionMinor = 1;
    PyramidLayout layout;
    layout.header = MakeHeaderRecord();
    layout.header.levelMin = levelMin;
    layout.header.levelMax = levelMax;
    if (!PyramidLimits::Allow(layout.header)) return;
    if (!OpenFile(true) || !Writable) return;
    // The file is empty: from here on the layout that stood is nobody's.
    metaUnknown = false;
    if (!WriteFront(layout)) {
        PyramidLayout none;
        none.header = MakeHeaderRecord();
        none.header.levelMin = none.header.levelMax = 0;
        return Settle(std::move(none));
    }
    Settle(std::move(layout));
    HasPyramid = CheckPyramidComplete();
}

// Writes everything in front of the tile data and lays out the levels behind it. The offsets come
// last: what a failure leaves has none, and is refused by everybody who opens it.
bool PyramidDataset::WriteFront(PyramidLayout& layout) {
    using Front = PyramidFront;
    unsigned char offsets[Front::kOffsetsSize] = {};
    const auto writeOffsets = [&] {
        return File->WriteAt(Front::kOffsetsOffset, offsets, sizeof offsets) == sizeof offsets;
    };
    HeaderDocument = PyramidXMLDocument::Make();
    const bool written =
        File->WriteAt(0, Front::kMagic, sizeof Front::kMagic) == sizeof Front::kMagic &&
        writeOffsets() && HeaderDocument && HeaderDocument->CreateDocument() &&
        HeaderDocument->WriteHeaderElement(layout.header) &&
        HeaderDocument->SerializeDocument(*File, Front::kHeaderOffset);
    HeaderDocument.reset();
    const auto end = SizeOf(*File);
    if (!written || !end) return false;
    layout.tileDataStart = *end;
    if (!layout.LayOut()) return false;
    Front{layout.tileDataStart, layout.metaDocumentOffset}.EncodeOffsets(offsets);
    return writeOffsets();
}

bool PyramidDataset::RefreshPyramidState() {
    HasPyramid = CheckPyramidComplete();
    return true;
}

bool PyramidDataset::CheckPyramidComplete() {
    // A file of too large tiles has an end of its tile data as well: none, or 0. One whose header
    // could not be written has none.
    const bool settled = LevelOffsets || TileSize > kMaxTileSize;
    return OpenFile(false) && settled &&
           PyramidLayout::IsComplete(VersionMajor, VersionMinor, TileDataEnd, SizeOf(*File));
}

void PyramidDataset::DeleteFile() {
    File.reset();
    files::RemoveSource(FileName);
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

void PyramidDataset::Settle(PyramidLayout&& layout) noexcept {
    const PyramidHeaderRecord& header = layout.header;
    VersionMajor = header.versionMajor;
    VersionMinor = header.versionMinor;
    BandCount = header.bandCount;
    Samples = header.width;
    Lines = header.height;
    TileSize = header.tileSize;
    LevelCount = layout.LevelCount();
    LevelMin = header.levelMin;
    LevelMax = header.levelMax;
    TileDataEnd = layout.tileDataEnd;
    HasPyramid = layout.complete;
    PixelType = header.pixelType;
    Interleave = header.interleave;
    TileOrdering = header.tileOrdering;
    TileCursor = layout.tileCursor;
    TakeArray(layout.tileOffsets, TileOffsets);
    // Made for the tile size that was.
    TileScratch.reset();
    tileScratchBytes = 0;
    BytesPerSample = PixelSize(PixelType);
    LevelOffsets = std::move(layout.levelOffsets);
    TileDataStart = layout.tileDataStart;
    MetaDocumentOffset = layout.metaDocumentOffset;
}

std::uint64_t PyramidDataset::GetTileOffset(std::uint32_t tileX, std::uint32_t tileY,
                                            std::uint32_t level) const {
    const LevelGeometry geometry(Samples, Lines, TileSize, level);
    return geometry.TileOffset(tileX, tileY, std::uint64_t{BytesPerSample} * BandCount);
}

void PyramidDataset::BuildTileTable(std::uint32_t width, std::uint32_t height,
                                    std::uint32_t tileWidth, std::uint32_t tileHeight,
                                    std::uint32_t bands, std::uint32_t bytesPerSample) {
    if (tileWidth != tileHeight) return TileOffsets.Clear();
    TileTable{LevelGeometry(width, height, tileWidth, 0), LevelMin, LevelMax, bands, bytesPerSample}
        .Place(TileOffsets, TileCursor);
}

TileTable PyramidDataset::DescribeTileTable() const {
    return {LevelGeometry(Samples, Lines, TileSize, 0), LevelMin, LevelMax, BandCount,
            BytesPerSample};
}

bool PyramidDataset::EnsureTileTable() {
    using namespace PyramidLimits;
    if (TileOffsets.data ||
        TileTableBytes(DescribeTileTable().Tiles(), BandCount, LevelMax) > kMaxHeldTableBytes)
        return true;
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
