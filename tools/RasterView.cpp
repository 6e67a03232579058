#include "tools/RasterView.h"

#include <cpl_string.h>

#include <algorithm>
#include <chrono>
#include <system_error>
#include <thread>
#include <utility>

#include "core/PixelVocabulary.h"
#include "files/FileSource.h"
#include "format/PyramidHeaderRecord.h"
#include "gdal/Dataset.h"
#include "gdal/Fetcher.h"
#include "gdal/GdalRasterSource.h"
#include "gdal/RemoteSource.h"
#include "gdal/VsiSource.h"
#include "host/journal/MetadataJournal.h"
#include "platform/File.h"
#include "platform/FileSystem.h"
#include "tools/GdalWorld.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"

namespace zmctools {
namespace {

constexpr std::uint64_t kStripBudget = std::uint64_t{32} << 20;

using zelm::files::ByteSource;
using zelm::files::Identity;

// Names of GDAL's file systems, and URLs.
bool IsElsewhere(const std::string& name) {
    return zmcgdal::IsVirtualName(zmcgdal::NameOfUrl(name));
}

std::shared_ptr<ByteSource> OpenElsewhere(const std::string& name) {
    try {
        return zmcgdal::OpenByName(zmcgdal::NameOfUrl(name), false);
    } catch (const zmchost::Error& error) {
        throw Failure(name, error.Reason());
    }
}

bool IsPyramid(ByteSource& source) {
    char start[64] = {};
    return zmchost::LooksLikePyramid({start, source.ReadAt(0, start, sizeof start)});
}

// Behind a network only pixels are asked for.
std::shared_ptr<ByteSource> WithoutDocument(const std::shared_ptr<ByteSource>& source,
                                            const std::string& name) {
    const auto remote = zmcgdal::ClippedSource::RemoteOf(source);
    if (!remote) return source;
    return std::make_shared<zmcgdal::ClippedSource>(
        remote, zmchost::PyramidHeader::Read(*source, name).tileDataEnd);
}

// What the module reads of a raster behind a network is told there beforehand.
class Planned {
public:
    Planned(const std::shared_ptr<zmcgdal::RemoteSource>& source, const zmchost::Raster& raster,
            std::uint32_t level, const zmchost::Window& window,
            std::span<const std::uint32_t> bands)
        : remote(source.get()) {
        if (remote) remote->Plan({raster.Header(), level, window, {bands.begin(), bands.end()}});
    }
    ~Planned() {
        if (remote) remote->EndPlan();
    }
    Planned(const Planned&) = delete;
    Planned& operator=(const Planned&) = delete;

private:
    zmcgdal::RemoteSource* remote;
};

Identity IdentityOf(const std::string& name) {
    return zelm::files::FileSource::IdentifyName(zelm::String(name.c_str()));
}

// Two writes within a tick of the file system's clock look like one: a file that was written a
// moment ago is given the time for the next write to show. Some ticks of the slowest clocks.
Identity IdentityAtRest(const std::string& name) {
    using std::chrono::nanoseconds;
    constexpr nanoseconds kRest = std::chrono::milliseconds(20);
    constexpr int kTries = 100;
    Identity now = IdentityOf(name);
    for (int i = 0; i < kTries && now.known; ++i) {
        const nanoseconds age =
            std::chrono::system_clock::now().time_since_epoch() - nanoseconds(now.modified);
        if (age >= kRest || age < -kRest) break;
        std::this_thread::sleep_for(kRest);
        now = IdentityOf(name);
    }
    return now;
}

std::string IncompleteText(const std::string& bytes) {
    return "the pyramid is incomplete, " + bytes + " bytes of tiles are missing";
}

class PyramidView final : public RasterView {
public:
    explicit PyramidView(const std::string& name)
        : before(IdentityAtRest(name)), raster(OpenPyramid(name)) {}
    PyramidView(const std::string& name, const std::shared_ptr<ByteSource>& source)
        : remote(zmcgdal::ClippedSource::RemoteOf(source)),
          raster(zmchost::Raster::Open(zmcgdal::SharedModule(), WithoutDocument(source, name),
                                       name)) {}
    std::string Name() const override { return raster.Name(); }
    std::uint32_t PixelType() const override { return raster.PixelType(); }
    std::uint32_t Bands() const override { return raster.Bands(); }
    std::uint32_t MinLevel() const override { return raster.MinLevel(); }
    std::uint32_t MaxLevel() const override { return raster.MaxLevel(); }
    std::uint32_t Width(std::uint32_t level) const override { return raster.Width(level); }
    std::uint32_t Height(std::uint32_t level) const override { return raster.Height(level); }
    void Read(std::uint32_t level, const zmchost::Window& window,
              std::span<const std::uint32_t> bands, void* pixels) override {
        const Planned planned(remote, raster, level, window, bands);
        try {
            raster.Read(level, window, bands, pixels);
        } catch (const zmchost::Error&) {
            const std::string reason = remote ? remote->TakeTrouble() : "";
            if (reason.empty()) throw;
            throw Failure(Name(), reason);
        }
    }
    void CheckUnchanged() const override {
        if (before.known && !raster.OpenedAs().SameContent(before))
            FailAsChanged(Name(), "it was replaced or written to");
        if (const std::string change = raster.ContentChange(); !change.empty())
            FailAsChanged(Name(), change);
    }
    std::uint32_t TileSide() const override { return raster.TileSide(); }
    zmcrender::RasterFacts Facts() const override {
        return remote ? zmcrender::FactsOf(OpenPyramid(Name())) : zmcrender::FactsOf(raster);
    }
    void WarnOfMissing() override {
        if (!raster.IsComplete())
            Warn(Name(), IncompleteText(std::to_string(raster.Header().BytesMissing())) +
                             "; what is there is read");
    }

private:
    Identity before;
    std::shared_ptr<zmcgdal::RemoteSource> remote;  // null where there is no network between
    zmchost::Raster raster;
};

class GdalView final : public RasterView {
public:
    explicit GdalView(const std::string& name)
        : before(IdentityAtRest(name)), dataset(OpenDataset(name)), source(*dataset) {
        const CPLStringList list(dataset->GetFileList());
        for (int i = 0; i < list.Count(); ++i) files.emplace_back(list[i], IdentityOf(list[i]));
        files.emplace_back(name, before);
    }
    std::string Name() const override { return source.Name(); }
    std::uint32_t PixelType() const override { return props.pixelType; }
    std::uint32_t Bands() const override { return props.bands; }
    std::uint32_t MinLevel() const override { return 0; }
    std::uint32_t MaxLevel() const override { return 0; }
    std::uint32_t Width(std::uint32_t) const override { return props.samples; }
    std::uint32_t Height(std::uint32_t) const override { return props.lines; }
    void Read(std::uint32_t, const zmchost::Window& window, std::span<const std::uint32_t> bands,
              void* pixels) override {
        source.Read(window, bands, pixels);
    }
    void CheckUnchanged() const override {
        for (const auto& [name, identity] : files)
            if (IdentityOf(name) != identity)
                FailAsChanged(Name(), Visible(name) + " was replaced or written to");
    }

private:
    Identity before;
    DatasetPtr dataset;
    zmcgdal::GdalRasterSource source;
    zelm::RasterProps props = source.Props();
    std::vector<std::pair<std::string, Identity>> files;
};

void TellRecovery(const std::string& name, const std::string& text) {
    if (!text.empty()) Warn(name, text);
}

}  // namespace

void RasterView::CheckLevel(std::uint32_t level) const {
    if (level >= MinLevel() && level <= MaxLevel()) return;
    throw UsageError("--level", "there is no level " + std::to_string(level) + ": " +
                                    Visible(Name()) + " has the levels " +
                                    std::to_string(MinLevel()) + " to " +
                                    std::to_string(MaxLevel()));
}

zmcrender::RasterFacts RasterView::Facts() const {
    return {Name(), PixelType(), std::vector<zmcrender::BandFacts>(Bands())};
}

bool IsPyramidFile(const std::string& name) {
    const zelm::String wide(name.c_str());
    const auto file =
        wide.wide ? platform::File::Open(wide.wide, platform::File::Mode::Read) : nullptr;
    char start[64] = {};
    return file && zmchost::LooksLikePyramid({start, file->ReadAt(0, start, sizeof start)});
}

void RefuseElsewhere(const std::string& name, const char* reason) {
    if (IsElsewhere(name)) throw Failure(name, reason);
}

void CheckIsNoDevice(const std::string& name) {
    if (platform::StatusOf(name).IsSpecial()) throw Failure(name, "it is not a regular file");
}

void CheckIsFile(const std::string& name) {
    const platform::FileStatus status = platform::StatusOf(name);
    if (!status.exists) throw Failure(name, "there is no such file");
    if (status.isFolder) throw Failure(name, "it is a folder");
    CheckIsNoDevice(name);
}

void FailAsChanged(const std::string& name, const std::string& change) {
    throw Failure(name, "it changed while it was read: " + change);
}

void FailAsIncomplete(const std::string& name, const std::string& bytes) {
    throw Failure(name, IncompleteText(bytes) + "; build it anew");
}

zmchost::PyramidFileInfo ReadLayout(const std::string& name) {
    if (IsElsewhere(name))
        return zmchost::DescribePyramidFile(
            zmchost::PyramidHeader::Read(*OpenElsewhere(name), name));
    CheckIsFile(name);
    TellRecovery(name, zmchost::LookForCopy(name).text);
    return zmchost::ReadPyramidFileInfo(name);
}

zmchost::Raster OpenPyramid(const std::string& name) {
    if (IsElsewhere(name))
        return zmchost::Raster::Open(zmcgdal::SharedModule(), OpenElsewhere(name), name);
    zmchost::Raster raster =
        zmchost::Raster::Open(zmcgdal::SharedModule(), name, zmchost::Access::Read);
    TellRecovery(name, raster.RecoveryNote());
    return raster;
}

std::unique_ptr<RasterView> OpenView(const std::string& name) {
    // Loaded before the file is looked at, so that little time is left for others to replace it.
    static_cast<void>(zmcgdal::SharedModule());
    if (IsElsewhere(name)) {
        const std::shared_ptr<ByteSource> source = OpenElsewhere(name);
        if (IsPyramid(*source)) return std::make_unique<PyramidView>(name, source);
        return std::make_unique<GdalView>(name);
    }
    if (IsPyramidFile(name)) return std::make_unique<PyramidView>(name);
    return std::make_unique<GdalView>(name);
}

std::size_t StripBytes(const RasterView& view, const Selection& selection,
                       const zmchost::Window& strip) {
    return static_cast<std::size_t>(std::uint64_t{strip.width} * strip.height *
                                    selection.bands.size() * zelm::PixelSize(view.PixelType()));
}

void Strips::Walk(const std::string& name, TerminalProgress& progress,
                  const std::function<void(const zmchost::Window& strip)>& take) const {
    const auto atLeastOne = [](std::uint64_t count) { return std::max<std::uint64_t>(count, 1); };
    const std::uint64_t pixels = BytesAtOnce(bytes, tileSide) / atLeastOne(pixelBytes);
    const std::uint64_t lines = atLeastOne(pixels / atLeastOne(window.width));
    // Of a line that is longer.
    const auto columns =
        static_cast<std::uint32_t>(std::clamp<std::uint64_t>(pixels, 1, atLeastOne(window.width)));
    const std::uint64_t total = std::uint64_t{window.width} * window.height;
    for (std::uint32_t done = 0; done < window.height;) {
        // Up to the end of a row of tiles, so that the next strip begins with one.
        std::uint64_t end = std::uint64_t{window.y} + done + lines;
        const std::uint64_t aligned = end / tileSide * tileSide;
        if (aligned > window.y + done) end = aligned;
        end = std::min<std::uint64_t>(end, std::uint64_t{window.y} + window.height);
        const auto height = static_cast<std::uint32_t>(end - window.y - done);
        for (std::uint32_t x = 0; x < window.width;) {
            const std::uint32_t width = std::min(columns, window.width - x);
            take({window.x + x, window.y + done, width, height});
            x += width;
            if (!progress.Show(std::uint64_t{done} * window.width + std::uint64_t{x} * height,
                               total))
                throw Interruption(name);
        }
        done += height;
    }
}

std::future<void> RunBeside(const std::function<void()>& task) {
    try {
        return std::async(std::launch::async, task);
    } catch (const std::system_error&) {
        std::packaged_task<void()> now(task);
        now();
        return now.get_future();
    }
}

void WalkStrips(RasterView& view, const Selection& selection, TerminalProgress& progress,
                const std::function<void(const zmchost::Window& strip, StripSamples&)>& read,
                const std::function<void(const zmchost::Window& strip, const StripSamples&)>& use) {
    // Those that are read and those that are used, in turns. They outlive the thread.
    StripSamples samples[2];
    std::size_t turn = 0;
    std::future<void> used;
    const std::uint64_t pixelBytes = selection.bands.size() * zelm::PixelSize(view.PixelType());
    Strips{selection.window, pixelBytes, kStripBudget / 2, view.TileSide()}.Walk(
        view.Name(), progress, [&](const zmchost::Window& strip) {
            StripSamples& here = samples[turn];
            turn = 1 - turn;
            read(strip, here);
            if (used.valid()) used.get();
            used = RunBeside([&use, &here, strip] { use(strip, here); });
        });
    if (used.valid()) used.get();
    view.WarnOfMissing();
}

}  // namespace zmctools
