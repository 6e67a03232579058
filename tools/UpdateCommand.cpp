#include <cstdio>
#include <filesystem>
#include <utility>

#include "describe/JsonNumbers.h"
#include "gdal/Mosaic.h"
#include "gdal/SidecarStage.h"
#include "host/base/Error.h"
#include "host/build/PyramidUpdate.h"
#include "host/file/PyramidRecords.h"
#include "host/journal/MetadataJournal.h"
#include "tools/Arguments.h"
#include "tools/BuildEnd.h"
#include "tools/Command.h"
#include "tools/Interrupt.h"
#include "tools/RasterView.h"
#include "tools/SourceState.h"
#include "tools/TerminalProgress.h"
#include "tools/UpdateNote.h"
#include "tools/UpdateWindows.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

class UpdateCommand final : public Command {
public:
    const char* Name() const override { return "update"; }
    const char* Summary() const override {
        return "Renew what depends on pixels of the source that have changed";
    }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    BuildWords words;
    std::vector<std::string> changed;
    std::string threads = "0";
    bool keepRecords = false;

    void CheckTarget() const;
    std::string TakeRecordedWords();
    void CheckSource(GDALDataset& dataset) const;
    zmchost::UpdateReport Update(GDALDataset& dataset, zmcgdal::GdalRasterSource& pixels,
                                 const std::vector<zmchost::Window>& windows,
                                 const zmchost::UpdateRecords& records) const;
    void Report(const zmchost::UpdateReport& report,
                const std::vector<zmchost::Window>& windows) const;
};

void UpdateCommand::Describe(OptionTable& table) {
    table.Text("TARGET", words.target, "Pyramid to bring up to date").Required();
    table.Text("SOURCE", words.source,
               "Raster that it was built from, as it is now (default: what its records name)");
    table
        .Texts("--changed", changed,
               "Pixels of the source that have changed, or a raster that covers them; may be given "
               "many times")
        .Required()
        .Named("X,Y,WIDTH,HEIGHT|SCENE");
    words.DescribeMaking(table);
    table.Text("--threads", threads, kThreadsText).Named("N");
    table.Flag("--keep-records", keepRecords,
               "With SOURCE: leave TARGET.zmcrecords for the next update");
    table.Footer(
        "Examples:\n"
        "  zmcraster update mosaic.pyr --changed 4096,2048,1000,1000\n"
        "  zmcraster update mosaic.pyr --changed scenes/17.tif --changed scenes/18.tif\n"
        "  zmcraster update classes.pyr classes.tif --resampling mode --changed 0,0,512,512\n"
        "\n"
        "Records are what zmcraster build --keep-records leaves beside the pyramid.\n"
        "The result is the file that build would make, byte for byte, as long as nothing else has\n"
        "changed. With records, source and options are those of the build, and statistics come "
        "from\n"
        "what was kept of each block; without, tell both as build was told, and statistics take a\n"
        "look at all of level 0. Nothing is written into TARGET before all of it is on the disk\n"
        "beside it; an update that is cut off behind that is finished by recover or by the next "
        "one.");
}

void UpdateCommand::CheckTarget() const {
    RefuseElsewhere(words.target, "only pyramids in plain folders are updated");
    CheckIsFile(words.target);
}

// "--no-statistics" of "noStatistics".
std::string OptionOf(const std::string& key) {
    std::string option = "--";
    for (const char c : key) {
        if (c >= 'A' && c <= 'Z') option += '-';
        option += c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
    }
    return option;
}

// What was read of the source is what it was when it was opened.
void CheckUnchanged(GDALDataset& dataset, const std::string& source, const std::string& state) {
    if (auto* const mosaic = dynamic_cast<zmcgdal::Mosaic*>(&dataset)) mosaic->CheckRead();
    if (SourceState(dataset) != state) throw Failure(source, "it changed while it was read");
}

// Words that are given must not be silently others than those of the build. What was known of its
// scenes then.
std::string UpdateCommand::TakeRecordedWords() {
    const BuildWords usual;
    VisitOptions(usual, [&](const std::string& key, const auto& value) {
        bool given = false;
        VisitOptions(words, [&](const std::string& other, const auto& now) {
            if constexpr (std::is_same_v<decltype(now), decltype(value)>)
                given = given || (key == other && now != value);
        });
        if (given && key != "memory")
            throw UsageError(OptionOf(key), "without SOURCE the options are those of the build");
    });
    if (keepRecords)
        throw UsageError("--keep-records", "without SOURCE the records are kept anyway");
    const auto records = zmchost::PyramidRecords::Find(words.target);
    if (!records)
        throw Failure(words.target,
                      "it has no records; name SOURCE and the options that it was built with");
    Noted noted = ReadNote(words.target, records->Note());
    words = std::move(noted.words);
    return std::move(noted.scenes);
}

void UpdateCommand::CheckSource(GDALDataset& dataset) const {
    std::error_code ignored;
    if (fs::equivalent(words.source, words.target, ignored))
        throw Failure(words.target, "it is the source; name another file");
    const DatasetPtr pyramid = OpenDataset(words.target);
    if (!LieAlike(dataset, *pyramid))
        throw Failure(words.source, "its size or georeference is not that of " +
                                        Visible(words.target) + "; build that anew");
    SetSubject(words.source);
}

zmchost::UpdateReport UpdateCommand::Update(GDALDataset& dataset, zmcgdal::GdalRasterSource& pixels,
                                            const std::vector<zmchost::Window>& windows,
                                            const zmchost::UpdateRecords& records) const {
    TerminalProgress bar(fs::path(words.target).filename().string(), !quiet);
    zmchost::BuildOptions options = words.Options(pixels.Props());
    options.threads = ParseThreads(threads);
    options.progress = [&](const zmchost::BuildProgress& state) {
        return bar.Show(state.done, state.total);
    };
    std::vector<zmchost::FullStatistics> statistics;
    options.takeStatistics = [&](const auto& stored) { statistics = stored; };
    const std::string state = SourceState(dataset);
    zmchost::PyramidUpdate update(zmcgdal::SharedModule(), pixels, words.target, options);
    update.beforeCommit = [&](const auto& updated, const std::string& beside) {
        WriteSidecar(
            dataset, words, options.bands, statistics,
            std::make_shared<zmcgdal::OpenFile>(words.target, updated, zmcgdal::OpenOptions{}),
            beside);
        CheckUnchanged(dataset, words.source, state);
        CheckInterrupt(words.target);
    };
    try {
        return update.Run(windows, records);
    } catch (const zmchost::Cancelled&) {
        throw Interruption(words.target);
    }
}

void UpdateCommand::Report(const zmchost::UpdateReport& report,
                           const std::vector<zmchost::Window>& windows) const {
    if (json) {
        Json list = Json::array();
        for (const zmchost::Window& window : windows)
            list.push_back({window.x, window.y, window.width, window.height});
        PrintDocument({{"schema", kSchema},
                       {"source", words.source},
                       {"file", words.target},
                       {"changed", list},
                       {"tiles", report.tiles},
                       {"blocks", report.blocks},
                       {"bytesWritten", zmcdescribe::JsonNumber(report.bytesWritten)},
                       {"seconds", zmcdescribe::JsonNumber(report.seconds)}});
    } else if (!quiet) {
        std::printf("%s: %llu tile%s renewed, %llu bytes written, %.2f s\n",
                    Visible(words.target).c_str(), static_cast<unsigned long long>(report.tiles),
                    report.tiles == 1 ? "" : "s",
                    static_cast<unsigned long long>(report.bytesWritten), report.seconds);
    }
}

ExitStatus UpdateCommand::Run() {
    CheckTarget();
    // What a build or an update that was ended has left belongs to the file as it is meant to be.
    const zmchost::Recovery before = zmchost::RecoverMetadata(words.target);
    if (before.outcome == zmchost::Recovery::Outcome::Complete ||
        before.outcome == zmchost::Recovery::Outcome::Restored)
        Warn(words.target, before.text);
    { const zmcgdal::SidecarStage settled(words.target); }
    zmchost::UpdateRecords records;
    records.use = words.source.empty();
    records.keep = records.use || keepRecords;
    std::string scenes;
    if (records.use) scenes = TakeRecordedWords();
    const DatasetPtr dataset = words.OpenSource(!quiet, scenes);
    zmcgdal::GdalRasterSource pixels(*dataset);
    CheckSource(*dataset);
    const std::vector<zmchost::Window> windows = ChangedWindows(changed, *dataset, words.source);
    if (records.keep) records.note = NoteOf(words, *dataset);
    CheckInterrupt(words.target);
    Report(Update(*dataset, pixels, windows, records), windows);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeUpdateCommand() { return std::make_unique<UpdateCommand>(); }

}  // namespace zmctools
