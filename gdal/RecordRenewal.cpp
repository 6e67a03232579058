#include "gdal/RecordRenewal.h"

#include "gdal/Band.h"
#include "gdal/NoDataValues.h"
#include "host/build/StatisticsRenewal.h"

namespace zmcgdal {
namespace {

Band& BandAt(Dataset& dataset, std::uint32_t index) {
    return *static_cast<Band*>(dataset.GetRasterBand(static_cast<int>(index) + 1));
}

// Whether a band has records that do not count.
struct Hidden {
    bool statistics = false;
    bool histograms = false;
};

std::vector<Hidden> HiddenOf(Dataset& dataset) {
    const std::uint32_t bands = dataset.File().info.header.bandCount;
    std::vector<Hidden> hidden;
    for (std::uint32_t i = 0; i < bands; ++i) {
        Band& band = BandAt(dataset, i);
        const RecordCounts old = band.OldRecords();
        hidden.push_back({old.statistics != 0 && !band.Stored(),
                          old.histograms != 0 && !band.CurrentHistogram()});
    }
    return hidden;
}

}  // namespace

void RenewRecords(Dataset& dataset, const std::vector<std::uint32_t>& bands, std::uint32_t threads,
                  const std::function<bool(double share)>& progress) {
    OpenFile& file = dataset.File();
    zmchost::RenewalRequest request;
    request.bands = bands;
    request.threads = threads;
    request.progress = progress;
    for (const std::uint32_t band : bands)
        if (const auto value = NoDataAsDouble(BandAt(dataset, band)))
            request.noDataValues[band] = *value;
    const std::vector<Hidden> hidden = HiddenOf(dataset);
    const auto full =
        zmchost::RenewStatistics(SharedModule(), file.source, file.raster.Name(), request);
    file.archive.Forget();
    const RecordCounts now = file.archive.Counts();
    for (std::uint32_t i = 0; i < hidden.size(); ++i)
        BandAt(dataset, i)
            .SetOldRecords({hidden[i].statistics ? now.statistics : 0,
                            hidden[i].histograms ? now.histograms : 0});
    dataset.SettleRecords();
    for (const zmchost::FullStatistics& each : full) BandAt(dataset, each.band).TakeRenewed(each);
}

}  // namespace zmcgdal
