#include "host/base/Xerces.h"

#include <mutex>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLException.hpp>

#include "host/base/Error.h"

namespace zmchost {
namespace {

void Start() {
    try {
        xercesc::XMLPlatformUtils::Initialize();
    } catch (const xercesc::OutOfMemoryException&) {
        throw Error("Xerces-C++", "start", "out of memory");
    } catch (const xercesc::XMLException& failure) {
        throw Error("Xerces-C++", "start", "error " + std::to_string(failure.getCode()));
    }
}

}  // namespace

void InitialiseXerces() {
    static std::once_flag once;
    std::call_once(once, Start);
}

}  // namespace zmchost
