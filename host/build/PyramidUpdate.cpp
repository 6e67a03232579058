#include "host/build/PyramidUpdate.h"

#include <chrono>
#include <optional>
#include <utility>

#include "host/base/Text.h"
#include "host/build/BuildRun.h"
#include "host/file/PyramidRecords.h"
#include "host/file/SideFile.h"
#include "host/journal/UpdateJournal.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

const std::string kNewRecordsKind = "zmcrecords";

std::unique_ptr<PyramidRecords> UsableRecords(const std::string& target, std::uint64_t facts) {
    auto records = PyramidRecords::Find(target);
    const auto refuse = [&](const char* why) {
        throw Error(target, "use the records of its statistics", why);
    };
    if (!records) refuse("it has none");
    if (records->Facts() != facts)
        refuse("the source or the options are not those that it was built from");
    return records;
}

}  // namespace

PyramidUpdate::PyramidUpdate(ModulePtr loadedModule, RasterSource& rasterSource,
                             std::string targetName, BuildOptions buildOptions)
    : module(std::move(loadedModule)),
      source(rasterSource),
      target(std::move(targetName)),
      options(std::move(buildOptions)) {}

UpdateReport PyramidUpdate::Run(const std::vector<Window>& changed, const UpdateRecords& records) {
    const auto start = std::chrono::steady_clock::now();
    BuildRun run(module, source, target, options);
    const zelm::RasterProps props = source.Props();
    const Window all{0, 0, props.samples, props.lines};
    for (const Window& window : changed)
        if (window.IsEmpty() || !all.Contains(window))
            throw Error(target, "update it", "a window is empty or not inside the raster");
    UpdateJournal journal(target);
    std::unique_ptr<PyramidRecords> before;
    if (records.use) before = UsableRecords(target, run.Facts());
    run.OpenUpdate(journal.Updated());
    UpdateReport report;
    report.tiles = run.RenewTiles(changed);
    std::optional<RecordsWriter> after;
    if (records.keep) after.emplace(journal.Staged(PyramidRecords::kEnding), target);
    report.blocks = run.GatherStatistics(changed, before.get(), after ? &*after : nullptr);
    run.StoreRenewed();
    if (after) after->End(run.Facts(), records.note);
    if (beforeCommit) beforeCommit(journal.Updated(), journal.Staged(""));
    journal.Commit();
    report.bytesWritten = journal.Bytes();
    report.seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    return report;
}

void PyramidUpdate::KeepRecords(const std::string& note) {
    BuildRun run(module, source, target, options);
    int error = 0;
    auto pyramid =
        zelm::files::FileSource::Open(WideFileName(target), zelm::files::OpenMode::Read, &error);
    const auto fail = [&](const std::string& why) {
        throw Error(target, "keep records of its statistics", why);
    };
    if (!pyramid) fail(platform::ErrorText(error));
    run.OpenUpdate(std::move(pyramid));
    const std::string file = platform::ResolveLinks(target);
    SideFile::RemoveStale(file, kNewRecordsKind);
    platform::FileLock lock;
    const std::string made = SideFile::MakeTemporary(file, kNewRecordsKind, lock);
    if (made.empty()) fail(platform::LastErrorText());
    try {
        RecordsWriter writer(made, target);
        run.GatherStatistics({}, nullptr, &writer);
        writer.End(run.Facts(), note);
        PyramidRecords::Stamp(made, file);
        if (!platform::RenameFile(made, PyramidRecords::PathFor(file)))
            fail(platform::LastErrorText());
    } catch (...) {
        platform::RemoveEntry(made);
        throw;
    }
}

}  // namespace zmchost
