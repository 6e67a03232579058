// What records beside a pyramid note of the command that made them: its source and its options, so
// that update needs no words but those of the change, and what is known of the scenes of a source
// of many rasters, so that update opens few of them.
#ifndef ZMC_TOOLS_UPDATENOTE_H
#define ZMC_TOOLS_UPDATENOTE_H

#include <string>

#include "gdal/GdalRasterSource.h"
#include "tools/BuildWords.h"

namespace zmctools {

// Throws Failure for a name that is not UTF-8.
std::string NoteOf(const BuildWords& words, const GDALDataset& source);

struct Noted {
    BuildWords words;    // with which the target was built
    std::string scenes;  // KnownScenes
};
// Throws Failure for what is no such note.
Noted ReadNote(const std::string& target, const std::string& note);

// Leaves records of a pyramid that was built just now. Throws Interruption too.
void KeepRecords(const BuildWords& words, const GDALDataset& source,
                 zmcgdal::GdalRasterSource& pixels, zmchost::BuildOptions options);

}  // namespace zmctools

#endif
