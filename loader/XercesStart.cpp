#include <mutex>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLException.hpp>

#include "loader/OpenModule.h"

namespace zmcraster {

std::string StartXerces() {
    // Of this library there is one copy in a process, so that hosts and plug-ins share the lock.
    static std::mutex mutex;
    static bool started = false;
    const std::lock_guard lock(mutex);
    if (started) return {};
    try {
        xercesc::XMLPlatformUtils::Initialize();
        started = true;
        return {};
    } catch (const xercesc::OutOfMemoryException&) {
        return "out of memory";
    } catch (const xercesc::XMLException& failure) {
        return "error " + std::to_string(failure.getCode());
    }
}

}  // namespace zmcraster
