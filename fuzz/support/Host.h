// What a host does once, before it touches a pyramid file: it initialises Xerces-C++. And what a
// fuzzer does besides: the messages of the XML layer, of which nearly every input makes some, go
// nowhere.
#ifndef ZMC_FUZZ_SUPPORT_HOST_H
#define ZMC_FUZZ_SUPPORT_HOST_H

#include <cstdio>

#include <xercesc/util/PlatformUtils.hpp>

namespace zmcfuzz {

inline const bool kHostReady = [] {
    xercesc::XMLPlatformUtils::Initialize();
    if (std::FILE* nowhere = std::fopen("/dev/null", "w")) stderr = nowhere;
    return true;
}();

}  // namespace zmcfuzz

#endif
