// PartFolder: what is kept of the parts of a build until it is finished, one small file for each.
//
//     FOLDER/17.part     what PartBuild::Make told of part 17
//     FOLDER/17.count    what PartBuild::Count did
//     FOLDER/17.store    what a store took of part 17
//     FOLDER/17.pieces   bytes of part 17 that it did not take yet
//     FOLDER/scenes      what a source of many rasters is made of, if it is one
//
// A record appears whole or not at all, and replaces one that is there: processes that make the
// same part write the same record. It tells which build it belongs to and carries a checksum; what
// is damaged, of another build or of another part counts as missing. Any number of processes may
// use the folder at once. Failures to write are thrown as Error.
#ifndef ZMC_HOST_BUILD_PARTFOLDER_H
#define ZMC_HOST_BUILD_PARTFOLDER_H

#include <cstdint>
#include <optional>
#include <string>

#include "host/build/PartBuild.h"

namespace zmchost {

class PartFolder {
public:
    enum class Kind { Part, Count, Store };

    // `build` is a number that no other build has. Where `durable`, a record that is there stays
    // there when the power fails.
    PartFolder(std::string folderPath, std::uint64_t build, bool durable = true);

    const std::string& Path() const { return folder; }

    // Makes the folder, which must not exist.
    void Make() const;
    void Keep(Kind kind, std::uint64_t part, const PartResult& result) const;
    // Where bytes of a part are kept that are no record; who writes them sees to all of it. A file
    // is written under the second name and gets the first when it is whole.
    std::string PiecesPath(std::uint64_t part) const;
    std::string NewPiecesPath(std::uint64_t part) const;
    std::optional<PartResult> Find(Kind kind, std::uint64_t part) const;
    // Bytes that tell all of the source, and what was kept; empty if nothing was.
    void KeepScenes(const std::string& bytes) const;
    std::string Scenes() const;
    // Removes all records, whole or not, and the folder if nothing else is in it.
    void Remove() const noexcept;

private:
    std::string NameOf(Kind kind, std::uint64_t part) const;
    std::string NewPath(const std::string& name) const;
    std::string Encode(Kind kind, std::uint64_t part, const PartResult& result) const;

    std::string folder;
    std::uint64_t build;
    bool durable;
};

}  // namespace zmchost

#endif
