// PyramidBuild: one run of a builder, step by step. Made for one source and one target, used once.
#ifndef ZMC_HOST_BUILD_PYRAMIDBUILD_H
#define ZMC_HOST_BUILD_PYRAMIDBUILD_H

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "host/build/BuildFile.h"
#include "host/build/BuildPlan.h"
#include "host/build/LevelCascade.h"
#include "host/build/PixelWork.h"
#include "host/build/PyramidBuilder.h"
#include "host/build/TileStore.h"
#include "host/raster/Raster.h"

namespace zmchost {

class PyramidBuild {
public:
    // Settles what is to be built; nothing is touched yet. Throws Error for options that do not fit
    // the source.
    PyramidBuild(ModulePtr loadedModule, RasterSource& rasterSource, std::string targetName,
                 const BuildOptions& buildOptions);

    BuildReport Run();

private:
    struct Job;

    void SettleBands();
    void SettleNoData();
    void SettleLevels();
    void SettleOrdering();
    void SettleResampling();
    void Plan();

    void LayOut();
    void Fill();
    void WalkPass(const Pass& pass);
    void WalkColumn(const Pass& pass, const Column& column, StripStore& store);
    void ReadStrip(const Pass& pass, const Column& column, Strip& strip);
    void LookAtStrip(const Pass& pass, const Column& column, Strip& strip);
    void WriteStrip(const Pass& pass, const Column& column, const Strip& strip);
    void CountLevel0();
    void StoreRecords();
    void Check();
    void Advance(std::uint64_t pixels);

    TileStoreSetup StoreSetup() const;
    PixelWorkSetup WorkSetup() const;
    std::uint64_t MetadataBound() const;

    ModulePtr module;
    RasterSource& source;
    std::string name;
    BuildOptions options;
    std::uint32_t threads = 1;
    std::uint32_t lanes = 1;

    zelm::RasterProps props;  // of the target
    std::vector<std::uint32_t> bands;
    std::vector<zelm::PalettePtr> palettes;
    std::uint32_t maxLevel = 0;
    Resampling resampling = Resampling::Average;
    std::uint32_t pixelBytes = 0;
    std::vector<Pass> passes;

    MemoryMeter meter;
    std::optional<BuildFile> file;
    std::optional<Raster> raster;
    std::unique_ptr<PixelWork> work;
    std::optional<TileStore> tiles;
    BuildProgress progress;
    BuildReport report;
};

}  // namespace zmchost

#endif
