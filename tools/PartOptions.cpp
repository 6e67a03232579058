#include "tools/PartOptions.h"

#include "tools/Arguments.h"

namespace zmctools {

void PartOptions::Describe(CLI::App& app) {
    app.add_option("--level", level, "Level, counted from 0, the finest (default 0)")
        ->type_name("N");
    app.add_option("--window", window, "Part of the level, in its pixels (default all)")
        ->type_name("X,Y,W,H");
    app.add_option("--bands", bands, "Bands in the order wanted, counted from 1 (default all)")
        ->type_name("3,2,1");
}

std::uint32_t PartOptions::Level() const {
    return static_cast<std::uint32_t>(ParseCount("--level", level, 63));
}

}  // namespace zmctools
