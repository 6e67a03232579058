// SidecarStage: what stands beside a pyramid (its sidecar .aux.xml, its mask .msk) replaced
// together with it.
//
// Three files cannot get their names in one step, so the step that counts is the pyramid's own. The
// companions of a new file are written, before it gets its name, as
//
//     .NAME.zmcside-NUMBER-END.aux.xml    .NAME.zmcside-NUMBER-END.msk
//
// with its number in the file system, which stays when it is renamed, and the end of its tiles. Who
// opens NAME and finds a staged sidecar of that very file takes the staged ones, and otherwise
// those under the usual names: so the old file is seen with the old ones and the new file with the
// new ones, wherever the process that builds is ended. Settling gives them their usual names; the
// sidecar comes last, since by it they are known. A pyramid without a sidecar has one that is empty
// staged. Beside them lies
//
//     .NAME.zmcside-NUMBER-END.lock
//
// which is locked for as long as they are wanted, from before the first of them is there: what
// nobody holds, and belongs to no file of that name, is left over.
//
// Names are those that the user gave, links not resolved, as GDAL has it. What is here throws
// zmchost::Error, but where it says so.
#ifndef ZMC_GDAL_SIDECARSTAGE_H
#define ZMC_GDAL_SIDECARSTAGE_H

#include <cstdint>
#include <string>

#include "host/file/PyramidHeader.h"
#include "platform/FileLock.h"

namespace zmcgdal {

// What the names of a pyramid's companions begin with: the name of a staged one if there is a
// sidecar of this file, which `source` is open on, else `name`.
std::string SidecarBase(const std::string& name, const zelm::files::ByteSource& source,
                        const zmchost::PyramidHeader& header);

// Gives staged companions of that file their usual names, if there are any.
void SettleSidecar(const std::string& name, const zelm::files::ByteSource& source,
                   const zmchost::PyramidHeader& header);

// The companions of one file that is being built.
class SidecarStage {
public:
    // Settles or removes what builds that were ended have left.
    explicit SidecarStage(std::string targetName);
    // Settles them if the file has its name, and else removes them. Throws nothing.
    ~SidecarStage();
    SidecarStage(const SidecarStage&) = delete;
    SidecarStage& operator=(const SidecarStage&) = delete;

    // Where they are to be written: the base of their names, for the finished file of that path. No
    // other stage removes what is written there.
    std::string Begin(const std::string& finished);
    // Must be called when they have been written, and before the file gets its name.
    void Complete();
    // The file has its name.
    void Settle();
    // The path of one that was written, by the ending of its name; empty if the pyramid needs none.
    std::string Written(const char* ending) const;

private:
    std::string target;
    std::string base;  // empty until Begin
    std::uint64_t number = 0;
    platform::FileLock lock;

    void Lock();
};

}  // namespace zmcgdal

#endif
