// Conditions: what a client has already, and which part it wants: RFC 9110, sections 13 and 14.
#ifndef ZMC_SERVE_CONDITIONS_H
#define ZMC_SERVE_CONDITIONS_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "serve/Answer.h"
#include "serve/Request.h"

namespace zmcserve {

// By which a client recognises what it has.
struct Validators {
    std::string etag;                      // a strong one; empty: there is none
    std::optional<std::int64_t> modified;  // seconds since 1970
};

// How long an answer may be kept. Tiles and files are kept by whoever likes, and asked for again
// with what is told here: a file can be replaced at any moment, and pixels of two states must not
// meet on one screen. Behind a proxy such a question costs no picture, but for the first.
inline constexpr const char* kRevalidate = "public, max-age=0, must-revalidate";

// Sets ETag, Last-Modified and Cache-Control; of what has no ETag that it is kept by nobody.
void SetValidators(Answer& answer, const Validators& validators);

// 304 or 412 where If-Match, If-Unmodified-Since, If-None-Match or If-Modified-Since ask for it.
std::optional<Answer> AnswerOfConditions(const Request& request, const Validators& validators);

// Bytes [offset, offset + size).
struct ByteRange {
    std::uint64_t offset = 0;
    std::uint64_t size = 0;
    friend bool operator==(const ByteRange&, const ByteRange&) = default;
};

enum class RangeKind {
    Whole,         // no Range, one that is malformed or of another unit, or of several parts
    Part,          // one part
    Unsatisfiable  // none of the parts lies in the bytes: 416
};

// What a value of Range asks of so many bytes; `range` is told of Part.
RangeKind ParseRange(std::string_view value, std::uint64_t size, ByteRange& range);

// The same of a request: of GET alone, and of what If-Range finds unchanged.
RangeKind RangeOf(const Request& request, const Validators& validators, std::uint64_t size,
                  ByteRange& range);

}  // namespace zmcserve

#endif
