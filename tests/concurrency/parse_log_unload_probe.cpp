// A host that builds no metadata itself: the module builds the first, and so makes the parse log of
// the process. The host goes on with it after the module has gone.
//
//   parse_log_unload_probe MODULE
#include <dlfcn.h>

#include <cstdio>
#include <vector>
#include <xercesc/util/PlatformUtils.hpp>

#include "connection/DataConnectionFactory.h"
#include "connection/RasterDataConnection.h"
#include "metadata/MetadataParseLog.h"
#include "tests/support/MemoryRaster.h"
#include "zmcg/zmcg.h"

using namespace zelm;

namespace {

int Fail(const char* what) {
    std::fprintf(stderr, "failed: %s\n", what);
    return 1;
}

bool OpenARaster(void* module) {
    const auto create = reinterpret_cast<DataConnectionFactory* (*)(const String&)>(
        dlsym(module, "CreateDataConnectionFactory"));
    const auto destroy = reinterpret_cast<void (*)(DataConnectionFactory*)>(
        dlsym(module, "DeleteDataConnectionFactory"));
    if (!create || !destroy) return false;
    std::vector<unsigned char> pixels(24);
    DataConnectionFactory* const factory = create("MemoryRaster");
    bool opened = false;
    {
        const DataConnectionPtr connection = factory->Open(
            zmctest::Argument({"MemoryRaster", zmctest::MemoryRasterText(pixels.data()).Text()}),
            GeoRefPtr(), MetadataPtr());
        opened = connection && connection->IsOpen();
    }
    destroy(factory);
    return opened;
}

// Called where no other thread logs.
bool IsOpenOnLevelTwo(const MetadataParseLog& log) ZMC_NO_LOCK_NEEDED {
    return log.stream.is_open() && log.stream.good() && log.level == 2;
}

}  // namespace

int main(int, char** argv) {
    xercesc::XMLPlatformUtils::Initialize();
    if (gpMetadataParseLogInstance) return Fail("the host made the log");
    MetadataParseLog* log = nullptr;
    for (int round = 0; round < 3; ++round) {
        void* const module = dlopen(argv[1], RTLD_NOW | RTLD_LOCAL);
        if (!module || !OpenARaster(module)) return Fail("the module");
        if (!gpMetadataParseLogInstance) return Fail("nobody made the log");
        if (!log) {
            log = gpMetadataParseLogInstance;
            MetadataParseLog::Log(1, L"while it is loaded\n");
        }
        dlclose(module);
        if (dlopen(argv[1], RTLD_NOW | RTLD_NOLOAD)) return Fail("it is still loaded");
        if (MetadataParseLog::GetInstance() != log) return Fail("another log");
        MetadataParseLog::Log(2, L"after unload %d, f\u00fcr %s\n", round, L"sich");
        MetadataParseLog::Log(3, L"above the level\n");
    }
    if (!IsOpenOnLevelTwo(*log)) return Fail("its state");
    return 0;
}
