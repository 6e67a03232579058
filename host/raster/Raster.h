// Raster: one raster of the module, pyramid file or memory, with errors instead of silence.
//
// The module answers true whatever the disk did, drops writes that its layout does not take, and
// reads what is not in the file as whatever was in the buffer. This class looks: it refuses what
// the module would drop, and throws Error with the reason that the system gave for whatever failed
// below the module, at which offset.
//
// A raster opens its file once. What it reads and writes stays that file, whatever happens to its
// name: a file that takes the name is not touched, and one that was replaced or removed is read on,
// but not written, since nobody would find that. Change tells of it. Reading a file that was cut
// throws.
//
// Levels count from 0, the finest; bands from 0. Samples of a pyramid are pixel-interleaved: lines
// from the top, each pixel the samples of the bands asked for, in that order. A memory raster moves
// them in its own interleave. Masks have one byte per sample in the same shape; bit 0 marks a
// sample that is not valid, the other bits are left alone. One thread at a time; a Raster may be
// moved, and outlives its Module's other users.
#ifndef ZMC_HOST_RASTER_RASTER_H
#define ZMC_HOST_RASTER_RASTER_H

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "files/ByteSource.h"
#include "host/base/Error.h"
#include "host/file/PyramidHeader.h"
#include "host/raster/Module.h"
#include "host/raster/RasterSource.h"

namespace zmchost {

class DocumentRecords;
class LentFile;
template <class T>
class StoredRecords;

// What a pyramid file is opened for.
enum class Access {
    Read,    // nothing is ever written, neither into the file nor beside it
    Update,  // for writing too where the file allows it
};

class Raster {
public:
    // Opens a pyramid file. What a store with a copy (KeepCopies) left behind when it was cut off
    // is put in order first where the file is opened for writing; RecoveryNote tells of it.
    static Raster Open(ModulePtr module, const std::string& file, Access access = Access::Update);
    // The same from an open source, which `name` stands for in messages: a file of another kind, or
    // one that the caller has looked at already. Nothing is put in order, and copies are kept of
    // plain files alone (FileSource.h).
    static Raster Open(ModulePtr module, std::shared_ptr<zelm::files::ByteSource> source,
                       const std::string& name);

    // Another raster on the open file of this one, with the same no-data values and what is known
    // of its header and records: for a thread of its own. Neither knows what the other changes.
    // Throws Error for a memory raster.
    Raster Another() const;

    // Lays out a new pyramid with the levels from 0 to maxLevel, replacing a file of that name. Of
    // `props` the size, bands, pixel type, tileLines (above 1: ordering Blocked) and no-data values
    // count; the file is always pixel-interleaved. Nothing protects the old file: to replace one
    // safely, build beside it, as PyramidBuilder does. A new file that fails goes again.
    static Raster Create(ModulePtr module, const std::string& file, zelm::RasterProps props,
                         std::uint32_t maxLevel);

    // Wraps the caller's samples, which live as long as the Raster. `props` tells size, bands,
    // interleave and pixel type.
    static Raster OfMemory(ModulePtr module, void* samples, const zelm::RasterProps& props);

    const std::string& Name() const { return name; }
    // What opening found of a store that was cut off, for people; empty as a rule.
    const std::string& RecoveryNote() const { return recoveryNote; }
    const zelm::RasterProps& Props() const { return props; }
    std::uint32_t Bands() const { return props.bands; }
    std::uint32_t PixelType() const { return props.pixelType; }
    std::uint32_t SampleSize() const;

    std::uint32_t MinLevel() const { return minLevel; }
    std::uint32_t MaxLevel() const { return maxLevel; }
    // Size of a level. Throws for a level that the raster does not have.
    std::uint32_t Width(std::uint32_t level = 0) const;
    std::uint32_t Height(std::uint32_t level = 0) const;

    bool IsPyramid() const { return header.has_value(); }
    // The header of a pyramid; throws for a memory raster.
    const PyramidHeader& Header() const;
    // Side of the square tiles; the greater side of a memory raster, which is one tile.
    std::uint32_t TileSide() const;
    std::uint32_t TilesAcross(std::uint32_t level = 0) const;
    std::uint32_t TilesDown(std::uint32_t level = 0) const;
    // The pixels of a tile, those of the last column and row with their true size.
    Window Tile(std::uint32_t level, std::uint32_t column, std::uint32_t row) const;

    // Whether all levels are in the file, looked at anew. A memory raster is always complete.
    bool IsComplete();
    // Throws Error where it is not: the raster cannot be used for `operation`.
    void CheckComplete(const std::string& operation);
    // Whether the file could be opened for writing. A memory raster always is.
    bool IsWritable() const;
    // What others have done to the file since it was opened, or last written to by this object, for
    // people: that it was cut, replaced, removed or written to. Empty if nothing is to be seen.
    std::string Change() const;
    // The part of it that concerns what is read: that the file was cut or written to. What was read
    // while this is empty is of one file in one state, but for writes within the clock tick of the
    // file system in which the file was last written before (Identity in ByteSource.h).
    std::string ContentChange() const;
    // Which file it is, in which state, as it was opened or last written to by this object; unknown
    // of a memory raster.
    zelm::files::Identity OpenedAs() const;

    std::optional<double> NoDataValue(std::uint32_t band) const;
    // By band; they live in this object, since files have no place for them. A value that the pixel
    // type cannot hold marks nothing.
    void SetNoDataValues(const std::map<std::uint32_t, double>& values);

    // Reads a window of a level. The window lies within the level, and the file has all of its
    // tiles: an incomplete one is read as far as it goes.
    // `pixels` has room for all samples, `mask` too unless it is null.
    void Read(std::uint32_t level, const Window& window, std::span<const std::uint32_t> bands,
              void* pixels, unsigned char* mask = nullptr);

    // Writes a window of a level, whatever its place: tiles that it covers in part are read and
    // written whole. Marked samples become the band's no-data value, if it has one. What a write
    // that was cut short leaves in its tile is anything.
    void Write(std::uint32_t level, const Window& window, std::span<const std::uint32_t> bands,
               const void* pixels, const unsigned char* mask = nullptr);

    // The same for a known type, all bands: checks that T is the raster's type.
    template <class T>
    std::vector<T> Read(std::uint32_t level, const Window& window) {
        CheckType(zelm::ElementTraits<T>::code);
        std::vector<T> pixels(std::size_t{window.width} * window.height * Bands());
        Read(level, window, AllBands(), pixels.data());
        return pixels;
    }
    template <class T>
    void Write(std::uint32_t level, const Window& window, const std::vector<T>& pixels) {
        CheckType(zelm::ElementTraits<T>::code);
        if (pixels.size() != std::size_t{window.width} * window.height * Bands())
            throw Error(name, "write pixels", "their number is not that of the window");
        Write(level, window, AllBands(), pixels.data());
    }

    // From now on each of the four stores below keeps a copy of what was stored before in a file
    // beside the pyramid (MetadataJournal.h) until it has reached the disk, and returns only then.
    // A process that dies or a power failure then loses nothing of the old statistics. Off at
    // first: it costs some flushes of the disk for each store.
    void KeepCopies(bool keep) { keepsCopies = keep; }
    // Runs `action`, which stores through the module's reader, and throws where it has failed. What
    // was read of the document before is forgotten.
    void Store(const std::function<void()>& action);

    // All records of the file's document, parsed when they are first asked for and kept until this
    // object stores something; null of a memory raster. T is the raster's type.
    template <class T>
    std::shared_ptr<const StoredRecords<T>> Records() const;

    // What is wrong with the form of the file's document, by the parse that Records keeps; empty if
    // nothing, or if there is none.
    std::string DocumentFault() const;
    // Elements that the document has, malformed or not; by the same parse.
    std::uint64_t DocumentElements() const;

    bool HasStatistics(std::uint32_t band) const;
    // The record of a band. Throws if there is none.
    template <class T>
    zelm::RasterBandStats<T> Statistics(std::uint32_t band) const;
    // Stores the records of all bands, in order and once: a file keeps every record, and answers
    // with the oldest.
    template <class T>
    void SetStatistics(const std::vector<zelm::RasterBandStats<T>>& records);

    // All histograms, in the order of their storing.
    template <class T>
    std::vector<zelm::RasterBandHistogram<T>> Histograms() const;
    template <class T>
    void SetHistograms(const std::vector<zelm::RasterBandHistogram<T>>& histograms);

    bool HasPalette(std::uint32_t band) const;
    // The palette of a band, made anew, or an empty pointer. Records() has its colours as numbers.
    zelm::PalettePtr BandPalette(std::uint32_t band) const;
    void SetBandPalette(std::uint32_t band, const zelm::Palette& palette);

    std::vector<std::uint32_t> AllBands() const;

    // Calls visit(zelm::RasterReader<T>&) with the module's own reader.
    template <class Visitor>
    void Visit(Visitor&& visit) const {
        if (!reader->Visit(std::forward<Visitor>(visit)))
            throw Error(name, "use the raster", "the module has no reader for its pixel type");
    }
    // Why the file did not do all that was asked of it since the last question, in words; empty if
    // it did. For those who work with the module's reader; the operations of this class ask.
    std::string TakeFailure() const;
    // The same thrown as an Error; `operation` is a verb with its object.
    void CheckDisk(const std::string& operation) const;

private:
    Raster(ModulePtr holder, std::string rasterName, zelm::RasterDataConnectionPtr opened);
    static Raster OpenLent(ModulePtr module, const std::string& name,
                           std::shared_ptr<LentFile> file,
                           const std::optional<PyramidHeader>& known = std::nullopt);
    void TakeReader();
    zelm::LevelGeometry Geometry(std::uint32_t level) const;
    void CheckType(std::uint32_t pixelType) const;
    void CheckLevel(std::uint32_t level) const;
    void CheckWindow(const char* operation, std::uint32_t level, const Window& window,
                     std::span<const std::uint32_t> bands) const;
    void CheckWritable(const char* operation) const;
    void CheckThere(std::uint32_t level, const Window& window,
                    std::span<const std::uint32_t> bands);
    void ReadTile(std::uint32_t level, const Window& window, std::span<const std::uint32_t> bands,
                  void* pixels) const;
    void WriteTile(std::uint32_t level, const Window& window, std::span<const std::uint32_t> bands,
                   const void* pixels);
    void CheckMoved(const char* verb, const Window& window, bool taken) const;
    bool FillsTiles(std::span<const std::uint32_t> bands) const;
    void ReadTiles(std::uint32_t level, const Window& window, std::span<const std::uint32_t> bands,
                   unsigned char* pixels) const;
    void MergeTile(std::uint32_t level, const Window& tile, const Window& window,
                   std::span<const std::uint32_t> bands, const unsigned char* pixels);
    template <class T>
    zelm::RasterReader<T>& Typed() const;
    std::shared_ptr<const DocumentRecords> AnyRecords() const;

    // In this order: the module goes last.
    ModulePtr module;
    std::string name;
    zelm::RasterDataConnectionPtr connection;
    zelm::RasterReaderDispatchPtr reader;
    zelm::RasterProps props;
    std::shared_ptr<LentFile> file;  // null of a memory raster
    std::optional<PyramidHeader> header;
    std::uint32_t minLevel = 0;
    std::uint32_t maxLevel = 0;
    std::string recoveryNote;
    bool keepsCopies = false;
    std::vector<unsigned char> cleanMask;  // zeros, as many as a tile had samples that was written
    mutable std::shared_ptr<const DocumentRecords> records;  // null: to be read
    // Until when records are kept that are not settled.
    mutable std::chrono::steady_clock::time_point recordsExpire;
    mutable std::uint32_t unsettledLooks = 0;  // in a row
};

}  // namespace zmchost

#endif
