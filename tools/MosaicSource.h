// Many rasters as the source of a build.
#ifndef ZMC_TOOLS_MOSAICSOURCE_H
#define ZMC_TOOLS_MOSAICSOURCE_H

#include <string>
#include <vector>

#include "gdal/MosaicLayout.h"
#include "tools/BuildWords.h"
#include "tools/Command.h"

namespace zmctools {

// Looks at all scenes and opens them as one. Throws what SurveyMosaic does, and Interruption.
DatasetPtr SurveyScenes(const BuildWords& words, std::vector<std::string> scenes, bool showsBar);

// The same of what was surveyed before.
DatasetPtr OpenMosaic(const std::string& name, zmcgdal::MosaicLayout layout);

// What of a source of many rasters could not be read and was left out: as warnings, and with the
// number of its scenes as members of a document. Nothing for other sources.
void TellLeftOut(const GDALDataset& source);
void AddScenes(Json& document, const GDALDataset& source);

}  // namespace zmctools

#endif
