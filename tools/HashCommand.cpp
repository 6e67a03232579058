#include <bit>
#include <cstdio>

#include "core/PixelVocabulary.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/PartOptions.h"
#include "tools/RasterView.h"
#include "tools/Sha256.h"

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
    std::string file;
    PartOptions part;
};

void HashCommand::Describe(OptionTable& table) {
    table.Text("FILE", file, "Pyramid, or any other raster that GDAL reads").Required();
    part.Describe(table);
    table.Footer(
        "Examples:\n"
        "  zmcraster hash scene.pyr\n"
        "  zmcraster hash scene.pyr --level 2 --window 0,0,256,256 --bands 1\n"
        "\n"
        "What is hashed: the samples as little-endian bytes, pixel-interleaved, rows from the "
        "top.\n"
        "A raster of another format with the same samples of the same type has the same hash.");
}

ExitStatus HashCommand::Run() {
    const auto view = OpenView(file);
    Selection selection;
    selection.level = part.Level();
    view->CheckLevel(selection.level);
    selection.window =
        ParseWindow(part.window, view->Width(selection.level), view->Height(selection.level));
    selection.bands = ParseBands(part.bands, view->Bands());

    Sha256 sha;
    std::uint64_t bytes = 0;
    std::vector<unsigned char> samples;
    {
        TerminalProgress bar("hash", !quiet);
        WalkStrips(*view, selection, bar, [&](const zmchost::Window& strip) {
            samples.resize(StripBytes(*view, selection, strip));
            view->Read(selection.level, strip, selection.bands, samples.data());
            sha.Add(samples.data(), samples.size());
            bytes += samples.size();
        });
    }
    view->CheckUnchanged();
    const std::string digest = sha.Finish();
    if (json) {
        Json numbers = Json::array();
        for (const std::uint32_t band : selection.bands) numbers.push_back(band + 1);
        const zmchost::Window& area = selection.window;
        PrintDocument({{"schema", kSchema},
                       {"file", file},
                       {"level", selection.level},
                       {"window", {area.x, area.y, area.width, area.height}},
                       {"bands", numbers},
                       {"pixelType", zelm::PixelTypeName(view->PixelType())},
                       {"bytes", JsonNumber(bytes)},
                       {"sha256", digest}});
    } else {
        std::printf("%s  %s\n", digest.c_str(), Visible(file).c_str());
    }
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeHashCommand() { return std::make_unique<HashCommand>(); }

}  // namespace zmctools
