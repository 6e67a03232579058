// PyramidPlan: a build that was laid out to be made in parts, as the file TARGET.zmcplan tells it.
//
// A plan names the source, and the target and its file by their names alone: both stand in the
// plan's own folder. The object of a store is named in full, and the file is an outline of it
// there. It carries the words of the command line that made it, the parts, what tells its source,
// target and file again, and a checksum over all of that, which is the number of the build in the
// records of its parts too: a plan that was changed has no record.
#ifndef ZMC_TOOLS_PYRAMIDPLAN_H
#define ZMC_TOOLS_PYRAMIDPLAN_H

#include <cstdint>
#include <string>
#include <vector>

#include "host/build/PartFolder.h"
#include "host/build/PartGrid.h"
#include "tools/BuildWords.h"

namespace zmctools {

inline constexpr const char* kPlanFileEnding = ".zmcplan";

// The upload that a target in a store is made by.
struct PlannedUpload {
    std::string id;                     // what the store calls it; empty: the target is a file
    std::string mark;                   // of the finished object
    std::vector<std::uint64_t> bounds;  // of its parts, as PlanRanges has them
};

struct PyramidPlan {
    BuildWords words;  // target: as it is reached from here
    std::string sourceState;
    std::string scenes;  // of a source of many rasters, its layout; not read with the plan
    std::uint64_t sceneCount = 0;  // 0: the source is one raster
    std::uint64_t facts = 0;       // of PartBuild
    std::string pyramid;           // name of the file that was laid out
    std::uint64_t number = 0;      // of that file in the file system
    std::string targetState;       // when the plan was made
    zmchost::PartGrid grid;
    PlannedUpload upload;
    bool durable = true;         // records and tiles are brought to the disk part by part
    std::string path;            // of the plan itself
    std::uint64_t checksum = 0;  // set by Write and Read

    bool IsInStore() const { return !upload.id.empty(); }
    // The name that the file is laid out beside: the target, or the plan of one in a store.
    const std::string& LocalName() const { return IsInStore() ? path : words.target; }
    // Where the file is, and its records.
    std::string PyramidPath() const;
    zmchost::PartFolder Records() const;
    // Whether the file is there, and the one that was laid out.
    bool HasFile() const;
    // Throws Failure if not.
    void CheckFile() const;
    // Whether the target is that file: it was finished.
    bool IsFinished() const;

    // Makes the folder of the records, and gives the plan its name, in one step; a plan of that
    // name is not replaced. Throws Failure or Error, and leaves nothing then.
    void Write();
    // Throws Failure for what is no plan, one of another version or one that was changed.
    static PyramidPlan Read(const std::string& file);

    // As it was when the plan was made, as far as that can be told of a source of many rasters
    // without a look at them. Throws Failure.
    DatasetPtr OpenSource() const;

    // What scratch files of workers into a store are called by, in that folder, or in the plan's if
    // it is empty (SideFile).
    std::string ScratchBase(const std::string& folder) const;
    static constexpr const char* kScratchKind = "zmcscratch";

    // Removes records and plan, the file if it was not finished, and what killed workers left in
    // the plan's folder.
    void Discard() const;
};

}  // namespace zmctools

#endif
