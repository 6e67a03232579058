#include <bit>
#include <cstdio>

#include "core/PixelVocabulary.h"
#include "store/Sha256.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/PartOptions.h"
#include "tools/RasterView.h"

namespace zmctools {
namespace {

static_assert(std::endian::native == std::endian::little, "samples are hashed as they lie here");

class HashCommand final : public Command {
public:
    const char* Name() const override { return "hash"; }
    const char* Summary() const override { return "Compute the SHA-256 of a raster's samples"; }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::vector<std::string> files;
    PartOptions part;

    Json Hash(const std::string& file) const;
    ExitStatus HashOneByOne() const;
};

void HashCommand::Describe(OptionTable& table) {
    table.Names("FILE", files, "Pyramids, or any other rasters that GDAL reads").Required();
    part.Describe(table);
    table.Footer(
        "Examples:\n"
        "  zmcraster hash scene.pyr\n"
        "  zmcraster hash scene.pyr --level 2 --window 0,0,256,256 --bands 1\n"
        "  zmcraster hash *.pyr > hashes.txt\n"
        "\n"
        "What is hashed: the samples as little-endian bytes, pixel-interleaved, rows from the "
        "top.\n"
        "A raster of another format with the same samples of the same type has the same hash.\n"
        "Of several files each has its line; one that cannot be read does not keep the others from "
        "theirs.");
}

// What --json tells of a file.
Json HashCommand::Hash(const std::string& file) const {
    const auto view = OpenView(file);
    Selection selection;
    selection.level = part.Level();
    view->CheckLevel(selection.level);
    selection.window =
        ParseWindow(part.window, view->Width(selection.level), view->Height(selection.level));
    selection.bands = ParseBands(part.bands, view->Bands());

    zmcstore::Sha256 sha;
    std::uint64_t bytes = 0;
    {
        TerminalProgress bar("hash", !quiet);
        WalkStrips(
            *view, selection, bar,
            [&](const zmchost::Window& strip, StripSamples& samples) {
                samples.first.resize(StripBytes(*view, selection, strip));
                view->Read(selection.level, strip, selection.bands, samples.first.data());
            },
            [&](const zmchost::Window&, const StripSamples& samples) {
                sha.Add(samples.first.data(), samples.first.size());
                bytes += samples.first.size();
            });
    }
    view->CheckUnchanged();
    Json numbers = Json::array();
    for (const std::uint32_t band : selection.bands) numbers.push_back(band + 1);
    const zmchost::Window& area = selection.window;
    return {{"file", file},
            {"level", selection.level},
            {"window", {area.x, area.y, area.width, area.height}},
            {"bands", numbers},
            {"pixelType", zelm::PixelTypeName(view->PixelType())},
            {"bytes", JsonNumber(bytes)},
            {"sha256", sha.Finish()}};
}

void PrintLine(const Json& hash) {
    std::printf("%s  %s\n", hash["sha256"].get<std::string>().c_str(),
                Visible(hash["file"].get<std::string>()).c_str());
}

// The status is that of the first file that failed. Who wants an end wants it for all of them.
ExitStatus HashCommand::HashOneByOne() const {
    ExitStatus status = ExitStatus::Done;
    Json list = Json::array();
    for (const std::string& file : files) try {
            list.push_back(Hash(file));
            if (!json) PrintLine(list.back());
        } catch (const Interruption&) {
            throw;
        } catch (const std::exception&) {
            Answer answer = AnswerOfException();
            // That options do not fit is told without the file that they do not fit.
            if (answer.status == ExitStatus::Usage)
                answer.text = Visible(file) + ": " + answer.text;
            Say(answer.text);
            list.push_back({{"file", file}, {"error", answer.text}});
            if (status == ExitStatus::Done) status = answer.status;
        }
    if (json) PrintDocument({{"schema", kSchema}, {"files", list}});
    return status;
}

ExitStatus HashCommand::Run() {
    if (files.size() > 1) return HashOneByOne();
    const Json hash = Hash(files.front());
    if (!json) return PrintLine(hash), ExitStatus::Done;
    Json document = {{"schema", kSchema}};
    document.update(hash);
    PrintDocument(document);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeHashCommand() { return std::make_unique<HashCommand>(); }

}  // namespace zmctools
