#include "python/BuildTask.h"

#include <memory>
#include <utility>
#include <vector>

#include "gdal/Dataset.h"
#include "gdal/ErrorCatcher.h"
#include "gdal/Sidecar.h"
#include "gdal/SidecarStage.h"
#include "host/base/Error.h"

namespace zmcpython {
namespace {

void KeepFacts(const BuildTask& task, GDALDataset& facts,
               const std::vector<zmchost::FullStatistics>& statistics, const std::string& built,
               const std::string& base) {
    const zmcgdal::ErrorCatcher errors(CE_Failure);
    const bool kept = zmcgdal::KeepSidecar(
        facts, {task.options.bands, task.noData, task.embed, task.target, base}, statistics,
        std::make_shared<zmcgdal::OpenFile>(built, GA_Update, zmcgdal::OpenOptions{}));
    if (!kept || !errors.Text().empty())
        throw zmchost::Error(task.target, "keep its metadata",
                             errors.Text().empty() ? "GDAL gives no reason" : errors.Text());
}

}  // namespace

zmchost::BuildReport Build(const BuildTask& task, zmchost::RasterSource& pixels,
                           GDALDataset& facts) {
    zmcgdal::SidecarStage stage(task.target);
    std::vector<zmchost::FullStatistics> statistics;
    zmchost::BuildOptions options = task.options;
    options.takeStatistics = [&](const auto& stored) { statistics = stored; };
    options.beforeNaming = [&](const std::string& built) {
        KeepFacts(task, facts, statistics, built, stage.Begin(built));
        stage.Complete();
    };
    const zmchost::BuildReport report =
        zmchost::PyramidBuilder(zmcgdal::SharedModule()).Build(pixels, task.target, options);
    stage.Settle();
    return report;
}

}  // namespace zmcpython
