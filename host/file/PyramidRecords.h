// PyramidRecords: what is kept beside a pyramid so that its statistics can be renewed without
// looking at all of it: what each block of level 0 gave for them, and a note of who keeps it.
//
// The records of "scene.pyr" are "scene.pyr.zmcrecords":
//
//     8 bytes "ZMCRECS1", size and time of the last write of the pyramid in 8 bytes each,
//     the pieces, the index, and behind it where it begins and its Checksum in 8 bytes each
//
// numbers little-endian, the index packed (PackedNumbers.h). Pieces are bytes that mean something
// to a build alone. Records count as long as the pyramid has that size and that time: whoever
// writes into it otherwise makes them useless, and a copy that keeps its time can have them too.
// One thread at a time.
#ifndef ZMC_HOST_FILE_PYRAMIDRECORDS_H
#define ZMC_HOST_FILE_PYRAMIDRECORDS_H

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "files/FileSource.h"

namespace zmchost {

class PyramidRecords {
public:
    static constexpr const char* kEnding = ".zmcrecords";
    static std::string PathFor(const std::string& pyramid);

    // Null if the pyramid has none. Throws Error for records that cannot be read, are damaged, or
    // are not of the pyramid as it is now.
    static std::unique_ptr<PyramidRecords> Find(const std::string& pyramid);

    const std::string& Note() const { return note; }
    // A number that tells what was built of what (PartBuild::Facts).
    std::uint64_t Facts() const { return facts; }
    std::size_t Pieces() const { return pieces.size(); }
    // Throws Error for a piece that is damaged.
    std::string Piece(std::size_t number) const;

    // Makes a file of records count for the pyramid as it is now. Throws Error.
    static void Stamp(const std::string& records, const std::string& pyramid);

private:
    friend class RecordsWriter;
    struct Place {
        std::uint64_t offset = 0;
        std::uint64_t size = 0;
        std::uint64_t sum = 0;
    };

    bool ReadIndex(std::string_view index, std::uint64_t end);

    std::string name;
    std::shared_ptr<zelm::files::FileSource> source;
    std::uint64_t facts = 0;
    std::string note;
    std::vector<Place> pieces;
};

// Writes a file of records, which count for no pyramid yet. Throws Error.
class RecordsWriter {
public:
    RecordsWriter(const std::string& path, const std::string& pyramid);
    void Append(std::string_view piece);
    // The file is on the disk then.
    void End(std::uint64_t facts, const std::string& note);

private:
    std::string name;  // of the pyramid, for messages
    std::shared_ptr<zelm::files::FileSource> file;
    std::uint64_t end = 0;
    std::vector<PyramidRecords::Place> pieces;

    void Write(std::string_view bytes);
};

}  // namespace zmchost

#endif
