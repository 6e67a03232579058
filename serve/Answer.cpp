#include "serve/Answer.h"

#include <cstdio>

#include "serve/Request.h"

namespace zmcserve {
namespace {

constexpr std::size_t kLongestQuoted = 80;

std::string Hex(unsigned char byte) {
    char text[8];
    static_cast<void>(std::snprintf(text, sizeof text, "\\x%02X", byte));
    return text;
}

// Length of the UTF-8 character at the start of a text; 0 where there is none that documents hold.
std::size_t CharacterAt(std::string_view text) {
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    const unsigned char first = byte(0);
    if (first < 0x80) return first >= 0x20 || first == '\t' || first == '\n' || first == '\r';
    const std::size_t size = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
    if (first < 0xC2 || first > 0xF4 || text.size() < size) return 0;
    for (std::size_t i = 1; i < size; ++i)
        if ((byte(i) & 0xC0) != 0x80) return 0;
    if ((first == 0xE0 && byte(1) < 0xA0) || (first == 0xED && byte(1) > 0x9F)) return 0;
    if ((first == 0xF0 && byte(1) < 0x90) || (first == 0xF4 && byte(1) > 0x8F)) return 0;
    // U+FFFE and U+FFFF are no characters of XML.
    if (first == 0xEF && byte(1) == 0xBF && byte(2) >= 0xBE) return 0;
    return size;
}

const char* EntityOf(char c) {
    switch (c) {
        case '&':
            return "&amp;";
        case '<':
            return "&lt;";
        case '>':
            return "&gt;";
        case '"':
            return "&quot;";
        case '\'':
            return "&#39;";
        default:
            return nullptr;
    }
}

struct SizeOf {
    std::uint64_t operator()(const std::string& text) const { return text.size(); }
    std::uint64_t operator()(const std::vector<unsigned char>& bytes) const { return bytes.size(); }
    std::uint64_t operator()(const SharedText& text) const { return text ? text->size() : 0; }
    std::uint64_t operator()(const FileRange& range) const { return range.size; }
};

struct TextOf {
    std::string operator()(const std::string& text) const { return text; }
    std::string operator()(const std::vector<unsigned char>& bytes) const {
        return {bytes.begin(), bytes.end()};
    }
    std::string operator()(const SharedText& text) const { return text ? *text : std::string(); }
    std::string operator()(const FileRange& range) const {
        std::string text(range.size, '\0');
        if (range.file->ReadAt(range.offset, text.data(), text.size()) != text.size())
            throw Refusal(500, "the file ends before what is to be read of it");
        return text;
    }
};

}  // namespace

std::uint64_t Answer::Size() const { return std::visit(SizeOf{}, body); }

std::string Answer::Text() const { return std::visit(TextOf{}, body); }

std::string_view Answer::Header(std::string_view name) const {
    for (const auto& [key, value] : headers)
        if (SameWord(key, name)) return value;
    return {};
}

void Answer::Set(std::string_view name, std::string value) {
    for (auto& [key, old] : headers)
        if (SameWord(key, name)) {
            old = std::move(value);
            return;
        }
    headers.emplace_back(name, std::move(value));
}

Refusal Refusal::Busy(const std::string& text, unsigned seconds) {
    return Refusal(503, text).With("Retry-After", std::to_string(seconds));
}

Refusal&& Refusal::With(std::string name, std::string value) && {
    headers.emplace_back(std::move(name), std::move(value));
    return std::move(*this);
}

Answer TextAnswer(int status, std::string_view line) {
    Answer answer;
    answer.status = status;
    answer.type = "text/plain; charset=utf-8";
    std::string text;
    // Reasons come from libraries too, and may have more lines.
    for (const char c : line) text += static_cast<unsigned char>(c) < 0x20 || c == 0x7F ? ' ' : c;
    answer.body = text + '\n';
    return answer;
}

Answer ToAnswer(const Refusal& refusal) {
    Answer answer = TextAnswer(refusal.Status(), refusal.what());
    answer.headers = refusal.Extra();
    answer.Set("Cache-Control", "no-store");
    return answer;
}

std::string Quoted(std::string_view text) {
    std::string quoted = "\"";
    for (const char c : text.substr(0, kLongestQuoted))
        if (c >= 0x20 && c < 0x7F)
            quoted += c;
        else
            quoted += Hex(static_cast<unsigned char>(c));
    return quoted + (text.size() > kLongestQuoted ? "...\"" : "\"");
}

std::string Escaped(std::string_view text) {
    std::string escaped;
    while (!text.empty()) {
        const std::size_t size = CharacterAt(text);
        if (size == 0)
            escaped += "\xEF\xBF\xBD";  // U+FFFD
        else if (const char* const entity = EntityOf(text[0]))
            escaped += entity;
        else
            escaped += text.substr(0, size);
        text.remove_prefix(size == 0 ? 1 : size);
    }
    return escaped;
}

}  // namespace zmcserve
