#include "gdal/Create.h"

#include <algorithm>

#include "core/PixelVocabulary.h"
#include "files/Lending.h"
#include "gdal/Band.h"
#include "gdal/Dataset.h"
#include "gdal/ErrorCatcher.h"
#include "gdal/Fetcher.h"
#include "gdal/GdalRasterSource.h"
#include "gdal/Reporting.h"
#include "gdal/Sidecar.h"
#include "gdal/VsiSource.h"
#include "host/build/PyramidBuilder.h"
#include "host/file/EmbeddedItems.h"
#include "host/raster/LentFile.h"
#include "platform/FileSystem.h"

namespace zmcgdal {
namespace {

// Names what cannot be kept; false if that is not acceptable.
bool AcceptLosses(const GdalRasterSource& source, bool strict) {
    const std::vector<std::string> losses = source.Losses();
    for (const std::string& loss : losses)
        CPLError(strict ? CE_Failure : CE_Warning, CPLE_NotSupported, "a pyramid does not keep %s",
                 loss.c_str());
    return losses.empty() || !strict;
}

void UseProgress(zmchost::BuildOptions& options, GDALProgressFunc progress, void* data) {
    if (!progress) return;
    options.progress = [progress, data](const zmchost::BuildProgress& state) {
        const double total = static_cast<double>(std::max<std::uint64_t>(state.total, 1));
        return progress(std::min(1.0, static_cast<double>(state.done) / total), "", data) != FALSE;
    };
}

// A target whose sidecar cannot be written goes again, with what there is of that.
class Unfinished {
public:
    explicit Unfinished(const std::string& target) : name(target) {}
    ~Unfinished() {
        if (kept) return;
        for (const char* const ending : {"", kSidecarEnding, kMaskEnding})
            Reported([&] { VSIUnlink((name + ending).c_str()); });
    }
    Unfinished(const Unfinished&) = delete;
    Unfinished& operator=(const Unfinished&) = delete;
    void Keep() { kept = true; }

private:
    const std::string& name;
    bool kept = false;
};

std::unique_ptr<Dataset> OpenForUpdate(const std::string& name) {
    auto file = std::make_shared<OpenFile>(name, GA_Update, OpenOptions{});
    auto dataset = Dataset::FromFile(std::move(file), GA_Update);
    dataset->LoadSidecar(name.c_str(), nullptr);
    return dataset;
}

// Builders work in plain folders: what is to stand elsewhere is built in the folder for temporary
// files first.
std::string TemporaryName() {
    const char* const folder =
        CPLGetConfigOption("CPL_TMPDIR", CPLGetConfigOption("TMPDIR", "/tmp"));
    return platform::JoinPath(folder, "zmcraster");
}

[[noreturn]] void FailToWrite(const std::string& target) {
    throw zmchost::Error(target, "create the pyramid", "GDAL cannot write it there");
}

// GDAL tells so of networks beforehand; of an archive that it can write, it says that it cannot.
void CheckWritable(const std::string& target) {
    if (!NetworkPart(target).empty() && !VSISupportsSequentialWrite(target.c_str(), true))
        FailToWrite(target);
}

// In order from its beginning, as every file system that can be written takes it.
void CopyFile(const std::string& from, const std::string& target) {
    const auto source = zmchost::OpenPlainFile(from, false);
    const CPLErrorStateBackuper before;
    const ErrorCatcher errors(CE_Failure);
    VSILFILE* const file = VSIFOpenL(target.c_str(), "wb");
    if (!file) FailToWrite(target);
    std::vector<unsigned char> piece(std::size_t{1} << 20);
    int error = 0;
    std::uint64_t at = 0;
    bool written = true;
    while (written && error == 0) {
        const std::size_t size = source->ReadAt(at, piece.data(), piece.size(), &error);
        if (size == 0) break;
        written = VSIFWriteL(piece.data(), 1, size, file) == size;
        at += size;
    }
    written = VSIFCloseL(file) == 0 && written && error == 0;
    if (written) return;
    VSIUnlink(target.c_str());
    FailToWrite(target);
}

// The builder knows a file by its temporary name.
template <class Work>
auto Naming(const std::string& target, Work&& work) {
    try {
        return work();
    } catch (const zmchost::Cancelled& error) {
        throw zmchost::Cancelled(target, error.Operation());
    } catch (const zmchost::Error& error) {
        throw zmchost::Error(target, error.Operation(), error.Reason());
    }
}

void BuildElsewhere(zmchost::RasterSource& pixels, const std::string& target,
                    const zmchost::BuildOptions& options) {
    const zmchost::BuildFile built(TemporaryName(), true);
    Naming(target, [&] {
        zmchost::PyramidBuilder(SharedModule()).Build(pixels, built.Path(), options);
        CopyFile(built.Path(), target);
    });
}

void Build(zmchost::RasterSource& pixels, const std::string& target,
           const zmchost::BuildOptions& options) {
    if (IsVirtualName(target)) return BuildElsewhere(pixels, target, options);
    zmchost::PyramidBuilder(SharedModule()).Build(pixels, target, options);
}

GDALDataset* CopyTo(const std::string& target, GDALDataset& source, bool strict,
                    CreationOptions options, GDALProgressFunc progress, void* progressData) {
    CheckWritable(target);
    GdalRasterSource pixels(source, options.signedByte);
    if (!AcceptLosses(pixels, strict)) return nullptr;
    UseProgress(options.build, progress, progressData);
    std::vector<zmchost::FullStatistics> statistics;
    options.build.takeStatistics = [&](const auto& stored) { statistics = stored; };
    Build(pixels, target, options.build);
    Unfinished made(target);
    auto dataset = OpenForUpdate(target);
    if (CopySidecar(source, *dataset, strict) != CE_None) return nullptr;
    KeepStatistics(statistics, *dataset, dataset->File().archive);
    (options.embed ? EmbedSidecar : SaveSidecar)(std::move(dataset), target);
    dataset = OpenForUpdate(target);
    made.Keep();
    return dataset.release();
}

zelm::RasterProps PropsOf(const char* target, int width, int height, int bands,
                          std::uint32_t pixelType) {
    if (bands < 1) throw zmchost::Error(target, "create the pyramid", "it would have no bands");
    if (pixelType == 0)
        throw zmchost::Error(target, "create the pyramid", "no pyramid holds this data type");
    zelm::RasterProps props;
    props.pixelType = pixelType;
    props.SetSamples(static_cast<std::uint32_t>(width));
    props.SetLines(static_cast<std::uint32_t>(height));
    props.SetBands(static_cast<std::uint32_t>(bands));
    return props;
}

// A raster that has no pixels yet.
class Outline final : public zmchost::RasterSource {
public:
    Outline(std::string targetName, zelm::RasterProps rasterProps)
        : name(std::move(targetName)), props(std::move(rasterProps)) {}

    std::string Name() const override { return name; }
    zelm::RasterProps Props() const override { return props; }
    void Read(const zmchost::Window&, std::span<const std::uint32_t>, void*) override {
        throw zmchost::Error(name, "read its pixels", "it has none yet");
    }

private:
    std::string name;
    zelm::RasterProps props;
};

std::shared_ptr<OpenFile> OpenDraft(const zmchost::BuildFile& draft,
                                    const CreationOptions& options) {
    OpenOptions open;
    if (options.signedByte) open.signedByteAs = SignedByteAs::FlaggedByte;
    return std::make_shared<OpenFile>(draft.Path(), GA_Update, open);
}

GDALDataset* ShowDraft(const std::string& target, CreationOptions options,
                       std::unique_ptr<zmchost::BuildFile> draft) {
    auto dataset = Dataset::FromFile(OpenDraft(*draft, options), GA_Update);
    dataset->SetDescription(target.c_str());
    const zelm::LevelGeometry grid = dataset->File().info.header.Geometry(0);
    const std::size_t blocks = std::size_t{grid.tilesAcross} * grid.tilesDown;
    dataset->BeginCreation(
        std::make_unique<Creation>(target, std::move(options), std::move(draft), blocks,
                                   static_cast<std::size_t>(dataset->GetRasterCount())));
    return dataset.release();
}

void DropColors(Dataset& dataset) {
    for (int number = 1; number <= dataset.GetRasterCount(); ++number)
        static_cast<Band*>(dataset.GetRasterBand(number))->DropSidecarColors();
}

bool RefuseLent(const char* target) {
    if (!zelm::files::LooksLent(target)) return false;
    CPLError(CE_Failure, CPLE_IllegalArg, "%s: names of lent sources are not taken here", target);
    return true;
}

}  // namespace

GDALDataset* CreateCopy(const char* target, GDALDataset* source, int strict, Items options,
                        GDALProgressFunc progress, void* progressData) {
    return Reporting<GDALDataset*>(nullptr, [&]() -> GDALDataset* {
        if (RefuseLent(target)) return nullptr;
        auto parsed = ParseCreationOptions(options);
        if (!parsed) return nullptr;
        return CopyTo(target, *source, strict != FALSE, std::move(*parsed), progress, progressData);
    });
}

GDALDataset* CreateNew(const char* target, int width, int height, int bands, GDALDataType type,
                       Items options) {
    return Reporting<GDALDataset*>(nullptr, [&]() -> GDALDataset* {
        if (RefuseLent(target)) return nullptr;
        auto parsed = ParseCreationOptions(options);
        if (!parsed) return nullptr;
        // A file would open with another type than the one that was asked for.
        const bool changes = type == GDT_CInt16 || type == GDT_CInt32;
        const std::uint32_t pixelType = changes ? 0 : PixelTypeFor(type, parsed->signedByte);
        const zelm::RasterProps props = PropsOf(target, width, height, bands, pixelType);
        CheckWritable(target);
        Outline outline(target, props);
        const zmchost::PyramidBuilder builder(SharedModule());
        builder.Check(outline, target, parsed->build);
        auto draft = std::make_unique<zmchost::BuildFile>(
            IsVirtualName(target) ? TemporaryName() : target, true);
        Naming(target, [&] { builder.LayOut(outline, *draft, target, parsed->build); });
        return ShowDraft(target, std::move(*parsed), std::move(draft));
    });
}

Creation::Creation(std::string targetName, CreationOptions creationOptions,
                   std::unique_ptr<zmchost::BuildFile> draftFile, std::size_t blockCount,
                   std::size_t bandCount)
    : target(std::move(targetName)),
      options(std::move(creationOptions)),
      draft(std::move(draftFile)),
      bands(bandCount),
      written(blockCount * bandCount),
      lost(written.size()) {}

void Creation::Check(Dataset& dataset, const zmchost::BuildOptions& build) const {
    GdalRasterSource source(dataset, options.signedByte);
    zmchost::PyramidBuilder(SharedModule()).Check(source, target, build);
}

CPLErr Creation::ChooseLevels(Dataset& dataset, const char* resampling, int count,
                              const int* factors) {
    std::uint32_t coarsest = 0;
    for (int i = 0; i < count; ++i) {
        std::uint32_t level = 1;
        while (level < 30 && 1 << level < factors[i]) ++level;
        if (1 << level != factors[i]) {
            CPLError(CE_Failure, CPLE_NotSupported, "a pyramid has no level reduced by %d",
                     factors[i]);
            return CE_Failure;
        }
        coarsest = std::max(coarsest, level);
    }
    const auto method = ResamplingFrom(resampling);
    if (!method) {
        CPLError(CE_Failure, CPLE_NotSupported, "resampling %s is not known", resampling);
        return CE_Failure;
    }
    zmchost::BuildOptions chosen = options.build;
    chosen.resampling = method;
    chosen.levels = coarsest;
    if (!Reported([&] { Check(dataset, chosen); })) return CE_Failure;
    const bool fits = dataset.File().info.header.levelMax == coarsest;
    if (!fits && IsUntouched() && !Reported([&] { LayOutAnew(dataset, chosen); }))
        return CE_Failure;
    options.build = std::move(chosen);
    return CE_None;
}

// Blocks in GDAL's cache are no matter of the file's yet.
bool Creation::IsUntouched() const {
    const auto none = [](const std::vector<bool>& blocks) {
        return std::find(blocks.begin(), blocks.end(), true) == blocks.end();
    };
    return none(written) && none(lost);
}

void Creation::LayOutAnew(Dataset& dataset, const zmchost::BuildOptions& build) {
    GdalRasterSource source(dataset, options.signedByte);
    Naming(target, [&] {
        zmchost::PyramidBuilder(SharedModule()).LayOut(source, *draft, target, build);
        dataset.Reopen(OpenDraft(*draft, options));
    });
}

// What there is of a mask by the end of a creation that failed.
Creation::~Creation() {
    Reported([&] { VSIUnlink((DraftName() + kMaskEnding).c_str()); });
}

// A target whose mask cannot be kept goes again.
void Creation::KeepMask(Dataset& dataset) const {
    Unfinished made(target);
    const std::string mask = DraftName() + kMaskEnding;
    VSIStatBufL status;
    const bool exists = VSIStatL(mask.c_str(), &status) == 0;
    if (exists) CloseMask(dataset, mask, target);
    if (exists && IsVirtualName(target))
        CopyFile(mask, target + kMaskEnding);
    else if (exists && VSIRename(mask.c_str(), (target + kMaskEnding).c_str()) != 0)
        throw zmchost::Error(target, "keep its mask", "it cannot be moved to its place");
    made.Keep();
}

bool Creation::Finish(Dataset& dataset) {
    sealed = std::find(written.begin(), written.end(), false) == written.end();
    std::vector<zmchost::FullStatistics> statistics;
    const auto keepStatistics = [&](const std::string& file) {
        OpenFile made(file, GA_ReadOnly, OpenOptions{});
        KeepStatistics(statistics, dataset, made.archive);
    };
    const bool built = Reported([&] {
        if (std::find(lost.begin(), lost.end(), true) != lost.end())
            throw zmchost::Error(target, "build it", "some of its blocks could not be written");
        options.build.takeStatistics = [&](const auto& stored) { statistics = stored; };
        if (options.embed)
            options.build.beforeNaming = [&](const std::string& made) {
                keepStatistics(made);
                Embed(dataset, made);
            };
        MakeTarget(dataset);
    });
    if (!built || !Reported([&] { KeepMask(dataset); })) return false;
    // The palettes are in the file now.
    Reported([&] {
        DropColors(dataset);
        if (!options.embed) keepStatistics(target);
    });
    if (options.embed) dataset.ForgetChanges();
    return true;
}

void Creation::MakeTarget(Dataset& dataset) {
    GdalRasterSource source(dataset, options.signedByte);
    AcceptLosses(source, false);
    const std::uint32_t laidOut = dataset.File().info.header.levelMax;
    if (options.build.levels.value_or(laidOut) == laidOut)
        CompleteDraft(dataset, source);
    else
        Build(source, target, options.build);
}

void Creation::CompleteDraft(Dataset& dataset, zmchost::RasterSource& source) {
    for (int number = 1; number <= dataset.GetRasterCount(); ++number)
        static_cast<Band*>(dataset.GetRasterBand(number))->WriteUnwritten();
    sealed = true;
    Naming(target, [&] {
        zmchost::PyramidBuilder(SharedModule()).Complete(source, *draft, target, options.build);
    });
    if (IsVirtualName(target))
        CopyFile(draft->Path(), target);
    else
        draft->Commit();
}

void Creation::Embed(Dataset& dataset, const std::string& made) const {
    DropColors(dataset);
    const std::string items = dataset.SidecarText();
    if (!items.empty()) zmchost::EmbedItems(*OpenByName(made, true), target, items);
}

}  // namespace zmcgdal
