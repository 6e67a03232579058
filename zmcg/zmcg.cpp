#include "zmcg/zmcg.h"

#include <atomic>
#include <map>
#include <mutex>

using zelm::EnvironmentImpl;
using zelm::String;

namespace {

struct TypeCodes {
    std::mutex mutex;
    std::map<String, unsigned> codes;
};

// Made on first use and never destroyed: initialisers of other modules draw codes before this
// module's own have run, and their destructors may outlive it.
template <class T>
T& Immortal() {
    static T* const instance = new T;
    return *instance;
}

}  // namespace

unsigned GloballyUniqueObjectTypeCode(const String& name) {
    TypeCodes& table = Immortal<TypeCodes>();
    const std::lock_guard<std::mutex> lock(table.mutex);
    const auto next = static_cast<unsigned>(table.codes.size() + 1);
    return table.codes.try_emplace(name, next).first->second;
}

unsigned GloballyUniqueObjectErrorCode() {
    static std::atomic<unsigned> last{0};
    return ++last;
}

FormatRecord gCdfFormatRecords[] = {{u"MemoryRaster"}, {u"Pyramid"}};
std::int32_t gCdfFormatRecordCount = 2;

MetadataParseLog* gpMetadataParseLogInstance = nullptr;

EnvironmentImpl& GetGlobalEnvironmentImpl() { return Immortal<EnvironmentImpl>(); }

tbb::mutex* gpCoordSysMutex = nullptr;
zelm::CoordSysLog* gpCoordSysLogInstance = nullptr;
zelm::CoordSysFactory* gpCoordSysFactoryInstance = nullptr;
int (*fp_Esri_Pe_Initialize)(String&, String&) = nullptr;
zelm::CoordSysImpl* (*fp_Esri_Pe_CreateFromString)(const String&) = nullptr;
zelm::CoordSysImpl* (*fp_Esri_Pe_CreateFromCode)(int) = nullptr;
int (*fp_Esri_Pe_Release)(zelm::CoordSysImpl*) = nullptr;
