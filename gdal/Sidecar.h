// CopySidecar, SaveSidecar: what a pyramid file has no place for and what stands beside it keeps.
#ifndef ZMC_GDAL_SIDECAR_H
#define ZMC_GDAL_SIDECAR_H

#include <cpl_string.h>
#include <gdal_priv.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "host/build/FullStatistics.h"

namespace zmcgdal {

class Archive;
class Dataset;
class OpenFile;

// What the names of companions of a raster end with, behind the raster's own name: GDAL's sidecar,
// mask of the whole dataset, and levels that stand in no file of ours.
inline constexpr const char* kSidecarEnding = ".aux.xml";
inline constexpr const char* kMaskEnding = ".msk";
inline constexpr const char* kOverviewsEnding = ".ovr";

// Takes georeference, control points, no-data values, descriptions, units, scale and offset,
// category names, attribute tables, colour interpretation, every metadata domain and a mask of the
// whole dataset from `source`. Statistics are not taken: the file has its own.
CPLErr CopySidecar(GDALDataset& source, Dataset& target, bool strict);

// Has the sidecar of `target` keep the digits that a file does not of statistics that were stored
// in it; `inFile` is that file's.
void KeepStatistics(const std::vector<zmchost::FullStatistics>& stored, Dataset& target,
                    Archive& inFile);

// Writes what was set, and closes the dataset. Throws zmchost::Error, of the pyramid that the user
// calls `name`, where GDAL could not save all of it; what there is of it by then is anything.
void SaveSidecar(std::unique_ptr<Dataset> dataset, const std::string& name);

// The same, but what a sidecar would tell goes into the file, in front of its records; a mask still
// stands beside it. The dataset is open for update and was built just now. Throws zmchost::Error.
void EmbedSidecar(std::unique_ptr<Dataset> dataset, const std::string& name);

// What was built of a raster, and where what a pyramid has no place for goes.
struct Built {
    std::vector<std::uint32_t> bands;  // from 0, in their order; empty: all
    std::string noData;                // in place of that of the source: a number, "none", or empty
    bool embed = false;                // into the file, a mask aside
    std::string name;                  // of the pyramid, for messages
    std::string base;                  // what stands beside it has names that begin with this
};

// Keeps what `source` tells besides pixels, and the digits of the statistics that were stored.
// False where that failed, reported to GDAL or not; throws what SaveSidecar does.
bool KeepSidecar(GDALDataset& source, const Built& built,
                 const std::vector<zmchost::FullStatistics>& stored,
                 std::shared_ptr<OpenFile> file);

// Ends the use of the mask that a dataset has in `file`, and reads that once more: of a disk that
// was full some versions of GDAL tell neither when they write nor when they close. The dataset can
// only be closed then. Throws zmchost::Error, of the pyramid that the user calls `name`.
void CloseMask(Dataset& dataset, const std::string& file, const std::string& name);

// A sidecar with this item was made of all that the file itself keeps.
inline constexpr const char* kEmbeddedDomain = "ZMCPYRAMID_SIDECAR";
inline constexpr const char* kEmbeddedItem = "EMBEDDED";

// Whether a metadata domain has statistics, and its items that are none.
bool HasStatistics(CSLConstList items);
CPLStringList WithoutStatistics(CSLConstList items);

}  // namespace zmcgdal

#endif
