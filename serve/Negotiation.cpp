#include "serve/Negotiation.h"

#include <charconv>

#include "serve/Request.h"

namespace zmcserve {
namespace {

// How closely a range names a type: 0 not at all, 3 by itself.
int Closeness(std::string_view range, std::string_view type) {
    if (SameWord(range, type)) return 3;
    if (range == "*/*") return 1;
    const std::size_t slash = type.find('/');
    return range.size() == slash + 2 && range.back() == '*' &&
                   SameWord(range.substr(0, slash + 1), type.substr(0, slash + 1))
               ? 2
               : 0;
}

double WeightOfType(std::string_view accepted, std::string_view type) {
    int closest = 0;
    double weight = 0;
    for (const std::string_view part : Split(accepted, ',')) {
        const std::size_t end = part.find(';');
        const int close = Closeness(Trimmed(part.substr(0, end)), type);
        if (close <= closest) continue;
        closest = close;
        weight = end == part.npos ? 1 : WeightOf(part.substr(end + 1));
    }
    return weight;
}

}  // namespace

bool Names(std::string_view accepted, std::string_view type) {
    for (const std::string_view part : Split(accepted, ',')) {
        const std::size_t end = part.find(';');
        if (SameWord(Trimmed(part.substr(0, end)), type))
            return end == part.npos || WeightOf(part.substr(end + 1)) > 0;
    }
    return false;
}

double WeightOf(std::string_view parameters) {
    for (const std::string_view part : Split(parameters, ';')) {
        const std::string_view text = Trimmed(part);
        if (text.substr(0, 2) != "q=") continue;
        double weight = 1;
        std::from_chars(text.data() + 2, text.data() + text.size(), weight);
        return weight;
    }
    return 1;
}

std::optional<std::size_t> BestOf(std::string_view accepted,
                                  const std::vector<std::string_view>& types) {
    std::optional<std::size_t> best;
    double most = 0;
    for (std::size_t i = 0; i < types.size(); ++i) {
        const double weight = WeightOfType(accepted, types[i]);
        if (weight > most) most = weight, best = i;
    }
    return best;
}

}  // namespace zmcserve
