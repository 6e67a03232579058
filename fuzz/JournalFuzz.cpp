// A hostile copy of a metadata document (MetadataJournal.h) beside a file: whatever it says, the
// header and the tiles of the file stay what they were.
//
// The copy stands behind the file, with its length in two bytes, in front of the script. By the
// script it is taken as it is, or made one that fits the file but for what the script says.
#include <algorithm>
#include <cstdint>
#include <string>

#include "fuzz/support/Expect.h"
#include "fuzz/support/Host.h"
#include "fuzz/support/HostileFile.h"
#include "fuzz/support/ScratchFolder.h"
#include "host/base/Checksum.h"
#include "host/journal/MetadataJournal.h"
#include "platform/FileSystem.h"
#include "tests/support/ScratchDirectory.h"

namespace {

using zmcfuzz::InputBytes;
using zmchost::JournalRecord;
using zmctest::ReadText;
using zmctest::WriteText;
using Outcome = zmchost::Recovery::Outcome;

// What a store into the file would have kept, with some of its numbers changed.
JournalRecord RecordOf(const std::string& file, const std::string& bytes, const std::string& text,
                       InputBytes& script) {
    JournalRecord record;
    const auto header = zmcfuzz::HeaderIn(bytes);
    if (header) {
        record.offset = header->tileDataEnd;
        record.frontSize = header->tileDataStart;
        record.frontSum = zmchost::Checksum(
            std::string_view(bytes).substr(0, static_cast<std::size_t>(header->tileDataStart)));
    }
    record.fileSize = bytes.size();
    record.fileNumber = platform::StatusOf(file).number;
    record.systemRun = script.Flag() ? platform::SystemRun() : "";
    record.text = text;
    for (std::uint64_t* const number : {&record.offset, &record.fileSize, &record.frontSize})
        if (script.UpTo(7) == 7) *number += std::uint64_t{script.Size()} - 50;
    return record;
}

void ExpectTilesKept(const std::string& before, const std::string& after) {
    const auto header = zmcfuzz::HeaderIn(before);
    if (!header) {
        ZMC_EXPECT(after == before);
        return;
    }
    const auto end =
        static_cast<std::size_t>(std::min<std::uint64_t>(header->tileDataEnd, before.size()));
    ZMC_EXPECT(after.size() >= end && after.compare(0, end, before, 0, end) == 0);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const zmcfuzz::ScratchFolder folder;
    static const std::string name = folder / "a.pyr";
    static const std::string copy = zmchost::MetadataJournal::PathFor(name);
    zmcfuzz::FileAndScript input = zmcfuzz::FileAndScript::Take(data, size);
    std::string journal = input.TakeSecond();
    if (const auto read = JournalRecord::Decode(journal)) ZMC_EXPECT(read->Encode() == journal);
    WriteText(name, input.file);
    if (input.script.Flag()) {
        const JournalRecord record = RecordOf(name, input.file, journal, input.script);
        journal = record.Encode();
        const auto read = JournalRecord::Decode(journal);
        ZMC_EXPECT(read && read->text == record.text && read->offset == record.offset);
    }
    WriteText(copy, journal);
    const zmchost::Recovery recovery = zmchost::RecoverMetadata(name);
    const std::string after = ReadText(name);
    ExpectTilesKept(input.file, after);
    const bool settled =
        recovery.outcome == Outcome::Complete || recovery.outcome == Outcome::Restored;
    ZMC_EXPECT(settled != platform::StatusOf(copy).exists);
    ZMC_EXPECT(recovery.outcome == Outcome::Restored || after == input.file);
    try {
        zmchost::DiscardMetadata(name);
    } catch (const zmchost::Error&) {
    }
    ExpectTilesKept(input.file, ReadText(name));
    return 0;
}
