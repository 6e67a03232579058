// BuildFile: the temporary file in which a pyramid grows, beside the name that it is to bear.
//
// The file is called ".NAME.zmcbuild-PROCESS-RANDOM.tmp". Commit flushes it to disk and gives it
// the name in one step, so that others see the old file or the finished one and nothing between.
// A file that it replaces leaves it owner, group, mode, access list and extended attributes, as far
// as this process may give them; a new one has what the system gives to new files (umask). Without
// Commit the destructor removes it. It is locked all the while; what a killed process left is not,
// and is removed by the next build of the same target.
#ifndef ZMC_HOST_BUILD_BUILDFILE_H
#define ZMC_HOST_BUILD_BUILDFILE_H

#include <cstdint>
#include <string>

#include "host/file/SideFile.h"
#include "platform/FileLock.h"
#include "platform/FileSystem.h"

namespace zmchost {

class BuildFile {
public:
    // What temporary files are called by: those of builds, which belong to a process, and those of
    // plans, ".NAME.zmcplan-PROCESS-RANDOM.tmp", which stay until somebody finishes them. An
    // outline is one of a plan whose tiles go elsewhere: no room is taken for them.
    enum class Kind { Build, Plan, Outline };

    // Refuses a target that is a folder, is read-only, or exists without `overwrite`; removes stale
    // temporary files of the target; makes an empty temporary file. Throws Error.
    explicit BuildFile(const std::string& target, bool overwrite, Kind kind = Kind::Build);
    // Takes on a file of a plan: locks it, and cuts off what an attempt to finish it has stored
    // behind its tiles. It stays if it is not committed. Throws Error, also while somebody else has
    // it.
    BuildFile(const std::string& target, bool overwrite, const std::string& planned);
    ~BuildFile();
    BuildFile(const BuildFile&) = delete;
    BuildFile& operator=(const BuildFile&) = delete;

    const std::string& Path() const { return path; }

    // From now on the file stays when this object goes; its lock does not.
    void Keep() { kept = true; }

    // The path of a file of a plan under that name, in the folder of the target. Files of builds
    // and plans may have companions, whose names are theirs with one of these behind.
    static std::string PlannedPath(const std::string& target, const std::string& name);
    static constexpr const char* kPlanEnding = ".plan";
    static constexpr const char* kNewPlanEnding = ".new";
    static constexpr const char* kPartsEnding = ".parts";
    // Removes files of plans whose lock nobody has and that are not to be spared, and the
    // companions of files that are gone.
    static void RemoveAbandoned(const std::string& target, const SideFile::Spare& spare);

    // Throws Error if the disk has no room for `size` bytes.
    void CheckSpace(std::uint64_t size) const;
    // Takes them, once the file has its beginning; the module would not tell that they ran out.
    void Reserve(std::uint64_t size) const;

    // From now on nothing here waits for the disk: the system writes the file when it likes.
    void LeaveToSystem() { durable = false; }
    // Lets the disk begin with what the file has; Flush waits for less then.
    void BeginFlush() const {
        if (durable) platform::BeginSync(path);
    }
    // Waits until the file is on the disk, giving back what was reserved and not used.
    void Flush() const;
    // Gives the file its name. A target that came into being meanwhile is refused as at the start.
    void Commit();

private:
    void CheckTarget() const;

    std::string given;  // the target as the caller named it, for messages
    bool overwrite;
    std::string target;  // where links led
    std::string path;
    platform::FileLock lock;  // of the temporary file, so that nobody takes it for a left-over
    bool outline = false;
    bool durable = true;
    bool kept = false;  // it does not go with this object
};

}  // namespace zmchost

#endif
