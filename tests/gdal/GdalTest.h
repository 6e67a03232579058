// GdalTest: what the tests of the driver from inside the process share. GDAL with the driver, its
// messages silenced, and a folder for each test.
#ifndef ZMC_TESTS_GDAL_GDALTEST_H
#define ZMC_TESTS_GDAL_GDALTEST_H

#include <gdal_priv.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <memory>
#include <string>

#include "gdal/Driver.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {

using DatasetPtr = std::unique_ptr<GDALDataset>;

class GdalTest : public testing::Test {
protected:
    // GDAL has the drivers of a process once; ours is the first to be asked.
    static void SetUpTestSuite() {
        setenv("ZMCRASTER_MODULE", ZMC_MODULE_PATH, 1);
        GDALRegister_ZMCPyramid();
        GDALAllRegister();
    }
    GdalTest() { CPLPushErrorHandler(CPLQuietErrorHandler); }
    ~GdalTest() override { CPLPopErrorHandler(); }

    static GDALDriver& Driver(const char* driver = "ZMCPyramid") {
        return *GetGDALDriverManager()->GetDriverByName(driver);
    }
    static DatasetPtr Open(const std::string& file, unsigned flags = 0) {
        return DatasetPtr(GDALDataset::Open(file.c_str(), GDAL_OF_RASTER | flags));
    }

    ScratchDirectory folder;
};

}  // namespace zmctest

#endif
