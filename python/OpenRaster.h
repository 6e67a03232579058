// OpenRaster: one pyramid as Python uses it, without anything of Python's.
//
// Any number of threads may call, and go on with what they do while another one closes it. Of a
// raster that is open for reading no lock is held while pixels are read, but for one behind a
// network, whose requests are planned for one window after the other; all other calls, and all of a
// raster that is open for writing, come one after the other.
//
// Bands count from 1, levels from 0, the finest. What fails is thrown as zmchost::Error, or as
// BadArgument where the caller has asked for what there is not. GDAL's warnings go to the handler
// of the calling thread.
#ifndef ZMC_PYTHON_OPENRASTER_H
#define ZMC_PYTHON_OPENRASTER_H

#include <gdal_priv.h>

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "gdal/Dataset.h"
#include "host/build/PyramidBuilder.h"
#include "python/Facts.h"

namespace zmcpython {

// Starts Xerces-C++ and GDAL, with our driver among its own.
void StartLibraries();

class OpenRaster {
public:
    struct Manner {
        bool update = false;
        bool renews = true;         // levels, statistics and histograms of what was written
        std::string resampling;     // of these levels, as GDAL names it; empty: as for a build
        std::uint32_t threads = 1;  // that read one large window
        bool missingAsZeros = false;
    };
    struct Level {
        std::uint32_t number, width, height;
    };
    // What the raster is made of.
    struct Layout {
        std::uint32_t width = 0, height = 0, bands = 0, pixelType = 0, tileSize = 0;
        std::string ordering;
        std::vector<Level> levels;
        std::uint64_t bytesMissing = 0;
        std::uint64_t fileSize = 0;
    };
    struct NewRaster {
        std::uint32_t width = 0, height = 0, bands = 0, pixelType = 0;
        std::vector<std::string> options;  // of creation, as GDAL takes them
        GivenFacts facts;
    };

    // A file, a name of one of GDAL's file systems, or a URL.
    static std::unique_ptr<OpenRaster> Open(const std::string& name, const Manner& manner);
    // `name` stands for the source in messages. Nothing is looked for beside it.
    static std::unique_ptr<OpenRaster> Open(std::shared_ptr<zelm::files::ByteSource> source,
                                            const std::string& name, const Manner& manner);
    // One that is written window by window, and gets its name when it is closed.
    static std::unique_ptr<OpenRaster> Create(const std::string& name, const NewRaster& raster);
    ~OpenRaster();
    OpenRaster(const OpenRaster&) = delete;
    OpenRaster& operator=(const OpenRaster&) = delete;

    const std::string& Name() const { return name; }
    const Layout& Shape() const { return layout; }
    // As which samples are read and written; with a signed byte's bits, or wider, where GDAL has no
    // type for it.
    GDALDataType SampleType() const { return sampleType; }
    std::size_t SampleSize() const;
    // Bytes that the samples of a window take. Throws BadArgument for a window that is empty or not
    // in the level, and for bands that there are not; Error where the file cannot hold so many.
    std::uint64_t Judge(std::uint32_t level, const zelm::Rectangle& window,
                        const std::vector<int>& bands) const;

    // The window has been judged, and the target has room for it.
    void Read(std::uint32_t level, const zelm::Rectangle& window, std::vector<int> bands,
              const zmcgdal::Target& target);
    // Whether a sample can be masked at all.
    bool HasMask(const std::vector<int>& bands);
    // One byte for each sample, band after band: 0 where a sample is not valid.
    void ReadMask(std::uint32_t level, const zelm::Rectangle& window, const std::vector<int>& bands,
                  unsigned char* valid);
    // Into the finest level.
    void Write(const zelm::Rectangle& window, std::vector<int> bands, const zmcgdal::Target& from);

    Facts Told();
    struct Statistics {
        double minimum = 0, maximum = 0, mean = 0, standardDeviation = 0;
    };
    struct Histogram {
        double lower = 0, upper = 0;
        std::vector<std::uint64_t> counts;
    };
    // Those that the file or its sidecar keeps.
    std::optional<Statistics> StatisticsOf(int band);
    std::optional<Histogram> HistogramOf(int band);
    // Red, green, blue and alpha, four bytes for each colour; empty where there is no palette.
    std::vector<std::uint8_t> PaletteOf(int band);

    // Brings to the disk what was written, and closes; what is called then is a BadArgument. Does
    // nothing when called again, or to a raster that is read. Of a raster that was created, nothing
    // is left where `keep` is false.
    void Close(bool keep = true);

private:
    OpenRaster(std::string rasterName, Manner opened);
    void Show(std::shared_ptr<zmcgdal::OpenFile> opened, const std::string& sidecarName,
              bool alone);
    zmcgdal::Dataset& LevelOf(std::uint32_t level);
    GDALRasterBand& BandOf(int band);
    void Renew();
    void CheckOpen() const;
    [[noreturn]] void Fail(const std::string& operation, const std::string& reason) const;

    const std::string name;
    const Manner manner;
    Layout layout;
    GDALDataType sampleType = GDT_Unknown;
    std::mutex mutex;  // guards what follows, but for pixels of a raster that is read
    std::unique_ptr<zmcgdal::Dataset> dataset;
    std::optional<bool> shared;  // whether masks are read without the lock
    bool created = false;
    bool written = false;
};

}  // namespace zmcpython

#endif
