// Negotiation: what a client likes most of what there is, by RFC 9110, section 12.
#ifndef ZMC_SERVE_NEGOTIATION_H
#define ZMC_SERVE_NEGOTIATION_H

#include <cstddef>
#include <optional>
#include <string_view>
#include <vector>

namespace zmcserve {

// The weight that parameters tell, "q=0.5": 0 to 1; one that cannot be read counts as 1.
double WeightOf(std::string_view parameters);

// Whether a value of Accept names a media type by itself, and takes it.
bool Names(std::string_view accepted, std::string_view type);

// Which of the media types a value of Accept likes most, the first of those that it likes alike;
// none where it takes none of them. Ranges ("image/*") count less than a type that is named.
std::optional<std::size_t> BestOf(std::string_view accepted,
                                  const std::vector<std::string_view>& types);

}  // namespace zmcserve

#endif
