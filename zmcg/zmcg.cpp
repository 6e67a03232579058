#include "zmcg/zmcg.h"

#include <atomic>
#include <cstddef>
#include <iterator>
#include <map>
#include <new>

#include "platform/Mutex.h"

using zelm::EnvironmentImpl;
using zelm::String;

namespace {

// Objects that stand in static storage from their first use on, and are never destroyed:
// initialisers of other modules draw codes before this module's own have run, and their destructors
// may outlive it. Nothing is allocated for them, so first use cannot fail.
template <class T>
T& Immortal() {
    alignas(T) static std::byte storage[sizeof(T)];
    static T* const instance = new (storage) T;
    return *instance;
}

struct TypeCodes {
    platform::Mutex mutex;
    std::map<String, unsigned> codes ZMC_GUARDED_BY(mutex);
    unsigned last ZMC_GUARDED_BY(mutex) = 0;
};

}  // namespace

// Where memory is too short to remember the word, the answer is still a code that no other word
// has; only a later call with the same word draws another.
unsigned GloballyUniqueObjectTypeCode(const String& name) {
    TypeCodes& table = Immortal<TypeCodes>();
    const platform::MutexHolder lock(table.mutex);
    if (const auto known = table.codes.find(name); known != table.codes.end()) return known->second;
    const unsigned code = ++table.last;
    try {
        const auto entry = table.codes.try_emplace(name, code).first;
        // A copy that ran out of memory is null, and must not stand for the null word.
        if (!(entry->first == name)) table.codes.erase(entry);
    } catch (...) {
    }
    return code;
}

unsigned GloballyUniqueObjectErrorCode() {
    static std::atomic<unsigned> last{0};
    return ++last;
}

FormatRecord gCdfFormatRecords[] = {{u"MemoryRaster"}, {u"Pyramid"}};
std::int32_t gCdfFormatRecordCount = std::size(gCdfFormatRecords);

MetadataParseLog* gpMetadataParseLogInstance = nullptr;

EnvironmentImpl& GetGlobalEnvironmentImpl() { return Immortal<EnvironmentImpl>(); }

tbb::mutex* gpCoordSysMutex = nullptr;
zelm::CoordSysLog* gpCoordSysLogInstance = nullptr;
zelm::CoordSysFactory* gpCoordSysFactoryInstance = nullptr;
int (*fp_Esri_Pe_Initialize)(String&, String&) = nullptr;
zelm::CoordSysImpl* (*fp_Esri_Pe_CreateFromString)(const String&) = nullptr;
zelm::CoordSysImpl* (*fp_Esri_Pe_CreateFromCode)(int) = nullptr;
int (*fp_Esri_Pe_Release)(zelm::CoordSysImpl*) = nullptr;
