// HttpDate: points of time as HTTP headers have them, in seconds since 1970.
#ifndef ZMC_SERVE_HTTPDATE_H
#define ZMC_SERVE_HTTPDATE_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace zmcserve {

// "Sun, 06 Nov 1994 08:49:37 GMT"
std::string HttpDateText(std::int64_t seconds);
// Of this form and of the two old ones, "Sunday, 06-Nov-94 08:49:37 GMT" and "Sun Nov  6 08:49:37
// 1994"; nothing for any other text.
std::optional<std::int64_t> ParseHttpDate(std::string_view text);

}  // namespace zmcserve

#endif
