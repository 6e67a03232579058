#include "platform/ParseNumber.h"

#include <locale.h>
#include <stdlib.h>

#include <algorithm>
#include <cstdlib>
#include <limits>

namespace platform {
namespace {

// Wide enough to saturate later: what it cannot hold, 32 bits cannot either.
static_assert(sizeof(long long) > sizeof(std::uint32_t));
long long ParseWhole(const char* text) { return std::strtoll(text, nullptr, 0); }

}  // namespace

double ParseReal(const char* text) {
    // The library's own locale: there is nothing to make, so it cannot fail.
    static const locale_t classic = newlocale(LC_ALL_MASK, "C", nullptr);
    return strtod_l(text, nullptr, classic);
}

std::uint32_t ParseUnsigned32(const char* text) {
    constexpr long long kHighest = std::numeric_limits<std::uint32_t>::max();
    const long long number = ParseWhole(text);
    return static_cast<std::uint32_t>(number >= -kHighest ? std::min(number, kHighest) : kHighest);
}

std::int32_t ParseSigned32(const char* text) {
    using Limits = std::numeric_limits<std::int32_t>;
    return static_cast<std::int32_t>(
        std::clamp<long long>(ParseWhole(text), Limits::min(), Limits::max()));
}

}  // namespace platform
