// JournalRecord: what a copy of a metadata document holds: the text, and what the file was that it
// comes from.
//
// As it stands in a file, integers little-endian: the magic "ZMCMETA1", the five numbers in the
// order below, the length of `systemRun` and of `text` in 8 bytes each, both, and the Checksum of
// all that in 8 bytes.
#ifndef ZMC_HOST_JOURNAL_JOURNALRECORD_H
#define ZMC_HOST_JOURNAL_JOURNALRECORD_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace zmchost {

struct JournalRecord {
    std::uint64_t offset = 0;      // where the document stands, or is to stand, in the raster file
    std::uint64_t fileSize = 0;    // of the raster file
    std::uint64_t fileNumber = 0;  // FileStatus::number of the raster file
    std::uint64_t frontSize = 0;   // of what stands in front of its tiles
    std::uint64_t frontSum = 0;    // and the Checksum of that
    std::string systemRun;         // platform::SystemRun when the copy was made
    std::string text;              // the document; empty if there was none

    // What no record is longer than.
    static const std::uint64_t kMaxBytes;
    // Bytes from its start that tell how long a record is.
    static constexpr std::size_t kHeadBytes = 64;

    std::string Encode() const;
    // Bytes of the record that begins so; none if no record does.
    static std::optional<std::uint64_t> SizeFrom(std::string_view head);
    // None if the bytes are not exactly those of a record. Takes them over for the text.
    static std::optional<JournalRecord> Decode(std::string bytes);
};

}  // namespace zmchost

#endif
