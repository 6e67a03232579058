// The holder of the process-wide table of directory settings.
#ifndef ZMC_ZMCG_ENVIRONMENTIMPL_H
#define ZMC_ZMCG_ENVIRONMENTIMPL_H

#include <map>

#include "core/String.h"

namespace zelm {

struct EnvironmentImpl {
    // Ordered by the wide text, code unit by code unit; a null text comes first. The host fills
    // the table before the first reader runs: there is no lock.
    std::map<String, String> settings;
};

}  // namespace zelm

#endif
