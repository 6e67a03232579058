// Options that users give this driver as texts.
#ifndef ZMC_GDAL_OPTIONS_H
#define ZMC_GDAL_OPTIONS_H

#include <cpl_string.h>

#include <cstdint>
#include <optional>
#include <string>

#include "gdal/SampleType.h"
#include "gdal/VsiSource.h"
#include "host/build/PyramidBuilder.h"

namespace zmcgdal {

// Described to users as XML: GDAL prints it and checks against it.
extern const char* const kOpenOptionsXml;
extern const char* const kCreationOptionsXml;

struct OpenOptions {
    SignedByteAs signedByteAs = SignedByteAs::Own;
    bool keepCopies = false;      // zmchost::Raster::KeepCopies
    bool missingAsZeros = false;  // pixels that an incomplete file does not have
    bool statistics = false;      // are renewed when a dataset whose pixels were edited is closed
    // The overview, counted from 0, that is shown in place of the raster; empty for the raster.
    std::optional<int> overview;
    bool alone = false;  // without coarser overviews
    std::uint64_t remoteBytes = kRemoteBytes;
    std::uint32_t threads = 1;  // that read a large window
    bool shared = false;        // threads are to read one dataset at once (Dataset::Share)
    // What a reader has of a tile serves its next window, as GDAL asks for one band or line after
    // the other.
    bool keepsTiles = true;
};

// Where NUM_THREADS is not among them, GDAL's configuration option GDAL_NUM_THREADS tells it. A
// number of threads that cannot be understood is a warning of GDAL's, and counts for one.
OpenOptions OpenOptionsFrom(CSLConstList options);

// Names of GDAL's overview methods and of this project's, in any case.
std::optional<zmchost::Resampling> ResamplingFrom(const char* word);

struct CreationOptions {
    zmchost::BuildOptions build;
    bool signedByte = false;  // PIXELTYPE=SIGNEDBYTE
    bool embed = false;       // what a sidecar would keep goes into the file
};

// Reads the creation options; reports the first bad one to GDAL and gives nothing.
std::optional<CreationOptions> ParseCreationOptions(CSLConstList options);

}  // namespace zmcgdal

#endif
