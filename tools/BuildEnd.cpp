#include "tools/BuildEnd.h"

#include <cstdio>
#include <utility>

#include "core/PixelVocabulary.h"
#include "describe/Description.h"
#include "describe/JsonNumbers.h"
#include "gdal/Dataset.h"
#include "gdal/Sidecar.h"
#include "tools/MosaicSource.h"

namespace zmctools {
namespace {

std::string ReportText(const BuildWords& words, const zmchost::BuildReport& report,
                       std::uint32_t pixelType) {
    return Visible(words.target) + ": " + std::to_string(report.width) + " x " +
           std::to_string(report.height) + " pixels, " + std::to_string(report.bands) + " band" +
           (report.bands == 1 ? "" : "s") + " of " + zelm::PixelTypeName(pixelType) +
           ", levels 0 to " + std::to_string(report.maxLevel) + " by " +
           zmchost::ResamplingName(report.resampling) + ", " + std::to_string(report.fileSize) +
           " bytes";
}

}  // namespace

BuildEnd::BuildEnd(GDALDataset& source, const BuildWords& buildWords,
                   zmchost::BuildOptions& options)
    : dataset(source), words(buildWords), bands(options.bands), stage(words.target) {
    options.takeStatistics = [this](const auto& stored) { Take(stored); };
    options.beforeNaming = [this](const std::string& built) {
        const std::string base = stage.Begin(built);
        WriteSidecar(dataset, words, bands, statistics,
                     std::make_shared<zmcgdal::OpenFile>(built, GA_Update, zmcgdal::OpenOptions{}),
                     base);
        stage.Complete();
    };
}

void WriteSidecar(GDALDataset& dataset, const BuildWords& words,
                  const std::vector<std::uint32_t>& bands,
                  const std::vector<zmchost::FullStatistics>& statistics,
                  std::shared_ptr<zmcgdal::OpenFile> built, const std::string& base) {
    const bool kept =
        zmcgdal::KeepSidecar(dataset, {bands, words.noData, words.embed, words.target, base},
                             statistics, std::move(built));
    const std::string reason = TakeGdalError(words.target);
    if (!kept || !reason.empty())
        throw Failure(words.target, "its metadata cannot be kept in " + Visible(words.target) +
                                        (words.embed ? "" : zmcgdal::kSidecarEnding) + ": " +
                                        (reason.empty() ? "no reason given" : reason));
}

Json BuildDocument(const BuildWords& words, const zmchost::BuildReport& report,
                   std::uint32_t pixelType, const GDALDataset& source) {
    Json document = {{"schema", zmcdescribe::kSchema},
                     {"source", words.source},
                     {"file", words.target},
                     {"width", report.width},
                     {"height", report.height},
                     {"bands", report.bands},
                     {"pixelType", zelm::PixelTypeName(pixelType)},
                     {"tileOrdering", zelm::TileOrderName(report.tileOrdering)},
                     {"levelMax", report.maxLevel},
                     {"resampling", zmchost::ResamplingName(report.resampling)},
                     {"bytes", zmcdescribe::JsonNumber(report.fileSize)},
                     {"seconds", zmcdescribe::JsonNumber(report.seconds)}};
    AddScenes(document, source);
    return document;
}

void PrintReport(const BuildWords& words, const zmchost::BuildReport& report,
                 std::uint32_t pixelType) {
    const double pixels = static_cast<double>(report.width) * report.height;
    std::printf("%s, %.2f s (%.1f Mpixel/s)\n", ReportText(words, report, pixelType).c_str(),
                report.seconds, report.seconds > 0 ? pixels / report.seconds / 1e6 : 0.0);
}

void PrintFinished(const BuildWords& words, const zmchost::BuildReport& report,
                   std::uint32_t pixelType) {
    std::printf("%s, finished in %.2f s\n", ReportText(words, report, pixelType).c_str(),
                report.seconds);
}

}  // namespace zmctools
