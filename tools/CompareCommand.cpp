#include <cmath>
#include <cstdio>

#include "core/PixelVocabulary.h"
#include "tools/Arguments.h"
#include "tools/Command.h"
#include "tools/RasterView.h"
#include "tools/SampleDifferences.h"

namespace zmctools {
namespace {

class CompareCommand final : public Command {
public:
    const char* Name() const override { return "compare"; }
    const char* Summary() const override { return "Compare two rasters, pixel for pixel"; }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string first;
    std::string second;
    std::string tolerance = "0";

    ExitStatus Report(const std::vector<std::string>& shape,
                      const SampleDifferences& samples) const;
};

void CompareCommand::Describe(OptionTable& table) {
    table.Text("A", first, "Pyramid, or any other raster that GDAL reads").Required();
    table.Text("B", second, "The other one").Required();
    table
        .Text("--tolerance", tolerance,
              "Absolute difference of two samples that is let pass (default 0)")
        .Named("V");
    table.Footer(
        "Examples:\n"
        "  zmcraster compare scene.tif scene.pyr\n"
        "  zmcraster compare before.pyr after.pyr --tolerance 0.5\n"
        "\n"
        "Of pyramids the finest level is compared. Samples are compared as numbers, whatever the\n"
        "two types are; two NaN are equal. Exit status 3 if something differs.");
}

std::vector<std::string> ShapeDifferences(const RasterView& a, const RasterView& b) {
    std::vector<std::string> list;
    const auto size = [](const RasterView& view) {
        return std::to_string(view.Width(view.MinLevel())) + " x " +
               std::to_string(view.Height(view.MinLevel()));
    };
    if (size(a) != size(b)) list.push_back("size: " + size(a) + " and " + size(b) + " pixels");
    if (a.Bands() != b.Bands())
        list.push_back("bands: " + std::to_string(a.Bands()) + " and " + std::to_string(b.Bands()));
    return list;
}

void CompareSamples(RasterView& a, RasterView& b, bool quiet, SampleDifferences& result) {
    Selection selection{a.MinLevel(),
                        {0, 0, a.Width(a.MinLevel()), a.Height(a.MinLevel())},
                        ParseBands("", a.Bands())};
    TerminalProgress bar("compare", !quiet);
    WalkStrips(
        a, selection, bar,
        [&](const zmchost::Window& strip, StripSamples& samples) {
            samples.first.resize(StripBytes(a, selection, strip));
            samples.second.resize(StripBytes(b, selection, strip));
            std::future<void> other = RunBeside(
                [&] { b.Read(b.MinLevel(), strip, selection.bands, samples.second.data()); });
            a.Read(a.MinLevel(), strip, selection.bands, samples.first.data());
            other.get();
        },
        [&](const zmchost::Window& strip, const StripSamples& samples) {
            result.Take(strip, samples.first.data(), samples.second.data());
        });
}

ExitStatus CompareCommand::Report(const std::vector<std::string>& shape,
                                  const SampleDifferences& samples) const {
    const bool equal = shape.empty() && samples.Samples() == 0;
    Json bands = Json::array();
    for (std::uint32_t band = 0; shape.empty() && band < samples.Bands().size(); ++band) {
        const BandDifference& found = samples.Bands()[band];
        bands.push_back({{"band", band + 1},
                         {"samplesDiffering", JsonNumber(found.samples)},
                         {"greatestDifference", JsonNumber(found.greatest)},
                         {"first", found.samples ? Json{found.x, found.y} : Json()}});
        if (!json && found.samples != 0)
            std::printf("band %u: %llu samples differ, by up to %.17Lg, first at %u,%u\n", band + 1,
                        static_cast<unsigned long long>(found.samples), found.greatest, found.x,
                        found.y);
    }
    if (json) {
        PrintDocument({{"schema", kSchema},
                       {"files", {first, second}},
                       {"tolerance", JsonNumber(ParseNumber("--tolerance", tolerance))},
                       {"equal", equal},
                       {"shape", shape},
                       {"bands", bands}});
    } else {
        for (const std::string& line : shape) std::printf("%s\n", line.c_str());
        if (equal && !quiet)
            std::printf("%s and %s are equal\n", Visible(first).c_str(), Visible(second).c_str());
    }
    return equal ? ExitStatus::Done : ExitStatus::Differences;
}

ExitStatus CompareCommand::Run() {
    const double allowed = ParseNumber("--tolerance", tolerance);
    if (!(allowed >= 0)) throw UsageError("--tolerance", tolerance + " is below 0");
    const auto a = OpenView(first);
    const auto b = OpenView(second);
    std::vector<std::string> shape = ShapeDifferences(*a, *b);
    SampleDifferences samples(a->PixelType(), b->PixelType(), a->Bands(), allowed);
    if (shape.empty()) CompareSamples(*a, *b, quiet, samples);
    a->CheckUnchanged();
    b->CheckUnchanged();
    return Report(shape, samples);
}

}  // namespace

std::unique_ptr<Command> MakeCompareCommand() { return std::make_unique<CompareCommand>(); }

}  // namespace zmctools
