// RenewRecords: statistics and histograms of an open pyramid, computed anew and stored in the file.
#ifndef ZMC_GDAL_RECORDRENEWAL_H
#define ZMC_GDAL_RECORDRENEWAL_H

#include <cstdint>
#include <functional>
#include <vector>

#include "gdal/Dataset.h"

namespace zmcgdal {

// The dataset is a main one, open for update, and no pixel of it waits to be written. `bands` count
// from 0; no-data values are those that its users see. What was marked as old of the other bands
// stays so. `threads` and `progress` are those of zmchost::RenewalRequest. The sidecar is not
// written yet. Throws as zmchost::RenewStatistics does.
void RenewRecords(Dataset& dataset, const std::vector<std::uint32_t>& bands, std::uint32_t threads,
                  const std::function<bool(double share)>& progress = nullptr);

}  // namespace zmcgdal

#endif
