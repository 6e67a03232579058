// Conversions of text written out by hand, a byte or a unit at a time: what the module's answers
// are held against.
#ifndef ZMC_FUZZ_SUPPORT_TEXTMODEL_H
#define ZMC_FUZZ_SUPPORT_TEXTMODEL_H

#include <cstdint>
#include <string>
#include <string_view>

namespace zmcfuzz {

constexpr char32_t kReplacement = 0xFFFD;

inline bool IsLead(char16_t unit) { return unit >= 0xD800 && unit < 0xDC00; }
inline bool IsTrail(char16_t unit) { return unit >= 0xDC00 && unit < 0xE000; }

inline void PutUtf16(char32_t character, std::u16string& out) {
    if (character < 0x10000) {
        out += static_cast<char16_t>(character);
        return;
    }
    out += static_cast<char16_t>(0xD800 + ((character - 0x10000) >> 10));
    out += static_cast<char16_t>(0xDC00 + ((character - 0x10000) & 0x3FF));
}

inline void PutUtf8(char32_t character, std::string& out) {
    if (character < 0x80) {
        out += static_cast<char>(character);
        return;
    }
    const int more = character < 0x800 ? 1 : character < 0x10000 ? 2 : 3;
    const char32_t marks[] = {0, 0xC0, 0xE0, 0xF0};
    out += static_cast<char>(marks[more] | character >> (6 * more));
    for (int i = more - 1; i >= 0; --i)
        out += static_cast<char>(0x80 | (character >> (6 * i) & 0x3F));
}

// UTF-8 to UTF-16. Where bytes make no character, the longest stretch that could have begun one
// becomes one U+FFFD, and any other byte becomes one of its own.
inline std::u16string Utf16Of(std::string_view bytes) {
    std::u16string out;
    for (std::size_t i = 0; i < bytes.size();) {
        const auto first = static_cast<unsigned char>(bytes[i++]);
        if (first < 0x80) {
            out += static_cast<char16_t>(first);
            continue;
        }
        const int more = first >= 0xC2 && first < 0xE0   ? 1
                         : first >= 0xE0 && first < 0xF0 ? 2
                         : first >= 0xF0 && first < 0xF5 ? 3
                                                         : 0;
        char32_t character = first & (0x3Fu >> more);
        int taken = 0;
        for (; taken < more && i < bytes.size(); ++taken, ++i) {
            const auto next = static_cast<unsigned char>(bytes[i]);
            unsigned low = 0x80, high = 0xBF;
            if (taken == 0) {  // neither longer than need be, nor a surrogate, nor beyond U+10FFFF
                if (first == 0xE0) low = 0xA0;
                if (first == 0xED) high = 0x9F;
                if (first == 0xF0) low = 0x90;
                if (first == 0xF4) high = 0x8F;
            }
            if (next < low || next > high) break;
            character = character << 6 | (next & 0x3Fu);
        }
        PutUtf16(more != 0 && taken == more ? character : kReplacement, out);
    }
    return out;
}

// Calls visit(character) for the characters of a text; a surrogate without its partner is passed
// as it is.
template <class Visit>
void ForEachCharacter(std::u16string_view text, Visit&& visit) {
    for (std::size_t i = 0; i < text.size(); ++i) {
        char32_t character = text[i];
        if (IsLead(text[i]) && i + 1 < text.size() && IsTrail(text[i + 1])) {
            character = 0x10000u + ((text[i] & 0x3FFu) << 10) + (text[i + 1] & 0x3FFu);
            ++i;
        }
        visit(character);
    }
}

inline bool IsSurrogate(char32_t character) { return character >= 0xD800 && character < 0xE000; }

// UTF-16 to UTF-8; a surrogate without its partner becomes U+FFFD.
inline std::string Utf8Of(std::u16string_view text) {
    std::string out;
    ForEachCharacter(text, [&](char32_t character) {
        PutUtf8(IsSurrogate(character) ? kReplacement : character, out);
    });
    return out;
}

// UTF-16 to ASCII, the charset of the classic locale.
inline std::string AsciiOf(std::u16string_view text) {
    std::string out;
    ForEachCharacter(text, [&](char32_t character) {
        out += character < 0x80 ? static_cast<char>(character) : '?';
    });
    return out;
}

}  // namespace zmcfuzz

#endif
