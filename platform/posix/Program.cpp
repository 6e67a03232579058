#include "platform/Program.h"

#include <unistd.h>

#include <cinttypes>
#include <climits>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <string_view>

namespace platform {
namespace {

// The file of one line of the table of mappings, if it covers the address.
std::string FileAt(std::uintptr_t address, const std::string& line) {
    std::uintptr_t first = 0;
    std::uintptr_t end = 0;
    int file = 0;
    // NOLINTNEXTLINE(cert-err34-c): numbers that the system wrote fit their types.
    if (std::sscanf(line.c_str(), "%" SCNxPTR "-%" SCNxPTR " %*s %*s %*s %*s %n", &first, &end,
                    &file) < 2)
        return {};
    if (address < first || address >= end || file == 0) return {};
    const std::string path = line.substr(static_cast<std::size_t>(file));
    return IsAbsolutePath(path) ? path : std::string();
}

}  // namespace

std::string FileOfCode(const void* code) {
    // Not dladdr: it tells argv[0] for a program, and for a library the name it was asked for by.
    std::ifstream mappings("/proc/self/maps");
    std::string path;
    for (std::string line; path.empty() && std::getline(mappings, line);)
        path = FileAt(reinterpret_cast<std::uintptr_t>(code), line);
    constexpr std::string_view kRemoved = " (deleted)";
    if (path.ends_with(kRemoved)) path.resize(path.size() - kRemoved.size());
    return path;
}

std::string FileOfProgram() {
    char path[PATH_MAX];
    const ssize_t length = ::readlink("/proc/self/exe", path, sizeof path);
    return length > 0 ? std::string(path, static_cast<std::size_t>(length)) : std::string();
}

std::string EnvironmentValue(const char* name) {
    // NOLINTNEXTLINE(concurrency-mt-unsafe): nothing of ours changes the environment.
    const char* const value = ::secure_getenv(name);
    return value ? value : "";
}

bool IsAbsolutePath(const std::string& path) { return path.starts_with('/'); }

}  // namespace platform
