#include <filesystem>

#include "gdal/Dataset.h"
#include "host/base/Error.h"
#include "tools/Arguments.h"
#include "tools/BuildEnd.h"
#include "tools/Command.h"
#include "tools/Interrupt.h"
#include "tools/MosaicSource.h"
#include "tools/ProcessBuild.h"
#include "tools/TerminalProgress.h"
#include "tools/UpdateNote.h"

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
    BuildWords words;
    std::string threads;
    std::string processes = "0";
    bool keepRecords = false;
    bool noFlush = false;

    zmchost::BuildReport Build(GDALDataset& dataset, zmcgdal::GdalRasterSource& pixels,
                               zmchost::BuildOptions options) const;
    zmchost::BuildReport BuildBy(GDALDataset& dataset, zmcgdal::GdalRasterSource& pixels,
                                 zmchost::BuildOptions options) const;
};

void BuildCommand::Describe(OptionTable& table) {
    words.Describe(table);
    table
        .Text("--threads", threads,
              "Threads to work with, in each process (default: all processors, and 1 with "
              "--processes)")
        .Named("N");
    table
        .Text("--processes", processes,
              "Processes to work with, which share the memory; 0: this one alone (default 0)")
        .Named("N");
    table.Flag("--no-flush", noFlush,
               "Do not wait for the disk; a system that stops soon after may leave TARGET without "
               "pixels");
    table.Flag("--keep-records", keepRecords,
               "Leave TARGET.zmcrecords, by which update renews statistics without looking at all "
               "pixels");
    table.Footer(
        "Examples:\n"
        "  zmcraster build scene.tif scene.pyr\n"
        "  zmcraster build landsat.vrt rgb.pyr --bands 3,2,1 --nodata 0 --threads 4\n"
        "  zmcraster build classes.tif classes.pyr --resampling mode --overwrite\n"
        "  zmcraster build 'scenes/*.tif' all.pyr --overlap mean --nodata 0\n"
        "\n"
        "The target appears when it is finished, and never half done: a build that fails or is\n"
        "interrupted leaves the old file as it was. Georeference, no-data values, descriptions "
        "and\n"
        "other metadata go to TARGET.aux.xml, or into TARGET with --embed. Neither threads nor\n"
        "processes change the file.");
}

// What belongs beside the new file is there before it has its name.
zmchost::BuildReport BuildCommand::Build(GDALDataset& dataset, zmcgdal::GdalRasterSource& pixels,
                                         zmchost::BuildOptions options) const {
    TerminalProgress bar(fs::path(words.target).filename().string(), !quiet);
    options.progress = [&](const zmchost::BuildProgress& state) {
        return bar.Show(state.done, state.total);
    };
    BuildEnd end(dataset, words, options);
    KeepBlocksForStrips(dataset, static_cast<std::uint64_t>(dataset.GetRasterXSize()));
    const zmchost::BuildReport report =
        zmchost::PyramidBuilder(zmcgdal::SharedModule()).Build(pixels, words.target, options);
    end.Settle();
    return report;
}

zmchost::BuildReport BuildCommand::BuildBy(GDALDataset& dataset, zmcgdal::GdalRasterSource& pixels,
                                           zmchost::BuildOptions options) const {
    const auto count = static_cast<std::uint32_t>(ParseCount("--processes", processes, 256));
    if (!threads.empty()) options.threads = ParseThreads(threads);
    options.flush = !noFlush;
    try {
        if (count == 0) return Build(dataset, pixels, options);
        return BuildInProcesses(words, dataset, pixels, options, count, !quiet);
    } catch (const zmchost::Cancelled&) {
        throw Interruption(words.target);
    }
}

ExitStatus BuildCommand::Run() {
    const DatasetPtr dataset = words.OpenSource(!quiet);
    zmcgdal::GdalRasterSource pixels(*dataset);
    const zelm::RasterProps props = pixels.Props();
    const zmchost::BuildOptions options = words.Options(props);
    words.CheckTarget();
    CheckInterrupt(words.target);
    for (const std::string& loss : pixels.Losses())
        Warn(words.source, "a pyramid does not keep " + loss);
    const zmchost::BuildReport report = BuildBy(*dataset, pixels, options);
    if (keepRecords) KeepRecords(words, *dataset, pixels, options);
    if (json)
        PrintDocument(BuildDocument(words, report, props.pixelType, *dataset));
    else if (!quiet)
        PrintReport(words, report, props.pixelType);
    TellLeftOut(*dataset);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeBuildCommand() { return std::make_unique<BuildCommand>(); }

}  // namespace zmctools
