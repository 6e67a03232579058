// SurveyMosaic: many rasters looked at once each, and laid out as one.
//
// The grid is that of the first scene that can be read: its system, its corner, and its resolution
// unless another is wanted. A scene that lies on it, all corners within a hundredth of a pixel, is
// taken as it is; any other is warped when it is read. Scenes have one type, one number of bands,
// one palette and one scale; a scene that differs is refused by its name.
#ifndef ZMC_GDAL_MOSAICSURVEY_H
#define ZMC_GDAL_MOSAICSURVEY_H

#include <optional>
#include <string>
#include <vector>

#include "gdal/JobCrew.h"
#include "gdal/MosaicLayout.h"

namespace zmcgdal {

struct MosaicWishes {
    Overlap overlap = Overlap::Last;
    std::string resampling = "near";
    // Width and height of a pixel; without a value those of the first scene, or the least that a
    // scene in the first one's system has.
    std::optional<double> resolution;
    bool finest = false;
    // Replaces the no-data values of scenes for the whole, and marks samples of those that have
    // neither such a value nor a mask.
    std::optional<double> noData;
    bool noNoData = false;  // the whole has no such value
    // Leaves out what cannot be read; every pixel is read for that.
    bool skipBroken = false;
    std::uint32_t threads = 1;
    ShareDone progress;  // may be empty; false cancels
};

// `name` stands for the mosaic in messages. Throws zmchost::Error for what cannot be, Cancelled.
MosaicLayout SurveyMosaic(const std::string& name, std::vector<std::string> scenes,
                          const MosaicWishes& wishes);

// The layout that a survey would find, of what was found before: opens the scenes whose files have
// changed since, the first one if these may not be to the mosaic what they were, and no other.
// Nothing where that does not do, and all are to be surveyed: names are added or gone, the first
// scene has changed, or one that has changed has another place. Throws what SurveyMosaic does.
std::optional<MosaicLayout> RenewLayout(MosaicLayout known, const std::vector<std::string>& scenes,
                                        const MosaicWishes& wishes);

}  // namespace zmcgdal

#endif
