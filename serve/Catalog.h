// Catalog: which names can be asked for, and what they stand for now.
//
// What was named when the server was started is served, and nothing else: a file by its own name,
// and the pyramid files of a folder by their paths below it, "sub/name". Where two have one name,
// the first that was named counts. Names are looked up at each request, and folders listed at each,
// so that files come, go and change without a restart.
//
// A name is a path of plain parts: one that is empty, begins with a dot, or has a zero in it, is
// nobody's. Links that leave a folder lead nowhere unless they are to be followed. No name reaches
// anything but a regular file of a plain file system: those of GDAL's, of URLs, of rasters in
// memory and of lent sources are looked for as files, and are not there.
//
// Any number of threads may call.
#ifndef ZMC_SERVE_CATALOG_H
#define ZMC_SERVE_CATALOG_H

#include <cstddef>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/Beneath.h"
#include "serve/ServedFile.h"
#include "serve/ServedRaster.h"

namespace zmcserve {

// What the name of a sidecar has behind that of its raster.
inline constexpr const char* kSidecar = ".aux.xml";

class Catalog {
public:
    static constexpr std::size_t kMostListed = 10000;  // entries that a listing looks at
    static constexpr std::size_t kMostDeep = 16;       // folders within each other
    static constexpr std::size_t kMostHeld = 64;       // rasters that are kept open

    // `named` are paths of files and folders. Throws zmchost::Error for one that is neither, and
    // for two files of one name.
    Catalog(const std::vector<std::string>& named, bool followLinks, zmchost::ModulePtr module);

    // The file of that name, in the state that it is in now. Throws Refusal: 404 where there is no
    // pyramid of that name, 400 for what can be no name, 403 for a link that leads out, 500 where
    // the system refuses.
    ServedFilePtr File(std::string_view name);
    // The sidecar beside the file of that name; null where it has none, nothing where there is no
    // such file. Throws Refusal as File does, but for 404.
    std::optional<ServedFilePtr> Sidecar(std::string_view name);
    // The file as a raster. Throws Refusal (500) too for a file whose header is damaged.
    ServedRasterPtr Raster(std::string_view name);
    // The same where it is open already and still is what the name stands for; else null. Takes no
    // more than a few calls of the system.
    ServedRasterPtr RasterIfOpen(std::string_view name);
    // The same where what stands beside it is still what it was, too, as for Raster.
    ServedRasterPtr RasterIfCurrent(std::string_view name);

    struct Listing {
        std::vector<std::string> names;  // sorted
        bool complete = true;            // false: there was more than is looked at
    };
    Listing List();

private:
    struct Root {
        std::string folder;
        std::string file;  // the name of the only file; empty: all below the folder
        platform::Links links;
    };
    struct Found {
        const Root* root = nullptr;
        std::string below;
        platform::FileIdentity identity;
    };
    struct Held {
        ServedRasterPtr raster;
        std::list<std::string>::iterator place;
    };

    Found Find(std::string_view name) const;
    ServedFilePtr Open(const Found& found, std::string_view name) const;
    ServedFilePtr FileOf(const Found& found, std::string_view name);
    ServedRasterPtr TakeHeld(std::string_view name, const Found& found);
    ServedRasterPtr TakeCurrent(std::string_view name, const Found& found,
                                const Companions& beside);
    void Hold(const std::string& name, ServedRasterPtr raster);
    void ListBelow(const Root& root, const std::string& folder, std::size_t depth,
                   std::size_t& looked, Listing& listing) const;

    std::vector<Root> roots;
    zmchost::ModulePtr module;
    std::mutex mutex;  // guards what follows
    std::unordered_map<std::string, Held> held;
    std::list<std::string> order;  // the one that was asked for last is the first
};

// Whether a name is a path of plain parts.
bool IsPlainName(std::string_view name);

}  // namespace zmcserve

#endif
