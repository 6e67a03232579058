// A file opened by wide name for transfers at given offsets: the one layer through which all file
// data of the module moves.
//
// There is no position and no buffer: a transfer is one system call in the usual case, repeated
// only where the system answers short or was interrupted. Handles are not inherited by programs
// that are started, and never have the numbers of the standard streams: in a process that began
// with one of those closed, a message meant for it must not land in a file. Only regular files
// open: directories, pipes and devices are refused. Nothing throws. Any number of threads may use
// one File at once; what writes leave that overlap is the system's affair.
//
// Operations that take `error` set it, unless it is null: to 0, or to the system's number (errno)
// for the failure.
#ifndef ZMC_PLATFORM_FILE_H
#define ZMC_PLATFORM_FILE_H

#include <cstddef>
#include <cstdint>
#include <memory>

namespace platform {

// What tells a file from all others, and one state of it from the next.
struct FileIdentity {
    std::uint64_t device = 0;   // the file system
    std::uint64_t number = 0;   // the file on it; free again once the file is gone and not open
    std::uint64_t size = 0;     // bytes
    std::int64_t modified = 0;  // last write or change of size, in nanoseconds since 1970
    std::int64_t changed = 0;   // the same, or last change of its names or rights

    bool operator==(const FileIdentity&) const = default;
};

class File {
public:
    enum class Mode {
        Create,  // for reading and writing; made if missing, emptied if there ("w+b")
        Update,  // for reading and writing what exists ("r+b")
        Read,    // for reading what exists ("rb")
    };

    // Opens the file of that zero-terminated UTF-16 name; null if that cannot be done.
    static std::unique_ptr<File> Open(const char16_t* name, Mode mode, int* error = nullptr);
    // The same of a file that the system has open under that number, which is taken over.
    static std::unique_ptr<File> Take(int descriptor, Mode mode, int* error = nullptr);
    ~File();
    File(const File&) = delete;
    File& operator=(const File&) = delete;

    // Bytes transferred: fewer than `size` at the end of the file or after a failure. Bytes of
    // `buffer` beyond them are left as they were. A read that is short because the file ends there
    // has not failed.
    std::size_t ReadAt(std::uint64_t offset, void* buffer, std::size_t size, int* error = nullptr);
    std::size_t WriteAt(std::uint64_t offset, const void* buffer, std::size_t size,
                        int* error = nullptr);

    // Size of the file in bytes. kUnknownSize if the system does not tell: larger than any file,
    // so that nothing takes a file that cannot be looked at for an empty one.
    static constexpr std::uint64_t kUnknownSize = ~std::uint64_t{0};
    std::uint64_t Size() const;
    // The same; false, with `size` as it was, if the system does not tell.
    bool TellSize(std::uint64_t& size, int* error = nullptr) const;
    // What the open file is now; false, with `identity` as it was, if the system does not tell.
    bool TellIdentity(FileIdentity& identity) const;
    // The system's number of the open file for libraries that take one: the caller's own, to be
    // closed by whoever it is given to. Below 0 if there is none to be had.
    int Duplicate() const;
    // Makes the file end there; what lay beyond is gone. False, with nothing changed, on failure.
    bool Truncate(std::uint64_t size, int* error = nullptr);
    // Waits until what was written has reached the disk; false if that failed.
    bool Sync(int* error = nullptr);

private:
    explicit File(int fileDescriptor) : descriptor(fileDescriptor) {}
    int descriptor;
};

// What the name leads to now, through links; false, with `identity` as it was, if to nothing, or if
// the system does not tell.
bool TellIdentity(const char16_t* name, FileIdentity& identity);

// Removes the file of that name; false if that failed.
bool RemoveFile(const char16_t* name, int* error = nullptr);

}  // namespace platform

#endif
