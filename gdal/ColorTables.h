// GDAL's colour tables as the module's palettes.
#ifndef ZMC_GDAL_COLORTABLES_H
#define ZMC_GDAL_COLORTABLES_H

#include <gdal_priv.h>

#include "colour/Palette.h"

namespace zmcgdal {

// Appends the entries, of which each component is cut to a byte.
inline void AddColors(const GDALColorTable& table, zelm::Palette& palette) {
    zelm::RGBAColor color{zelm::Array<unsigned char>()};  // one for all: its name is made once
    for (int i = 0; i < table.GetColorEntryCount(); ++i) {
        const GDALColorEntry& entry = *table.GetColorEntry(i);
        color.red = static_cast<unsigned char>(entry.c1);
        color.green = static_cast<unsigned char>(entry.c2);
        color.blue = static_cast<unsigned char>(entry.c3);
        color.alpha = static_cast<unsigned char>(entry.c4);
        palette.AddColor(color);
    }
}

}  // namespace zmcgdal

#endif
