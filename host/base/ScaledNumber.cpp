#include "host/base/ScaledNumber.h"

#include <charconv>
#include <system_error>

namespace zmchost {

std::optional<std::uint64_t> ParseScaled(std::string_view text, std::string_view units) {
    unsigned shift = 0;
    if (const auto unit = text.empty() ? units.npos : units.find(text.back()); unit != units.npos) {
        shift = 10 * (static_cast<unsigned>(unit % 3) + 1);
        text.remove_suffix(1);
    }
    std::uint64_t value = 0;
    const char* const end = text.data() + text.size();
    const auto parsed = std::from_chars(text.data(), end, value);
    if (parsed.ec != std::errc() || parsed.ptr != end || value > (UINT64_MAX >> shift))
        return std::nullopt;
    return value << shift;
}

}  // namespace zmchost
