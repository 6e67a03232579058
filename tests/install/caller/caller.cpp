// Calls the functions of the guide, each of which is compiled as it stands there, and looks at what
// they did.
#include <cstdio>
#include <vector>

#include <zmcraster/coordsys/Environment.h>
#include <zmcraster/coordsys/EnvironmentKeys.h>
#include <zmcraster/host/raster/Raster.h>

void SetDirectories();
void StoreStatistics(const std::vector<zelm::RasterBandStats<float>>& records);

namespace {

bool DirectoriesAreSet() {
    SetDirectories();
    return zelm::Environment().GetSetting(zelm::EnvironmentKeys::kGdalDirectory) ==
           "/usr/share/proj";
}

// A pyramid of one band and one level that has no statistics yet.
void MakeScene() {
    zelm::RasterProps props;
    props.samples = 3;
    props.lines = 2;
    props.SetBands(1);
    props.pixelType = zelm::ElementTraits<float>::code;
    zmchost::Raster scene = zmchost::Raster::Create(zmchost::Module::Load(), "scene.pyr", props, 0);
    scene.Write<float>(0, {0, 0, 3, 2}, {1, 2, 3, 4, 5, 6});
}

bool StatisticsAreStored() {
    MakeScene();
    zelm::RasterBandStats<float> record;
    record.flags = zelm::StatsFlag::Maximum;
    record.maximum = 6;
    StoreStatistics({record});
    const auto scene = zmchost::Raster::Open(zmchost::Module::Load(), "scene.pyr");
    return scene.HasStatistics(0) && scene.Statistics<float>(0).maximum == 6;
}

}  // namespace

int main() {
    if (!DirectoriesAreSet() || !StatisticsAreStored()) return 1;
    std::puts("stored and set");
}
