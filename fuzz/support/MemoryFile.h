// A file that lives in memory and has a name, and is a regular file to whoever opens it by that.
#ifndef ZMC_FUZZ_SUPPORT_MEMORYFILE_H
#define ZMC_FUZZ_SUPPORT_MEMORYFILE_H

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "fuzz/support/Expect.h"

namespace zmcfuzz {

class MemoryFile {
public:
    MemoryFile() : descriptor(memfd_create("zmc-fuzz", MFD_CLOEXEC | MFD_ALLOW_SEALING)) {
        ZMC_EXPECT(descriptor >= 0);
        name = "/proc/self/fd/" + std::to_string(descriptor);
    }
    explicit MemoryFile(std::string_view bytes) : MemoryFile() { Assign(bytes); }
    MemoryFile(const MemoryFile&) = delete;
    MemoryFile& operator=(const MemoryFile&) = delete;
    ~MemoryFile() { close(descriptor); }

    const std::string& Name() const { return name; }

    void Assign(std::string_view bytes) {
        ZMC_EXPECT(ftruncate(descriptor, 0) == 0);
        ZMC_EXPECT(pwrite(descriptor, bytes.data(), bytes.size(), 0) ==
                   static_cast<ssize_t>(bytes.size()));
    }

    // Makes the file longer, by zeros that take no memory.
    void Extend(std::uint64_t bytes) {
        ZMC_EXPECT(ftruncate(descriptor, static_cast<off_t>(Size() + bytes)) == 0);
    }

    std::uint64_t Size() const {
        struct stat status = {};
        ZMC_EXPECT(fstat(descriptor, &status) == 0);
        return static_cast<std::uint64_t>(status.st_size);
    }

    // Up to `limit` bytes from the offset on.
    std::vector<unsigned char> Read(std::uint64_t offset, std::uint64_t limit) const {
        const std::uint64_t size = Size();
        if (offset >= size) return {};
        std::vector<unsigned char> bytes(static_cast<std::size_t>(std::min(size - offset, limit)));
        ZMC_EXPECT(pread(descriptor, bytes.data(), bytes.size(), static_cast<off_t>(offset)) ==
                   static_cast<ssize_t>(bytes.size()));
        return bytes;
    }

    // From now on nobody can change a byte or the size, as on a disk that fails every write.
    void Seal() {
        ZMC_EXPECT(fcntl(descriptor, F_ADD_SEALS, F_SEAL_WRITE | F_SEAL_GROW | F_SEAL_SHRINK) == 0);
    }

private:
    int descriptor;
    std::string name;
};

}  // namespace zmcfuzz

#endif
