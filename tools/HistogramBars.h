// DrawBars: a histogram as lines of block characters.
#ifndef ZMC_TOOLS_HISTOGRAMBARS_H
#define ZMC_TOOLS_HISTOGRAMBARS_H

#include <string>
#include <vector>

namespace zmctools {

// Neighbouring bins are summed until there are 64 bars at most; the highest one fills all six
// lines, and one that is not empty shows at least an eighth of a line.
std::vector<std::string> DrawBars(const std::vector<double>& counts);

}  // namespace zmctools

#endif
