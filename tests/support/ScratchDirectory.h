// A directory of the test's own, gone when the test is over, and small disks mounted in it.
#ifndef ZMC_TESTS_SUPPORT_SCRATCHDIRECTORY_H
#define ZMC_TESTS_SUPPORT_SCRATCHDIRECTORY_H

#include <sys/mount.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

namespace zmctest {

// Where a test may have its files in memory, since it asks for what the system does with them and
// not for what a disk does, and would spend its time in waiting for one. The usual folder where the
// user has chosen one, or memory has no room.
inline std::filesystem::path MemoryFolder() {
    const std::filesystem::path memory = "/dev/shm";
    std::error_code error;
    const auto space = std::filesystem::space(memory, error);
    const bool fits = !error && space.available >= std::uintmax_t{1} << 30;
    // NOLINTNEXTLINE(concurrency-mt-unsafe): nobody changes the environment at the same time.
    const bool chosen = std::getenv("TMPDIR") != nullptr;
    if (chosen || !fits || access(memory.c_str(), W_OK) != 0)
        return std::filesystem::temp_directory_path();
    return memory;
}

class ScratchDirectory {
public:
    explicit ScratchDirectory(
        const std::filesystem::path& parent = std::filesystem::temp_directory_path()) {
        std::string name = (parent / "zmcXXXXXX").string();
        if (mkdtemp(name.data())) path = name;
    }
    ScratchDirectory(const ScratchDirectory&) = delete;
    ScratchDirectory& operator=(const ScratchDirectory&) = delete;
    ~ScratchDirectory() {
        std::error_code ignored;
        if (!path.empty()) std::filesystem::remove_all(path, ignored);
    }

    std::string operator/(const std::string& name) const { return (path / name).string(); }
    std::string String() const { return path.string(); }

private:
    std::filesystem::path path;
};

// A disk of its own at that directory. Mounting takes rights that not every test run has: then
// IsMounted is false and the test is to be skipped.
class SmallDisk {
public:
    SmallDisk(std::string directory, const std::string& options)
        : path(std::move(directory)),
          mounted(mount("tmpfs", path.c_str(), "tmpfs", 0, options.c_str()) == 0) {}
    SmallDisk(const SmallDisk&) = delete;
    SmallDisk& operator=(const SmallDisk&) = delete;
    ~SmallDisk() {
        if (mounted) umount2(path.c_str(), MNT_DETACH);
    }

    bool IsMounted() const { return mounted; }
    bool MakeReadOnly() {
        return mount(nullptr, path.c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr) == 0;
    }
    // Fills the disk to its last byte.
    void Fill() {
        std::ofstream filler(path + "/filler", std::ios::binary);
        const std::string block(1024, 'x');
        while (filler.write(block.data(), static_cast<std::streamsize>(block.size())).flush()) {
        }
    }

private:
    std::string path;
    bool mounted;
};

inline std::string ReadText(const std::string& name) {
    std::ostringstream text;
    text << std::ifstream(name, std::ios::binary).rdbuf();
    return text.str();
}

inline void WriteText(const std::string& name, const std::string& text) {
    std::ofstream(name, std::ios::binary) << text;
}

}  // namespace zmctest

#endif
