// Request: what a client asks for, taken apart once and judged, as a plain value.
//
// The path is split at its slashes before it is decoded, so that "%2F" stays within its segment.
// Bytes are kept as they are: a name need be no UTF-8. Whoever makes a path of segments looks at
// what is in them (Catalog.h does).
#ifndef ZMC_SERVE_REQUEST_H
#define ZMC_SERVE_REQUEST_H

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace zmcserve {

enum class Method { Get, Head, Options, Other };

// When an answer has to be there.
class Deadline {
public:
    using Clock = std::chrono::steady_clock;
    Deadline() = default;  // never
    // Also as soon as `isOver`, which lives as long, is true.
    explicit Deadline(Clock::duration left, const std::atomic<bool>* isOver = nullptr)
        : end(Clock::now() + left), over(isOver) {}
    // Throws Refusal (503) once it has passed. Long work asks now and then.
    void Check() const;

private:
    Clock::time_point end = Clock::time_point::max();
    const std::atomic<bool>* over = nullptr;
};

class Request {
public:
    static constexpr std::size_t kLongestTarget = 8192;  // bytes
    static constexpr std::size_t kMostSegments = 64;
    static constexpr std::size_t kMostPairs = 64;  // of the query
    static constexpr std::size_t kMostHeaders = 100;

    // Takes a request target apart: "/tiles/scene.pyr/0/0/0.jpg?stretch=p2,98", or the same behind
    // "http://" and a server, which is not looked at. Throws Refusal: 414 where it is too long, 400
    // where it is no path, has a "%" without two hexadecimal digits, or too many parts.
    static Request Parse(Method method, std::string_view target);

    Method method = Method::Get;
    std::string target;                 // as it came
    std::string path;                   // the part between server and query, as it came
    std::vector<std::string> segments;  // decoded; "/a/b%2Fc/" has "a", "b/c" and ""
    std::vector<std::pair<std::string, std::string>> query;  // decoded, "+" is a blank
    std::vector<std::pair<std::string, std::string>> headers;
    std::string baseUrl;  // "http://127.0.0.1:8080", for links in answers
    Deadline deadline;
    // Whether the thread that read the request may compute for about a millisecond: few wait for
    // it, and to hand such a request to a worker and back takes a good part of its time.
    bool mayCompute = false;

    // The value of a header, in any case of letters of its name; several are joined by ", ".
    std::optional<std::string> Header(std::string_view name) const;
    // The value of a key of the query. Throws Refusal (400) where it is given twice.
    std::optional<std::string_view> Value(std::string_view key) const;
    // The same in any case of letters of the key.
    std::optional<std::string_view> ValueOfAnyCase(std::string_view key) const;
    // A whole number, at most `most`. Throws Refusal (400) for anything else.
    std::optional<std::uint64_t> Count(std::string_view key, std::uint64_t most) const;
    // Throws Refusal (400) where the query has a key that is not among them, and naming it.
    void AllowKeys(std::initializer_list<std::string_view> keys) const;
};

// The bytes that a text with "%HH" stands for; none where a "%" lacks its digits.
std::optional<std::string> PercentDecoded(std::string_view text, bool plusIsBlank = false);
// The text with "%HH" in place of all but letters, digits and "-._~"; slashes stay where that is
// wanted.
std::string PercentEncoded(std::string_view text, bool keepSlashes = false);
// A whole number without a sign, all of the text, at most `most`.
std::optional<std::uint64_t> WholeNumber(std::string_view text, std::uint64_t most);
bool SameWord(std::string_view left, std::string_view right);  // in any case of ASCII letters
std::string_view Trimmed(std::string_view text);               // of blanks and tabs
std::vector<std::string_view> Split(std::string_view text, char separator);

}  // namespace zmcserve

#endif
