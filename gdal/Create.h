// New pyramids through GDAL: copies of other datasets, and datasets that are written block by
// block.
//
// A copy goes straight through the builder. Blocks that come in any order go to a draft, which is
// laid out as the whole pyramid under a temporary name beside the target, each to its final place.
// When the dataset is closed the builder makes the levels and statistics within the draft, and it
// gets its name. So nothing half done ever bears the target's name, every ordering takes writes in
// every order, and the disk holds each pixel once. Where other levels are asked for while there are
// pixels in the draft already, the builder makes the target from it as from any source.
#ifndef ZMC_GDAL_CREATE_H
#define ZMC_GDAL_CREATE_H

#include <gdal_priv.h>

#include <cstdint>
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

// What a dataset under creation knows beside its draft.
class Creation {
public:
    Creation(std::string targetName, CreationOptions creationOptions,
             std::unique_ptr<zmchost::BuildFile> draftFile, std::size_t blockCount,
             std::size_t bandCount);

    bool IsWritten(std::size_t block, std::size_t band) const {
        return written[block * bands + band];
    }
    void MarkWritten(std::size_t block, std::size_t band) {
        written[block * bands + band] = true;
        lost[block * bands + band] = false;
    }
    // The draft has so many bytes more: now and then the disk is set on to them, so that closing
    // does not wait for all of it.
    void NoteBytes(std::uint64_t bytes) {
        unflushed += bytes;
        if (unflushed < kFlushedAtOnce) return;
        unflushed = 0;
        draft->BeginFlush();
    }
    // The draft did not take a block: without it there will be no target.
    void MarkLost(std::size_t block, std::size_t band) noexcept {
        lost[block * bands + band] = true;
    }
    // The file that pixels are gathered in; a mask of the dataset stands beside it meanwhile.
    const std::string& DraftName() const { return draft->Path(); }
    ~Creation();
    // Every block has been written, and none will be any more.
    bool IsSealed() const { return sealed; }

    // Throws zmchost::Error where no target can be made of the dataset by such options.
    void Check(Dataset& dataset, const zmchost::BuildOptions& build) const;
    // Levels that the user asks for are made at the end; the method counts for all of them. A
    // request that is refused changes nothing.
    CPLErr ChooseLevels(Dataset& dataset, const char* resampling, int count, const int* factors);

    // Makes the target of the draft. Failures are reported to GDAL, and there is no target then.
    bool Finish(Dataset& dataset);

private:
    void KeepMask(Dataset& dataset) const;
    bool IsUntouched() const;
    void LayOutAnew(Dataset& dataset, const zmchost::BuildOptions& build);
    void MakeTarget(Dataset& dataset);
    void CompleteDraft(Dataset& dataset, zmchost::RasterSource& source);

    std::string target;
    CreationOptions options;
    std::unique_ptr<zmchost::BuildFile> draft;
    std::size_t bands;
    std::vector<bool> written;  // by block and band
    std::vector<bool> lost;     // likewise
    static constexpr std::uint64_t kFlushedAtOnce = std::uint64_t{16} << 20;
    std::uint64_t unflushed = 0;
    bool sealed = false;

    // Puts what was set into the finished file of that path, which has no name yet.
    void Embed(Dataset& dataset, const std::string& made) const;
};

}  // namespace zmcgdal

#endif
