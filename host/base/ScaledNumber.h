// ParseScaled: a whole number with a unit of 1024, its square or its cube behind it, as all sizes
// are read that people give: "512K", "256M", "2G".
//
// `units` are the letters that stand for the three, in that order, as often as that is repeated
// ("KMGkmg"). A number without one is taken as it is. Nothing if the text is anything else, or the
// value beyond 64 bits.
#ifndef ZMC_HOST_BASE_SCALEDNUMBER_H
#define ZMC_HOST_BASE_SCALEDNUMBER_H

#include <cstdint>
#include <optional>
#include <string_view>

namespace zmchost {

std::optional<std::uint64_t> ParseScaled(std::string_view text, std::string_view units);

}  // namespace zmchost

#endif
