#include "platform/TextStream.h"

#include <new>
#include <string>

#include "platform/TextConversion.h"

namespace platform {
namespace {

std::string Utf8Name(const char16_t* name) {
    const std::size_t units = std::char_traits<char16_t>::length(name);
    const std::size_t bytes = Utf16ToUtf8(name, units, nullptr, 0);
    if (bytes == kConversionFailed) return {};
    std::string narrow(bytes, '\0');
    Utf16ToUtf8(name, units, narrow.data(), bytes);
    return narrow;
}

}  // namespace

std::FILE* OpenTextStream(const char16_t* name, const char* mode) {
    if (!name) return nullptr;
    try {
        // 'e' is the letter that closes the descriptor when the process becomes another program.
        return std::fopen(Utf8Name(name).c_str(), (std::string(mode) + 'e').c_str());
    } catch (...) {
        return nullptr;
    }
}

bool SeekToEnd(std::FILE* stream, std::uint64_t& position) {
    if (fseeko(stream, 0, SEEK_END) != 0) return false;
    const off_t offset = ftello(stream);
    if (offset < 0) return false;
    position = static_cast<std::uint64_t>(offset);
    return true;
}

}  // namespace platform
