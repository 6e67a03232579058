#include "tools/Verification.h"

#include "core/PixelVocabulary.h"
#include "format/PyramidLayout.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"
#include "tools/SampleDifferences.h"

namespace zmctools {
namespace {

void JudgeRecord(CheckResult& result, const zmchost::Raster& raster, const char* what,
                 std::uint32_t band, std::uint32_t level) {
    if (band >= raster.Bands())
        result.problems.push_back(std::string(what) + " of band " + std::to_string(band + 1) +
                                  ", which the raster does not have");
    if (level < raster.MinLevel() || level > raster.MaxLevel())
        result.problems.push_back(std::string(what) + " of level " + std::to_string(level) +
                                  ", which the raster does not have");
}

}  // namespace

CheckResult CheckStructure(const zmchost::PyramidFileInfo& info, const zmchost::Raster& raster) {
    CheckResult result{"structure", {}, {}};
    const zmchost::PyramidHeader& header = info.header;
    const zelm::RasterProps& props = raster.Props();
    const auto expect = [&](const char* what, std::uint64_t inHeader, std::uint64_t inModule) {
        if (inHeader != inModule)
            result.problems.push_back(std::string(what) + " is " + std::to_string(inHeader) +
                                      " in the header and " + std::to_string(inModule) +
                                      " for the module");
    };
    expect("the width", header.width, props.samples);
    expect("the height", header.height, props.lines);
    expect("the number of bands", header.bandCount, props.bands);
    expect("the pixel type", header.pixelType, props.pixelType);
    expect("the finest level", header.levelMin, 0);
    if (!zelm::PyramidLayout::MayHaveLevels(header.versionMajor, header.versionMinor))
        result.problems.push_back("version " + std::to_string(header.versionMajor) + '.' +
                                  std::to_string(header.versionMinor) +
                                  " has no levels; a pyramid is of 1.1 or later");
    for (const zmchost::PyramidLevelInfo& level : info.levels)
        if (level.width == 0 || level.height == 0)
            result.problems.push_back("level " + std::to_string(level.level) + " has no pixels");
    return result;
}

CheckResult CheckCompleteness(const zmchost::PyramidFileInfo& info) {
    CheckResult result{"completeness", {}, {}};
    if (info.bytesMissing != 0)
        result.problems.push_back(std::to_string(info.bytesMissing) +
                                  " bytes of tiles are missing; build the file anew");
    return result;
}

CheckResult CheckDocuments(const zmchost::PyramidFileInfo& info, const zmchost::Raster& raster) {
    CheckResult result{"documents", {}, {}};
    if (!info.HasMetadataDocument()) return result;
    const std::string wrong = raster.DocumentFault();
    if (!wrong.empty()) {
        result.problems.push_back(wrong);
        return result;
    }
    zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
        for (const auto& histogram : raster.Histograms<T>()) {
            JudgeRecord(result, raster, "histogram", histogram.band, histogram.level);
            if (histogram.binCount != histogram.counts.shape.elements)
                result.problems.push_back(
                    "histogram of band " + std::to_string(histogram.band + 1) + " has " +
                    std::to_string(histogram.counts.shape.elements) + " counts for " +
                    std::to_string(histogram.binCount) + " bins");
        }
    });
    return result;
}

CheckResult CheckSource(zmchost::Raster& raster, RasterView& source,
                        const std::vector<std::uint32_t>& sourceBands, bool quiet) {
    CheckResult result{"source", {}, {}};
    const std::uint32_t level = source.MinLevel();
    if (source.Width(level) != raster.Width() || source.Height(level) != raster.Height()) {
        result.problems.push_back(source.Name() + " has " + std::to_string(source.Width(level)) +
                                  " x " + std::to_string(source.Height(level)) + " pixels");
        return result;
    }
    if (sourceBands.size() != raster.Bands()) {
        result.problems.push_back(source.Name() + " has " + std::to_string(sourceBands.size()) +
                                  " bands; --bands names those that the file was built from");
        return result;
    }
    SampleDifferences differences(raster.PixelType(), source.PixelType(), raster.Bands(), 0);
    const Selection selection{level, {0, 0, raster.Width(), raster.Height()}, sourceBands};
    TerminalProgress bar("level 0 against " + source.Name(), !quiet);
    WalkStrips(
        source, selection, bar,
        [&](const zmchost::Window& strip, StripSamples& samples) {
            samples.first.resize(std::size_t{strip.width} * strip.height * raster.Bands() *
                                 raster.SampleSize());
            samples.second.resize(StripBytes(source, selection, strip));
            source.Read(level, strip, sourceBands, samples.second.data());
            raster.Read(0, strip, raster.AllBands(), samples.first.data());
        },
        [&](const zmchost::Window& strip, const StripSamples& samples) {
            differences.Take(strip, samples.first.data(), samples.second.data());
        });
    for (std::uint32_t band = 0; band < raster.Bands(); ++band) {
        const BandDifference& found = differences.Bands()[band];
        if (found.samples != 0)
            result.problems.push_back("band " + std::to_string(band + 1) + ": " +
                                      std::to_string(found.samples) +
                                      " samples of level 0 differ from the source, first at " +
                                      std::to_string(found.x) + ',' + std::to_string(found.y));
    }
    return result;
}

}  // namespace zmctools
