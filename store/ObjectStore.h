// ObjectStore: one object of a store that keeps whole objects under names, and takes a large one as
// the numbered parts of an upload: in any order, from any number of processes, a part again in
// place of the one before. The object appears when the upload is completed, whole, and replaces
// what had its name; until then nobody sees anything of it.
//
// What fails is thrown as zmchost::Error of the object's name, in one line, with what the store
// said and what helps; what may pass has been tried again by then, for a bounded time. An end that
// was asked for meanwhile is thrown as zmchost::Cancelled. One thread at a time.
#ifndef ZMC_STORE_OBJECTSTORE_H
#define ZMC_STORE_OBJECTSTORE_H

#include <cstdint>
#include <memory>
#include <span>
#include <string>

#include "files/ByteSource.h"
#include "host/base/Error.h"

namespace zmcstore {

// Bytes on their way to the store: [offset, offset + size) of a source, which has them all.
struct Body {
    zelm::files::ByteSource* source = nullptr;
    std::uint64_t offset = 0;
    std::uint64_t size = 0;
};

// A part of an upload as the store has it. Numbers count from 1.
struct UploadedPart {
    std::uint32_t number = 0;
    std::string tag;  // the store's own word for its bytes, with its quotation marks

    bool operator==(const UploadedPart&) const = default;
};

struct ObjectState {
    bool exists = false;
    std::string tag;
    std::string mark;  // of Begin; empty of what was put there otherwise
};

// The upload is not there: it was completed, or ended.
class UploadGone : public zmchost::Error {
public:
    using Error::Error;
};

class ObjectStore {
public:
    virtual ~ObjectStore() = default;
    ObjectStore() = default;
    ObjectStore(const ObjectStore&) = delete;
    ObjectStore& operator=(const ObjectStore&) = delete;

    // What the store has under the name now.
    virtual ObjectState Look() = 0;

    // Begins an upload, and gives the word that the others know it by. The finished object bears
    // `mark`, letters and digits, by which Look tells it from all others.
    virtual std::string Begin(const std::string& mark) = 0;
    // The others throw UploadGone where the store does not know the upload.
    virtual UploadedPart PutPart(const std::string& upload, std::uint32_t number,
                                 const Body& body) = 0;
    // `parts` in the order of their numbers.
    virtual void Complete(const std::string& upload, std::span<const UploadedPart> parts) = 0;
    // Drops all parts.
    virtual void Abort(const std::string& upload) = 0;

    // Puts a small object beside this one, under its name with `ending` behind, or removes it if it
    // is there.
    virtual void PutBeside(const std::string& ending, const Body& body) = 0;
    virtual void RemoveBeside(const std::string& ending) = 0;
};

}  // namespace zmcstore

#endif
