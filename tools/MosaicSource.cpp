#include "tools/MosaicSource.h"

#include <algorithm>
#include <cmath>
#include <optional>
#include <type_traits>
#include <utility>

#include "core/PixelVocabulary.h"
#include "gdal/Mosaic.h"
#include "gdal/MosaicSurvey.h"
#include "host/base/Error.h"
#include "host/base/Threads.h"
#include "platform/Network.h"
#include "tools/Arguments.h"
#include "tools/Message.h"
#include "tools/TerminalProgress.h"

namespace zmctools {
namespace {

// A quarter of the files that the process may have open: a scene may be several.
std::size_t MostOpenScenes() {
    static const std::size_t most =
        std::clamp<std::size_t>(platform::RaiseOpenFiles() / 4, 8, 1024);
    return most;
}

zmcgdal::Overlap RuleOf(const std::string& word) {
    using zmcgdal::Overlap;
    if (word == "first") return Overlap::First;
    if (word == "mean") return Overlap::Mean;
    if (word == "min") return Overlap::Minimum;
    if (word == "max") return Overlap::Maximum;
    return word == "median" ? Overlap::Median : Overlap::Last;
}

zmcgdal::MosaicWishes WishesOf(const BuildWords& words) {
    zmcgdal::MosaicWishes wishes;
    wishes.overlap = RuleOf(words.overlap);
    wishes.resampling = words.sceneResampling == "nearest" ? "near" : words.sceneResampling;
    wishes.finest = words.resolution == "finest";
    if (!wishes.finest && words.resolution != "first") {
        wishes.resolution = ParseNumber("--resolution", words.resolution);
        if (!(*wishes.resolution > 0) || std::isinf(*wishes.resolution))
            throw UsageError("--resolution", "a pixel has a side above 0");
    }
    wishes.noNoData = words.noData == "none";
    if (!words.noData.empty() && !wishes.noNoData)
        wishes.noData = ParseNumber("--nodata", words.noData);
    wishes.skipBroken = words.skipBroken;
    wishes.threads = zmchost::AvailableThreads();
    return wishes;
}

// A value that nothing marks as none.
bool FillsWithZeros(const zmcgdal::MosaicLayout& layout) {
    bool whole = false;
    zelm::VisitElementType(layout.pixelType,
                           [&]<class T>(std::type_identity<T>) { whole = std::is_integral_v<T>; });
    return whole && !layout.HasAlpha() && !layout.bands.front().noData;
}

const zmcgdal::MosaicLayout* LayoutOf(const GDALDataset& source) {
    const auto* const mosaic = dynamic_cast<const zmcgdal::Mosaic*>(&source);
    return mosaic ? &mosaic->Layout() : nullptr;
}

}  // namespace

DatasetPtr SurveyScenes(const BuildWords& words, std::vector<std::string> scenes, bool showsBar,
                        std::string_view known) {
    zmcgdal::MosaicWishes wishes = WishesOf(words);
    TerminalProgress bar(words.source, showsBar);
    wishes.progress = [&](double share) { return bar.ShowShare(share); };
    TakeGdalError(words.source);
    SetSubject(words.source);
    try {
        std::optional<zmcgdal::MosaicLayout> renewed = zmcgdal::MosaicLayout::Unpack(known);
        if (renewed) renewed = zmcgdal::RenewLayout(std::move(*renewed), scenes, wishes);
        zmcgdal::MosaicLayout layout =
            renewed ? std::move(*renewed)
                    : zmcgdal::SurveyMosaic(words.source, std::move(scenes), wishes);
        if (FillsWithZeros(layout) && layout.HasGaps())
            Warn(words.source,
                 "there are gaps between its scenes, which are filled with 0; --nodata "
                 "tells another value");
        return OpenMosaic(words.source, std::move(layout));
    } catch (const zmchost::Cancelled&) {
        throw Interruption(words.target);
    }
}

std::string KnownScenes(const GDALDataset& source) {
    const zmcgdal::MosaicLayout* const layout = LayoutOf(source);
    return layout ? layout->Pack() : std::string();
}

DatasetPtr OpenMosaic(const std::string& name, zmcgdal::MosaicLayout layout) {
    return DatasetPtr(new zmcgdal::Mosaic(name, std::move(layout), MostOpenScenes()));
}

void TellLeftOut(const GDALDataset& source) {
    const zmcgdal::MosaicLayout* const layout = LayoutOf(source);
    if (!layout) return;
    for (const auto& each : layout->leftOut) Warn(each.name, "it was left out: " + each.reason);
}

void AddScenes(Json& document, const GDALDataset& source) {
    const zmcgdal::MosaicLayout* const layout = LayoutOf(source);
    if (!layout) return;
    document["scenes"] = layout->scenes.size();
    Json skipped = Json::array();
    for (const auto& each : layout->leftOut) skipped.push_back(each.name);
    document["skipped"] = std::move(skipped);
}

}  // namespace zmctools
