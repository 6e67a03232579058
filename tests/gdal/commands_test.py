"""Pyramids made by GDAL's commands from windows, warps and calculations, and moved about."""
import subprocess
import sys
import unittest

import numpy as np
from osgeo import gdal

from rasters import COMPLEX, DRIVER, TYPES, FolderTest, halve, memory_dataset, place, samples


class Commands(FolderTest):
    def run_tool(self, *words):
        done = subprocess.run([str(w) for w in words], capture_output=True, text=True,
                              cwd=self.folder)
        self.assertEqual(done.returncode, 0, " ".join(map(str, words)) + "\n" + done.stdout +
                         done.stderr)
        return done.stdout

    def script(self, name, *words):
        return self.run_tool(sys.executable, "-m", "osgeo_utils." + name, *words)

    def tiff(self, name, array, data_type=gdal.GDT_Byte, no_data=None):
        source = memory_dataset(array, data_type)
        place(source)
        if no_data is not None:
            for number in range(array.shape[0]):
                source.GetRasterBand(number + 1).SetNoDataValue(no_data)
        gdal.GetDriverByName("GTiff").CreateCopy(self.path(name), source,
                                                 options=["INTERLEAVE=PIXEL"])

    def test_translate_there_and_back_for_every_type(self):
        for data_type in TYPES:
            with self.subTest(type=gdal.GetDataTypeName(data_type)):
                self.tiff("a.tif", samples(data_type, 300, 400, 2), data_type)
                self.run_tool("gdal_translate", "-q", "-of", DRIVER, "-co", "STATISTICS=NO",
                              "a.tif", "a.pyr")
                self.run_tool("gdal_translate", "-q", "a.pyr", "b.tif")
                if data_type in COMPLEX:
                    one, two = gdal.Open(self.path("a.tif")), gdal.Open(self.path("b.tif"))
                    np.testing.assert_array_equal(one.ReadAsArray(), two.ReadAsArray())
                else:
                    # Not one byte of the file has changed on the way.
                    out = self.script("gdalcompare", "a.tif", "b.tif")
                    self.assertIn("Differences Found: 0", out)

    def test_translate_to_a_scaled_window(self):
        array = samples(gdal.GDT_Byte, 600, 800, 3)
        self.tiff("a.tif", array)
        self.run_tool("gdal_translate", "-q", "-of", DRIVER, "a.tif", "a.pyr")
        self.run_tool("gdal_translate", "-q", "-of", DRIVER, "-srcwin", 200, 100, 400, 400,
                      "-outsize", 200, 200, "a.pyr", "window.pyr")
        np.testing.assert_array_equal(gdal.Open(self.path("window.pyr")).ReadAsArray(),
                                      halve(array)[:, 50:250, 100:300])

    def test_warp_agrees_with_a_warp_of_the_geotiff(self):
        self.tiff("a.tif", samples(gdal.GDT_Int16, 300, 400, 2), gdal.GDT_Int16, -32768)
        self.run_tool("gdal_translate", "-q", "-of", DRIVER, "a.tif", "a.pyr")
        for name, options in (("plain", []), ("cubic", ["-r", "cubic"])):
            for source in ("a.tif", "a.pyr"):
                self.run_tool("gdalwarp", "-q", "-t_srs", "EPSG:4326", *options, "-of",
                              DRIVER if source == "a.pyr" else "GTiff", source,
                              name + "_" + source)
            one = gdal.Open(self.path(name + "_a.tif"))
            two = gdal.Open(self.path(name + "_a.pyr"))
            np.testing.assert_array_equal(one.ReadAsArray(), two.ReadAsArray())
            self.assertEqual(one.GetGeoTransform(), two.GetGeoTransform())
            self.assertEqual(two.GetRasterBand(1).GetNoDataValue(), -32768)

    def test_calc(self):
        array = samples(gdal.GDT_Byte, 300, 400, 2)
        self.tiff("a.tif", array)
        self.run_tool("gdal_translate", "-q", "-of", DRIVER, "a.tif", "a.pyr")
        self.script("gdal_calc", "-A", "a.pyr", "--A_band=1", "-B", "a.pyr", "--B_band=2",
                    "--calc=A.astype(float)-B", "--type=Float32", "--format=" + DRIVER,
                    "--outfile=d.pyr", "--quiet", "--hideNoData")
        np.testing.assert_array_equal(gdal.Open(self.path("d.pyr")).ReadAsArray(),
                                      array[0].astype(np.float32) - array[1])

    def test_edit_addo_and_manage(self):
        array = samples(gdal.GDT_Byte, 600, 800, 1)
        self.tiff("a.tif", array)
        self.run_tool("gdal_translate", "-q", "-of", DRIVER, "a.tif", "a.pyr")
        self.script("gdal_edit", "-a_nodata", 3, "-mo", "COLOUR=blue", "-a_srs", "EPSG:32632",
                    "a.pyr")
        dataset = gdal.Open(self.path("a.pyr"))
        self.assertEqual(dataset.GetRasterBand(1).GetNoDataValue(), 3)
        self.assertEqual(dataset.GetMetadataItem("COLOUR"), "blue")
        del dataset
        self.run_tool("gdaladdo", "-q", "-r", "nearest", "a.pyr", 2)
        level = gdal.Open(self.path("a.pyr")).GetRasterBand(1)
        del level
        dataset = gdal.Open(self.path("a.pyr"))
        # Where the nearest sample holds no data, the first valid one of its cell counts.
        expected = array[0, ::2, ::2]
        found = dataset.GetRasterBand(1).GetOverview(0).ReadAsArray()
        np.testing.assert_array_equal(found[expected != 3], expected[expected != 3])
        del dataset
        self.run_tool("gdalmanage", "copy", "a.pyr", "b.pyr")
        self.run_tool("gdalmanage", "rename", "b.pyr", "c.pyr")
        self.assertIn("c.pyr.aux.xml", self.files())
        self.run_tool("gdalmanage", "delete", "c.pyr")
        self.assertEqual(self.files(), ["a.pyr", "a.pyr.aux.xml", "a.tif"])


if __name__ == "__main__":
    unittest.main()
