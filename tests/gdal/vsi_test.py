"""Pyramids in GDAL's virtual file systems, and files that change between the open and the read."""
import gzip
import io
import os
import tarfile
import unittest
import zipfile

import numpy as np
from osgeo import gdal

from rasters import FolderTest, memory_dataset, place, samples


class VirtualFiles(FolderTest):
    def setUp(self):
        super().setUp()
        self.array = samples(gdal.GDT_UInt16, 700, 600, 3)
        source = memory_dataset(self.array, gdal.GDT_UInt16)
        self.file = self.copy(source)
        with open(self.file, "rb") as stream:
            self.bytes = stream.read()

    def check(self, name):
        dataset = gdal.Open(name)
        self.assertEqual((dataset.RasterXSize, dataset.RasterYSize), (600, 700))
        np.testing.assert_array_equal(dataset.ReadAsArray(), self.array)
        plain = gdal.Open(self.file)
        for number in (1, 2, 3):
            band, same = dataset.GetRasterBand(number), plain.GetRasterBand(number)
            np.testing.assert_array_equal(band.GetOverview(0).ReadAsArray(),
                                          same.GetOverview(0).ReadAsArray())
            self.assertEqual(band.GetStatistics(False, False), same.GetStatistics(False, False))
        return dataset

    def in_memory(self, name, content):
        gdal.FileFromMemBuffer(name, content)
        self.addCleanup(gdal.Unlink, name)
        return name

    def test_in_memory(self):
        self.check(self.in_memory("/vsimem/scene.pyr", self.bytes))

    def test_in_a_zip_archive(self):
        for method in (zipfile.ZIP_STORED, zipfile.ZIP_DEFLATED):
            path = os.path.join(self.folder, f"scene{method}.zip")
            with zipfile.ZipFile(path, "w", method) as archive:
                archive.writestr("inner/scene.pyr", self.bytes)
            self.check(f"/vsizip/{path}/inner/scene.pyr")

    def test_in_a_tar_archive(self):
        path = os.path.join(self.folder, "scene.tar")
        with tarfile.open(path, "w") as archive:
            entry = tarfile.TarInfo("scene.pyr")
            entry.size = len(self.bytes)
            archive.addfile(entry, io.BytesIO(self.bytes))
        self.check(f"/vsitar/{path}/scene.pyr")

    def test_compressed(self):
        path = os.path.join(self.folder, "scene.pyr.gz")
        with gzip.open(path, "wb") as stream:
            stream.write(self.bytes)
        self.check(f"/vsigzip/{path}")

    def test_inside_another_file(self):
        path = os.path.join(self.folder, "scenes.dat")
        with open(path, "wb") as stream:
            stream.write(b"x" * 1000 + self.bytes + b"y" * 1000)
        self.check(f"/vsisubfile/1000_{len(self.bytes)},{path}")

    def test_in_memory_within_an_archive_in_memory(self):
        content = io.BytesIO()
        with zipfile.ZipFile(content, "w") as archive:
            archive.writestr("scene.pyr", self.bytes)
        name = self.in_memory("/vsimem/scenes.zip", content.getvalue())
        self.check(f"/vsizip/{name}/scene.pyr")

    def test_updates_where_the_file_system_can_write(self):
        name = self.in_memory("/vsimem/update.pyr", self.bytes)
        dataset = gdal.OpenEx(name, gdal.OF_UPDATE)
        self.array[1, 300:310, 280:290] = 7
        dataset.GetRasterBand(2).WriteArray(self.array[1, 300:310, 280:290], 280, 300)
        dataset.GetRasterBand(1).SetStatistics(1, 2, 1.5, 0.5)
        dataset = None
        dataset = gdal.Open(name)
        np.testing.assert_array_equal(dataset.ReadAsArray(), self.array)
        self.assertEqual(dataset.GetRasterBand(1).GetStatistics(False, False), [1, 2, 1.5, 0.5])

    def test_what_cannot_be_written_is_told(self):
        path = os.path.join(self.folder, "scene.zip")
        with zipfile.ZipFile(path, "w") as archive:
            archive.writestr("scene.pyr", self.bytes)
        with open(path, "rb") as stream:
            before = stream.read()
        with self.assertRaises(RuntimeError):
            dataset = gdal.OpenEx(f"/vsizip/{path}/scene.pyr", gdal.OF_UPDATE)
            dataset.GetRasterBand(1).WriteArray(self.array[1])
            dataset.FlushCache()
        dataset = None
        with open(path, "rb") as stream:
            self.assertEqual(stream.read(), before)

    def test_file_that_is_cut_after_it_was_opened(self):
        for cut in (len(self.bytes) // 2, 100, 0):
            name = self.in_memory(f"/vsimem/cut{cut}.pyr", self.bytes)
            dataset = gdal.Open(name)
            stream = gdal.VSIFOpenL(name, "r+b")
            gdal.VSIFTruncateL(stream, cut)
            gdal.VSIFCloseL(stream)
            with self.assertRaises(RuntimeError):
                dataset.ReadAsArray()

    def test_file_that_is_cut_after_its_first_read(self):
        name = self.in_memory("/vsimem/cut.pyr", self.bytes)
        dataset = gdal.Open(name)
        dataset.ReadAsArray(0, 0, 10, 10)
        stream = gdal.VSIFOpenL(name, "r+b")
        gdal.VSIFTruncateL(stream, len(self.bytes) // 2)
        gdal.VSIFCloseL(stream)
        with self.assertRaisesRegex(RuntimeError, "it was cut from"):
            dataset.ReadAsArray()


class VirtualTargets(FolderTest):
    """Pyramids made where GDAL's file systems can write."""

    def setUp(self):
        super().setUp()
        self.array = samples(gdal.GDT_UInt16, 700, 600, 3)
        self.source = memory_dataset(self.array, gdal.GDT_UInt16)
        place(self.source)
        self.driver = gdal.GetDriverByName("ZMCPyramid")
        self.before = self.spools()

    def spools(self):
        return [name for name in os.listdir("/tmp") if name.startswith(".zmcraster.zmcbuild")]

    def remove(self, *names):
        for name in names:
            self.addCleanup(gdal.Unlink, name)

    def check(self, name):
        dataset = gdal.Open(name)
        self.assertEqual(dataset.GetDriver().ShortName, "ZMCPyramid")
        np.testing.assert_array_equal(dataset.ReadAsArray(), self.array)
        self.assertEqual(dataset.GetRasterBand(1).GetOverviewCount(), 2)
        self.assertEqual(dataset.GetGeoTransform()[1], 30)
        low, high = self.array[0].min(), self.array[0].max()
        self.assertEqual(dataset.GetRasterBand(1).GetStatistics(False, False)[:2], [low, high])
        self.assertEqual(self.spools(), self.before)

    def test_copy_into_memory(self):
        name = "/vsimem/made.pyr"
        self.remove(name, name + ".aux.xml")
        made = self.driver.CreateCopy(name, self.source)
        np.testing.assert_array_equal(made.ReadAsArray(), self.array)
        made = None
        self.check(name)
        self.driver.CreateCopy(name, self.source)
        self.check(name)

    def test_translate_into_memory_and_back(self):
        self.remove("/vsimem/made.pyr", "/vsimem/made.pyr.aux.xml", "/vsimem/back.tif")
        gdal.Translate("/vsimem/made.pyr", self.source, format="ZMCPyramid")
        self.check("/vsimem/made.pyr")
        gdal.Translate("/vsimem/back.tif", "/vsimem/made.pyr")
        np.testing.assert_array_equal(gdal.Open("/vsimem/back.tif").ReadAsArray(), self.array)

    def test_created_in_memory_and_written(self):
        name = "/vsimem/made.pyr"
        self.remove(name, name + ".aux.xml")
        made = self.driver.Create(name, 600, 700, 3, gdal.GDT_UInt16)
        place(made)
        made.WriteArray(self.array)
        made = None
        self.check(name)

    def test_into_an_archive(self):
        path = self.path("made.zip")
        self.driver.CreateCopy(f"/vsizip/{path}/made.pyr", memory_dataset(self.array,
                                                                         gdal.GDT_UInt16))
        with zipfile.ZipFile(path) as archive:
            self.assertIn("made.pyr", archive.namelist())
        np.testing.assert_array_equal(gdal.Open(f"/vsizip/{path}/made.pyr").ReadAsArray(),
                                      self.array)

    def test_where_nothing_can_be_written(self):
        for name in ("/vsicurl/http://127.0.0.1:9/a.pyr", f"/vsitar/{self.path('a.tar')}/a.pyr",
                     f"/vsisubfile/0_100,{self.path('missing')}"):
            with self.assertRaises(RuntimeError) as caught:
                self.driver.CreateCopy(name, self.source)
            self.assertNotIn("\n", str(caught.exception))
        self.assertEqual(self.spools(), self.before)

    def test_a_copy_that_is_cancelled_leaves_nothing(self):
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        self.addCleanup(gdal.PopErrorHandler)
        with self.assertRaises(RuntimeError):
            self.driver.CreateCopy("/vsimem/made.pyr", self.source, callback=lambda *_: 0)
        self.assertIsNone(gdal.VSIStatL("/vsimem/made.pyr"))
        self.assertEqual(self.spools(), self.before)


class ReplacedFiles(FolderTest):
    """The file that was opened is the one that is read."""

    def make(self, name, value, width, height, bands=1, data_type=gdal.GDT_Byte):
        array = samples(data_type, height, width, bands)
        array[:] = value
        return array, self.copy(memory_dataset(array, data_type), name)

    def test_a_file_that_takes_the_name_before_the_first_read(self):
        for other in ((2000, 1500, 3, gdal.GDT_Float64), (30, 20, 1, gdal.GDT_Byte),
                      (512, 512, 1, gdal.GDT_Byte), (512, 512, 9, gdal.GDT_Byte)):
            array, path = self.make("scene.pyr", 1, 512, 512)
            _, taking = self.make("other.pyr", 200, *other)
            dataset = gdal.Open(path)
            os.replace(taking, path)
            np.testing.assert_array_equal(dataset.ReadAsArray(), array[0])
            np.testing.assert_array_equal(dataset.GetRasterBand(1).GetOverview(0).ReadAsArray(),
                                          np.ones((256, 256)))
            self.assertEqual(dataset.GetRasterBand(1).GetStatistics(False, False)[:2], [1, 1])

    def test_a_file_that_is_written_over_before_the_first_read(self):
        for other in ((2000, 1500, 3, gdal.GDT_Float64), (30, 20, 1, gdal.GDT_Byte),
                      (512, 512, 9, gdal.GDT_Byte), (512, 512, 1, gdal.GDT_Int16)):
            _, path = self.make("scene.pyr", 1, 512, 512)
            _, taking = self.make("other.pyr", 100, *other)
            dataset = gdal.Open(path)
            with open(taking, "rb") as stream:
                content = stream.read()
            with open(path, "wb") as stream:
                stream.write(content)
            with self.assertRaises(RuntimeError):
                dataset.ReadAsArray()
            os.remove(taking)

    def test_a_file_that_is_removed_before_the_first_read(self):
        array, path = self.make("scene.pyr", 1, 512, 512)
        dataset = gdal.Open(path)
        os.remove(path)
        np.testing.assert_array_equal(dataset.ReadAsArray(), array[0])

    def test_nothing_is_written_once_another_file_has_the_name(self):
        array, path = self.make("scene.pyr", 1, 512, 512)
        _, taking = self.make("other.pyr", 2, 512, 512)
        dataset = gdal.OpenEx(path, gdal.OF_UPDATE)
        os.replace(taking, path)
        with open(path, "rb") as stream:
            before = stream.read()
        with self.assertRaises(RuntimeError):
            dataset.GetRasterBand(1).WriteArray(array[0])
            dataset.FlushCache()
        dataset = None
        with open(path, "rb") as stream:
            self.assertEqual(stream.read(), before)


class LentNames(FolderTest):
    """A name that looks like that of a lent source reaches nothing, not even a file."""
    NAME = "zmc-lent:0123456789abcdef0123456789abcdef"

    def setUp(self):
        super().setUp()
        self.home = os.getcwd()
        os.chdir(self.folder)
        self.addCleanup(os.chdir, self.home)
        array = samples(gdal.GDT_Byte, 20, 30, 1)
        self.source = memory_dataset(array, gdal.GDT_Byte)
        self.file = self.copy(self.source)

    def test_is_not_opened(self):
        os.rename(self.file, self.NAME)
        gdal.Open("./" + self.NAME).ReadAsArray()
        for flags in (gdal.OF_RASTER, gdal.OF_UPDATE):
            with self.assertRaises(RuntimeError):
                gdal.OpenEx(self.NAME, flags, ["ZMCPyramid"])
        self.assertIsNone(gdal.IdentifyDriverEx(self.NAME, 0, ["ZMCPyramid"]))

    def test_is_not_made(self):
        driver = gdal.GetDriverByName("ZMCPyramid")
        with self.assertRaises(RuntimeError):
            driver.CreateCopy(self.NAME, self.source)
        with self.assertRaises(RuntimeError):
            driver.Create(self.NAME, 20, 20)
        self.assertFalse(os.path.exists(self.NAME))


if __name__ == "__main__":
    unittest.main()
