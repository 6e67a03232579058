"""The driver at its edges: levels that stand for their band, signed bytes, options that are not
understood, files that go away, headers that GDAL cannot hold."""
import os
import re
import struct
import unittest
from xml.etree import ElementTree

import numpy as np
from osgeo import gdal

from rasters import DRIVER, FolderTest, memory_dataset, samples


def header(**fields):
    """The front of a pyramid file with these header fields."""
    text = {"VERSION_MAJOR": 1, "VERSION_MINOR": 1, "BANDS": 1, "PIXEL_HEIGHT": 8,
            "PIXEL_WIDTH": 8, "LEVELMIN": 0, "LEVELMAX": 0, "TILESIZE": 8, "INTERLEAVE": "BIP",
            "BUILD_METHOD": "Blocked", "PIXEL_TYPE": "Byte", **fields}
    document = "".join(f"<HEADER_{name}>{value}</HEADER_{name}>" for name, value in text.items())
    document = f"<DATASET><HEADER>{document}</HEADER></DATASET>".encode()
    return b"KOBT" + struct.pack("<QQ", 20 + len(document), 0) + document


class Levels(FolderTest):
    def update(self, data_type=gdal.GDT_Byte, bands=1):
        self.array = samples(data_type, 520, 530, bands)
        path = self.copy(memory_dataset(self.array, data_type))
        return gdal.OpenEx(path, gdal.OF_UPDATE)

    def test_a_levels_no_data_value_is_that_of_its_band(self):
        for data_type in (gdal.GDT_Byte, gdal.GDT_Int64, gdal.GDT_UInt64):
            with self.subTest(gdal.GetDataTypeName(data_type)):
                dataset = self.update(data_type)
                band = dataset.GetRasterBand(1)
                level = band.GetOverview(0)
                self.assertIsNone(level.GetNoDataValue())
                level.SetNoDataValue(5)
                self.assertEqual((band.GetNoDataValue(), level.GetNoDataValue()), (5, 5))
                band.SetNoDataValue(6)
                self.assertEqual(level.GetNoDataValue(), 6)
                level.DeleteNoDataValue()
                self.assertIsNone(band.GetNoDataValue())

    def test_levels_that_are_not_there(self):
        dataset = self.update()
        band = dataset.GetRasterBand(1)
        for index in (-1, band.GetOverviewCount(), 99):
            self.assertIsNone(band.GetOverview(index))
        self.assertIsNone(band.GetOverview(0).GetOverview(0))

    def test_masks_of_levels(self):
        array = samples(gdal.GDT_Float32, 600, 600, 1)
        array[0, 100:300, 100:300] = np.nan
        dataset = gdal.Open(self.copy(memory_dataset(array, gdal.GDT_Float32)))
        band = dataset.GetRasterBand(1)
        mask = band.GetMaskBand()
        level = mask.GetOverview(0)
        self.assertEqual((level.XSize, level.YSize), (300, 300))
        self.assertTrue((level.ReadAsArray()[51:149, 51:149] == 0).all())
        self.assertTrue((level.ReadAsArray()[:49] == 255).all())
        self.assertIsNone(mask.GetOverview(9))
        # Other types, sizes and steps than the plain read.
        plain = mask.ReadAsArray()
        self.assertTrue((mask.ReadAsArray(buf_type=gdal.GDT_Int16) == plain).all())
        self.assertEqual(mask.ReadAsArray(0, 0, 600, 600, 60, 60).shape, (60, 60))
        self.assertTrue((mask.ReadAsArray(590, 590, 10, 10) == 255).all())

    def test_statistics_of_some_bands_in_any_order(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 300, 300, 3), gdal.GDT_Byte)
        path = self.copy(source, options=["STATISTICS=NO"])
        for number, mean in ((3, 30.0), (1, 10.0), (3, 31.0)):
            dataset = gdal.OpenEx(path, gdal.OF_UPDATE)
            dataset.GetRasterBand(number).SetStatistics(0, 255, mean, 2)
            dataset = None
        dataset = gdal.Open(path)
        self.assertEqual(dataset.GetRasterBand(1).GetStatistics(False, False)[2], 10)
        self.assertEqual(dataset.GetRasterBand(3).GetStatistics(False, False)[2], 31)
        self.assertNotIn("STATISTICS_MEAN", dataset.GetRasterBand(2).GetMetadata())
        self.assertIsNone(dataset.GetRasterBand(2).GetMetadataItem("STATISTICS_MEAN"))
        self.assertEqual(dataset.GetRasterBand(2).GetMinimum(), None)
        self.assertEqual(dataset.GetRasterBand(3).GetMaximum(), 255)

    def test_histograms_of_whole_and_broken_bins(self):
        for data_type, lower, upper, counts in (
                (gdal.GDT_Byte, -0.5, 255.5, [1] * 256), (gdal.GDT_Byte, 10.5, 20.5, [7] * 10),
                (gdal.GDT_Byte, 0.5, 3.5, [3, 4]), (gdal.GDT_Float32, 0.25, 1.75, [3, 4, 5]),
                (gdal.GDT_Int64, -4.5, 5.5, [2] * 10), (gdal.GDT_CFloat32, 0.0, 2.0, [1, 2])):
            with self.subTest((gdal.GetDataTypeName(data_type), lower)):
                array = samples(data_type, 64, 64, 1)
                path = self.copy(memory_dataset(array, data_type), options=["STATISTICS=NO"])
                dataset = gdal.OpenEx(path, gdal.OF_UPDATE)
                dataset.GetRasterBand(1).SetDefaultHistogram(lower, upper, counts)
                dataset = None
                dataset = gdal.Open(path)
                stored = dataset.GetRasterBand(1).GetDefaultHistogram(force=False)
                self.assertEqual(stored[3], counts)
                if data_type != gdal.GDT_Byte or len(counts) != 2:
                    self.assertEqual(stored[:2], (lower, upper))
                dataset = None
                os.remove(path)


class SignedBytes(FolderTest):
    def test_sixteen_bits_are_cut_to_eight(self):
        array = samples(gdal.GDT_Byte, 300, 300, 2)
        path = self.copy(memory_dataset(array, gdal.GDT_Byte), options=["PIXELTYPE=SIGNEDBYTE"])
        dataset = gdal.OpenEx(path, gdal.OF_UPDATE, open_options=["INT8_AS=INT16"])
        band = dataset.GetRasterBand(2)
        self.assertEqual(band.DataType, gdal.GDT_Int16)
        band.WriteArray(np.array([[-100, 200, -300, 5]], np.int16), 3, 7)
        band = dataset = None
        dataset = gdal.Open(path)
        self.assertEqual(dataset.GetRasterBand(2).ReadAsArray(3, 7, 4, 1).tolist(),
                         [[-100, 127, -128, 5]])
        self.assertTrue((dataset.GetRasterBand(1).ReadAsArray() == array[0].view(np.int8)).all())
        dataset = gdal.OpenEx(path, open_options=["INT8_AS=SIGNEDBYTE"])
        band = dataset.GetRasterBand(1)
        self.assertEqual(band.DataType, gdal.GDT_Byte)
        self.assertEqual(band.GetMetadataItem("PIXELTYPE", "IMAGE_STRUCTURE"), "SIGNEDBYTE")
        self.assertEqual(band.GetMetadata("IMAGE_STRUCTURE"), {"PIXELTYPE": "SIGNEDBYTE"})


class Options(FolderTest):
    def made(self, option):
        source = memory_dataset(samples(gdal.GDT_Byte, 40, 50, 1), gdal.GDT_Byte)
        gdal.GetDriverByName(DRIVER).CreateCopy(self.path("made.pyr"), source, options=[option])

    def test_understood(self):
        for option in ("MEMORY=512M", "MEMORY=1G", "MEMORY=1gb", "MEMORY=524288K",
                       "MEMORY=536870912", "ORDERING=auto", "ORDERING=SCANLINE",
                       "ORDERING=Blocked", "LEVELS=AUTO", "LEVELS=0", "LEVELS=2", "BINS=7",
                       "NUM_THREADS=ALL_CPUS", "NUM_THREADS=1",
                       "NUM_THREADS=1000000", "NUM_THREADS=2147483647", "RESAMPLING=near",
                       "RESAMPLING=AVERAGE", "STATISTICS=NO"):
            with self.subTest(option):
                self.made(option)

    def test_the_page_of_the_driver_has_all_of_them(self):
        with open(os.path.join(os.path.dirname(__file__), "../../docs/gdal.md")) as page:
            rows = re.findall(r"^\| `([A-Z_]+)` \| (.*) \| (.*) \|$", page.read(), re.M)
        told = {name: (values, standard) for name, values, standard in rows}
        xml = gdal.GetDriverByName(DRIVER).GetMetadataItem("DMD_CREATIONOPTIONLIST")
        options = {each.get("name"): each for each in ElementTree.fromstring(xml)}
        self.assertEqual(told.keys(), options.keys())
        for name, (values, standard) in told.items():
            choices = [each.text for each in options[name]]
            if choices:
                self.assertEqual(re.findall("`([A-Z]+)`", values), choices, name)
            if "default" in options[name].attrib:
                self.assertIn(options[name].get("default"), standard.replace("`", ""), name)

    def test_not_understood(self):
        for option in ("MEMORY=", "MEMORY=B", "MEMORY=M", "MEMORY=12X", "MEMORY=-1",
                       "MEMORY=1234567890123456789", "MEMORY=99999999999999999G",
                       "ORDERING=HILBERT", "LEVELS=few", "LEVELS=4294967296", "BINS=1.5",
                       "NUM_THREADS=", "RESAMPLING=guess"):
            with self.subTest(option):
                with self.assertRaisesRegex(RuntimeError, "is not understood"):
                    self.made(option)
                self.assertEqual(self.files(), [])

    def test_understood_and_impossible(self):
        for option in ("ORDERING=MORTON", "MEMORY=1K", "LEVELS=9"):
            with self.subTest(option):
                self.assertRaises(RuntimeError, self.made, option)
                self.assertEqual(self.files(), [])


class FilesThatAreNoMore(FolderTest):
    def test_reading_a_file_that_was_removed(self):
        array = samples(gdal.GDT_Float32, 300, 300, 2)
        path = self.copy(memory_dataset(array, gdal.GDT_Float32))
        dataset = gdal.Open(path)
        band = dataset.GetRasterBand(1)
        os.remove(path)
        np.testing.assert_array_equal(band.ReadAsArray(), array[0])
        np.testing.assert_array_equal(dataset.ReadAsArray(), array)
        self.assertTrue((band.GetMaskBand().ReadAsArray() == 255).all())
        self.assertRaises(RuntimeError, gdal.Open, path)

    def test_reading_a_file_that_was_cut(self):
        path = self.copy(memory_dataset(samples(gdal.GDT_Float32, 300, 300, 2), gdal.GDT_Float32))
        dataset = gdal.Open(path)
        band = dataset.GetRasterBand(1)
        os.truncate(path, 2000)
        self.assertRaises(RuntimeError, band.ReadAsArray)
        self.assertRaises(RuntimeError, dataset.ReadAsArray)
        self.assertRaises(RuntimeError, band.GetMaskBand)
        self.assertRaises(RuntimeError, band.ReadBlock, 0, 0)

    def test_storing_into_a_file_that_was_removed(self):
        path = self.copy(memory_dataset(samples(gdal.GDT_Byte, 30, 30, 1), gdal.GDT_Byte))
        dataset = gdal.OpenEx(path, gdal.OF_UPDATE)
        os.remove(path)
        band = dataset.GetRasterBand(1)
        self.assertRaises(RuntimeError, band.SetStatistics, 0, 1, 0.5, 0.1)
        self.assertRaises(RuntimeError, band.SetDefaultHistogram, 0, 4, [1, 2, 3, 4])
        self.assertRaises(RuntimeError, band.SetColorTable, gdal.ColorTable())


class Headers(FolderTest):
    def opened(self, **fields):
        with open(self.path("raster.pyr"), "wb") as file:
            file.write(header(**fields) + bytes(64))
        return gdal.Open(self.path("raster.pyr"))

    def test_a_plain_one(self):
        dataset = self.opened()
        self.assertEqual((dataset.RasterXSize, dataset.RasterYSize), (8, 8))
        self.assertTrue((dataset.ReadAsArray() == 0).all())

    def test_what_gdal_cannot_hold(self):
        for why, fields in {
                "holds no pixels": {"PIXEL_WIDTH": 0},
                "no pixels": {"LEVELMIN": 5, "LEVELMAX": 5},
                "too large": {"PIXEL_WIDTH": 2147483648, "PIXEL_HEIGHT": 1},
                "70000 bands, beyond the limit of 65536; ZMC_LIMITS=bands=70000": {"BANDS": 70000},
                "tiles are too large": {"BANDS": 2000, "TILESIZE": 2048},
                "of its number of bands": {"BANDS": "many"},
                "tile size is 0": {"TILESIZE": ""}}.items():
            with self.subTest(why):
                with self.assertRaisesRegex(RuntimeError, why):
                    self.opened(**fields)

    def test_new_files_that_no_pyramid_is(self):
        driver = gdal.GetDriverByName(DRIVER)
        self.assertRaises(RuntimeError, driver.Create, self.path("new.pyr"), 10, 10, 0,
                          gdal.GDT_Byte)
        self.assertEqual(self.files(), [])

    def test_levels_that_a_new_file_cannot_have(self):
        driver = gdal.GetDriverByName(DRIVER)
        dataset = driver.Create(self.path("new.pyr"), 600, 600, 1, gdal.GDT_Byte)
        for resampling, factors in (("AVERAGE", [3]), ("AVERAGE", [1]), ("GUESS", [2])):
            self.assertRaises(RuntimeError, dataset.BuildOverviews, resampling, factors)
        dataset.BuildOverviews("NEAREST", [2, 4])
        dataset.GetRasterBand(1).WriteArray(np.full((600, 600), 7, np.uint8))
        dataset = None
        dataset = gdal.Open(self.path("new.pyr"))
        self.assertEqual(dataset.GetRasterBand(1).GetOverviewCount(), 2)


if __name__ == "__main__":
    unittest.main()
