// PartOptions: the options that choose a part of a raster: --level, --window and --bands.
#ifndef ZMC_TOOLS_PARTOPTIONS_H
#define ZMC_TOOLS_PARTOPTIONS_H

#include <cstdint>
#include <string>

#include "tools/OptionTable.h"

namespace zmctools {

struct PartOptions {
    std::string level = "0";
    std::string window;  // empty: all of the level
    std::string bands;   // empty: all of them

    // Adds the three options to the command line.
    void Describe(OptionTable& table);
    // The level as a number. Throws UsageError for what no pyramid can have.
    std::uint32_t Level() const;
};

}  // namespace zmctools

#endif
