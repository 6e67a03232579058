// The plug-in: GDAL loads gdal_ZMCPyramid.so and calls GDALRegister_ZMCPyramid, which is linked in
// whole by being named here.
#include "gdal/Driver.h"

namespace {

[[maybe_unused]] __attribute__((used)) void (*const entry)() = &GDALRegister_ZMCPyramid;

}  // namespace
