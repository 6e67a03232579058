// A folder of this process's own, in memory where the system has such, gone when the program ends
// as it should.
#ifndef ZMC_FUZZ_SUPPORT_SCRATCHFOLDER_H
#define ZMC_FUZZ_SUPPORT_SCRATCHFOLDER_H

#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <string>

namespace zmcfuzz {

class ScratchFolder {
public:
    ScratchFolder() {
        const std::filesystem::path memory("/dev/shm");
        const auto base =
            std::filesystem::is_directory(memory) ? memory : std::filesystem::temp_directory_path();
        std::string name = (base / "zmc-fuzz-XXXXXX").string();
        if (!mkdtemp(name.data())) std::abort();
        path = name;
    }
    ScratchFolder(const ScratchFolder&) = delete;
    ScratchFolder& operator=(const ScratchFolder&) = delete;
    ~ScratchFolder() {
        std::error_code ignored;
        std::filesystem::remove_all(path, ignored);
    }

    const std::string& Path() const { return path; }
    std::string operator/(const std::string& name) const { return path + "/" + name; }

private:
    std::string path;
};

}  // namespace zmcfuzz

#endif
