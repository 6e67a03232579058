#include "tools/Suggestion.h"

#include <algorithm>
#include <numeric>
#include <utility>

namespace zmctools {
namespace {

// Names are short; what is much longer than any of them is none of them, and costs nothing.
constexpr std::size_t kLongestWord = 64;

}  // namespace

std::size_t EditDistance(std::string_view from, std::string_view to) {
    std::vector<std::size_t> before, last(to.size() + 1), row(to.size() + 1);
    std::iota(last.begin(), last.end(), 0);
    for (std::size_t i = 1; i <= from.size(); ++i) {
        row[0] = i;
        for (std::size_t j = 1; j <= to.size(); ++j) {
            const bool same = from[i - 1] == to[j - 1];
            row[j] = std::min({last[j] + 1, row[j - 1] + 1, last[j - 1] + (same ? 0U : 1U)});
            if (i > 1 && j > 1 && from[i - 1] == to[j - 2] && from[i - 2] == to[j - 1])
                row[j] = std::min(row[j], before[j - 2] + 1);
        }
        before = std::exchange(last, row);
    }
    return last[to.size()];
}

std::string Suggestion(std::string_view word, const std::vector<std::string>& names) {
    if (word.size() > kLongestWord) return {};
    const std::size_t most = std::max<std::size_t>(word.size() / 3, 1);
    std::size_t least = most + 1;
    const std::string* nearest = nullptr;
    for (const std::string& name : names) {
        const std::size_t distance = EditDistance(word, name);
        if (distance == 0 || distance >= std::min(least, word.size())) continue;
        least = distance;
        nearest = &name;
    }
    return nearest ? *nearest : std::string();
}

}  // namespace zmctools
