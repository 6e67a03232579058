// One row of the table of dataset formats.
#ifndef ZMC_ZMCG_FORMATRECORD_H
#define ZMC_ZMCG_FORMATRECORD_H

#include "core/WideChar.h"

struct FormatRecord {
    const zelm::WideChar* name;  // zero-terminated format word, or null
};

#endif
