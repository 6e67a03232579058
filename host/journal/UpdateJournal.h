// UpdateJournal: changes to tiles and document of a pyramid file that reach it together.
//
// What is to be written is gathered beside the file first:
//
//     UpdateJournal journal(file);
//     ... write into journal.Updated(); companions go to journal.Staged(ending) ...
//     journal.Commit(endings);
//
// Until Commit the file is not touched, and without it nothing stays. Commit brings the journal to
// the disk under the name "scene.pyr.zmcupdate", and from that step on the update counts: its bytes
// are written into the file, the document last, companions get their names, and the journal goes.
// Where that is cut off, RecoverUpdate, which RecoverMetadata and so every opening for update
// calls, does the same again; bytes that are there already are written once more.
//
// Who reads meanwhile finds old and new tiles, whole or in part, and a document that counts as
// malformed. The file is locked as long as the object lives, so that of several processes one
// updates at a time. Whose word counts is settled as for the copies of MetadataJournal.h: the
// journal belongs to the owner of the file, the superuser or the user of the process, and was made
// of that very file.
#ifndef ZMC_HOST_JOURNAL_UPDATEJOURNAL_H
#define ZMC_HOST_JOURNAL_UPDATEJOURNAL_H

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "files/FileSource.h"
#include "host/file/PyramidHeader.h"
#include "host/journal/MetadataJournal.h"
#include "host/journal/StagedSource.h"
#include "platform/FileLock.h"

namespace zmchost {

class UpdateJournal {
public:
    static std::string PathFor(const std::string& file);

    // Locks the file, and puts in order what an update or a store that was cut off has left. Throws
    // Error where somebody else updates it, it cannot be written, is no complete pyramid, or is
    // reached by a link, whose companions would be others.
    explicit UpdateJournal(const std::string& file);
    // Without Commit removes all that was gathered.
    ~UpdateJournal();
    UpdateJournal(const UpdateJournal&) = delete;
    UpdateJournal& operator=(const UpdateJournal&) = delete;

    const PyramidHeader& Header() const { return header; }
    // The file as it is to become; it has no metadata document at first.
    const std::shared_ptr<StagedSource>& Updated() const { return staged; }
    // What a companion with that ending, one of kEndings, is written as until it gets its name.
    std::string Staged(const std::string& ending) const { return path + ending; }
    static const std::vector<std::string> kEndings;

    // Companions that were not written are removed. Throws Error, with the file untouched; or, once
    // the journal has its name, with a text that says how to go on.
    void Commit();

    // Bytes of the file that are written.
    std::uint64_t Bytes() const { return staged->AsideSize(); }

private:
    void Seal();

    std::string given;  // as the caller named it, for messages
    std::string file;   // where links led
    platform::FileLock fileLock;
    platform::FileLock lock;  // of the journal under its first name
    std::string path;         // that name
    std::shared_ptr<zelm::files::FileSource> base;
    zelm::files::Identity opened;
    PyramidHeader header;
    std::shared_ptr<zelm::files::FileSource> journal;
    std::shared_ptr<StagedSource> staged;
    bool sealed = false;
};

// Finishes an update that was cut off, if there is one: Nothing, UnderWay, Complete, Unusable or
// Failed. Never throws, but for memory.
Recovery RecoverUpdate(const std::string& file);

// Looks for one and changes nothing: Nothing, UnderWay, Unusable, Failed or Pending. Never throws,
// but for memory.
Recovery LookForUpdate(const std::string& file);

// Removes the journal of an update that cannot be finished; false if there is none. Throws Error
// where it can be finished, or is under way, or it cannot be done.
bool DiscardUpdate(const std::string& file);

}  // namespace zmchost

#endif
