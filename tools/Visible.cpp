#include "tools/Visible.h"

#include <algorithm>
#include <array>
#include <cstdint>

namespace zmctools {
namespace {

struct Character {
    std::uint32_t code = 0;
    std::size_t bytes = 0;  // 0: the text does not begin with a character
};

// The first character of a text in its shortest form, as UTF-8 demands.
Character FirstOf(std::string_view text) {
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    const unsigned char lead = byte(0);
    if (lead < 0x80) return {lead, 1};
    const std::size_t bytes = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
    if (lead < 0xC2 || lead > 0xF4 || text.size() < bytes) return {};
    std::uint32_t code = lead & (0x7Fu >> bytes);
    for (std::size_t i = 1; i < bytes; ++i) {
        if ((byte(i) & 0xC0) != 0x80) return {};
        code = code << 6 | (byte(i) & 0x3Fu);
    }
    constexpr std::array<std::uint32_t, 5> kLeast = {0, 0, 0x80, 0x800, 0x10000};
    const bool isSurrogate = code >= 0xD800 && code <= 0xDFFF;
    return code < kLeast[bytes] || code > 0x10FFFF || isSurrogate ? Character{}
                                                                  : Character{code, bytes};
}

bool IsShown(std::uint32_t code) {
    const bool control = code < 0x20 || (code >= 0x7F && code < 0xA0);
    const bool lineEnd = code == 0x2028 || code == 0x2029;
    const bool direction = code == 0x061C || code == 0x200E || code == 0x200F ||
                           (code >= 0x202A && code <= 0x202E) || (code >= 0x2066 && code <= 0x2069);
    return !control && !lineEnd && !direction;
}

void AppendBytes(std::string& shown, std::string_view bytes) {
    constexpr std::string_view kDigits = "0123456789abcdef";
    for (const char c : bytes) {
        const auto byte = static_cast<unsigned char>(c);
        shown += "\\x";
        shown += kDigits[byte >> 4];
        shown += kDigits[byte & 15];
    }
}

}  // namespace

std::string Visible(std::string_view text) {
    std::string shown;
    while (!text.empty()) {
        const Character first = FirstOf(text);
        const std::string_view bytes = text.substr(0, first.bytes == 0 ? 1 : first.bytes);
        if (first.bytes != 0 && IsShown(first.code))
            shown += bytes;
        else
            AppendBytes(shown, bytes);
        text.remove_prefix(bytes.size());
    }
    return shown;
}

std::string Shortened(const std::string& visible, std::size_t columns) {
    constexpr std::string_view kDots = "...";
    if (visible.size() <= columns) return visible;
    std::size_t end = columns - std::min(columns, kDots.size());
    while (end > 0 && (static_cast<unsigned char>(visible[end]) & 0xC0) == 0x80) --end;
    return visible.substr(0, end).append(kDots);
}

}  // namespace zmctools
