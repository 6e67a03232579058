// ByteSource: where bytes come from. A row of bytes that is read, and perhaps written, at given
// offsets: a plain file (FileSource.h), memory (MemorySource.h), or whatever a host derives.
//
// A source has two faces. Users call the public functions, which never throw, move no more than was
// asked for, refuse offsets that overflow, and go on where a source answers short; all of this is
// done in one place, so that code that calls a source may rely on it whoever wrote the source.
// Derived classes fill in the functions whose names begin with Do, may throw from them, and need
// not check their arguments. The least is DoReadAt and DoTellSize: a source that can be read.
//
// Offsets and sizes are in bytes, and ranges half-open: [offset, offset + size).
//
// Sources are shared: they live as long as anybody holds a std::shared_ptr to them, and go when the
// last one does, on that thread.
//
// Threads. Any number of threads may call ReadAt, ReadMany, Size, TellSize, IsWritable and Identity
// of one source at once. Whoever writes, truncates or removes sees to it that nobody else does so
// at the same moment, and knows that a read beside a write may see part of it. A source that is
// lent to several users at once (Lending.h) has to bear everything from several threads, as the
// sources of this folder do.
//
// Failures. An operation that fails says so by what it returns, and sets `error`, unless that is
// null, to a number of <cerrno>; an operation that does not fail sets it to 0. What a source throws
// is ENOMEM for std::bad_alloc and EIO for the rest. An answer that cannot be (more bytes than were
// asked for, nothing moved and no reason given) is EIO as well.
#ifndef ZMC_FILES_BYTESOURCE_H
#define ZMC_FILES_BYTESOURCE_H

#include <cstddef>
#include <cstdint>
#include <span>

#include "files/FilesApi.h"

namespace zelm::files {

// What a source is opened for.
enum class OpenMode {
    Create,  // for reading and writing; made if missing, emptied if there
    Update,  // for reading and writing what exists
    Read,    // for reading what exists
};

// Which thing a source stands for, and which state of it. Two sources, or one source at two
// moments, are compared by it. Sources of this folder that are files fill in what the file system
// tells; others take whatever numbers tell their things apart, and ~0 for the volume.
struct Identity {
    bool known = false;  // false: nothing could be told, and the rest is 0
    // Which thing. A file system gives the number of a file that is gone and closed to another one,
    // so these two are good for comparing what is open, not for keeping.
    std::uint64_t volume = 0;
    std::uint64_t number = 0;
    // Which state. Of files, the last write and the last change of any kind (rights and names
    // included) in nanoseconds since 1970, as coarse as the file system's clock: two writes within
    // some milliseconds that leave the size alone may look like one.
    std::uint64_t size = 0;
    std::int64_t modified = 0;
    std::int64_t changed = 0;

    // Both stand for one thing, whatever its state; false if either is unknown.
    bool SameThing(const Identity& other) const {
        return known && other.known && volume == other.volume && number == other.number;
    }
    // One thing, with the same size and last write; false if either is unknown. Renaming a file, or
    // giving it other rights, is no difference here, but one for operator==.
    bool SameContent(const Identity& other) const {
        return SameThing(other) && size == other.size && modified == other.modified;
    }
    // Member by member: unknown ones are equal.
    bool operator==(const Identity&) const = default;
};

// What a derived class answers for one transfer.
struct Transfer {
    std::size_t bytes = 0;  // moved, from the start of the range on
    int error = 0;          // a number of <cerrno> if the transfer failed behind those bytes
    // A read is short because the source ends there, and not for any other reason. A source that
    // cannot tell leaves it false: then the rest is asked for, and Size decides in the end.
    bool end = false;
};

// One range of ReadMany.
struct Range {
    std::uint64_t offset = 0;
    void* buffer = nullptr;  // at least `size` bytes, the caller's
    std::size_t size = 0;
    Transfer done;  // filled in by ReadMany; the rest stays as it is
};

enum class Operation { Read, Write, Size, Truncate, Sync, Remove };

// A transfer that did not move all, or another operation that failed.
struct Failure {
    Operation operation = Operation::Read;
    std::uint64_t offset = 0;  // of the transfer; the size that was asked for, of Truncate; else 0
    std::size_t size = 0;      // bytes asked for; 0 of what is no transfer
    std::size_t moved = 0;     // bytes moved
    int error = 0;             // 0: nothing failed, but the source ended there
};

class ZMC_FILES_API ByteSource {
public:
    // Answer of Size for "cannot tell": larger than any source, so that nothing takes a source that
    // cannot be looked at for an empty one.
    static constexpr std::uint64_t kUnknownSize = ~std::uint64_t{0};

    virtual ~ByteSource();
    ByteSource(const ByteSource&) = delete;
    ByteSource& operator=(const ByteSource&) = delete;

    // --- transfers ---

    // Reads [offset, offset + size) into `buffer` and returns the bytes transferred: fewer than
    // `size` where the source ends, with `error` 0, or after a failure. Bytes of `buffer` beyond
    // them are left as they were. EOVERFLOW if the range ends beyond what an offset can tell.
    std::size_t ReadAt(std::uint64_t offset, void* buffer, std::size_t size,
                       int* error = nullptr) noexcept;

    // Reads several ranges, which may overlap and stand in any order, and says of each what ReadAt
    // would: `done.bytes`, `done.error`, and `done.end` if it is short because the source ends.
    // True if all are whole. A failure in one range is none of the others'. Sources to which many
    // requests cost less than one after the other do them together; the others take them singly.
    bool ReadMany(std::span<Range> ranges) noexcept;

    // Writes [offset, offset + size) from `buffer` and returns the bytes transferred: fewer than
    // `size` only after a failure. A source grows to hold what is written behind its end; what lies
    // between reads as zeros. EBADF if the source is not writable.
    std::size_t WriteAt(std::uint64_t offset, const void* buffer, std::size_t size,
                        int* error = nullptr) noexcept;

    // --- the source as a whole ---

    // Size in bytes, now; kUnknownSize if the source cannot tell.
    std::uint64_t Size() const noexcept;
    // The same; false, with `size` as it was, if the source cannot tell.
    bool TellSize(std::uint64_t& size, int* error = nullptr) const noexcept;
    // Makes the source end there: what lay beyond is gone, what was not there reads as zeros. False
    // on failure. EBADF if the source is not writable.
    bool Truncate(std::uint64_t size, int* error = nullptr) noexcept;
    // Waits until what was written would outlast a loss of power; false if that failed. True at
    // once for sources to which this means nothing.
    bool Sync(int* error = nullptr) noexcept;
    // Whether WriteAt, Truncate and Remove are of any use. Fixed for the life of the source.
    bool IsWritable() const noexcept;
    // What the source stands for, as it is now. Asked again later, it tells whether somebody has
    // changed the thing meanwhile.
    Identity Identify() const noexcept;
    // Removes the thing that the source stands for, if the name that it was found by still means
    // it. False if it does not, on failure, and where removing means nothing (ENOTSUP). The source
    // itself goes on: a file that is open can be read until it is closed. EBADF if not writable.
    bool Remove(int* error = nullptr) noexcept;

protected:
    ByteSource() = default;

    // For derived classes. Arguments are in order: sizes are not 0, ranges do not overflow, and the
    // functions that change anything are called only if DoIsWritable. `int` answers are 0 or a
    // number of <cerrno>. All may throw.

    // As ReadAt: at once, or as far as it goes; see Transfer. Bytes of `buffer` beyond those
    // answered for have to stay as they were.
    virtual Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) = 0;
    // Fills in `done` of each range. Default: one DoReadAt after the other.
    virtual void DoReadMany(std::span<Range> ranges);
    // 0 with `size` set, or the reason why it cannot be told.
    virtual int DoTellSize(std::uint64_t& size) const = 0;

    // Default: false, and ENOTSUP for the three that it makes of use.
    virtual bool DoIsWritable() const;
    virtual Transfer DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size);
    virtual int DoTruncate(std::uint64_t size);
    virtual int DoRemove();

    // Default: nothing to wait for.
    virtual int DoSync();
    // Default: unknown.
    virtual Identity DoIdentify() const;

    // Called behind each public operation that moved less than was asked for, or failed, those that
    // were refused before a source saw them included: on the thread of the call, possibly on
    // several at once. What it throws is dropped. Default: nothing.
    virtual void DoNote(const Failure& failure) const;

private:
    class ZMC_FILES_LOCAL Border;  // between the two faces
};

}  // namespace zelm::files

#endif
