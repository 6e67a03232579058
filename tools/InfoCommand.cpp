#include <cstdint>
#include <cstdio>
#include <span>
#include <string>
#include <vector>

#include "core/PixelVocabulary.h"
#include "describe/Description.h"
#include "host/file/PyramidFileInfo.h"
#include "platform/Terminal.h"
#include "tools/Command.h"
#include "tools/HistogramBars.h"
#include "tools/Place.h"
#include "tools/RasterView.h"

namespace zmctools {
namespace {

class InfoCommand final : public Command {
public:
    const char* Name() const override { return "info"; }
    const char* Summary() const override { return "Show what is in a pyramid file"; }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;
};

void InfoCommand::Describe(OptionTable& table) {
    table.Text("FILE", file, "Pyramid to look at").Required();
    table.Footer(
        "Examples:\n"
        "  zmcraster info scene.pyr\n"
        "  zmcraster info scene.pyr --json\n"
        "\n"
        "Offsets are bytes from the start of the file. In the Morton ordering the levels are "
        "woven\n"
        "into each other, and have no offset. Histograms are drawn on a terminal.");
}

// A program gets all there is. People are shown no more of 65,536 colours than a line, with their
// true number, and bars in place of counts, on a terminal.
enum class Detail { All, Readable };

constexpr std::size_t kColorsOnALine = 64;

void AddReadableRecords(const zmchost::Raster& raster, Json& document) {
    const bool draws = platform::IsTerminal(platform::StandardStream::Output);
    document["statistics"] = zmcdescribe::DescribeStatistics(raster);
    document["histograms"] = zmcdescribe::DescribeHistograms(
        raster, [&](Json& histogram, std::span<const std::uint64_t> counts) {
            if (draws)
                histogram["bars"] = DrawBars(std::vector<double>(counts.begin(), counts.end()));
        });
    document["palettes"] = zmcdescribe::DescribePalettes(raster, kColorsOnALine);
}

Json Describe(const std::string& file, Detail detail) {
    const zmchost::PyramidFileInfo info = ReadLayout(file);
    // Of a type without a reader the header is all that can be told.
    if (zelm::CheckedPixelType(info.header.pixelType) == 0 || !info.HasMetadataDocument())
        return zmcdescribe::DescribeLayout(file, info);
    const zmchost::Raster raster = OpenPyramid(file);
    // Of the file that is open now, should another have taken the name.
    Json document =
        zmcdescribe::DescribeLayout(file, zmchost::DescribePyramidFile(raster.Header()));
    if (const std::string wrong = raster.DocumentFault(); !wrong.empty()) {
        Warn(file, wrong + "; statistics, histograms and palettes are not shown");
        return document;
    }
    if (detail == Detail::Readable)
        AddReadableRecords(raster, document);
    else
        zmcdescribe::AddRecords(raster, document);
    return document;
}

// A number as people read it: strings of a document without their quotes.
std::string Text(const Json& value) {
    if (value.is_null()) return "-";
    if (value.is_string()) return value.get<std::string>();
    if (!value.is_number_float()) return value.dump();
    char text[40];
    static_cast<void>(std::snprintf(text, sizeof text, "%.10g", value.get<double>()));
    return text;
}

void PrintLevels(const Json& document) {
    std::printf("%-6s %12s %12s %15s %15s\n", "level", "pixels", "tiles", "offset", "bytes");
    for (const Json& level : document["levels"]) {
        const std::string pixels = Text(level["width"]) + " x " + Text(level["height"]);
        const std::string tiles = Text(level["tilesAcross"]) + " x " + Text(level["tilesDown"]);
        std::printf("%-6s %12s %12s %15s %15s\n", Text(level["level"]).c_str(), pixels.c_str(),
                    tiles.c_str(), Text(level["offset"]).c_str(), Text(level["bytes"]).c_str());
    }
}

void PrintStatistics(const Json& document) {
    if (document["statistics"].empty()) return;
    std::printf("%-6s %15s %15s %15s %15s\n", "band", "minimum", "maximum", "mean", "deviation");
    for (const Json& band : document["statistics"])
        std::printf("%-6s %15s %15s %15s %15s\n", Text(band["band"]).c_str(),
                    Text(band["minimum"]).c_str(), Text(band["maximum"]).c_str(),
                    Text(band["mean"]).c_str(), Text(band["standardDeviation"]).c_str());
}

void PrintHistograms(const Json& document) {
    for (const Json& histogram : document["histograms"]) {
        std::printf("histogram of band %s, level %s: %s bins of %s from %s to %s\n",
                    Text(histogram["band"]).c_str(), Text(histogram["level"]).c_str(),
                    Text(histogram["binCount"]).c_str(), Text(histogram["binSize"]).c_str(),
                    Text(histogram["minimum"]).c_str(), Text(histogram["maximum"]).c_str());
        const auto bars = histogram.find("bars");
        if (bars == histogram.end()) continue;
        for (const Json& row : *bars)
            std::printf("  %s\n", row.get_ref<const std::string&>().c_str());
    }
}

void PrintPalettes(const Json& document) {
    for (const Json& palette : document["palettes"]) {
        std::printf("palette of band %s: %s colors\n", Text(palette["band"]).c_str(),
                    Text(palette["count"]).c_str());
        if (!platform::IsTerminal(platform::StandardStream::Output)) continue;
        std::printf("  ");
        for (const Json& color : palette["colors"])
            std::printf("\x1b[48;2;%d;%d;%dm ", color[0].get<int>(), color[1].get<int>(),
                        color[2].get<int>());
        std::printf("\x1b[0m\n");
    }
}

void Print(const Json& document) {
    std::printf("%s\n", Visible(Text(document["file"])).c_str());
    std::printf("%s x %s pixels, %s band%s of %s\n", Text(document["width"]).c_str(),
                Text(document["height"]).c_str(), Text(document["bands"]).c_str(),
                document["bands"] == 1 ? "" : "s", Text(document["pixelType"]).c_str());
    std::printf("interleave %s, ordering %s, tiles of %s, version %s\n",
                Text(document["interleave"]).c_str(), Text(document["tileOrdering"]).c_str(),
                Text(document["tileSize"]).c_str(), Text(document["version"]).c_str());
    if (document["complete"].get<bool>())
        std::printf("complete\n");
    else
        std::printf("not complete: %s bytes are missing\n", Text(document["bytesMissing"]).c_str());
    PrintPlace(document);
    PrintLevels(document);
    PrintStatistics(document);
    PrintHistograms(document);
    PrintPalettes(document);
}

ExitStatus InfoCommand::Run() {
    Json document = zmctools::Describe(file, json ? Detail::All : Detail::Readable);
    document.update(PlaceOf(file));
    if (json)
        PrintDocument(document);
    else
        Print(document);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeInfoCommand() { return std::make_unique<InfoCommand>(); }

}  // namespace zmctools
