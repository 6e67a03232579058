// PyramidUpdate: a pyramid whose source has changed in places, brought to what a build of the
// source as it is now would make of it, byte for byte, without making all of it.
//
//     PyramidUpdate update(module, source, "scene.pyr", options);
//     update.Run({{4096, 2048, 1000, 1000}});
//
// Renewed are the tiles of level 0 that a window touches, and of each coarser level those with a
// cell that comes from them, the margins of the reducer included. Level 0 of the pyramid is taken
// for the source everywhere else: what changed outside of the windows is not seen. Source and
// options are those of the build, but for pixels.
//
// Statistics come from records, which are kept beside the pyramid (PyramidRecords.h): blocks that
// hold a window are looked at anew. Without records all of level 0 is, in the pyramid.
//
// The pyramid is the old file until all that is new is on the disk beside it (UpdateJournal.h);
// what is cut off behind that is finished by whoever opens it for update next. One thread at a
// time; the work is done on as many as the options say. Throws Error, Cancelled, or what the source
// threw, with the pyramid as it was, or, where its text says so, to be finished.
#ifndef ZMC_HOST_BUILD_PYRAMIDUPDATE_H
#define ZMC_HOST_BUILD_PYRAMIDUPDATE_H

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "files/ByteSource.h"
#include "host/build/PyramidBuilder.h"

namespace zmchost {

struct UpdateReport {
    std::uint64_t tiles = 0;         // that were made anew, of all levels
    std::uint64_t blocks = 0;        // of level 0 that statistics were gathered of anew
    std::uint64_t bytesWritten = 0;  // into the pyramid
    double seconds = 0;
};

// What an update does with records.
struct UpdateRecords {
    bool use = false;   // statistics come from them; it is an Error if they are not of use
    bool keep = false;  // new ones are left; else those that are there go
    std::string note;   // kept with them: what the caller wants to know next time
};

class PyramidUpdate {
public:
    PyramidUpdate(ModulePtr loadedModule, RasterSource& rasterSource, std::string targetName,
                  BuildOptions buildOptions);

    // Called once, when the pyramid is finished but for what others put in: `updated` is the
    // file, open for writing, and `beside` what its companions are to be written as, with the
    // endings ".aux.xml" and ".msk". Those that are not written are removed with the update.
    std::function<void(const std::shared_ptr<zelm::files::ByteSource>& updated,
                       const std::string& beside)>
        beforeCommit;

    // `changed`: windows of level 0 within the raster, none of them empty.
    UpdateReport Run(const std::vector<Window>& changed, const UpdateRecords& records = {});

    // Looks at all of a finished pyramid once more and leaves records of it for later updates.
    void KeepRecords(const std::string& note);

private:
    ModulePtr module;
    RasterSource& source;
    std::string target;
    BuildOptions options;
};

}  // namespace zmchost

#endif
