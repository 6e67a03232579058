#include <cstdio>
#include <map>

#include "core/PixelVocabulary.h"
#include "gdal/GdalRasterSource.h"
#include "gdal/NoDataValues.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/GdalWorld.h"
#include "tools/Methods.h"
#include "tools/Verification.h"

namespace zmctools {
namespace {

class VerifyCommand final : public Command {
public:
    const char* Name() const override { return "verify"; }
    const char* Summary() const override {
        return "Check a pyramid file against itself and a source";
    }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;
    std::string resampling;
    std::string weights = "auto";
    std::string source;
    std::string bands;
    std::string threads = "0";
    std::vector<CheckResult> results;

    void CheckPixels(zmchost::Raster& raster, bool documentIsGood);
    ExitStatus Report() const;
};

void VerifyCommand::Describe(OptionTable& table) {
    table.Text("FILE", file, "Pyramid to check").Required();
    table
        .Text("--resampling", resampling,
              "Method that the levels were made by (default average, and mode for rasters "
              "with a palette)")
        .Named("METHOD")
        .OneOf(MethodNames());
    table
        .Text(
            "--weights", weights,
            "Whether an alpha band and masks weighed the pixels that levels were made of (default "
            "auto)")
        .Named("WEIGHTS")
        .OneOf({"auto", "none"});
    table.Text("--against", source, "Raster that level 0 must be equal to").Named("SOURCE");
    table
        .Text("--bands", bands,
              "Bands of SOURCE that the file was built from, counted from 1 (default all)")
        .Named("3,2,1")
        .Filled(kNoBands);
    table.Text("--threads", threads, kThreadsText).Named("N");
    table.Footer(
        "Examples:\n"
        "  zmcraster verify scene.pyr\n"
        "  zmcraster verify scene.pyr --against scene.tif\n"
        "  zmcraster verify classes.pyr --resampling mode --json\n"
        "\n"
        "Checked are structure, completeness, documents, statistics and levels, and level 0 where "
        "a\n"
        "source is named. No-data values are those of FILE.aux.xml, or else of FILE. Exit status "
        "3, and a list, if\n"
        "something differs.");
}

// The file has no place for no-data values; masks go by those of the sidecar.
void TakeNoDataValues(zmchost::Raster& raster, GDALDataset& dataset) {
    std::map<std::uint32_t, double> values;
    for (int number = 1; number <= dataset.GetRasterCount(); ++number)
        if (const auto value = zmcgdal::NoDataAsDouble(*dataset.GetRasterBand(number)))
            values[static_cast<std::uint32_t>(number - 1)] = *value;
    raster.SetNoDataValues(values);
}

bool HasPalette(const zmchost::Raster& raster) {
    for (std::uint32_t band = 0; band < raster.Bands(); ++band)
        if (raster.HasPalette(band)) return true;
    return false;
}

void VerifyCommand::CheckPixels(zmchost::Raster& raster, bool documentIsGood) {
    const DatasetPtr dataset = OpenDataset(raster.Name());
    TakeNoDataValues(raster, *dataset);
    zmcgdal::GdalRasterSource shown(*dataset);
    const CheckManner manner{quiet, ParseThreads(threads)};
    results.push_back(documentIsGood
                          ? CheckStatistics(raster, manner)
                          : CheckResult{"statistics", "the document cannot be read", {}});
    const auto usual = documentIsGood && HasPalette(raster) ? zmchost::Resampling::Mode
                                                            : zmchost::Resampling::Average;
    results.push_back(CheckLevels(raster, zmchost::ParseResampling(resampling).value_or(usual),
                                  weights == "auto" ? &shown : nullptr, manner));
    if (source.empty()) return;
    const auto view = OpenView(source);
    results.push_back(CheckSource(raster, *view, ParseBands(bands, view->Bands()), quiet));
    view->CheckUnchanged();
}

ExitStatus VerifyCommand::Report() const {
    bool equal = true;
    Json checks = Json::array();
    for (const CheckResult& result : results) {
        equal = equal && result.problems.empty();
        const char* const verdict = !result.problems.empty()  ? "differs"
                                    : !result.skipped.empty() ? "skipped"
                                                              : "good";
        Json entry = {{"check", result.check}, {"result", verdict}, {"problems", result.problems}};
        if (!result.skipped.empty()) entry["reason"] = result.skipped;
        checks.push_back(entry);
        if (json || (quiet && result.problems.empty())) continue;
        std::printf("%-13s %s%s\n", result.check.c_str(), verdict,
                    result.skipped.empty() ? "" : (": " + result.skipped).c_str());
        for (const std::string& problem : result.problems)
            std::printf("  %s\n", Visible(problem).c_str());
    }
    if (json)
        PrintDocument({{"schema", kSchema}, {"file", file}, {"good", equal}, {"checks", checks}});
    return equal ? ExitStatus::Done : ExitStatus::Differences;
}

ExitStatus VerifyCommand::Run() {
    zmchost::PyramidFileInfo info = ReadLayout(file);
    if (zelm::CheckedPixelType(info.header.pixelType) == 0)
        throw Failure(file, std::string("no pixels of type ") +
                                zelm::PixelTypeName(info.header.pixelType) + " can be read");
    zmchost::Raster raster = OpenPyramid(file);
    // Of the file that is open now, should another have taken the name.
    info = zmchost::DescribePyramidFile(raster.Header());
    results.push_back(CheckStructure(info, raster));
    results.push_back(CheckCompleteness(info));
    results.push_back(CheckDocuments(info, raster));
    const bool documentIsGood = results.back().problems.empty();
    if (info.complete)
        CheckPixels(raster, documentIsGood);
    else
        for (const char* const check : {"statistics", "levels"})
            results.push_back({check, "the file is not complete", {}});
    if (const std::string change = raster.ContentChange(); !change.empty())
        FailAsChanged(file, change);
    return Report();
}

}  // namespace

std::unique_ptr<Command> MakeVerifyCommand() { return std::make_unique<VerifyCommand>(); }

}  // namespace zmctools
