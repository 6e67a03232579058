// Answer: what a request is answered with, as a plain value, and Refusal, which becomes one.
//
// Handlers make answers and know nothing of sockets: HttpServer.h hands them out, and tests look at
// them as they are. Headers that follow from the body (Content-Length, Date) are none of an
// answer's.
#ifndef ZMC_SERVE_ANSWER_H
#define ZMC_SERVE_ANSWER_H

#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "serve/ServedFile.h"

namespace zmcserve {

using Headers = std::vector<std::pair<std::string, std::string>>;
using SharedText = std::shared_ptr<const std::string>;

// Bytes [offset, offset + size) of an open file, which are handed out without being read here.
struct FileRange {
    ServedFilePtr file;
    std::uint64_t offset = 0;
    std::uint64_t size = 0;
};

using Body = std::variant<std::string, std::vector<unsigned char>, SharedText, FileRange>;

struct Answer {
    int status = 200;
    std::string type;  // of the body, as Content-Type; empty: none is sent
    Headers headers;   // names once each
    Body body;
    // Whether the body may be sent compressed where the client takes it (Compression.h).
    bool compressible = false;

    std::uint64_t Size() const;
    // The bytes; those of a file are read. Throws Refusal where that fails.
    std::string Text() const;
    // Empty where there is none of that name, which is as it was set.
    std::string_view Header(std::string_view name) const;
    void Set(std::string_view name, std::string value);
};

// Why a request is not answered as it was wanted, in one line for people without control
// characters.
class Refusal : public std::runtime_error {
public:
    Refusal(int status, const std::string& text) : std::runtime_error(text), code(status) {}
    // Of 503: after how many seconds it is worth asking again.
    static Refusal Busy(const std::string& text, unsigned seconds = 1);

    int Status() const { return code; }
    const Headers& Extra() const { return headers; }
    Refusal&& With(std::string name, std::string value) &&;

private:
    int code;
    Headers headers;
};

// text/plain of one line, with an end of line.
Answer TextAnswer(int status, std::string_view line);
Answer ToAnswer(const Refusal& refusal);

// What stands in a message of a name or value that somebody sent: cut, in quotes, and with `\xHH`
// in place of what is no printable ASCII character.
std::string Quoted(std::string_view text);

// The text for elements and attributes of HTML and XML: & < > " ' are escaped, and what neither can
// hold is replaced.
std::string Escaped(std::string_view text);

}  // namespace zmcserve

#endif
