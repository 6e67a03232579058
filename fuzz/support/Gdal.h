// GDAL for the targets that drive it.
#ifndef ZMC_FUZZ_SUPPORT_GDAL_H
#define ZMC_FUZZ_SUPPORT_GDAL_H

#include <cpl_conv.h>
#include <cpl_error.h>
#include <gdal_priv.h>

#include "fuzz/support/HostileFile.h"
#include "gdal/Driver.h"

namespace zmcfuzz {

// With no driver but ours: what a sidecar names is opened by this one, or not at all. Once in a
// process, however often it is called.
inline void StartGdal() {
    static const bool started = [] {
        TellModulePath();
        CPLSetErrorHandler(CPLQuietErrorHandler);
        CPLSetConfigOption("GDAL_HTTP_TIMEOUT", "1");
        GDALSetCacheMax64(16 << 20);
        GDALRegister_ZMCPyramid();
        return true;
    }();
    static_cast<void>(started);
}

}  // namespace zmcfuzz

#endif
