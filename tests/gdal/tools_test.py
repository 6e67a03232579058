"""Pyramid files in the hands of the tools that raster people use."""
import os
import subprocess
import unittest

import numpy as np
import rasterio
from osgeo import gdal
from rasters import DRIVER, TYPES, FolderTest, memory_dataset, place, samples


def run(*command):
    """Runs a tool; what it prints, or a failure with what it said."""
    done = subprocess.run([str(word) for word in command], stdout=subprocess.PIPE,
                          stderr=subprocess.STDOUT, text=True, check=False)
    if done.returncode != 0:
        raise AssertionError(f"{command[0]}: {done.returncode}: {done.stdout}")
    return done.stdout


class Tools(FolderTest):
    def tiff(self, name, array, data_type):
        memory = memory_dataset(array, data_type)
        place(memory)
        gdal.GetDriverByName("GTiff").CreateCopy(self.path(name), memory)
        return self.path(name)

    def test_gdal_translate_there_and_back_for_every_type(self):
        for data_type in TYPES:
            array = samples(data_type, 300, 517, 2)
            source = self.tiff("source.tif", array, data_type)
            run("gdal_translate", "-q", "-of", DRIVER, source, self.path("there.pyr"))
            run("gdal_translate", "-q", "-of", "GTiff", self.path("there.pyr"),
                self.path("back.tif"))
            back = gdal.Open(self.path("back.tif"))
            self.assertEqual(back.GetRasterBand(1).DataType, data_type)
            np.testing.assert_array_equal(back.ReadAsArray(), array)
            self.assertEqual(back.GetGeoTransform(), gdal.Open(source).GetGeoTransform())

    def test_gdalinfo_names_driver_levels_and_statistics(self):
        source = self.tiff("source.tif", samples(gdal.GDT_Byte, 600, 700, 3), gdal.GDT_Byte)
        run("gdal_translate", "-q", "-of", DRIVER, source, self.path("a.pyr"))
        text = run("gdalinfo", self.path("a.pyr"))
        self.assertIn("Driver: ZMCPyramid/Pyramid raster", text)
        self.assertIn("Overviews: 350x300, 175x150", text)
        self.assertIn("STATISTICS_MEAN=", text)
        self.assertFalse(os.path.exists(self.path("a.pyr.msk")))

    def test_gdalwarp_reads_and_writes_pyramids(self):
        source = self.tiff("source.tif", samples(gdal.GDT_Float32, 300, 300, 1), gdal.GDT_Float32)
        run("gdal_translate", "-q", "-of", DRIVER, source, self.path("a.pyr"))
        for name, driver in (("w.tif", "GTiff"), ("w.pyr", DRIVER)):
            run("gdalwarp", "-q", "-of", driver, "-t_srs", "EPSG:3857", self.path("a.pyr"),
                self.path(name))
        run("gdalwarp", "-q", "-t_srs", "EPSG:3857", source, self.path("expected.tif"))
        expected = gdal.Open(self.path("expected.tif")).ReadAsArray()
        for name in ("w.tif", "w.pyr"):
            np.testing.assert_array_equal(gdal.Open(self.path(name)).ReadAsArray(), expected)

    def test_gdal_calc_computes_on_pyramids(self):
        array = samples(gdal.GDT_Byte, 300, 400, 2)
        source = self.tiff("source.tif", array, gdal.GDT_Byte)
        run("gdal_translate", "-q", "-of", DRIVER, source, self.path("a.pyr"))
        run("gdal_calc.py", "--quiet", "-A", self.path("a.pyr"), "--A_band=1",
            "-B", self.path("a.pyr"), "--B_band=2", "--type=Int16", "--hideNoData",
            "--calc=A.astype(numpy.int16)-B", "--outfile", self.path("out.tif"))
        np.testing.assert_array_equal(gdal.Open(self.path("out.tif")).ReadAsArray(),
                                      array[0].astype("i2") - array[1])

    def test_gdalcompare_finds_no_difference_and_finds_one(self):
        array = samples(gdal.GDT_UInt16, 200, 300, 1)
        source = self.tiff("source.tif", array, gdal.GDT_UInt16)
        run("gdal_translate", "-q", "-of", DRIVER, source, self.path("a.pyr"))
        run("gdal_translate", "-q", self.path("a.pyr"), self.path("same.tif"))
        array[0, 100, 100] ^= 1
        self.tiff("other.tif", array, gdal.GDT_UInt16)

        def compare(golden):  # its exit status is the number of differences, of metadata too
            return subprocess.run(["gdalcompare.py", self.path(golden), self.path("a.pyr")],
                                  stdout=subprocess.PIPE, text=True, check=False).stdout

        self.assertIn("Files differ at the binary level", compare("source.tif"))
        self.assertNotIn("Pixels Differing", compare("source.tif"))
        self.assertIn("Pixels Differing: 1", compare("other.tif"))

    def test_gdal_edit_and_gdaladdo_update_in_place(self):
        array = samples(gdal.GDT_Int16, 600, 600, 1)
        source = self.tiff("source.tif", array, gdal.GDT_Int16)
        run("gdal_translate", "-q", "-of", DRIVER, source, self.path("a.pyr"))
        run("gdal_edit.py", "-a_nodata", "-7", "-a_srs", "EPSG:32633", self.path("a.pyr"))
        dataset = gdal.Open(self.path("a.pyr"))
        self.assertEqual(dataset.GetRasterBand(1).GetNoDataValue(), -7)
        self.assertIn("32633", dataset.GetProjection())
        before = dataset.GetRasterBand(1).GetOverview(0).ReadAsArray()
        dataset = None
        dataset = gdal.Open(self.path("a.pyr"), gdal.GA_Update)
        dataset.GetRasterBand(1).WriteArray(np.full((256, 256), 5, "i2"))
        dataset = None
        run("gdaladdo", "-q", "-r", "average", self.path("a.pyr"), "2")
        dataset = gdal.Open(self.path("a.pyr"))
        after = dataset.GetRasterBand(1).GetOverview(0).ReadAsArray()
        self.assertTrue((after[:128, :128] == 5).all())
        self.assertFalse((before[:128, :128] == 5).all())

    def test_rasterio_reads_windows_levels_and_masks(self):
        array = samples(gdal.GDT_Float64, 520, 410, 2)
        array[0, 10, 20] = np.nan
        source = self.tiff("source.tif", array, gdal.GDT_Float64)
        run("gdal_translate", "-q", "-of", DRIVER, source, self.path("a.pyr"))
        with rasterio.open(self.path("a.pyr")) as raster:
            self.assertEqual((raster.width, raster.height, raster.count), (410, 520, 2))
            self.assertEqual(raster.overviews(1), [2, 4])
            window = rasterio.windows.Window(5, 7, 100, 50)
            np.testing.assert_array_equal(raster.read(window=window), array[:, 7:57, 5:105])
            self.assertEqual(raster.read_masks(1)[10, 20], 0)
        with rasterio.open(self.path("a.pyr"), overview_level=0) as level:
            self.assertEqual((level.width, level.height), (205, 260))


if __name__ == "__main__":
    unittest.main()
