// LazyRaster: the module's view of a file, opened when it is first needed.
//
// GDAL opens many files only to look at their size and place, and the header tells those; the
// module parses the file's statistics as well. What it refuses then fails the read that asked.
#ifndef ZMC_GDAL_LAZYRASTER_H
#define ZMC_GDAL_LAZYRASTER_H

#include <cpl_error.h>

#include <exception>
#include <optional>
#include <string>
#include <utility>

#include "host/raster/Raster.h"

namespace zmcgdal {

// The module, loaded once per process.
inline const zmchost::ModulePtr& SharedModule() {
    static const zmchost::ModulePtr module = zmchost::Module::Load();
    return module;
}

class LazyRaster {
public:
    // With `keepCopies` its stores keep the document of before until they have reached the disk.
    LazyRaster(std::string fileName, bool keepCopies)
        : name(std::move(fileName)), keepsCopies(keepCopies) {}

    // Throws zmchost::Error, each time anew, if the module does not open the file.
    zmchost::Raster& Get() {
        if (!raster) {
            raster.emplace(zmchost::Raster::Open(SharedModule(), name));
            raster->KeepCopies(keepsCopies);
        }
        return *raster;
    }

    // Calls visit(zelm::RasterReader<T>&) with the module's reader. What is thrown goes to GDAL as
    // a failure, and the answer is false.
    template <class Visitor>
    bool Visit(Visitor&& visit) {
        try {
            Get().Visit(std::forward<Visitor>(visit));
            return true;
        } catch (const std::exception& error) {
            CPLError(CE_Failure, CPLE_AppDefined, "%s", error.what());
            return false;
        }
    }

private:
    std::string name;
    bool keepsCopies;
    std::optional<zmchost::Raster> raster;
};

}  // namespace zmcgdal

#endif
