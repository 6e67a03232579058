// GDAL's colour tables as the module's palettes.
#ifndef ZMC_GDAL_COLORTABLES_H
#define ZMC_GDAL_COLORTABLES_H

#include <gdal_priv.h>

#include "colour/ColorList.h"

namespace zmcgdal {

// The entries in their order, of which each component is cut to a byte.
inline zelm::ColorList ColorsOf(const GDALColorTable& table) {
    zelm::ColorList colors;
    const auto cut = [](short component) { return static_cast<std::uint8_t>(component); };
    for (int i = 0; i < table.GetColorEntryCount(); ++i) {
        const GDALColorEntry& entry = *table.GetColorEntry(i);
        colors.Add(
            zelm::ColorList::Pack(cut(entry.c1), cut(entry.c2), cut(entry.c3), cut(entry.c4)));
    }
    return colors;
}

}  // namespace zmcgdal

#endif
