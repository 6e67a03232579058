// A file opened by wide name for transfers at given offsets: the one layer through which all file
// data of the module moves.
//
// There is no position and no buffer: a transfer is one system call in the usual case, repeated
// only where the system answers short or was interrupted. Handles are not inherited by child
// processes. Only regular files open: directories, pipes and devices are refused. Nothing throws.
// One thread at a time, except that ReadAt may run on several threads.
#ifndef ZMC_PLATFORM_FILE_H
#define ZMC_PLATFORM_FILE_H

#include <cstddef>
#include <cstdint>
#include <memory>

namespace platform {

class File {
public:
    enum class Mode {
        Create,  // for reading and writing; made if missing, emptied if there ("w+b")
        Update,  // for reading and writing what exists ("r+b")
        Read,    // for reading what exists ("rb")
    };

    // Opens the file of that zero-terminated UTF-16 name; null if that cannot be done.
    static std::unique_ptr<File> Open(const char16_t* name, Mode mode);
    ~File();
    File(const File&) = delete;
    File& operator=(const File&) = delete;

    // Bytes transferred: fewer than `size` at the end of the file or after a failure. Bytes of
    // `buffer` beyond them are left as they were.
    std::size_t ReadAt(std::uint64_t offset, void* buffer, std::size_t size);
    std::size_t WriteAt(std::uint64_t offset, const void* buffer, std::size_t size);

    // Size of the file in bytes. kUnknownSize if the system does not tell: larger than any file,
    // so that nothing takes a file that cannot be looked at for an empty one.
    static constexpr std::uint64_t kUnknownSize = ~std::uint64_t{0};
    std::uint64_t Size() const;
    // The same; false, with `size` as it was, if the system does not tell.
    bool TellSize(std::uint64_t& size) const;
    // Makes the file end there; what lay beyond is gone. False, with nothing changed, on failure.
    bool Truncate(std::uint64_t size);
    // Waits until what was written has reached the disk; false if that failed.
    bool Sync();

private:
    explicit File(int fileDescriptor) : descriptor(fileDescriptor) {}
    int descriptor;
};

// Removes the file of that name; false if that failed.
bool RemoveFile(const char16_t* name);

}  // namespace platform

#endif
