// The driver ZMCPyramid: pyramid files as rasters of GDAL.
//
// The plug-in gdal_ZMCPyramid.so holds it; a program may also link it and call the function below.
#ifndef ZMC_GDAL_DRIVER_H
#define ZMC_GDAL_DRIVER_H

#include <cpl_port.h>

// Registers the driver with GDAL, once. Initialises Xerces-C++ first: GDAL's own formats may do so
// later, and clean up after themselves only, because this is never undone.
CPL_C_START
__attribute__((visibility("default"))) void GDALRegister_ZMCPyramid(void);
CPL_C_END

#endif
