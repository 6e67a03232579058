// New pyramids through GDAL: copies of other datasets, and datasets that are written block by
// block.
//
// A copy goes straight through the builder. Blocks that come in any order first go to a spool, a
// pyramid of one level under a temporary name beside the target; when the dataset is closed the
// builder makes the target from it, with all levels and statistics, and the spool goes. So nothing
// half done ever bears the target's name, and every ordering takes writes in every order.
#ifndef ZMC_GDAL_CREATE_H
#define ZMC_GDAL_CREATE_H

#include <gdal_priv.h>

#include <memory>
#include <string>
#include <vector>

#include "gdal/Options.h"
#include "gdal/Versions.h"
#include "host/build/BuildFile.h"

namespace zmcgdal {

class Dataset;

// Entries of the driver.
GDALDataset* CreateCopy(const char* target, GDALDataset* source, int strict, Items options,
                        GDALProgressFunc progress, void* progressData);
GDALDataset* CreateNew(const char* target, int width, int height, int bands, GDALDataType type,
                       Items options);

// What a dataset under creation knows beside its spool.
class Creation {
public:
    Creation(std::string targetName, CreationOptions creationOptions,
             std::unique_ptr<zmchost::BuildFile> spoolFile, std::size_t blockCount,
             std::size_t bandCount);

    bool IsWritten(std::size_t block, std::size_t band) const {
        return written[block * bands + band];
    }
    void MarkWritten(std::size_t block, std::size_t band) {
        written[block * bands + band] = true;
        lost[block * bands + band] = false;
    }
    // The spool did not take a block: without it there will be no target.
    void MarkLost(std::size_t block, std::size_t band) noexcept {
        lost[block * bands + band] = true;
    }
    // The file that pixels are gathered in; a mask of the dataset stands beside it meanwhile.
    const std::string& SpoolName() const { return spool->Path(); }
    ~Creation();
    // Every block has been written, and none will be any more.
    bool IsSealed() const { return sealed; }

    // Throws zmchost::Error where no target can be made of the dataset by such options.
    void Check(Dataset& dataset, const zmchost::BuildOptions& build) const;
    void Check(Dataset& dataset) const { Check(dataset, options.build); }
    // Levels that the user asks for are made at the end; the method counts for all of them. A
    // request that is refused changes nothing.
    CPLErr ChooseLevels(Dataset& dataset, const char* resampling, int count, const int* factors);

    // Builds the target from the spool. Failures are reported to GDAL, and there is no target then.
    bool Finish(Dataset& dataset);

private:
    void KeepMask(Dataset& dataset) const;

    std::string target;
    CreationOptions options;
    std::unique_ptr<zmchost::BuildFile> spool;
    std::size_t bands;
    std::vector<bool> written;  // by block and band
    std::vector<bool> lost;     // likewise
    bool sealed = false;

    // Puts what was set into the finished file of that path, which has no name yet.
    void Embed(Dataset& dataset, const std::string& made) const;
};

}  // namespace zmcgdal

#endif
