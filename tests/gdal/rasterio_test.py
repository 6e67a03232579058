"""Pyramids in rasterio, read and written."""
import unittest

import numpy as np
from osgeo import gdal

from rasters import DRIVER, FolderTest, halve, memory_dataset, place, samples

import rasterio
from rasterio.enums import ColorInterp
from rasterio.io import MemoryFile
from rasterio.windows import Window


class Rasterio(FolderTest):
    def setUp(self):
        super().setUp()
        self.array = samples(gdal.GDT_Byte, 600, 700, 3)
        source = memory_dataset(self.array, gdal.GDT_Byte)
        place(source)
        source.GetRasterBand(1).SetNoDataValue(9)
        self.name = self.copy(source)

    def test_what_a_user_asks_first(self):
        with rasterio.open(self.name) as raster:
            self.assertEqual((raster.driver, raster.count, raster.shape), (DRIVER, 3, (600, 700)))
            self.assertEqual(raster.crs.to_epsg(), 32631)
            self.assertEqual(raster.transform.a, 30)
            self.assertEqual(raster.overviews(1), [2, 4])
            self.assertEqual(raster.block_shapes, [(256, 256)] * 3)
            self.assertEqual(raster.nodata, 9)
            self.assertEqual(raster.colorinterp,
                             (ColorInterp.red, ColorInterp.green, ColorInterp.blue))
            self.assertIn("STATISTICS_MEAN", raster.tags(1))
            np.testing.assert_array_equal(raster.read(), self.array)
            np.testing.assert_array_equal(raster.read(2, window=Window(100, 200, 333, 44)),
                                          self.array[1, 200:244, 100:433])
            masked = raster.read(1, masked=True)
            np.testing.assert_array_equal(masked.mask, self.array[0] == 9)
            small = raster.read(2, out_shape=(300, 350))
            np.testing.assert_array_equal(small, halve(self.array)[1])

    def test_levels_by_option(self):
        with rasterio.open(self.name, overview_level=0) as level:
            np.testing.assert_array_equal(level.read(2), halve(self.array)[1])
            self.assertEqual(level.transform.a, 60)

    def test_writing(self):
        target = self.path("written.pyr")
        with rasterio.open(self.name) as raster:
            profile = raster.profile
        profile.pop("tiled", None)
        with rasterio.open(target, "w", driver=DRIVER, width=700, height=600, count=3,
                           dtype="uint8", crs=profile["crs"], transform=profile["transform"],
                           nodata=9) as out:
            out.write(self.array)
            out.set_band_description(2, "green one")
        with rasterio.open(target) as raster:
            np.testing.assert_array_equal(raster.read(), self.array)
            self.assertEqual(raster.descriptions[1], "green one")
            self.assertEqual((raster.crs.to_epsg(), raster.nodata), (32631, 9))
            self.assertEqual(raster.overviews(1), [2, 4])

    def test_files_in_memory(self):
        with open(self.name, "rb") as stream, MemoryFile(stream.read(), ext=".pyr") as memory:
            with memory.open() as raster:
                self.assertEqual(raster.driver, DRIVER)
                np.testing.assert_array_equal(raster.read(), self.array)

    def test_writing_into_memory(self):
        with MemoryFile(ext=".pyr") as memory:
            with memory.open(driver=DRIVER, width=700, height=600, count=3, dtype="uint8") as out:
                out.write(self.array)
            content = memory.read()
            with memory.open() as raster:
                np.testing.assert_array_equal(raster.read(), self.array)
        with open(self.path("written.pyr"), "wb") as stream:
            stream.write(content)
        with rasterio.open(self.path("written.pyr")) as raster:
            np.testing.assert_array_equal(raster.read(), self.array)
            self.assertEqual(raster.overviews(1), [2, 4])


if __name__ == "__main__":
    unittest.main()
