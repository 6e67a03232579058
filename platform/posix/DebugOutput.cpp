#include "platform/DebugOutput.h"

#include <cstdio>
#include <string>

#include "platform/TextConversion.h"

namespace platform {

void WriteDebugOutput(const char16_t* text) {
    constexpr std::size_t kStretch = 1024;  // units at a time; each takes at most three bytes
    char bytes[3 * kStretch];
    std::size_t left = std::char_traits<char16_t>::length(text);
    while (left != 0) {
        std::size_t units = left < kStretch ? left : kStretch;
        const bool splitsPair = units < left && (text[units - 1] & 0xFC00) == 0xD800;
        if (splitsPair) --units;
        const std::size_t size = Utf16ToUtf8(text, units, bytes, sizeof bytes);
        if (size == kConversionFailed) return;  // unreachable: the bytes have room for all units
        static_cast<void>(std::fwrite(bytes, 1, size, stderr));
        text += units;
        left -= units;
    }
}

}  // namespace platform
