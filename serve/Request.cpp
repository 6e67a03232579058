#include "serve/Request.h"

#include <algorithm>
#include <charconv>

#include "serve/Answer.h"

namespace zmcserve {
namespace {

char Lower(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c; }

int DigitOf(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    const char lower = Lower(c);
    return lower >= 'a' && lower <= 'f' ? lower - 'a' + 10 : -1;
}

bool StaysPlain(char c) {
    const char lower = Lower(c);
    return (lower >= 'a' && lower <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '.' ||
           c == '_' || c == '~';
}

std::string Decoded(std::string_view text, bool plusIsBlank) {
    auto decoded = PercentDecoded(text, plusIsBlank);
    if (!decoded) throw Refusal(400, "the address has a \"%\" without two hexadecimal digits");
    return std::move(*decoded);
}

// "http://server/path" means "/path" as well: every server has to take what proxies are sent.
std::string_view WithoutServer(std::string_view target) {
    for (const std::string_view scheme : {"http://", "https://"}) {
        if (!SameWord(target.substr(0, scheme.size()), scheme)) continue;
        const std::size_t end = target.find_first_of("/?#", scheme.size());
        if (target.size() == scheme.size() || end == scheme.size()) break;
        return end == target.npos ? "/" : target.substr(end);
    }
    return target;
}

std::vector<std::string> SegmentsOf(std::string_view path) {
    if (path.empty() || path[0] != '/') throw Refusal(400, "the address is no path");
    const auto parts = Split(path.substr(1), '/');
    if (parts.size() > Request::kMostSegments) throw Refusal(400, "the address has too many parts");
    std::vector<std::string> segments;
    for (const std::string_view part : parts) segments.push_back(Decoded(part, false));
    return segments;
}

std::vector<std::pair<std::string, std::string>> PairsOf(std::string_view query) {
    std::vector<std::pair<std::string, std::string>> pairs;
    if (query.empty()) return pairs;
    for (const std::string_view part : Split(query, '&')) {
        if (part.empty()) continue;
        if (pairs.size() == Request::kMostPairs)
            throw Refusal(400, "the query has too many parameters");
        const std::size_t equals = part.find('=');
        const std::string_view value =
            equals == part.npos ? std::string_view() : part.substr(equals + 1);
        pairs.emplace_back(Decoded(part.substr(0, equals), true), Decoded(value, true));
    }
    return pairs;
}

template <class Same>
std::optional<std::string_view> Single(
    const std::vector<std::pair<std::string, std::string>>& pairs, std::string_view key,
    Same&& same) {
    std::optional<std::string_view> found;
    for (const auto& [name, value] : pairs) {
        if (!same(name, key)) continue;
        if (found) throw Refusal(400, std::string(key) + " is given twice");
        found = value;
    }
    return found;
}

}  // namespace

void Deadline::Check() const {
    if (over && *over) throw Refusal::Busy("the server ends");
    if (Clock::now() >= end) throw Refusal::Busy("it takes longer than a request may", 10);
}

std::optional<std::string> PercentDecoded(std::string_view text, bool plusIsBlank) {
    std::string decoded;
    decoded.reserve(text.size());
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] != '%') {
            decoded += plusIsBlank && text[i] == '+' ? ' ' : text[i];
            continue;
        }
        const int high = i + 1 < text.size() ? DigitOf(text[i + 1]) : -1;
        const int low = i + 2 < text.size() ? DigitOf(text[i + 2]) : -1;
        if (high < 0 || low < 0) return std::nullopt;
        decoded += static_cast<char>(high * 16 + low);
        i += 2;
    }
    return decoded;
}

std::string PercentEncoded(std::string_view text, bool keepSlashes) {
    constexpr char kDigits[] = "0123456789ABCDEF";
    std::string encoded;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (StaysPlain(c) || (keepSlashes && c == '/'))
            encoded += c;
        else
            encoded.append({'%', kDigits[byte >> 4], kDigits[byte & 15]});
    }
    return encoded;
}

std::optional<std::uint64_t> WholeNumber(std::string_view text, std::uint64_t most) {
    std::uint64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || end != text.data() + text.size() || number > most)
        return std::nullopt;
    return number;
}

bool SameWord(std::string_view left, std::string_view right) {
    return std::equal(left.begin(), left.end(), right.begin(), right.end(),
                      [](char a, char b) { return Lower(a) == Lower(b); });
}

std::string_view Trimmed(std::string_view text) {
    const auto isBlank = [](char c) { return c == ' ' || c == '\t'; };
    while (!text.empty() && isBlank(text.front())) text.remove_prefix(1);
    while (!text.empty() && isBlank(text.back())) text.remove_suffix(1);
    return text;
}

std::vector<std::string_view> Split(std::string_view text, char separator) {
    std::vector<std::string_view> parts;
    for (;;) {
        const std::size_t end = text.find(separator);
        parts.push_back(text.substr(0, end));
        if (end == text.npos) return parts;
        text.remove_prefix(end + 1);
    }
}

Request Request::Parse(Method method, std::string_view target) {
    if (target.size() > kLongestTarget) throw Refusal(414, "the address is too long");
    Request request;
    request.method = method;
    request.target = target;
    target = WithoutServer(target);
    const bool hasServer = target.size() != request.target.size();
    // No client sends a fragment; what looks like one ends the query.
    target = target.substr(0, target.find('#'));
    const std::size_t question = target.find('?');
    const std::string_view path = target.substr(0, question);
    request.path = path.empty() && hasServer ? std::string_view("/") : path;
    request.segments = SegmentsOf(request.path);
    if (question != target.npos) request.query = PairsOf(target.substr(question + 1));
    return request;
}

std::optional<std::string> Request::Header(std::string_view name) const {
    std::optional<std::string> joined;
    for (const auto& [key, value] : headers) {
        if (!SameWord(key, name)) continue;
        joined = joined ? *joined + ", " + value : value;
    }
    return joined;
}

std::optional<std::string_view> Request::Value(std::string_view key) const {
    return Single(query, key, [](std::string_view a, std::string_view b) { return a == b; });
}

std::optional<std::string_view> Request::ValueOfAnyCase(std::string_view key) const {
    return Single(query, key, SameWord);
}

std::optional<std::uint64_t> Request::Count(std::string_view key, std::uint64_t most) const {
    const auto text = Value(key);
    if (!text) return std::nullopt;
    const auto number = WholeNumber(*text, most);
    if (!number)
        throw Refusal(400, std::string(key) + ": " + Quoted(*text) +
                               " is no whole number from 0 to " + std::to_string(most));
    return number;
}

void Request::AllowKeys(std::initializer_list<std::string_view> keys) const {
    for (const auto& [key, value] : query)
        if (std::find(keys.begin(), keys.end(), key) == keys.end())
            throw Refusal(400, Quoted(key) + " is no parameter of this address");
}

}  // namespace zmcserve
