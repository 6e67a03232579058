// PyramidDataset: one pyramid file, its tables and the source that its bytes come from.
//
// A pyramid file holds an image at several resolutions (levels), cut into square tiles, between a
// header document in front and a metadata document behind. No tile offset is stored: the tables
// are recomputed from the header at each open, so the formulas here are the format
// (docs/format.md). Fields are public: the reader, the connection and the archive work on them.
//
// What a header settles (the numbers, the tables, both ends, completeness) is a PyramidLayout that
// is built aside; the fields take it over whole, or stay as they were.
//
// One open source and one work buffer: a dataset is for one thread at a time, reads included. No
// operation throws. Tile transfers do not report what the disk did.
#ifndef ZMC_PYRAMID_PYRAMIDDATASET_H
#define ZMC_PYRAMID_PYRAMIDDATASET_H

#include <cstddef>
#include <cstdint>
#include <memory>

#include "colour/Palette.h"
#include "core/Array.h"
#include "core/Pointer.h"
#include "core/String.h"
#include "files/ByteSource.h"
#include "format/PyramidHeaderRecord.h"
#include "format/PyramidLayout.h"
#include "format/PyramidLimits.h"
#include "format/TileTable.h"
#include "pyramid/DocumentOnDemand.h"
#include "pyramid/PyramidXMLDocument.h"
#include "raster/RasterBandHistogram.h"
#include "raster/RasterBandStats.h"
#include "raster/RasterProps.h"

namespace XERCES_CPP_NAMESPACE {
class HandlerBase;
class MemBufInputSource;
class SAXParser;
}  // namespace XERCES_CPP_NAMESPACE

namespace zelm {

class PyramidDataset {
public:
    // Results of ParseDocument.
    static constexpr int kParsed = 0;
    static constexpr int kParseError = 4;
    static constexpr int kParseOutOfMemory = 5;

    // Files with larger tiles open, and then refuse every tile operation.
    static constexpr std::uint32_t kMaxTileSize = PyramidLimits::kMaxTileSize;

    std::shared_ptr<files::ByteSource> File;  // the open file or lent source, or null
    bool Writable = false;                    // `File` was opened for update
    std::uint32_t VersionMajor = 0;
    std::uint32_t VersionMinor = 0;
    std::uint32_t BandCount = 0;
    std::uint32_t Samples = 0;  // width of level 0
    std::uint32_t Lines = 0;    // height of level 0
    std::uint32_t TileSize = 0;
    std::uint32_t LevelCount = 0;  // LevelMax - LevelMin + 1; wraps where no level is laid out
    std::uint32_t LevelMin = 0;
    std::uint32_t LevelMax = 0;
    std::uint64_t TileDataEnd = 0;
    bool HasPyramid = false;  // result of the last completeness test
    std::uint32_t PixelType = 0;
    std::int32_t Interleave = -1;    // only carried: no byte of the tile data depends on it
    std::uint32_t TileOrdering = 0;  // TileOrder code
    String FileName;                 // the path, exactly as the connection got it
    std::uint64_t TileCursor = 0;    // running offset of BuildTileTable
    // Absolute offset of every tile: (LevelMax + 1) x BandCount x tiles of level 0, of which a
    // level uses the start of its row; what it does not use is 0. Filled in the ordering Morton
    // alone, since nothing addresses by it in the others: at once where it is small, with the first
    // tile that moves where it is larger, and never where it is large (PyramidLimits.h).
    Array<std::uint64_t> TileOffsets;
    // Room for 2 x 2 tiles with all bands, in the orderings Scanline and Blocked. Null until a
    // transfer needs it, and where it would be larger than PyramidLimits allow.
    std::unique_ptr<unsigned char[]> TileScratch;
    String SourceName;  // name given to the open constructor
    std::uint32_t BytesPerSample = 1;
    std::unique_ptr<std::uint64_t[]> LevelOffsets;  // LevelMax + 1 entries
    std::uint64_t TileDataStart = 0;
    std::uint64_t MetaDocumentOffset = 0;
    // Tree of the metadata document: an empty one until a header is read with a document behind it,
    // then that of the text which was there, made when the first store asks for it. Records join it
    // as they are stored. It outlives the file: one that is made anew by the same dataset gets all
    // of it with the next store.
    DocumentOnDemand MetaDocument;
    std::unique_ptr<PyramidXMLDocument> HeaderDocument;  // only while CreateFile runs
    std::unique_ptr<xercesc::SAXParser> Parser;          // for both documents
    DocumentSource MetaSource;
    DocumentSource HeaderSource;
    bool MetaLoaded = false;    // MetaSource reflects the file, and no store is under way there
    bool HeaderLoaded = false;  // HeaderSource reflects the file
    PalettePtr CurrentPalette;  // palette of the last GetPalette

    // Describes a file that does not exist yet; nothing is opened.
    PyramidDataset(String fileName, RasterProps props);
    // Names an existing file; ReadHeader opens it.
    explicit PyramidDataset(String fileName);
    ~PyramidDataset();
    PyramidDataset(const PyramidDataset&) = delete;
    PyramidDataset& operator=(const PyramidDataset&) = delete;

    // --- life of the file (PyramidDataset.cpp) ---
    // Opens for update, or failing that for reading; `create` makes the file or empties it. A name
    // under which the process lends a source (files/Lending.h) opens that source, each time.
    bool OpenFile(bool create);
    // Opens the file and lays out all levels. FALSE on success, TRUE on failure: callers are
    // written to this sense. A header that claims more than PyramidLimits allow is a failure, one
    // whose tiles are too large a success with no tables behind it. After a failure the file may be
    // open, and all that a layout settles is as it was.
    bool ReadHeader();
    // Makes the file, or empties it, writes the header and lays out the levels, both inclusive.
    // Nothing is reported. On a file that cannot be made, and for a layout beyond PyramidLimits (a
    // level above kMaxLevel, more tile data or tile offsets than it allows), nothing but the
    // version changes. Where the header of an emptied file cannot be written, no layout is left:
    // tiles and records are refused until a file is made.
    void CreateFile(std::uint32_t levelMin, std::uint32_t levelMax);
    // Reopens the file and stores in HasPyramid whether it is complete; always true.
    bool RefreshPyramidState();
    // Reopens the file; true if its version is 1.1 or later and it reaches TileDataEnd.
    bool CheckPyramidComplete();
    // Closes and removes the file, whether that succeeds or not. Of a lent source, what it stands
    // for.
    void DeleteFile();

    // --- addresses (TileTable.cpp, with the arithmetic of LevelGeometry.h) ---
    // Offset of a tile from LevelOffsets[level], in the orderings Scanline and Blocked.
    std::uint64_t GetTileOffset(std::uint32_t tileX, std::uint32_t tileY,
                                std::uint32_t level) const;
    // Fills TileOffsets along the Morton curve from TileCursor on, and advances that. Tiles are
    // square; a grid beyond PyramidLimits leaves the table empty.
    void BuildTileTable(std::uint32_t width, std::uint32_t height, std::uint32_t tileWidth,
                        std::uint32_t tileHeight, std::uint32_t bands,
                        std::uint32_t bytesPerSample);

    // --- tile transfer (TileTransfer.cpp) ---
    // Whether a transfer can be asked for: the rectangle inside the level, the level laid out and
    // addressable, every band in the file, and less than 4 GiB in all. In the ordering Morton the
    // list has to name its bands. Without a file, width or height there is nothing to refuse.
    bool AcceptsTile(std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height,
                     const Array<int>& bandList, std::int32_t level) const;

    // The three transfers move a rectangle of one level, pixel-interleaved in `buffer`, with the
    // listed bands in list order; an identity or (in the orderings 0 and 1) empty list means all
    // bands. T has the size of the file's samples. False, with nothing moved, for what AcceptsTile
    // refuses, and where memory runs out; a null File moves nothing and is true. True is all that
    // is told of a disk that failed.

    // What the file does not hold reads as zeros, except that one whole tile with all bands in
    // order (orderings 0 and 1) leaves that part of `buffer` as it was. So does what the disk does
    // not give.
    template <class T>
    bool ReadTile(std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height,
                  const Array<int>& bandList, std::int32_t level, T* buffer);
    // For the orderings 0 and 1. Whole tiles and edge tiles of exact size, with all bands, are
    // written as they are, other rectangles merged into their tiles; nothing is written where the
    // old samples cannot be read, or there is no memory (or they have 4 GiB or more) to hold them.
    // Three kinds of rectangles do not arrive where they belong (see TileRequest.h): write whole
    // tiles with all bands.
    template <class T>
    bool WriteTileInterleaved(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                              std::uint32_t height, const Array<int>& bandList, std::int32_t level,
                              const T* buffer);
    // For the other orderings. Whole tiles and edge tiles of exact size are written, band by band
    // in list order; any other rectangle is dropped without a word.
    template <class T>
    bool WriteTileMorton(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                         std::uint32_t height, const Array<int>& bandList, std::int32_t level,
                         const T* buffer);

    // --- documents (PyramidDocuments.cpp) ---
    // FALSE when the document was loaded or File is null, TRUE when its region is empty.
    bool LoadHeaderDocument();
    bool ParseHeaderDocument(PyramidHeaderRecord& out);
    // True when MetaSource was filled from the file: old or new, where another process stores.
    bool LoadMetaDocument();
    // Runs Parser over `source`, which may be null only after a failure; `handlers` may be null.
    // kParsed, kParseError or kParseOutOfMemory. The source is one of the two members: after an
    // exception it is dropped and its flag cleared.
    int ParseDocument(xercesc::HandlerBase* handlers, DocumentSource& source, bool& loaded);
    // Gives the file's text to MetaDocument, if the file has any. Text that cannot be had, or is
    // malformed, leaves MetaDocument without a tree, so that no store replaces it.
    void ReadMetaTree();
    // MetaDocument, ready for records; null if memory ran out. Where the open could not tell
    // whether the file has a document, the file is looked at now, and nothing is given until that
    // is known.
    PyramidXMLDocument* EnsureMetaDocument();

    // --- archive of statistics, histograms and palettes (PyramidArchive.cpp) ---
    // A record with that band number exists.
    template <class T>
    bool HasBandStats(std::uint32_t band);
    // The record at POSITION `band` of the document, whatever band it names; a default record where
    // there is none. Store all bands in one call, in band order, once, and the two agree.
    template <class T>
    RasterBandStats<T> GetBandStats(std::int32_t band);
    template <class T>
    bool SetBandStats(const Array<RasterBandStats<T>>& stats);
    template <class T>
    Array<RasterBandHistogram<T>> GetHistograms();
    template <class T>
    bool SetHistograms(const Array<RasterBandHistogram<T>>& histograms);
    // Never null: a palette of no colours for a band without one. The last one stored wins.
    template <class T>
    PalettePtr GetPalette(std::uint32_t band);
    bool SetPalette(std::uint32_t band, const Palette& palette);
    // The parses under the fetches; they differ in their answer where the file has no document:
    // false for statistics, true (and `out` untouched) for the other two.
    template <class T>
    bool LoadBandStats(Array<RasterBandStats<T>>& out);
    template <class T>
    bool LoadHistograms(Array<RasterBandHistogram<T>>& out);
    template <class T>
    bool LoadPalette(std::uint32_t band, Palette& out);

private:
    friend class TileTransfer;

    PyramidHeaderRecord MakeHeaderRecord() const;
    // Takes a layout over, whole.
    void Settle(PyramidLayout&& layout) noexcept;
    // The fixed fields of the open file, and its header document, as far as `layout` goes.
    bool ReadFixedFields(PyramidLayout& layout) const;
    bool ReadHeaderText(PyramidLayout& layout, DocumentSource& text);
    bool ParseHeaderText(DocumentSource& text, bool& loaded, PyramidHeaderRecord& out);
    bool WriteFront(PyramidLayout& layout);
    // Whether tiles can be addressed by TileOffsets, or have to be without.
    bool EnsureTileTable();
    TileTable DescribeTileTable() const;
    // Judges a transfer that has something to move, and makes sure of the tile table.
    bool PrepareTransfer(std::uint32_t x, std::uint32_t y, std::uint32_t width,
                         std::uint32_t height, const Array<int>& bandList, std::int32_t level,
                         std::size_t elementBytes, const void* buffer);
    void AllocateTileScratch();
    // At least `bytes` of work space: TileScratch where it suffices, else a buffer that is kept.
    // Null if memory ran out.
    unsigned char* WorkSpace(std::uint64_t bytes);

    bool metaUnknown = false;  // the open could not tell whether the file has a metadata document
    std::uint64_t tileScratchBytes = 0;
    std::unique_ptr<unsigned char[]> workBuffer;
    std::uint64_t workBufferBytes = 0;
};

class PyramidDatasetPtr : public Pointer<PyramidDataset> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
