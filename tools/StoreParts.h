// StoreParts: how a pyramid that is planned into a store gets there.
//
// A worker makes its part in a scratch file of its own, sends the ranges of the upload that the
// part fills alone, and leaves the rest of its bytes as pieces beside its record, with the tiles
// from which the levels above are made. Who finishes puts all pieces into the outline, and sends
// what is not in the store yet out of that.
//
// One thread at a time; any number of processes. Failures are thrown as zmchost::Error or Failure.
#ifndef ZMC_TOOLS_STOREPARTS_H
#define ZMC_TOOLS_STOREPARTS_H

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "host/build/PartExtents.h"
#include "host/file/PyramidHeader.h"
#include "platform/FileLock.h"
#include "store/ObjectStore.h"
#include "store/UploadRanges.h"
#include "tools/PyramidPlan.h"

namespace zmctools {

// The ranges for a file that is laid out, of `leastRange` bytes at least. Throws Failure, of the
// target, for a file that no upload can hold.
std::vector<std::uint64_t> UploadBounds(const std::string& target,
                                        const zmchost::PyramidHeader& header,
                                        const zmchost::PartGrid& grid, std::uint64_t leastRange);

class StoreParts {
public:
    // The plan is one into a store, and lives as long.
    explicit StoreParts(const PyramidPlan& openedPlan);
    ~StoreParts();
    StoreParts(const StoreParts&) = delete;
    StoreParts& operator=(const StoreParts&) = delete;

    // From now on all is made in a file of this process, in that folder, or in the plan's if it is
    // empty: Path(). It goes with this object. Else it is made in the outline.
    void UseScratch(const std::string& folder);
    const std::string& Path() const { return path; }
    // Drops all tiles of the scratch file.
    void Clear() const;

    // Of a part that was just made: sends its ranges, keeps its pieces, and leaves a record of
    // that.
    void Send(std::uint64_t part);

    // Puts the pieces of a part into the file, and knows its ranges from then on. False where its
    // record or its pieces are missing, damaged or of other parts.
    bool Restore(std::uint64_t part);
    // Gives the disk back what the tiles of a part take in the file, but for its pieces.
    void Drop(std::uint64_t part);

    // Once all parts have been restored and the file has all the rest: sends what the store does
    // not have, and completes the upload.
    void SendRest();
    // Has the file beside the object, its name with `ending` behind; where `file` is empty, none.
    void PutBeside(const char* ending, const std::string& file);
    void Complete();

private:
    struct Fill {
        std::vector<zmchost::Extent> all;
        std::vector<std::uint64_t> ranges;
        std::vector<zmchost::Extent> pieces;
    };
    Fill FillOf(std::uint64_t part) const;
    zmcstore::UploadedPart SendRange(zelm::files::ByteSource& source, std::uint64_t range,
                                     std::uint64_t end);
    std::uint64_t KeepPieces(zelm::files::ByteSource& source, std::uint64_t part,
                             const std::vector<zmchost::Extent>& pieces) const;
    bool TakePieces(zelm::files::ByteSource& target, std::uint64_t part,
                    const std::vector<zmchost::Extent>& pieces, std::uint64_t sum) const;

    const PyramidPlan& plan;
    const zmchost::PyramidHeader header;
    const std::unique_ptr<zmcstore::ObjectStore> store;
    std::string path;
    bool isScratch = false;
    platform::FileLock lock;                     // of the scratch file
    std::vector<zmcstore::UploadedPart> stored;  // what the store has
};

// Drops the plan with all that was done; the upload of one into a store too. Where the store does
// not let go of that, a warning tells of it.
void DropPlan(const PyramidPlan& plan);

}  // namespace zmctools

#endif
