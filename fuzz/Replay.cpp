// Runs a fuzz target over files: every argument is one input, or a folder of them. An input that
// fails ends the program, as in a fuzzer, after its name; a replay of nothing fails too.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

std::vector<std::filesystem::path> Inputs(int count, char** arguments) {
    std::vector<std::filesystem::path> inputs;
    for (int i = 1; i < count; ++i) {
        if (!std::filesystem::is_directory(arguments[i])) {
            inputs.emplace_back(arguments[i]);
            continue;
        }
        for (const auto& entry : std::filesystem::directory_iterator(arguments[i]))
            if (entry.is_regular_file()) inputs.push_back(entry.path());
    }
    std::sort(inputs.begin(), inputs.end());
    return inputs;
}

// Bytes in a block of their very size, so that a sanitizer sees the first byte beyond.
std::vector<char> Bytes(const std::filesystem::path& path) {
    std::vector<char> bytes(static_cast<std::size_t>(std::filesystem::file_size(path)));
    std::ifstream file(path, std::ios::binary);
    file.read(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    return bytes;
}

}  // namespace

int main(int count, char** arguments) {
    const std::vector<std::filesystem::path> inputs = Inputs(count, arguments);
    for (const std::filesystem::path& input : inputs) {
        const std::vector<char> bytes = Bytes(input);
        std::printf("%s\n", input.c_str());
        static_cast<void>(std::fflush(stdout));
        LLVMFuzzerTestOneInput(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
    }
    std::printf("replayed %zu inputs\n", inputs.size());
    return inputs.empty() ? 1 : 0;
}
