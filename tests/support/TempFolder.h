// A folder of its own for a test, removed with it, and whole files in and out.
#ifndef ZMC_TESTS_SUPPORT_TEMPFOLDER_H
#define ZMC_TESTS_SUPPORT_TEMPFOLDER_H

#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

namespace zelm::test {

class TempFolder {
public:
    TempFolder() {
        std::string pattern = (std::filesystem::temp_directory_path() / "zmctestXXXXXX").string();
        path = mkdtemp(pattern.data());
    }
    ~TempFolder() {
        std::error_code ignored;
        std::filesystem::remove_all(path, ignored);
    }
    TempFolder(const TempFolder&) = delete;
    TempFolder& operator=(const TempFolder&) = delete;

    std::string File(const std::string& leaf) const { return (path / leaf).string(); }

    std::filesystem::path path;
};

inline std::string ReadWholeFile(const std::string& name) {
    std::ifstream stream(name, std::ios::binary);
    return {std::istreambuf_iterator<char>(stream), {}};
}

inline void WriteWholeFile(const std::string& name, const std::string& bytes) {
    std::ofstream(name, std::ios::binary | std::ios::trunc) << bytes;
}

}  // namespace zelm::test

#endif
