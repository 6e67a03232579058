#include "tools/RasterView.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <set>

#include "core/PixelVocabulary.h"
#include "format/PyramidHeaderRecord.h"
#include "gdal/Dataset.h"
#include "gdal/GdalRasterSource.h"
#include "host/journal/MetadataJournal.h"
#include "tools/GdalWorld.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"

namespace zmctools {
namespace {

constexpr std::uint64_t kStripBudget = std::uint64_t{32} << 20;
// Of the files that builds write; those of others are read as well, if slower.
constexpr std::uint32_t kTileRows = zelm::kWrittenTileSize;

class PyramidView final : public RasterView {
public:
    explicit PyramidView(const std::string& name) : raster(OpenPyramid(name)) {}
    std::string Name() const override { return raster.Name(); }
    std::uint32_t PixelType() const override { return raster.PixelType(); }
    std::uint32_t Bands() const override { return raster.Bands(); }
    std::uint32_t MinLevel() const override { return raster.MinLevel(); }
    std::uint32_t MaxLevel() const override { return raster.MaxLevel(); }
    std::uint32_t Width(std::uint32_t level) const override { return raster.Width(level); }
    std::uint32_t Height(std::uint32_t level) const override { return raster.Height(level); }
    void Read(std::uint32_t level, const zmchost::Window& window,
              std::span<const std::uint32_t> bands, void* pixels) override {
        raster.Read(level, window, bands, pixels);
    }
    std::uint32_t TileSide() const override { return raster.TileSide(); }
    void CheckReadable() override {
        if (!raster.IsComplete())
            throw zmchost::Error(raster.Name(), "read its pixels",
                                 "the file is incomplete, " +
                                     std::to_string(raster.Header().BytesMissing()) +
                                     " bytes are missing");
    }

private:
    zmchost::Raster raster;
};

class GdalView final : public RasterView {
public:
    explicit GdalView(const std::string& name) : dataset(OpenDataset(name)), source(*dataset) {}
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

private:
    DatasetPtr dataset;
    zmcgdal::GdalRasterSource source;
    zelm::RasterProps props = source.Props();
};

// Once for each file: a copy that cannot be used is found again by whoever looks next.
void TellRecovery(const std::string& name, const std::string& text) {
    static std::set<std::string> told;
    if (!text.empty() && told.insert(name).second) Warn(name + ": warning: " + text);
}

std::uint64_t LineBytes(const RasterView& view, const Selection& selection) {
    return std::uint64_t{selection.window.width} * selection.bands.size() *
           zelm::PixelSize(view.PixelType());
}

}  // namespace

void RasterView::CheckLevel(std::uint32_t level) const {
    if (level >= MinLevel() && level <= MaxLevel()) return;
    throw UsageError("--level", "there is no level " + std::to_string(level) + ": " + Name() +
                                    " has the levels " + std::to_string(MinLevel()) + " to " +
                                    std::to_string(MaxLevel()));
}

bool IsPyramidFile(const std::string& name) {
    std::ifstream file(name, std::ios::binary);
    char start[64];
    file.read(start, sizeof start);
    return zmchost::LooksLikePyramid({start, static_cast<std::size_t>(file.gcount())});
}

void CheckIsFile(const std::string& name) {
    std::error_code ignored;
    if (!std::filesystem::exists(name, ignored)) throw Failure(name, "there is no such file");
    if (std::filesystem::is_directory(name, ignored)) throw Failure(name, "it is a folder");
}

zmchost::PyramidFileInfo ReadLayout(const std::string& name) {
    CheckIsFile(name);
    TellRecovery(name, zmchost::RecoverMetadata(name).text);
    return zmchost::ReadPyramidFileInfo(name);
}

zmchost::Raster OpenPyramid(const std::string& name) {
    zmchost::Raster raster = zmchost::Raster::Open(zmcgdal::SharedModule(), name);
    TellRecovery(name, raster.RecoveryNote());
    return raster;
}

std::unique_ptr<RasterView> OpenView(const std::string& name) {
    if (IsPyramidFile(name)) return std::make_unique<PyramidView>(name);
    return std::make_unique<GdalView>(name);
}

std::size_t StripBytes(const RasterView& view, const Selection& selection,
                       const zmchost::Window& strip) {
    return static_cast<std::size_t>(std::uint64_t{strip.width} * strip.height *
                                    selection.bands.size() * zelm::PixelSize(view.PixelType()));
}

void WalkStrips(RasterView& view, const Selection& selection, TerminalProgress& progress,
                const std::function<void(const zmchost::Window& strip)>& take) {
    view.CheckReadable();
    const zmchost::Window& window = selection.window;
    const std::uint64_t lineBytes = std::max<std::uint64_t>(LineBytes(view, selection), 1);
    const std::uint64_t budget = BytesAtOnce(kStripBudget, view.TileSide());
    const std::uint64_t lines = std::max<std::uint64_t>(budget / lineBytes, 1);
    // Of a line that is longer.
    const auto columns = static_cast<std::uint32_t>(std::clamp<std::uint64_t>(
        std::uint64_t{window.width} * budget / lineBytes, 1, std::max(window.width, 1u)));
    const std::uint64_t total = std::uint64_t{window.width} * window.height;
    for (std::uint32_t done = 0; done < window.height;) {
        // Up to the end of a row of tiles, so that the next strip begins with one.
        std::uint64_t end = std::uint64_t{window.y} + done + lines;
        const std::uint64_t aligned = end / kTileRows * kTileRows;
        if (aligned > window.y + done) end = aligned;
        end = std::min<std::uint64_t>(end, std::uint64_t{window.y} + window.height);
        const auto height = static_cast<std::uint32_t>(end - window.y - done);
        for (std::uint32_t x = 0; x < window.width;) {
            const std::uint32_t width = std::min(columns, window.width - x);
            take({window.x + x, window.y + done, width, height});
            x += width;
            if (!progress.Show(std::uint64_t{done} * window.width + std::uint64_t{x} * height,
                               total))
                throw Interruption(view.Name());
        }
        done += height;
    }
}

}  // namespace zmctools
