// BuildEnd: what is done besides when a pyramid is finished: what it has no place for goes beside
// it or into it, before it gets its name, and then the result is told.
#ifndef ZMC_TOOLS_BUILDEND_H
#define ZMC_TOOLS_BUILDEND_H

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "gdal/Dataset.h"
#include "gdal/SidecarStage.h"
#include "tools/BuildWords.h"
#include "tools/Command.h"

namespace zmctools {

class BuildEnd {
public:
    // Has the builder of these options call this object, which lives as long and stays where it is.
    BuildEnd(GDALDataset& source, const BuildWords& buildWords, zmchost::BuildOptions& options);
    BuildEnd(const BuildEnd&) = delete;
    BuildEnd& operator=(const BuildEnd&) = delete;

    // The file has its name.
    void Settle() { stage.Settle(); }
    // What stands beside it until it has, and belongs to it.
    const zmcgdal::SidecarStage& Companions() const { return stage; }

private:
    void Take(const std::vector<zmchost::FullStatistics>& stored) { statistics = stored; }

    GDALDataset& dataset;
    const BuildWords& words;
    std::vector<std::uint32_t> bands;
    zmcgdal::SidecarStage stage;
    std::vector<zmchost::FullStatistics> statistics;
};

// Puts what a pyramid of those bands of `source` has no place for beside it, as files whose names
// begin with `base`, or into it. `statistics` are those that were stored in it. Throws Failure.
void WriteSidecar(GDALDataset& source, const BuildWords& words,
                  const std::vector<std::uint32_t>& bands,
                  const std::vector<zmchost::FullStatistics>& statistics,
                  std::shared_ptr<zmcgdal::OpenFile> built, const std::string& base);

// A finished build of a source, as a document and for people; the last one where others have made
// the parts.
Json BuildDocument(const BuildWords& words, const zmchost::BuildReport& report,
                   std::uint32_t pixelType, const GDALDataset& source);
void PrintReport(const BuildWords& words, const zmchost::BuildReport& report,
                 std::uint32_t pixelType);
void PrintFinished(const BuildWords& words, const zmchost::BuildReport& report,
                   std::uint32_t pixelType);

}  // namespace zmctools

#endif
