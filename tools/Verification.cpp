#include "tools/Verification.h"

#include <cpl_error.h>
#include <cpl_minixml.h>

#include <fstream>

#include "core/PixelVocabulary.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"
#include "tools/SampleDifferences.h"

namespace zmctools {
namespace {

// A document that is longer is none of a raster: 65,536 colours take 3 MB.
constexpr std::uint64_t kMaxDocument = std::uint64_t{256} << 20;

std::string ReadDocument(const std::string& file, const zmchost::PyramidFileInfo& info) {
    const std::uint64_t size = info.header.fileSize - info.MetaDocumentOffset();
    std::string text(static_cast<std::size_t>(size), '\0');
    std::ifstream stream(file, std::ios::binary);
    stream.seekg(static_cast<std::streamoff>(info.MetaDocumentOffset()));
    stream.read(text.data(), static_cast<std::streamsize>(text.size()));
    if (!stream) throw Failure(file, "its metadata document cannot be read");
    return text;
}

// What is wrong with the document; empty if nothing.
std::string JudgeDocument(const std::string& text) {
    if (text.find("<!DOCTYPE") != text.npos) return "the metadata document has a document type";
    if (text.find('\0') != text.npos) return "the metadata document holds bytes of 0";
    CPLPushErrorHandler(CPLQuietErrorHandler);
    CPLErrorReset();
    CPLXMLNode* const tree = CPLParseXMLString(text.c_str());
    const bool good = tree && CPLGetLastErrorType() < CE_Failure;
    const bool rooted = good && CPLGetXMLNode(tree, "=DATASET");
    const std::string reason = CPLGetLastErrorMsg();
    CPLDestroyXMLNode(tree);
    CPLErrorReset();
    CPLPopErrorHandler();
    if (!good) return "the metadata document is malformed: " + reason;
    return rooted ? "" : "the metadata document has no root DATASET";
}

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

std::string JudgeMetadata(const std::string& file, const zmchost::PyramidFileInfo& info) {
    if (!info.HasMetadataDocument()) return "";
    if (info.header.fileSize - info.MetaDocumentOffset() > kMaxDocument)
        return "the metadata document is longer than 256 MiB";
    return JudgeDocument(ReadDocument(file, info));
}

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
    expect("the number of bands", header.bands, props.bands);
    expect("the pixel type", header.pixelType, props.pixelType);
    expect("the finest level", header.minLevel, 0);
    const std::uint32_t version = header.versionMajor << 16 | header.versionMinor;
    if (version < (1u << 16 | 1u))
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

CheckResult CheckDocuments(const std::string& file, const zmchost::PyramidFileInfo& info,
                           const zmchost::Raster& raster) {
    CheckResult result{"documents", {}, {}};
    if (!info.HasMetadataDocument()) return result;
    const std::string wrong = JudgeMetadata(file, info);
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
    std::vector<unsigned char> ours, theirs;
    TerminalProgress bar("level 0 against " + source.Name(), !quiet);
    WalkStrips(source, selection, bar, [&](const zmchost::Window& strip) {
        theirs.resize(StripBytes(source, selection, strip));
        ours.resize(std::size_t{strip.width} * strip.height * raster.Bands() * raster.SampleSize());
        source.Read(level, strip, sourceBands, theirs.data());
        raster.Read(0, strip, raster.AllBands(), ours.data());
        differences.Take(strip, ours.data(), theirs.data());
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
