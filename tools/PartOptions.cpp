#include "tools/PartOptions.h"

#include "tools/Arguments.h"

namespace zmctools {

void PartOptions::Describe(OptionTable& table) {
    table.Text("--level", level, "Level, counted from 0, the finest (default 0)").Named("N");
    table.Text("--window", window, "Part of the level, in its pixels (default all)")
        .Named("X,Y,W,H");
    table.Text("--bands", bands, "Bands in the order wanted, counted from 1 (default all)")
        .Named("3,2,1")
        .Filled(kNoBands);
}

std::uint32_t PartOptions::Level() const {
    return static_cast<std::uint32_t>(ParseCount("--level", level, 63));
}

}  // namespace zmctools
