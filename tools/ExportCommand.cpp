#include <cpl_string.h>
#include <gdal_utils.h>

#include <cstdio>
#include <filesystem>

#include "gdal/Sidecar.h"
#include "host/file/PresentTiles.h"
#include "platform/Interrupts.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/GdalWorld.h"
#include "tools/Interrupt.h"
#include "tools/PartOptions.h"
#include "tools/RasterView.h"

namespace zmctools {
namespace {

namespace fs = std::filesystem;

class ExportCommand final : public Command {
public:
    const char* Name() const override { return "export"; }
    const char* Summary() const override { return "Write a level or a part of it in any format"; }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;
    std::string target;
    PartOptions part;
    std::string format;
    std::vector<std::string> creationOptions;

    DatasetPtr OpenLevel(std::uint32_t wanted) const;
    std::vector<std::string> Arguments(GDALDataset& raster, zmchost::Window& area) const;
    void Translate(GDALDataset& dataset, const std::vector<std::string>& arguments) const;
};

void ExportCommand::Describe(OptionTable& table) {
    table.Text("FILE", file, "Pyramid to read").Required();
    table.Text("TARGET", target, "Raster to write; a file of that name is replaced").Required();
    part.Describe(table);
    table
        .Text("--format,--of", format,
              "GDAL's short name of the format, also written -of (default: what the ending of "
              "TARGET tells)")
        .Named("NAME");
    table.Texts("--co", creationOptions, "Creation option of the format, also written -co")
        .Named("K=V");
    table.Footer(
        "Examples:\n"
        "  zmcraster export scene.pyr overview.png --level 3\n"
        "  zmcraster export scene.pyr part.tif --window 1000,2000,512,512 -co COMPRESS=DEFLATE\n"
        "  zmcraster export scene.pyr band4.img --bands 4 --format HFA");
}

DatasetPtr ExportCommand::OpenLevel(std::uint32_t wanted) const {
    const zmchost::PyramidFileInfo info = ReadLayout(file);
    const std::uint32_t base = info.header.levelMin;
    if (!info.FindLevel(wanted))
        throw UsageError("--level", "there is no level " + std::to_string(wanted) + ": " +
                                        Visible(file) + " has the levels " + std::to_string(base) +
                                        " to " + std::to_string(info.header.levelMax));
    // Of a coarser level the driver shows all or nothing.
    if (!zmchost::PresentTiles(info.header).HaveLevel(wanted, info.header.fileSize) &&
        wanted != base)
        FailAsIncomplete(file, std::to_string(info.bytesMissing));
    std::vector<std::string> options;
    if (wanted > base) options.push_back("OVERVIEW_LEVEL=" + std::to_string(wanted - base - 1));
    return OpenDataset(file, options);
}

std::vector<std::string> ExportCommand::Arguments(GDALDataset& raster,
                                                  zmchost::Window& area) const {
    area = ParseWindow(part.window, static_cast<std::uint32_t>(raster.GetRasterXSize()),
                       static_cast<std::uint32_t>(raster.GetRasterYSize()));
    std::vector<std::string> arguments;
    if (!part.window.empty()) {
        arguments.push_back("-srcwin");
        for (const std::uint32_t number : {area.x, area.y, area.width, area.height})
            arguments.push_back(std::to_string(number));
    }
    if (!part.bands.empty())
        for (const std::uint32_t band :
             ParseBands(part.bands, static_cast<std::uint32_t>(raster.GetRasterCount())))
            arguments.insert(arguments.end(), {"-b", std::to_string(band + 1)});
    if (!format.empty()) {
        if (!GetGDALDriverManager()->GetDriverByName(format.c_str()))
            throw UsageError("--format",
                             "GDAL has no format " + format + "; gdalinfo --formats lists them");
        arguments.insert(arguments.end(), {"-of", format});
    }
    for (const std::string& option : creationOptions) {
        if (option.find('=') == option.npos)
            throw UsageError("-co", "\"" + option + "\" is not NAME=VALUE");
        arguments.insert(arguments.end(), {"-co", option});
    }
    return arguments;
}

// When a file was last written; the least time for one that there is not.
fs::file_time_type StampOf(const std::string& name) {
    std::error_code missing;
    const auto stamp = fs::last_write_time(name, missing);
    return missing ? fs::file_time_type::min() : stamp;
}

// What was written of a raster that did not come to its end.
void RemoveFiles(const std::string& target) {
    std::error_code ignored;
    for (const char* const ending : {"", zmcgdal::kSidecarEnding, zmcgdal::kMaskEnding})
        if (fs::is_regular_file(target + ending, ignored)) fs::remove(target + ending, ignored);
}

void ExportCommand::Translate(GDALDataset& dataset,
                              const std::vector<std::string>& arguments) const {
    CPLStringList list;
    for (const std::string& word : arguments) list.AddString(word.c_str());
    const std::unique_ptr<GDALTranslateOptions, decltype(&GDALTranslateOptionsFree)> translate(
        GDALTranslateOptionsNew(list.List(), nullptr), &GDALTranslateOptionsFree);
    if (!translate) throw Failure(target, TakeGdalError(target));
    SetSubject(target);
    const auto before = StampOf(target);
    TerminalProgress bar(fs::path(target).filename().string(), !quiet);
    GDALTranslateOptionsSetProgress(
        translate.get(),
        [](double share, const char*, void* data) -> int {
            return static_cast<TerminalProgress*>(data)->ShowShare(share) ? TRUE : FALSE;
        },
        &bar);
    DatasetPtr written(GDALDataset::FromHandle(
        GDALTranslate(target.c_str(), GDALDataset::ToHandle(&dataset), translate.get(), nullptr)));
    const bool made = written != nullptr;
    if (made) written->FlushCache(true);
    written.reset();
    const std::string reason = TakeGdalError(target);
    if (made && reason.empty() && !platform::IsInterrupted()) return;
    if (StampOf(target) != before) RemoveFiles(target);
    CheckInterrupt(target);
    throw Failure(target, reason.empty() ? "GDAL does not write it and gives no reason" : reason);
}

ExitStatus ExportCommand::Run() {
    const auto wanted = part.Level();
    const DatasetPtr dataset = OpenLevel(wanted);
    zmchost::Window area;
    const std::vector<std::string> arguments = Arguments(*dataset, area);
    std::error_code ignored;
    if (fs::is_directory(target, ignored))
        throw Failure(target, "it is a folder; name a file in it");
    CheckIsNoDevice(target);
    if (fs::exists(target, ignored) && fs::equivalent(file, target, ignored))
        throw Failure(target, "it is the pyramid itself; name another file");
    Translate(*dataset, arguments);
    if (json)
        PrintDocument({{"schema", kSchema},
                       {"file", file},
                       {"target", target},
                       {"level", wanted},
                       {"window", {area.x, area.y, area.width, area.height}}});
    else if (!quiet)
        std::printf("%s: level %u of %s, %u x %u pixels from %u,%u\n", Visible(target).c_str(),
                    wanted, Visible(file).c_str(), area.width, area.height, area.x, area.y);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeExportCommand() { return std::make_unique<ExportCommand>(); }

}  // namespace zmctools
