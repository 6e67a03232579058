#include "format/XercesText.h"

#include <cstdio>

#include "core/String.h"

namespace zelm {

std::u16string ToWide(std::string_view ascii) { return {ascii.begin(), ascii.end()}; }

std::string ToNarrow(const XMLCh* text) {
    const String message(text);
    const char* narrow = message.GetUtf8();
    return narrow ? narrow : "";
}

void NarrowAscii(std::u16string_view text, std::string& out) {
    out.resize(text.size());
    for (std::size_t i = 0; i < text.size(); ++i)
        out[i] = text[i] < 0x80 ? static_cast<char>(text[i]) : '?';
}

void PrintError(std::string_view text) noexcept {
    static_cast<void>(std::fwrite(text.data(), 1, text.size(), stderr));
    static_cast<void>(std::fflush(stderr));
}

void PrintError(const XMLCh* text) noexcept {
    const String message(text);
    if (const char* narrow = message.GetUtf8()) PrintError(std::string_view(narrow));
}

}  // namespace zelm
