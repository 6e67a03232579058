// ServedRaster: one pyramid file in one state, with all that requests ask of it.
//
// It belongs to a ServedFile: every sample, record and header comes out of the file that was
// opened. When the name comes to mean another file, or another state of it, there is a new
// ServedRaster, and this one goes with its last request. So no answer is made of two states.
//
// Levels count from 0, the finest, as in the file; zooms from 0, the coarsest level that has a
// pixel. Any number of threads may call; each borrows a reader of its own.
//
//     const ServedRasterPtr raster = service.catalog.Raster(name);
//     const auto reader = raster->Borrow(request.deadline);
//     const auto renderer = raster->RendererFor(style, *reader);
//     const auto picture = zmcrender::RenderWindow(*renderer, reader->Pixels(), window, 512, 512);
//     raster->File().CheckUnchanged();
#ifndef ZMC_SERVE_SERVEDRASTER_H
#define ZMC_SERVE_SERVEDRASTER_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "gdal/Dataset.h"
#include "host/file/PyramidHeader.h"
#include "host/raster/Raster.h"
#include "render/DatasetFacts.h"
#include "render/PixelSource.h"
#include "render/RasterFacts.h"
#include "render/Renderer.h"
#include "serve/Request.h"
#include "serve/ServedFile.h"

namespace zmcserve {

class Mercator;
class ServedRaster;
using ServedRasterPtr = std::shared_ptr<ServedRaster>;

// Where a raster lies, as the driver tells it.
struct Georeference {
    std::string wkt;  // WKT 2 of 2019
    // GDAL's, from pixels of the finest level that is there: x and y of its upper left corner are
    // the first and the fourth number.
    std::optional<std::array<double, 6>> transform;
};

// Takes a place through such numbers.
inline void Apply(const std::array<double, 6>& transform, double& x, double& y) {
    const double east = transform[0] + x * transform[1] + y * transform[2];
    y = transform[3] + x * transform[4] + y * transform[5];
    x = east;
}

// The files beside a raster that tell of it, and the state in which each was found.
struct Companions {
    std::string path;                   // of the raster, for the driver
    std::vector<std::string> siblings;  // names beside it that may be looked at
    std::string version;                // of all of them, letters and digits
    friend bool operator==(const Companions&, const Companions&) = default;
};

class ServedRaster : public std::enable_shared_from_this<ServedRaster> {
public:
    // What one thread reads with. It goes back to its raster when it ends.
    class Reader {
    public:
        Reader(ServedRaster& owner, const Deadline& deadline);
        ~Reader();
        Reader(const Reader&) = delete;
        Reader& operator=(const Reader&) = delete;

        // All samples, hidden by the mask where there is one. Reads throw Refusal (503) once the
        // deadline has passed, and zmchost::Error.
        zmcrender::PixelSource& Pixels();
        zmchost::Raster& Raster();
        // The raster as a dataset of the driver; null where it shows none. Whoever uses it catches
        // what it reports (gdal/ErrorCatcher.h).
        GDALDataset* Dataset();
        // Where the raster lies in Web Mercator; it stays with this reader for the next who borrows
        // it. Throws Refusal (404) where it has no place there.
        const Mercator& InMercator();

    private:
        friend class ServedRaster;
        class MaskedPixels;
        struct Tools;
        std::shared_ptr<ServedRaster> raster;
        std::unique_ptr<Tools> tools;
    };

    // Throws Refusal (500) where the file is no pyramid or its header is damaged.
    ServedRaster(ServedFilePtr opened, Companions beside, zmchost::ModulePtr module);
    ~ServedRaster();

    const std::string& Name() const { return file->Name(); }
    const ServedFile& File() const { return *file; }
    const ServedFilePtr& FilePtr() const { return file; }
    const Companions& Beside() const { return companions; }
    const zmchost::PyramidHeader& Header() const { return header; }
    std::uint32_t SampleBytes() const;
    std::uint64_t PixelBytes() const { return std::uint64_t{SampleBytes()} * header.bandCount; }

    // Levels that have pixels. A raster without any has Levels() 0.
    std::uint32_t FinestLevel() const { return header.levelMin; }
    std::uint32_t CoarsestLevel() const { return coarsest; }
    std::uint32_t Levels() const { return levels; }
    zelm::LevelGeometry Geometry(std::uint32_t level) const { return header.Geometry(level); }
    // All of level 0, as far as the finest level tells of it, in its pixels.
    zmchost::Window Whole() const;
    // The level of a zoom; none where there is no such.
    std::optional<std::uint32_t> LevelOfZoom(std::uint64_t zoom) const;
    std::uint32_t MostZoom() const { return levels == 0 ? 0 : levels - 1; }

    // An entity tag of what depends on the file alone, and of what depends on what stands beside it
    // too; empty where none can be told.
    std::string ETag(std::string_view variant = {}) const { return file->ETag(variant); }
    std::string ETagWithCompanions(std::string_view variant = {}) const;

    std::unique_ptr<Reader> Borrow(const Deadline& deadline);

    // What is archived, and what the driver tells; found when it is first asked for. Throw
    // zmchost::Error.
    const zmcrender::RasterFacts& Facts();
    const Georeference& Place();
    // Whether RendererFor has that of a style already, and only hands it out.
    bool HasRenderer(const zmcrender::Style& style);
    // The renderer of a style, which is kept for the next request. Throws zmcrender::StyleError.
    std::shared_ptr<const zmcrender::Renderer> RendererFor(const zmcrender::Style& style,
                                                           Reader& reader);

private:
    static constexpr std::size_t kMostRenderers = 32;
    static constexpr std::size_t kMostReaders = 16;  // that wait for the next request
    struct Told;

    using RendererPtr = std::shared_ptr<const zmcrender::Renderer>;

    const Told& Tell();
    RendererPtr TakeRenderer(const zmcrender::Style& style);  // null: there is none

    ServedFilePtr file;
    Companions companions;
    zmchost::ModulePtr module;
    zmchost::PyramidHeader header;
    std::uint32_t coarsest = 0;
    std::uint32_t levels = 0;

    std::mutex tellMutex;  // guards `told`, which does not change once it is there
    std::unique_ptr<Told> told;
    std::mutex mutex;  // guards what follows
    std::vector<std::unique_ptr<Reader::Tools>> idle;
    std::list<std::pair<zmcrender::Style, RendererPtr>> renderers;
};

}  // namespace zmcserve

#endif
