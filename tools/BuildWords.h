// BuildWords: what build and plan are told on the command line of source, target and what is to be
// made of them; a plan keeps these words.
#ifndef ZMC_TOOLS_BUILDWORDS_H
#define ZMC_TOOLS_BUILDWORDS_H

#include <string>
#include <string_view>

#include "host/build/PyramidBuilder.h"
#include "tools/GdalWorld.h"
#include "tools/OptionTable.h"

namespace zmctools {

struct BuildWords {
    std::string source;
    std::string target;
    std::string levels = "auto";
    std::string resampling;
    std::string weights = "auto";
    std::string ordering = "auto";
    std::string noData;
    std::string bands;
    std::string bins = "256";
    std::string memory = "256M";
    std::string overlap = "last";
    std::string sceneResampling = "nearest";
    std::string resolution = "first";
    bool skipBroken = false;
    bool noStatistics = false;
    bool overwrite = false;
    bool embed = false;

    // Adds all of them to the command line, or those that are neither source nor target and mean
    // something where the target is there already.
    void Describe(OptionTable& table);
    void DescribeMaking(OptionTable& table);
    // What they mean for a source with these properties. Throws UsageError.
    zmchost::BuildOptions Options(const zelm::RasterProps& props) const;
    // Throws Failure for a target that cannot be made or is not to be replaced.
    void CheckTarget() const;
    // Throws Failure too for a source that is incomplete. One of many rasters is surveyed, with a
    // bar where that is wanted; Interruption then. What `known` has of it (KnownScenes) is taken
    // from there.
    DatasetPtr OpenSource(bool showsBar = false, std::string_view known = {}) const;
};

// Lets `visit(name, word)` have the words that are options, by their names in plans and records.
template <class Words, class Visit>
void VisitOptions(Words& words, const Visit& visit) {
    visit("levels", words.levels);
    visit("resampling", words.resampling);
    visit("weights", words.weights);
    visit("ordering", words.ordering);
    visit("nodata", words.noData);
    visit("bands", words.bands);
    visit("bins", words.bins);
    visit("memory", words.memory);
    visit("overlap", words.overlap);
    visit("sceneResampling", words.sceneResampling);
    visit("resolution", words.resolution);
    visit("skipBroken", words.skipBroken);
    visit("noStatistics", words.noStatistics);
    visit("overwrite", words.overwrite);
    visit("embed", words.embed);
}

}  // namespace zmctools

#endif
