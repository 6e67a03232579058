// MetadataJournal: the metadata document of a pyramid file as it was before a store, in a file
// beside it, until the store has reached the disk.
//
// A store rewrites the document in place. The module sees to it that a process that dies in the
// middle leaves a document that nobody believes; the statistics of before are lost then, and when
// the power fails the disk may hold any part of both. Whoever cannot have that stores like this:
//
//     MetadataJournal journal(file);  // the copy is on the disk
//     ... store ...
//     journal.Finish();  // the store is on the disk, and can be read; the copy is gone
//
// The copy of "scene.pyr" is "scene.pyr.zmcmeta". One that is found when nobody is storing is left
// over: RecoverMetadata, which Raster::Open calls where it opens for update, puts the old document
// back, or removes the copy where the store is whole. Who opens for reading alone writes nothing,
// and asks LookForCopy. Storing takes a lock on the copy, so that of several processes one stores
// at a time; those that store without a copy know nothing of it.
//
// Whoever may write the folder can put a file of that name there. It counts if it belongs to the
// owner of the raster file, to the superuser or to the user of the process, and was made of that
// very file, by its number and its front; and no more of it is read than a copy can have.
#ifndef ZMC_HOST_JOURNAL_METADATAJOURNAL_H
#define ZMC_HOST_JOURNAL_METADATAJOURNAL_H

#include <string>

#include "host/journal/JournalRecord.h"
#include "platform/FileLock.h"

namespace zmchost {

class MetadataJournal {
public:
    // Where the copy of a file is kept.
    static std::string PathFor(const std::string& file);

    // Puts a left-over copy back first, if there is one. Throws Error, with no copy left, if the
    // document is damaged already, another process is storing, or the copy cannot be made.
    explicit MetadataJournal(const std::string& file);
    // Without Finish the store has failed: puts the old document back where the new one is
    // malformed. A copy that may still be needed stays.
    ~MetadataJournal();
    MetadataJournal(const MetadataJournal&) = delete;
    MetadataJournal& operator=(const MetadataJournal&) = delete;

    // Waits until the file is on the disk, looks whether its document is well-formed, and removes
    // the copy. Throws Error if one of them fails; the destructor then does the rest.
    void Finish();

private:
    void Write(const std::string& bytes);

    std::string given;  // as the caller named it, for messages
    std::string file;   // where links led
    JournalRecord record;
    platform::FileLock lock;
    bool finished = false;
};

struct Recovery {
    enum class Outcome {
        Nothing,   // there is no copy
        UnderWay,  // another process is storing now
        Complete,  // the document is whole, and the copy was removed
        Restored,  // the document of before was put back, and the copy removed
        Unusable,  // the copy is torn, of another file or somebody else's; nothing was changed
        Failed,    // the copy or the file cannot be read or written; the copy stays
        Pending,   // the copy is of use; nothing was changed, since nobody asked for that
    };
    Outcome outcome = Outcome::Nothing;
    std::string text;  // what was found and done, for people; empty for Nothing and UnderWay
};

// Finishes an update that was cut off (UpdateJournal.h), looks for a left-over copy, and does what
// is to be done. Never throws, but for memory.
Recovery RecoverMetadata(const std::string& file);

// Looks for an update that was cut off or a left-over copy and changes nothing, the lock of a store
// included: Nothing, UnderWay, Unusable, Failed or Pending. Never throws, but for memory.
Recovery LookForCopy(const std::string& file);

// Cuts off the metadata document of a file and removes its copy, so that statistics can be stored
// anew; the journal of an update that cannot be finished too. Throws Error where nothing is
// damaged, a copy can be put back, or it cannot be done.
void DiscardMetadata(const std::string& file);

}  // namespace zmchost

#endif
