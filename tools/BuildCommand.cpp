#include <cpl_string.h>
#include <gdal_utils.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <utility>

#include "core/PixelVocabulary.h"
#include "gdal/Dataset.h"
#include "gdal/GdalRasterSource.h"
#include "gdal/Sidecar.h"
#include "gdal/SidecarStage.h"
#include "host/build/PyramidBuilder.h"
#include "host/raster/NoData.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/GdalWorld.h"
#include "tools/Interrupt.h"
#include "tools/Methods.h"
#include "tools/RasterView.h"
#include "tools/TerminalProgress.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

class BuildCommand final : public Command {
public:
    const char* Name() const override { return "build"; }
    const char* Summary() const override { return "Make a pyramid of any raster that GDAL reads"; }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string source;
    std::string target;
    std::string levels = "auto";
    std::string resampling;
    std::string weights = "auto";
    std::string ordering = "auto";
    std::string noData;
    std::string bands;
    std::string bins = "256";
    std::string threads = "0";
    std::string memory = "256M";
    bool noStatistics = false;
    bool overwrite = false;
    bool embed = false;

    zmchost::BuildOptions Options(const zelm::RasterProps& props) const;
    void CheckTarget() const;
    zmchost::BuildReport Build(GDALDataset& dataset, zmcgdal::GdalRasterSource& pixels,
                               zmchost::BuildOptions options) const;
    void WriteSidecar(GDALDataset& dataset, const zmchost::BuildOptions& options,
                      const std::vector<zmchost::FullStatistics>& statistics,
                      const std::string& built, const std::string& base) const;
    void Report(const zmchost::BuildReport& report, std::uint32_t pixelType) const;
};

void BuildCommand::Describe(OptionTable& table) {
    table.Text("SOURCE", source, "Raster to read: a file or any other name that GDAL knows")
        .Required();
    table.Text("TARGET", target, "Pyramid file to make").Required();
    table
        .Text("--levels", levels,
              "Coarsest level; 0 makes the finest only, auto goes on until a level fits one "
              "tile (default auto)")
        .Named("auto|N");
    table
        .Text("--resampling", resampling,
              "How levels are reduced (default average, and mode for rasters with a palette)")
        .Named("METHOD")
        .OneOf(MethodNames());
    table
        .Text(
            "--weights", weights,
            "Whether an alpha band and masks weigh the pixels that levels are reduced from; none: "
            "all count alike (default auto)")
        .Named("WEIGHTS")
        .OneOf({"auto", "none"});
    table
        .Text("--ordering", ordering,
              "Order of the tiles in the file; more than eight bands are always in the Morton "
              "ordering (default auto)")
        .Named("ORDERING")
        .OneOf({"auto", "scanline", "blocked"});
    table
        .Text("--nodata", noData,
              "Value that marks samples without data in all bands; none: there is no such "
              "value (default: what the source says)")
        .Named("V|none");
    table
        .Text("--bands", bands,
              "Bands of the source in the order wanted, counted from 1 (default all)")
        .Named("3,2,1")
        .Filled(kNoBands);
    table.Text("--bins", bins, "Bins of a histogram; 8-bit types have one per value (default 256)")
        .Named("N");
    table.Flag("--no-statistics", noStatistics, "Leave out statistics and histograms");
    table.Text("--threads", threads, "Threads to work with (default: all processors)").Named("N");
    table.Text("--memory", memory, "Memory for pixels, such as 64M or 2G (default 256M)")
        .Named("SIZE");
    table.Flag("--embed", embed,
               "Keep georeference, no-data values and other metadata in TARGET itself");
    table.Flag("--overwrite", overwrite, "Replace TARGET if it exists");
    table.Footer(
        "Examples:\n"
        "  zmcraster build scene.tif scene.pyr\n"
        "  zmcraster build landsat.vrt rgb.pyr --bands 3,2,1 --nodata 0 --threads 4\n"
        "  zmcraster build classes.tif classes.pyr --resampling mode --overwrite\n"
        "\n"
        "The target appears when it is finished, and never half done: a build that fails or is\n"
        "interrupted leaves the old file as it was. Georeference, no-data values, descriptions "
        "and\n"
        "other metadata go to TARGET.aux.xml, or into TARGET with --embed.");
}

bool IsInteger(std::uint32_t pixelType) {
    bool integer = false;
    zelm::VisitElementType(
        pixelType, [&]<class T>(std::type_identity<T>) { integer = std::is_integral_v<T>; });
    return integer;
}

zmchost::BuildOptions BuildCommand::Options(const zelm::RasterProps& props) const {
    zmchost::BuildOptions options;
    if (levels != "auto")
        options.levels = static_cast<std::uint32_t>(ParseCount("--levels", levels, 31));
    if (!resampling.empty()) options.resampling = zmchost::ParseResampling(resampling);
    options.weights = weights == "auto";
    if (ordering == "scanline") options.ordering = zmchost::Ordering::Scanline;
    if (ordering == "blocked") options.ordering = zmchost::Ordering::Blocked;
    if (noData == "none") options.noData = zmchost::BuildOptions::NoData{};
    if (!noData.empty() && noData != "none") {
        const double value = ParseNumber("--nodata", noData);
        bool holds = false;
        zelm::VisitElementType(props.pixelType, [&]<class T>(std::type_identity<T>) {
            holds = zmchost::HoldsValue<T>(value);
        });
        if (!holds)
            throw UsageError("--nodata", std::string("no sample of type ") +
                                             zelm::PixelTypeName(props.pixelType) + " can be " +
                                             noData);
        options.noData = zmchost::BuildOptions::NoData{value};
        // A long real holds all integers of 64 bits.
        if (std::strtold(noData.c_str(), nullptr) != static_cast<long double>(value) &&
            IsInteger(props.pixelType))
            Warn(target, "a pyramid does not keep the last digits of the no-data value " + noData +
                             " while levels are reduced");
    }
    options.bands = ParseBands(bands, props.bands);
    options.bins = static_cast<std::uint32_t>(ParseCount("--bins", bins, 1 << 24));
    if (options.bins == 0) throw UsageError("--bins", "a histogram has one bin at least");
    options.statistics = !noStatistics;
    options.threads = static_cast<std::uint32_t>(ParseCount("--threads", threads, 1024));
    options.memory = ParseSize("--memory", memory);
    options.overwrite = overwrite;
    return options;
}

// The builder looks at all of this again; here it is told with what helps.
void BuildCommand::CheckTarget() const {
    RefuseElsewhere(target, "pyramids are made in plain folders; copy the finished file there");
    std::error_code ignored;
    if (fs::is_directory(target, ignored))
        throw Failure(target, "it is a folder; name a file in it");
    if (!fs::exists(target, ignored)) return;
    if (fs::equivalent(source, target, ignored))
        throw Failure(target, "it is the source; name another file");
    if (!overwrite) throw Failure(target, "the file exists already; --overwrite replaces it");
}

// What belongs beside the new file is there before it has its name.
zmchost::BuildReport BuildCommand::Build(GDALDataset& dataset, zmcgdal::GdalRasterSource& pixels,
                                         zmchost::BuildOptions options) const {
    TerminalProgress bar(fs::path(target).filename().string(), !quiet);
    options.progress = [&](const zmchost::BuildProgress& state) {
        return bar.Show(state.done, state.total);
    };
    zmcgdal::SidecarStage stage(target);
    std::vector<zmchost::FullStatistics> statistics;
    options.takeStatistics = [&](const auto& stored) { statistics = stored; };
    options.beforeNaming = [&](const std::string& built) {
        WriteSidecar(dataset, options, statistics, built, stage.Begin(built));
        stage.Complete();
    };
    try {
        const zmchost::BuildReport report =
            zmchost::PyramidBuilder(zmcgdal::SharedModule()).Build(pixels, target, options);
        stage.Settle();
        return report;
    } catch (const zmchost::Cancelled&) {
        throw Interruption(target);
    }
}

std::vector<std::string> TranslateArguments(const zmchost::BuildOptions& options,
                                            const std::string& noData) {
    std::vector<std::string> arguments = {"-of", "VRT"};
    for (const std::uint32_t band : options.bands) {
        arguments.push_back("-b");
        arguments.push_back(std::to_string(band + 1));
    }
    if (!noData.empty()) {
        arguments.push_back("-a_nodata");
        arguments.push_back(noData);
    }
    return arguments;
}

// A virtual raster selects the bands; only its metadata are looked at.
void BuildCommand::WriteSidecar(GDALDataset& dataset, const zmchost::BuildOptions& options,
                                const std::vector<zmchost::FullStatistics>& statistics,
                                const std::string& built, const std::string& base) const {
    CPLStringList list;
    for (const std::string& word : TranslateArguments(options, noData))
        list.AddString(word.c_str());
    const std::unique_ptr<GDALTranslateOptions, decltype(&GDALTranslateOptionsFree)> translate(
        GDALTranslateOptionsNew(list.List(), nullptr), &GDALTranslateOptionsFree);
    const DatasetPtr selected(GDALDataset::FromHandle(
        GDALTranslate("", GDALDataset::ToHandle(&dataset), translate.get(), nullptr)));
    auto pyramid = zmcgdal::Dataset::FromFile(
        std::make_shared<zmcgdal::OpenFile>(built, GA_Update, zmcgdal::OpenOptions{}), GA_Update);
    pyramid->LoadSidecar(base.c_str(), nullptr);
    bool kept = selected && zmcgdal::CopySidecar(*selected, *pyramid, true) == CE_None;
    if (kept) {
        zmcgdal::KeepStatistics(statistics, *pyramid, pyramid->File().archive);
        (embed ? zmcgdal::EmbedSidecar : zmcgdal::SaveSidecar)(std::move(pyramid), target);
    }
    pyramid.reset();
    const std::string reason = TakeGdalError(target);
    kept = kept && reason.empty();
    if (!kept)
        throw Failure(target, "its metadata cannot be kept in " + Visible(target) +
                                  (embed ? "" : zmcgdal::kSidecarEnding) + ": " +
                                  (reason.empty() ? "no reason given" : reason));
}

void BuildCommand::Report(const zmchost::BuildReport& report, std::uint32_t pixelType) const {
    const double pixels = static_cast<double>(report.width) * report.height;
    if (json) {
        PrintDocument({{"schema", kSchema},
                       {"source", source},
                       {"file", target},
                       {"width", report.width},
                       {"height", report.height},
                       {"bands", report.bands},
                       {"pixelType", zelm::PixelTypeName(pixelType)},
                       {"tileOrdering", zelm::TileOrderName(report.tileOrdering)},
                       {"levelMax", report.maxLevel},
                       {"resampling", zmchost::ResamplingName(report.resampling)},
                       {"bytes", JsonNumber(report.fileSize)},
                       {"seconds", JsonNumber(report.seconds)}});
    } else if (!quiet) {
        std::printf(
            "%s: %u x %u pixels, %u band%s of %s, levels 0 to %u by %s, %llu bytes, %.2f s "
            "(%.1f Mpixel/s)\n",
            Visible(target).c_str(), report.width, report.height, report.bands,
            report.bands == 1 ? "" : "s", zelm::PixelTypeName(pixelType), report.maxLevel,
            zmchost::ResamplingName(report.resampling),
            static_cast<unsigned long long>(report.fileSize), report.seconds,
            report.seconds > 0 ? pixels / report.seconds / 1e6 : 0.0);
    }
}

// What is missing reads as zeros, and a few bytes of header can claim terabytes of them.
void CheckComplete(GDALDataset& dataset, const std::string& source) {
    if (const char* const missing = dataset.GetMetadataItem("BYTES_MISSING", "ZMCPYRAMID"))
        FailAsIncomplete(source, missing);
}

ExitStatus BuildCommand::Run() {
    const DatasetPtr dataset = OpenDataset(source);
    CheckComplete(*dataset, source);
    zmcgdal::GdalRasterSource pixels(*dataset);
    const zelm::RasterProps props = pixels.Props();
    const zmchost::BuildOptions options = Options(props);
    CheckTarget();
    CheckInterrupt(target);
    for (const std::string& loss : pixels.Losses()) Warn(source, "a pyramid does not keep " + loss);
    const zmchost::BuildReport report = Build(*dataset, pixels, options);
    Report(report, props.pixelType);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeBuildCommand() { return std::make_unique<BuildCommand>(); }

}  // namespace zmctools
