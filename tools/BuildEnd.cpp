#include "tools/BuildEnd.h"

#include <cpl_string.h>
#include <gdal_utils.h>

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

std::vector<std::string> TranslateArguments(const std::vector<std::uint32_t>& bands,
                                            const std::string& noData) {
    std::vector<std::string> arguments = {"-of", "VRT"};
    for (const std::uint32_t band : bands) {
        arguments.push_back("-b");
        arguments.push_back(std::to_string(band + 1));
    }
    if (!noData.empty()) {
        arguments.push_back("-a_nodata");
        arguments.push_back(noData);
    }
    return arguments;
}

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

// A virtual raster selects the bands; only its metadata are looked at.
void WriteSidecar(GDALDataset& dataset, const BuildWords& words,
                  const std::vector<std::uint32_t>& bands,
                  const std::vector<zmchost::FullStatistics>& statistics,
                  std::shared_ptr<zmcgdal::OpenFile> built, const std::string& base) {
    CPLStringList list;
    for (const std::string& word : TranslateArguments(bands, words.noData))
        list.AddString(word.c_str());
    const std::unique_ptr<GDALTranslateOptions, decltype(&GDALTranslateOptionsFree)> translate(
        GDALTranslateOptionsNew(list.List(), nullptr), &GDALTranslateOptionsFree);
    const DatasetPtr selected(GDALDataset::FromHandle(
        GDALTranslate("", GDALDataset::ToHandle(&dataset), translate.get(), nullptr)));
    auto pyramid = zmcgdal::Dataset::FromFile(std::move(built), GA_Update);
    pyramid->LoadSidecar(base.c_str(), nullptr);
    bool kept = selected && zmcgdal::CopySidecar(*selected, *pyramid, true) == CE_None;
    if (kept) {
        zmcgdal::KeepStatistics(statistics, *pyramid, pyramid->File().archive);
        (words.embed ? zmcgdal::EmbedSidecar : zmcgdal::SaveSidecar)(std::move(pyramid),
                                                                     words.target);
    }
    pyramid.reset();
    const std::string reason = TakeGdalError(words.target);
    kept = kept && reason.empty();
    if (!kept)
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
