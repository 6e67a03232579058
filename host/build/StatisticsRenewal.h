// RenewStatistics: statistics and histograms of level 0, computed anew and put in the place of
// those that a pyramid file keeps.
//
// The module never removes a record, and answers with the oldest; so the document is cut down to
// what else it holds, and the records of all bands are stored behind that, in order: the new ones,
// and the newest of the bands that were left out. Samples of 8 and 16 bits are walked over once,
// others twice, since their bins depend on minimum and maximum. Some 128 bands are gathered at a
// time. Of a plain file a copy of the old document is kept beside it meanwhile (MetadataJournal.h).
#ifndef ZMC_HOST_BUILD_STATISTICSRENEWAL_H
#define ZMC_HOST_BUILD_STATISTICSRENEWAL_H

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "files/ByteSource.h"
#include "host/build/FullStatistics.h"
#include "host/raster/Module.h"

namespace zmchost {

struct RenewalRequest {
    std::vector<std::uint32_t> bands;              // from 0; empty: all of them
    std::map<std::uint32_t, double> noDataValues;  // by band
    std::uint32_t bins = 256;                      // of a histogram; one per value for 8-bit types
    std::uint32_t threads = 0;                     // 0: as many as the machine has processors
    // Called now and then with the share of the work that is done, one call at a time, on any of
    // the threads; false cancels.
    std::function<bool(double share)> progress;
};

// The file is open for update, complete, and has no document or one that is well-formed; `name`
// stands for it in errors. Throws Error or Cancelled; the document is then what it was, as far as
// the disk takes it. Rasters that are open on the same file know nothing of the change. Answers
// with the statistics of the bands asked for, in their order.
std::vector<FullStatistics> RenewStatistics(const ModulePtr& module,
                                            const std::shared_ptr<zelm::files::ByteSource>& source,
                                            const std::string& name, const RenewalRequest& request);

// A document without its statistics and histograms, all else as it stands; empty if nothing is
// left but the root. `text` is well-formed, in an encoding that has ASCII as single bytes.
std::string WithoutRecords(const std::string& text);

}  // namespace zmchost

#endif
