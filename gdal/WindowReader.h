// WindowReader: windows of one open pyramid, read by any number of threads at once.
//
// A thread that reads takes a TileReader for as long as it does, each with a reader of the module
// of its own: one that waits, or a new one. The first one works with the raster of the dataset and
// is taken before the others, so that a single thread meets the tile that it read last. No lock is
// held while pixels are read.
//
// A large window is read by several threads, if there are to be several: each copies whole tiles
// into its own parts of the caller's buffer (JobCrew.h, WindowParts.h). Only samples that no other
// one in the buffer overlaps are read so.
#ifndef ZMC_GDAL_WINDOWREADER_H
#define ZMC_GDAL_WINDOWREADER_H

#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

#include "gdal/LazyRaster.h"
#include "gdal/TileReader.h"

namespace zmcgdal {

class WindowReader {
public:
    // How the samples of a file are read.
    struct Manner {
        GDALDataType type = GDT_Unknown;  // what they are shown as
        bool missingAsZeros = false;
        std::uint32_t threads = 1;  // that may read one window, of a file behind no network
        // The raster is used by others while windows are read.
        bool leavesRaster = false;
        bool keepsTiles = true;  // as TileReader has it
    };

    // Both outlive this object.
    WindowReader(LazyRaster& pyramid, const zmchost::PyramidFileInfo& info, const Manner& manner);

    // As those of TileReader; any thread.
    GDALDataType Type() const { return shape.Type(); }
    bool IsPixelInterleaved() const { return shape.IsPixelInterleaved(); }
    bool IsHeld(const zelm::Rectangle& tile) const { return shape.IsHeld(tile); }
    zelm::Rectangle TileAt(std::uint32_t level, int tileX, int tileY) const {
        return shape.TileAt(level, tileX, tileY);
    }
    bool Read(std::uint32_t level, const zelm::Rectangle& window, const int* bands, int bandCount,
              const Target& target);
    // Several threads where that pays. The caller's progress is told on the caller's thread.
    bool Read(std::uint32_t level, const zelm::Rectangle& window, const int* bands, int bandCount,
              const Target& target, const GDALRasterIOExtraArg* extra);

    // The threads that would read such a window into any usual buffer.
    std::uint32_t ThreadsFor(const zelm::Rectangle& window, int bandCount) const;

    // Must be called when the file has changed. Nobody reads meanwhile.
    void Forget();

private:
    struct Reader {
        std::unique_ptr<LazyRaster> own;  // null where it works with that of the dataset
        TileReader tiles;
    };
    using ReaderPtr = std::unique_ptr<Reader>;
    // Gives the reader back when it goes.
    class Lease {
    public:
        explicit Lease(WindowReader& owner) : home(owner), reader(home.Take()) {}
        ~Lease() { home.GiveBack(std::move(reader)); }
        Lease(const Lease&) = delete;
        Lease& operator=(const Lease&) = delete;
        TileReader& Tiles() { return reader->tiles; }

    private:
        WindowReader& home;
        ReaderPtr reader;
    };
    // What is asked for; all of it outlives the reading.
    struct Request {
        std::uint32_t level;
        const zelm::Rectangle& window;
        const int* bands;
        int bandCount;
        const Target& target;
    };

    TileReader Over(LazyRaster& pyramid) const;
    ReaderPtr MakeReader() const;
    ReaderPtr Take();
    void GiveBack(ReaderPtr reader) noexcept;
    std::uint32_t BandsApart(int bandCount) const;
    bool ReadTogether(const Request& request, std::uint32_t threads,
                      const GDALRasterIOExtraArg* extra);

    LazyRaster& raster;
    const zmchost::PyramidFileInfo& layout;
    const Manner how;
    const TileReader shape;  // reads nothing
    std::mutex mutex;        // guards what follows
    ReaderPtr first;         // null while it is taken, or where there is none
    std::vector<ReaderPtr> idle;
};

}  // namespace zmcgdal

#endif
