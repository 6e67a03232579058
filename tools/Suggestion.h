// What somebody may have meant by a word that there is not.
#ifndef ZMC_TOOLS_SUGGESTION_H
#define ZMC_TOOLS_SUGGESTION_H

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace zmctools {

// The least number of steps from one word to the other. A step puts in, takes out or replaces one
// byte, or swaps two neighbours, none of which is touched again.
std::size_t EditDistance(std::string_view from, std::string_view to);

// The first of the nearest names, or an empty text where none is near: a third of the word's length
// may be wrong, one byte at the least, and some of it must be right. A name that is the word itself
// is none.
std::string Suggestion(std::string_view word, const std::vector<std::string>& names);

}  // namespace zmctools

#endif
