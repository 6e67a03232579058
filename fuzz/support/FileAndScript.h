// FileAndScript: an input that is a whole file and what is done with it.
//
// The last byte of an input is the length of its script, the bytes in front of it are the script,
// and what comes before is the file. So every file is an input.
#ifndef ZMC_FUZZ_SUPPORT_FILEANDSCRIPT_H
#define ZMC_FUZZ_SUPPORT_FILEANDSCRIPT_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "fuzz/support/InputBytes.h"

namespace zmcfuzz {

// The bytes of both, which stay the fuzzer's.
struct FileAndScriptBytes {
    std::string_view file;
    std::string_view script;

    FileAndScriptBytes(const std::uint8_t* data, std::size_t size) {
        if (size == 0) return;
        const std::string_view all(reinterpret_cast<const char*>(data), size - 1);
        const std::size_t scriptSize = std::min<std::size_t>(data[size - 1], all.size());
        file = all.substr(0, all.size() - scriptSize);
        script = all.substr(file.size());
    }
    InputBytes Script() const {
        return InputBytes(reinterpret_cast<const std::uint8_t*>(script.data()), script.size());
    }
};

struct FileAndScript {
    std::string file;
    InputBytes script;

    static FileAndScript Take(const std::uint8_t* data, std::size_t size) {
        const FileAndScriptBytes bytes(data, size);
        return {std::string(bytes.file), bytes.Script()};
    }

    // Takes a second file off the end of the first: its length is in the last two bytes.
    std::string TakeSecond() {
        if (file.size() < 2) return {};
        const auto byte = [&](std::size_t back) {
            return static_cast<unsigned char>(file[file.size() - back]);
        };
        const std::size_t told = byte(2) + std::size_t{byte(1)} * 256;
        file.resize(file.size() - 2);
        std::string second = file.substr(file.size() - std::min(told, file.size()));
        file.resize(file.size() - second.size());
        return second;
    }
};

}  // namespace zmcfuzz

#endif
