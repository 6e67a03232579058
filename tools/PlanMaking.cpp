#include "tools/PlanMaking.h"

#include <algorithm>
#include <bit>

#include "core/PixelVocabulary.h"
#include "format/PyramidHeaderRecord.h"
#include "gdal/Dataset.h"
#include "gdal/Mosaic.h"
#include "host/base/Checksum.h"
#include "host/build/PartBuild.h"
#include "platform/FileSystem.h"
#include "tools/Arguments.h"
#include "tools/Message.h"
#include "tools/SourceState.h"

namespace zmctools {
namespace {

constexpr std::uint32_t kUsualSide = 8192;
constexpr const char* kOption = "--part-size";

std::uint32_t ParseSide(const std::string& text) {
    const std::uint64_t side = ParseCount(kOption, text, 0x7FFFFFFF);
    if (side == 0) throw UsageError(kOption, "a part has one pixel at least");
    return static_cast<std::uint32_t>(side);
}

}  // namespace

PartSize ParsePartSize(const std::string& text) {
    const std::size_t cross = text.find('x');
    if (cross == text.npos) return {ParseSide(text), ParseSide(text)};
    return {ParseSide(text.substr(0, cross)), ParseSide(text.substr(cross + 1))};
}

PartSize UsualPartSize(GDALDataset& source) {
    int blockWidth = 0, blockHeight = 0;
    source.GetRasterBand(1)->GetBlockSize(&blockWidth, &blockHeight);
    const auto width = static_cast<std::uint32_t>(source.GetRasterXSize());
    if (static_cast<std::uint32_t>(blockWidth) < width || width <= kUsualSide)
        return {kUsualSide, kUsualSide};
    constexpr std::uint32_t kLeastHeight = 1024;
    return {width, std::max(kLeastHeight, kUsualSide / (width / kUsualSide + 1))};
}

PartSize PartSizeFor(const zelm::RasterProps& props, std::uint32_t processes) {
    constexpr std::uint32_t kLeastHeight = 512;
    const std::uint32_t height = props.lines / (4 * processes) + 1;
    // Of a power of two tiles, so that a part can make as many levels.
    return {props.samples, std::clamp(std::bit_floor(height), kLeastHeight, kUsualSide)};
}

PartSize StorePartSize(const zelm::RasterProps& props, std::uint32_t bands,
                       std::uint64_t leastRange) {
    // Of these bytes the levels up to the second have enough for ranges of their own.
    const std::uint64_t bytes = 24 * leastRange;
    const std::uint64_t sample = zelm::PixelSize(props.pixelType);
    constexpr std::uint64_t kLeast = 1024, kMost = 1 << 30;
    if (bands > zelm::kMaxInterleavedBands) {
        std::uint64_t side = kLeast;
        while (side * side * sample < 4 * leastRange && side < kMost) side *= 2;
        return {static_cast<std::uint32_t>(side), static_cast<std::uint32_t>(side)};
    }
    const std::uint64_t lines = bytes / (sample * bands * props.samples);
    return {props.samples,
            static_cast<std::uint32_t>(std::clamp(std::bit_ceil(lines + 1), kLeast, kMost))};
}

PyramidPlan MakePlan(const BuildWords& words, GDALDataset& dataset,
                     zmcgdal::GdalRasterSource& pixels, const zmchost::BuildOptions& options,
                     zmchost::BuildFile& file, const PartSize& size) {
    zmchost::PyramidBuilder(zmcgdal::SharedModule()).LayOut(pixels, file, words.target, options);
    zmchost::PartBuild build(zmcgdal::SharedModule(), pixels, words.target, options, file.Path());
    PyramidPlan plan;
    plan.words = words;
    if (const auto* const mosaic = dynamic_cast<const zmcgdal::Mosaic*>(&dataset)) {
        plan.scenes = mosaic->Layout().Pack();
        plan.sceneCount = mosaic->Layout().scenes.size();
        plan.sourceState = HexText(zmchost::Checksum(plan.scenes));
    } else {
        plan.sourceState = SourceState(dataset);
    }
    plan.facts = build.Facts();
    plan.pyramid = platform::NameOf(file.Path());
    plan.number = platform::StatusOf(file.Path()).number;
    plan.targetState = FileState(words.target);
    plan.grid = build.Plan(size.width, size.height);
    return plan;
}

}  // namespace zmctools
