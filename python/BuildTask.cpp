#include "python/BuildTask.h"

#include <cpl_string.h>
#include <gdal_utils.h>

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

// A virtual raster of the bands that are built, of which only the metadata are looked at.
std::unique_ptr<GDALDataset> Selected(GDALDataset& facts, const BuildTask& task) {
    CPLStringList list;
    for (const char* const word : {"-of", "VRT"}) list.AddString(word);
    for (const std::uint32_t band : task.options.bands) {
        list.AddString("-b");
        list.AddString(std::to_string(band + 1).c_str());
    }
    if (!task.noData.empty()) {
        list.AddString("-a_nodata");
        list.AddString(task.noData.c_str());
    }
    const std::unique_ptr<GDALTranslateOptions, decltype(&GDALTranslateOptionsFree)> translate(
        GDALTranslateOptionsNew(list.List(), nullptr), &GDALTranslateOptionsFree);
    return std::unique_ptr<GDALDataset>(GDALDataset::FromHandle(
        GDALTranslate("", GDALDataset::ToHandle(&facts), translate.get(), nullptr)));
}

void KeepFacts(const BuildTask& task, GDALDataset& facts,
               const std::vector<zmchost::FullStatistics>& statistics, const std::string& built,
               const std::string& base) {
    const zmcgdal::ErrorCatcher errors(CE_Failure);
    const auto selected = Selected(facts, task);
    auto file = std::make_shared<zmcgdal::OpenFile>(built, GA_Update, zmcgdal::OpenOptions{});
    auto pyramid = zmcgdal::Dataset::FromFile(std::move(file), GA_Update);
    pyramid->LoadSidecar(base.c_str(), nullptr);
    const bool copied = selected && zmcgdal::CopySidecar(*selected, *pyramid, true) == CE_None;
    if (copied) {
        zmcgdal::KeepStatistics(statistics, *pyramid, pyramid->File().archive);
        (task.embed ? zmcgdal::EmbedSidecar : zmcgdal::SaveSidecar)(std::move(pyramid),
                                                                    task.target);
    }
    pyramid.reset();
    if (!copied || !errors.Text().empty())
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
