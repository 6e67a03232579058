#include <algorithm>
#include <cstdio>

#include "core/ElementTypes.h"
#include "gdal/Dataset.h"
#include "gdal/RecordRenewal.h"
#include "host/journal/MetadataJournal.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/GdalWorld.h"
#include "tools/RasterView.h"

namespace zmctools {
namespace {

class StatsCommand final : public Command {
public:
    const char* Name() const override { return "stats"; }
    const char* Summary() const override {
        return "Renew the statistics and histograms of a pyramid file";
    }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;
    std::string bands;
    std::string threads = "0";

    std::vector<std::uint32_t> Renew() const;
    void Report(const std::vector<std::uint32_t>& renewed) const;
};

void StatsCommand::Describe(OptionTable& table) {
    table.Text("FILE", file, "Pyramid whose statistics to renew").Required();
    table.Text("--bands", bands, "Bands to renew them of, counted from 1 (default all)")
        .Named("3,2,1");
    table.Text("--threads", threads, kThreadsText).Named("N");
    table.Footer(
        "Examples:\n"
        "  zmcraster stats scene.pyr\n"
        "  zmcraster stats scene.pyr --bands 2 --json\n"
        "\n"
        "They are computed from the pixels of level 0, without those that have the no-data value "
        "of\n"
        "FILE.aux.xml, and take the place of those in the file. Colours stay.");
}

void RefuseWhatHasNone(const zmchost::PyramidFileInfo& info, const std::string& file) {
    if (!info.complete) FailAsIncomplete(file, std::to_string(info.bytesMissing));
    zelm::VisitElementType(info.header.pixelType, [&]<class T>(std::type_identity<T>) {
        if (zelm::kIsComplex<T>) throw Failure(file, "complex samples have no statistics");
    });
}

std::vector<std::uint32_t> StatsCommand::Renew() const {
    const std::string recovered = zmchost::RecoverMetadata(file).text;
    if (!recovered.empty()) Warn(file, recovered);
    const auto dataset = zmcgdal::Dataset::FromFile(
        std::make_shared<zmcgdal::OpenFile>(file, GA_Update, zmcgdal::OpenOptions{}), GA_Update);
    dataset->LoadSidecar(file.c_str(), nullptr);
    auto list = ParseBands(bands, static_cast<std::uint32_t>(dataset->GetRasterCount()));
    std::sort(list.begin(), list.end());
    list.erase(std::unique(list.begin(), list.end()), list.end());
    TakeGdalError(file);
    try {
        TerminalProgress bar("stats", !quiet);
        zmcgdal::RenewRecords(*dataset, list, ParseThreads(threads),
                              [&](double share) { return bar.ShowShare(share); });
    } catch (const zmchost::Cancelled&) {
        throw Interruption(file);
    }
    dataset->SaveSidecarNow();
    if (const std::string wrong = TakeGdalError(file); !wrong.empty()) throw Failure(file, wrong);
    return list;
}

void StatsCommand::Report(const std::vector<std::uint32_t>& renewed) const {
    if (json) {
        Json numbers = Json::array();
        for (const std::uint32_t band : renewed) numbers.push_back(band + 1);
        PrintDocument({{"schema", kSchema}, {"file", file}, {"bands", numbers}});
    } else if (!quiet) {
        std::printf("%s: statistics and histograms of %zu band%s renewed\n", Visible(file).c_str(),
                    renewed.size(), renewed.size() == 1 ? "" : "s");
    }
}

ExitStatus StatsCommand::Run() {
    RefuseWhatHasNone(ReadLayout(file), file);
    Report(Renew());
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeStatsCommand() { return std::make_unique<StatsCommand>(); }

}  // namespace zmctools
