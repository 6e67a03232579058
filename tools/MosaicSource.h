// Many rasters as the source of a build.
#ifndef ZMC_TOOLS_MOSAICSOURCE_H
#define ZMC_TOOLS_MOSAICSOURCE_H

#include <string>
#include <string_view>
#include <vector>

#include "gdal/MosaicLayout.h"
#include "tools/BuildWords.h"
#include "tools/Command.h"

namespace zmctools {

// Looks at all scenes, or of those that `known` has as they are now at none, and opens them as one.
// Throws what SurveyMosaic does, and Interruption.
DatasetPtr SurveyScenes(const BuildWords& words, std::vector<std::string> scenes, bool showsBar,
                        std::string_view known);

// What was learnt of the scenes of a source, as bytes; empty for other sources.
std::string KnownScenes(const GDALDataset& source);

// The same of what was surveyed before.
DatasetPtr OpenMosaic(const std::string& name, zmcgdal::MosaicLayout layout);

// What of a source of many rasters could not be read and was left out: as warnings, and with the
// number of its scenes as members of a document. Nothing for other sources.
void TellLeftOut(const GDALDataset& source);
void AddScenes(Json& document, const GDALDataset& source);

}  // namespace zmctools

#endif
