"""Large windows that several threads read: the same bytes, errors and answers as one thread gives."""
import os
import unittest

import numpy as np
from osgeo import gdal

from rasters import COMPLEX, DRIVER, TYPES, FolderTest, memory_dataset, samples

MANY = ("NUM_THREADS=2", "NUM_THREADS=5", "NUM_THREADS=ALL_CPUS")


class Told:
    """What GDAL reports while it lives: kinds and texts."""

    def __enter__(self):
        self.reports = []
        gdal.PushErrorHandler(lambda kind, number, text: self.reports.append((kind, number, text)))
        return self.reports

    def __exit__(self, *what):
        gdal.PopErrorHandler()


class Threads(FolderTest):
    def windows(self, dataset):
        width, height = dataset.RasterXSize, dataset.RasterYSize
        return ((0, 0, width, height), (3, 5, width - 10, height - 6), (256, 256, width - 256,
                                                                       height - 256),
                (width - 300, 1, 290, height - 1), (1, height - 270, width - 1, 260))

    def ways(self, dataset, part):
        """Ways to read a window, as functions of a dataset."""
        size = gdal.GetDataTypeSize(dataset.GetRasterBand(1).DataType) // 8
        bands, width = dataset.RasterCount, part[2]
        complex_type = dataset.GetRasterBand(1).DataType in COMPLEX
        other = gdal.GDT_CFloat64 if complex_type else gdal.GDT_Float64
        yield lambda d: d.ReadRaster(*part)
        yield lambda d: d.ReadRaster(*part, buf_pixel_space=size * bands,
                                     buf_line_space=size * bands * width, buf_band_space=size)
        yield lambda d: d.ReadRaster(*part, buf_type=other)
        yield lambda d: d.ReadRaster(*part, band_list=[bands, 1, 1, bands])
        yield lambda d: d.GetRasterBand(bands).ReadRaster(*part)
        # Columns one after the other.
        yield lambda d: d.GetRasterBand(1).ReadRaster(*part, buf_pixel_space=size * part[3],
                                                      buf_line_space=size)
        # Steps with room between the pixels.
        yield lambda d: d.GetRasterBand(1).ReadRaster(*part, buf_pixel_space=size * 3,
                                                      buf_line_space=size * 3 * width + 7)
        # All lines in one place: what is written last stays.
        yield lambda d: d.GetRasterBand(1).ReadRaster(*part, buf_pixel_space=size,
                                                      buf_line_space=0)

    def check_same(self, name, options=(), many=MANY):
        one = gdal.OpenEx(name, open_options=["NUM_THREADS=1", *options])
        for threads in many:
            several = gdal.OpenEx(name, open_options=[threads, *options])
            for part in self.windows(one):
                for number, read in enumerate(self.ways(one, part)):
                    self.assertTrue(read(one) == read(several), (threads, part, number))

    def test_every_type_has_the_same_bytes(self):
        for data_type in TYPES:
            with self.subTest(type=gdal.GetDataTypeName(data_type)):
                array = samples(data_type, 1030, 1290, 2)
                name = self.copy(memory_dataset(array, data_type), options=["STATISTICS=NO"])
                self.check_same(name, many=MANY[:1])
                read = gdal.OpenEx(name, open_options=MANY[:1]).ReadAsArray()
                np.testing.assert_array_equal(read, array)

    def test_every_order_of_tiles_and_bands_has_the_same_bytes(self):
        for bands, order in ((1, "SCANLINE"), (1, "BLOCKED"), (3, "SCANLINE"), (4, "BLOCKED"),
                             (7, "SCANLINE"), (12, "MORTON")):
            with self.subTest(bands=bands, order=order):
                array = samples(gdal.GDT_UInt16, 1030, 1290, bands)
                name = self.copy(memory_dataset(array, gdal.GDT_UInt16),
                                 options=["STATISTICS=NO", "ORDERING=" + order])
                told = gdal.Open(name).GetMetadataItem("ORDERING", "ZMCPYRAMID")
                self.assertEqual(told.upper(), order)
                self.check_same(name)

    def test_few_tiles_of_many_bands_have_the_same_bytes(self):
        array = samples(gdal.GDT_Int16, 300, 310, 30)
        self.check_same(self.copy(memory_dataset(array, gdal.GDT_Int16)))

    def test_signed_bytes_and_levels_and_masks(self):
        array = samples(gdal.GDT_Byte, 2100, 2300, 2)
        source = memory_dataset(array, gdal.GDT_Byte)
        name = self.copy(source, options=["PIXELTYPE=SIGNEDBYTE"])
        self.check_same(name)
        self.check_same(name, ["INT8_AS=SIGNEDBYTE"], MANY[:1])
        source.GetRasterBand(1).SetNoDataValue(7)
        name = self.copy(source, "masked.pyr")
        one, two = (gdal.OpenEx(name, open_options=["NUM_THREADS=" + n]) for n in "12")
        for read in (lambda d: d.GetRasterBand(1).GetOverview(0).ReadRaster(),
                     lambda d: d.GetRasterBand(1).GetMaskBand().ReadRaster(),
                     lambda d: d.ReadRaster(0, 0, 2300, 2100, 1000, 900)):
            self.assertTrue(read(one) == read(two))

    def test_files_in_memory_and_in_archives(self):
        array = samples(gdal.GDT_Byte, 1030, 1290, 3)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte))
        with open(name, "rb") as file:
            gdal.FileFromMemBuffer("/vsimem/threads.pyr", file.read())
        self.addCleanup(gdal.Unlink, "/vsimem/threads.pyr")
        self.check_same("/vsimem/threads.pyr")
        self.check_same("/vsisubfile/0,/vsimem/threads.pyr", many=MANY[:1])

    def incomplete(self):
        array = samples(gdal.GDT_Byte, 2100, 2300, 1)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte), options=["LEVELS=0"])
        os.truncate(name, os.path.getsize(name) // 2)
        return name, array

    def test_an_incomplete_file_fails_once_and_with_the_same_words(self):
        name, array = self.incomplete()
        failures = []
        for threads in ("1", "2", "8"):
            gdal.PushErrorHandler("CPLQuietErrorHandler")
            dataset = gdal.OpenEx(name, open_options=["NUM_THREADS=" + threads])
            gdal.PopErrorHandler()
            for _ in range(5):
                with Told() as reports:
                    with self.assertRaises(RuntimeError) as raised:
                        dataset.ReadRaster()
                self.assertLessEqual(len(reports), 1)
                failures.append(str(raised.exception))
            # What is there can still be read.
            np.testing.assert_array_equal(dataset.ReadAsArray(0, 0, 2300, 800), array[0, :800])
        self.assertEqual(len(set(failures)), 1, set(failures))
        self.assertIn("incomplete", failures[0])

    def test_an_incomplete_file_is_zeros_where_it_is_wished_so(self):
        name, _ = self.incomplete()
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        self.addCleanup(gdal.PopErrorHandler)
        self.check_same(name, ["MISSING=ZEROS"], MANY[:2])

    def test_progress_grows_to_one_and_can_end_the_read(self):
        array = samples(gdal.GDT_Byte, 2100, 2300, 2)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte))
        dataset = gdal.OpenEx(name, open_options=["NUM_THREADS=4"])
        shares = []

        def tell(share, text, data):
            shares.append(share)
            return 1

        read = dataset.ReadRaster(callback=tell)
        self.assertTrue(read == array.tobytes())
        self.assertEqual(shares, sorted(set(shares)))
        self.assertEqual(shares[-1], 1)
        for most in (1, 3, len(shares)):
            shares.clear()

            def stop(share, text, data, most=most):
                shares.append(share)
                return 0 if len(shares) == most or share == 1 else 1

            with self.assertRaises(RuntimeError):
                dataset.ReadRaster(callback=stop)
            self.assertEqual(gdal.GetLastErrorNo(), 9)  # CPLE_UserInterrupt

    def test_what_waits_to_be_written_is_read_in_update_mode(self):
        array = samples(gdal.GDT_Byte, 1030, 1290, 3)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte))
        dataset = gdal.OpenEx(name, gdal.OF_UPDATE, open_options=["NUM_THREADS=3"])
        np.testing.assert_array_equal(dataset.ReadAsArray(), array)
        patch = samples(gdal.GDT_Byte, 500, 600, 3, seed=9)
        dataset.WriteRaster(100, 90, 600, 500, patch.tobytes())
        changed = array.copy()
        changed[:, 90:590, 100:700] = patch
        np.testing.assert_array_equal(dataset.ReadAsArray(), changed)
        dataset.FlushCache()
        np.testing.assert_array_equal(dataset.ReadAsArray(), changed)
        dataset.GetRasterBand(2).Fill(5)
        changed[1] = 5
        np.testing.assert_array_equal(dataset.ReadAsArray(), changed)
        np.testing.assert_array_equal(dataset.GetRasterBand(2).ReadAsArray(), changed[1])
        del dataset
        np.testing.assert_array_equal(gdal.Open(name).ReadAsArray(), changed)

    def test_a_new_file_is_read_back_before_it_is_whole(self):
        array = samples(gdal.GDT_Byte, 1030, 1290, 2)
        gdal.SetConfigOption("GDAL_NUM_THREADS", "3")
        self.addCleanup(gdal.SetConfigOption, "GDAL_NUM_THREADS", None)
        made = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 1290, 1030, 2)
        made.WriteRaster(0, 0, 1290, 600, array[:, :600].tobytes())
        read = made.ReadAsArray()
        np.testing.assert_array_equal(read[:, :600], array[:, :600])
        self.assertFalse(read[:, 600:].any())

    def test_values_that_are_no_number_of_threads_are_one_warning(self):
        array = samples(gdal.GDT_Byte, 1030, 1290, 1)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte))
        for value in ("many", "-1", "2.5", "", " 2", "99999999999999999999"):
            with self.subTest(value=value):
                with Told() as reports:
                    dataset = gdal.OpenEx(name, open_options=["NUM_THREADS=" + value])
                    read = dataset.ReadAsArray()
                self.assertEqual([r[0] for r in reports], [gdal.CE_Warning], reports)
                self.assertIn("Invalid value for NUM_THREADS: " + value, reports[0][2])
                np.testing.assert_array_equal(read, array[0])
        for value in ("0", "1", "7", "100000", "ALL_CPUS", "all_cpus"):
            with Told() as reports:
                np.testing.assert_array_equal(
                    gdal.OpenEx(name, open_options=["NUM_THREADS=" + value]).ReadAsArray(),
                    array[0])
            self.assertEqual(reports, [])

    def test_the_configuration_option_counts_where_the_open_option_is_missing(self):
        array = samples(gdal.GDT_Byte, 300, 300, 1)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte))
        gdal.SetConfigOption("GDAL_NUM_THREADS", "plenty")
        self.addCleanup(gdal.SetConfigOption, "GDAL_NUM_THREADS", None)
        with Told() as reports:
            gdal.Open(name)
        self.assertIn("plenty", reports[0][2])
        with Told() as reports:
            gdal.OpenEx(name, open_options=["NUM_THREADS=2"])
        self.assertEqual(reports, [])


if __name__ == "__main__":
    unittest.main()
