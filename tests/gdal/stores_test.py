"""What stores answer, and which statistics are shown: of the file, of the sidecar, or none."""
import os
import subprocess
import unittest

import numpy as np
from osgeo import gdal

from rasters import DRIVER, FolderTest, memory_dataset, samples


def shown(band):
    """What a band shows of its statistics without a scan."""
    items = {name: float(value) for name, value in band.GetMetadata().items()
             if name in ("STATISTICS_MINIMUM", "STATISTICS_MAXIMUM", "STATISTICS_MEAN",
                         "STATISTICS_STDDEV")}
    one_by_one = {name: float(band.GetMetadataItem(name)) for name in items}
    assert items == one_by_one
    assert items.get("STATISTICS_MINIMUM") == band.GetMinimum()
    assert items.get("STATISTICS_MAXIMUM") == band.GetMaximum()
    return sorted(items.values())


def has_histogram(band):
    return band.GetDefaultHistogram(force=False) is not None


class StoreTest(FolderTest):
    def setUp(self):
        super().setUp()
        self.array = samples(gdal.GDT_Byte, 300, 300, 3)
        self.name = self.copy(memory_dataset(self.array, gdal.GDT_Byte))

    def update(self, name=None, *options):
        return gdal.OpenEx(name or self.name, gdal.OF_UPDATE, open_options=list(options))

    def change(self, number, change, name=None):
        dataset = self.update(name)
        return change(dataset.GetRasterBand(number))

    def edit(self, number=2, name=None):
        self.change(number, lambda band: band.WriteArray(np.full((9, 9), 77, np.uint8)), name)

    def band(self, number=2, name=None):
        self.dataset = gdal.Open(name or self.name)
        return self.dataset.GetRasterBand(number)


class Editing(StoreTest):
    def test_old_statistics_and_histograms_are_not_shown(self):
        dataset = self.update()
        band = dataset.GetRasterBand(2)
        self.assertEqual(len(shown(band)), 4)
        band.WriteArray(np.full((9, 9), 77, np.uint8))
        dataset.FlushCache()
        self.assertEqual((shown(band), has_histogram(band)), ([], False))
        del band, dataset
        self.assertEqual((shown(self.band()), has_histogram(self.band())), ([], False))
        for other in (1, 3):
            self.assertEqual(len(shown(self.band(other))), 4)
            self.assertTrue(has_histogram(self.band(other)))

    def test_a_flush_leaves_nothing_of_the_sidecar_to_closing(self):
        dataset = self.update()
        dataset.GetRasterBand(2).WriteArray(np.full((9, 9), 77, np.uint8))
        dataset.FlushCache()
        with open(self.name + ".aux.xml") as sidecar:
            text = sidecar.read()
        self.assertIn("OLD_STATISTICS", text)
        self.assertNotIn("EDITING", text)
        os.remove(self.name + ".aux.xml")
        del dataset
        self.assertEqual(self.files(), ["raster.pyr"])

    def test_all_bands_of_blocks_that_waited_together(self):
        dataset = self.update()
        dataset.WriteArray(np.full((3, 9, 9), 3, np.uint8))
        del dataset
        self.assertEqual([shown(self.band(number)) for number in (1, 2, 3)], [[], [], []])

    def test_new_ones_are_shown(self):
        self.edit()
        dataset = self.update()
        dataset.GetRasterBand(2).SetStatistics(1, 2, 1.5, 0.25)
        dataset.GetRasterBand(2).SetDefaultHistogram(-0.5, 3.5, [4, 3, 2, 1])
        del dataset
        self.assertEqual(shown(self.band()), [0.25, 1, 1.5, 2])
        self.assertEqual(self.band().GetDefaultHistogram(force=False)[3], [4, 3, 2, 1])
        self.edit()
        self.assertEqual((shown(self.band()), has_histogram(self.band())), ([], False))

    def test_an_editing_that_is_cut_off_leaves_all_in_doubt(self):
        script = ("import os, sys, numpy\nfrom osgeo import gdal\n"
                  "ds = gdal.OpenEx(sys.argv[1], gdal.OF_UPDATE)\n"
                  "gdal.SetCacheMax(70000)\n"
                  "ds.GetRasterBand(2).WriteArray(numpy.full((300, 300), 7, 'u1'))\n"
                  "os._exit(0)\n")
        subprocess.run(["/usr/bin/python3", "-c", script, self.name], check=True)
        self.assertTrue((self.band().ReadAsArray() == 7).any())
        self.assertEqual([shown(self.band(number)) for number in (1, 2, 3)], [[], [], []])
        # Another one leaves them so.
        self.edit(3)
        self.assertEqual([shown(self.band(number)) for number in (1, 2, 3)], [[], [], []])
        self.change(1, lambda band: band.SetStatistics(1, 2, 1.5, 0.25))
        self.assertEqual(shown(self.band(1)), [0.25, 1, 1.5, 2])

    def test_a_file_without_any_gets_no_sidecar(self):
        name = self.copy(memory_dataset(self.array, gdal.GDT_Byte), "plain.pyr",
                         options=["STATISTICS=NO"])
        self.edit(2, name)
        self.assertEqual(self.files(), ["plain.pyr", "raster.pyr"])

    def test_marks_are_not_copied(self):
        self.edit()
        copy = self.copy(gdal.Open(self.name), "copy.pyr")
        self.assertEqual(len(shown(self.band(2, copy))), 4)
        self.assertEqual(self.files(), ["copy.pyr", "raster.pyr", "raster.pyr.aux.xml"])


class Closing(StoreTest):
    def test_renews_statistics_of_edited_bands_where_that_is_wanted(self):
        dataset = self.update(None, "STATISTICS=YES")
        dataset.GetRasterBand(2).WriteArray(np.full((300, 300), 9, np.uint8))
        del dataset
        self.assertEqual(shown(self.band()), [0, 9, 9, 9])
        self.assertEqual(self.band().GetDefaultHistogram(force=False)[3][9], 90000)
        self.assertEqual(len(shown(self.band(1))), 4)
        self.assertEqual(self.files(), ["raster.pyr"])

    def test_without_an_edit_stores_nothing(self):
        with open(self.name, "rb") as file:
            before = file.read()
        dataset = self.update(None, "STATISTICS=YES")
        dataset.GetRasterBand(1).ReadAsArray()
        del dataset
        with open(self.name, "rb") as file:
            self.assertEqual(file.read(), before)

    def test_of_complex_samples_there_are_none_to_renew(self):
        array = samples(gdal.GDT_CFloat32, 30, 20, 1)
        name = self.copy(memory_dataset(array, gdal.GDT_CFloat32), "complex.pyr")
        dataset = self.update(name, "STATISTICS=YES")
        dataset.GetRasterBand(1).WriteArray(np.full((2, 2), 3 + 1j, np.complex64))
        gdal.ErrorReset()
        del dataset
        self.assertEqual(gdal.GetLastErrorMsg(), "")
        self.assertEqual(self.band(1, name).ReadAsArray(1, 1, 1, 1)[0, 0], 3 + 1j)

    def test_bands_that_were_edited_before_stay_marked(self):
        self.edit(1)
        dataset = self.update(None, "STATISTICS=YES")
        dataset.GetRasterBand(2).WriteArray(np.full((300, 300), 9, np.uint8))
        del dataset
        self.assertEqual([len(shown(self.band(number))) for number in (1, 2, 3)], [0, 4, 4])


class Digits(FolderTest):
    """What a file rounds stands in the sidecar as it is."""

    def setUp(self):
        super().setUp()
        # In the file as 1.23457 and -7.65432.
        self.array = np.full((1, 300, 300), 1.2345678, np.float32)
        self.array[0, 3, 4] = -7.6543213

    def check(self, name):
        dataset = gdal.Open(name)
        band = dataset.GetRasterBand(1)
        plane = self.array[0].astype(np.float64)
        self.assertEqual((band.GetMinimum(), band.GetMaximum()), (plane.min(), plane.max()))
        minimum, maximum, mean, deviation = band.GetStatistics(0, 0)
        self.assertEqual((minimum, maximum), (plane.min(), plane.max()))
        self.assertAlmostEqual(mean, plane.mean(), 12)
        self.assertAlmostEqual(deviation, plane.std(), 9)

    def test_of_a_copy(self):
        name = self.copy(memory_dataset(self.array, gdal.GDT_Float32))
        self.check(name)

    def test_of_stored_ones(self):
        name = self.copy(memory_dataset(self.array, gdal.GDT_Float32), options=["STATISTICS=NO"])
        self.assertEqual(self.files(), ["raster.pyr"])
        dataset = gdal.OpenEx(name, gdal.OF_UPDATE)
        dataset.GetRasterBand(1).ComputeStatistics(False)
        del dataset
        self.check(name)

    def test_of_those_renewed_at_closing(self):
        name = self.copy(memory_dataset(self.array, gdal.GDT_Float32))
        dataset = gdal.OpenEx(name, gdal.OF_UPDATE, open_options=["STATISTICS=YES"])
        self.array[0, 9, 9] = 987.65432
        dataset.GetRasterBand(1).WriteArray(self.array[0])
        del dataset
        self.check(name)

    def test_of_a_new_file_written_block_by_block(self):
        name = self.path("new.pyr")
        dataset = gdal.GetDriverByName(DRIVER).Create(name, 300, 300, 1, gdal.GDT_Float32)
        dataset.GetRasterBand(1).WriteArray(self.array[0])
        del dataset
        self.check(name)

    def test_of_integers_of_64_bits(self):
        self.array = np.full((1, 30, 30), 5, np.int64)
        self.array[0, 1, 1], self.array[0, 2, 2] = 2**53 + 2, -2**53 - 2
        dataset = gdal.Open(self.copy(memory_dataset(self.array, gdal.GDT_Int64)))
        band = dataset.GetRasterBand(1)
        self.assertEqual((band.GetMinimum(), band.GetMaximum()), (-2**53 - 2, 2**53 + 2))

    def test_a_file_that_keeps_all_digits_has_no_sidecar(self):
        self.copy(memory_dataset(samples(gdal.GDT_Int32, 300, 300, 2), gdal.GDT_Int32))
        self.assertEqual(self.files(), ["raster.pyr"])

    def test_newer_ones_of_the_file_count(self):
        name = self.copy(memory_dataset(self.array, gdal.GDT_Float32))
        dataset = gdal.OpenEx(name, gdal.OF_UPDATE)
        dataset.GetRasterBand(1).SetStatistics(1, 2, 1.5, 0.25)
        del dataset
        dataset = gdal.Open(name)
        self.assertEqual(shown(dataset.GetRasterBand(1)), [0.25, 1, 1.5, 2])
        self.assertEqual(self.files(), ["raster.pyr"])


class Removing(StoreTest):
    def test_clear_statistics(self):
        for flag in (gdal.OF_UPDATE, gdal.OF_READONLY):
            name = self.copy(memory_dataset(self.array, gdal.GDT_Byte), f"of{flag}.pyr")
            dataset = gdal.OpenEx(name, flag)
            dataset.GetRasterBand(3).SetMetadataItem("kept", "yes")
            dataset.ClearStatistics()
            self.assertEqual(shown(dataset.GetRasterBand(1)), [])
            del dataset
            for number in (1, 2, 3):
                self.assertEqual(shown(self.band(number, name)), [])
            self.assertEqual(self.band(3, name).GetMetadata(), {"kept": "yes"})

    def test_clear_statistics_tells_that_it_cannot(self):
        os.mkdir(self.name + ".aux.xml")
        dataset = self.update()
        with self.assertRaisesRegex(RuntimeError, "aux.xml could not be written"):
            dataset.ClearStatistics()

    def test_gdal_edit_unsets_and_sets_them(self):
        subprocess.run(["gdal_edit.py", "-unsetstats", self.name], check=True)
        self.assertEqual([shown(self.band(number)) for number in (1, 2, 3)], [[], [], []])
        subprocess.run(["gdal_edit.py", "-stats", self.name], check=True)
        plane = self.array[1].astype(float)
        self.assertEqual([round(value, 9) for value in shown(self.band())],
                         sorted(round(float(value), 9) for value in
                                (plane.min(), plane.max(), plane.mean(), plane.std())))

    def test_one_item(self):
        self.change(2, lambda band: band.SetMetadataItem("STATISTICS_MEAN", "100"))
        self.assertEqual(self.band().GetMetadataItem("STATISTICS_MEAN"), "100")
        self.assertEqual((self.band().GetMinimum(), self.band().GetMaximum()), (0, 255))
        self.change(2, lambda band: band.SetMetadataItem("STATISTICS_MEAN", None))
        self.assertEqual(len(shown(self.band())), 3)

    def test_a_list_of_items(self):
        dataset = self.update()
        items = dataset.GetRasterBand(2).GetMetadata()
        before = shown(dataset.GetRasterBand(2))
        dataset.GetRasterBand(2).SetMetadata({**items, "more": "1"})
        del dataset
        self.assertEqual(shown(self.band()), before)
        self.assertEqual(self.band().GetMetadataItem("more"), "1")
        self.change(2, lambda band: band.SetMetadata({"less": "1"}))
        self.assertEqual(self.band().GetMetadata(), {"less": "1"})


class ReadOnly(StoreTest):
    def test_stores_go_to_the_sidecar_and_are_shown(self):
        dataset = gdal.Open(self.name)
        band = dataset.GetRasterBand(2)
        self.assertEqual(band.SetStatistics(1, 2, 1.5, 0.25), gdal.CE_None)
        self.assertEqual(band.SetDefaultHistogram(-0.5, 3.5, [4, 3, 2, 1]), gdal.CE_None)
        self.assertEqual(shown(band), [0.25, 1, 1.5, 2])
        # Before it is closed.
        self.assertEqual(shown(self.band()), [0.25, 1, 1.5, 2])
        self.assertEqual(self.band().GetDefaultHistogram(force=False)[3], [4, 3, 2, 1])
        del band, dataset
        # What is stored in the file later counts.
        dataset = self.update()
        dataset.GetRasterBand(2).SetStatistics(3, 4, 3.5, 0.5)
        dataset.GetRasterBand(2).SetDefaultHistogram(-0.5, 1.5, [8, 9])
        del dataset
        self.assertEqual(shown(self.band()), [0.5, 3, 3.5, 4])
        self.assertEqual(self.band().GetDefaultHistogram(force=False)[3], [8, 9])

    def test_stores_tell_that_they_cannot(self):
        os.mkdir(self.name + ".aux.xml")
        for store in (lambda band: band.SetStatistics(1, 2, 1.5, 0.25),
                      lambda band: band.SetDefaultHistogram(-0.5, 3.5, [4, 3, 2, 1])):
            dataset = gdal.Open(self.name)
            with self.assertRaisesRegex(RuntimeError, "aux.xml could not be written"):
                store(dataset.GetRasterBand(2))

    def test_without_sidecars_nothing_is_stored_and_that_is_told(self):
        gdal.SetConfigOption("GDAL_PAM_ENABLED", "NO")
        self.addCleanup(gdal.SetConfigOption, "GDAL_PAM_ENABLED", None)
        dataset = gdal.Open(self.name)
        band = dataset.GetRasterBand(2)
        self.assertRaises(RuntimeError, band.SetStatistics, 1, 2, 1.5, 0.25)
        self.assertRaises(RuntimeError, band.SetDefaultHistogram, -0.5, 3.5, [4, 3, 2, 1])

    def test_statistics_are_computed_where_they_cannot_be_stored(self):
        name = self.copy(memory_dataset(self.array, gdal.GDT_Byte), "plain.pyr",
                         options=["STATISTICS=NO"])
        os.mkdir(name + ".aux.xml")
        heard = []
        gdal.PushErrorHandler(lambda kind, number, text: heard.append(kind))
        try:
            self.assertEqual(self.band(2, name).ComputeStatistics(False)[:2], [0, 255])
        finally:
            gdal.PopErrorHandler()
        self.assertIn(gdal.CE_Warning, heard)

    def test_a_color_table_beside_that_of_the_file_is_refused(self):
        table = gdal.ColorTable()
        table.SetColorEntry(0, (9, 8, 7, 255))
        dataset = gdal.Open(self.name)
        self.assertEqual(dataset.GetRasterBand(1).SetColorTable(table), gdal.CE_None)
        del dataset
        self.assertEqual(self.band(1).GetColorTable().GetColorEntry(0), (9, 8, 7, 255))
        self.change(1, lambda band: band.SetColorTable(table))
        dataset = gdal.Open(self.name)
        with self.assertRaisesRegex(RuntimeError, "open it for update"):
            dataset.GetRasterBand(1).SetColorTable(table)

    def test_statistics_of_a_level_are_told_to_be_kept_for_a_while(self):
        dataset = self.update()
        level = dataset.GetRasterBand(1).GetOverview(0)
        heard = []
        gdal.PushErrorHandler(lambda kind, number, text: heard.append((kind, text)))
        try:
            self.assertEqual(level.SetStatistics(1, 2, 1.5, 0.25), gdal.CE_Warning)
        finally:
            gdal.PopErrorHandler()
        self.assertEqual(heard[0][0], gdal.CE_Warning)
        self.assertIn("not stored", heard[0][1])

    def test_histograms_of_a_level_are_in_the_file(self):
        dataset = self.update()
        level = dataset.GetRasterBand(1).GetOverview(0)
        self.assertEqual(level.SetDefaultHistogram(-0.5, 3.5, [4, 3, 2, 1]), gdal.CE_None)
        del level, dataset
        level = self.band(1).GetOverview(0)
        self.assertEqual(level.GetDefaultHistogram(force=False)[3], [4, 3, 2, 1])
        with self.assertRaisesRegex(RuntimeError, "open it for update"):
            level.SetDefaultHistogram(-0.5, 1.5, [2, 1])


class Levels(StoreTest):
    def test_those_beyond_the_last_are_passed_over_with_a_warning(self):
        array = samples(gdal.GDT_Byte, 600, 700, 1)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte), "two.pyr")
        self.edit(1, name)
        done = subprocess.run(["gdaladdo", "-r", "nearest", name, "2", "4", "8", "16"],
                              capture_output=True, text=True, check=False)
        self.assertEqual(done.returncode, 0, done)
        for factor in (8, 16):
            self.assertIn(f"no room for a level reduced by {factor}", done.stderr)
        dataset = gdal.Open(name)
        whole = dataset.GetRasterBand(1).ReadAsArray()
        for index in (0, 1):
            np.testing.assert_array_equal(
                dataset.GetRasterBand(1).GetOverview(index).ReadAsArray(),
                whole[::2 << index, ::2 << index])
        self.assertEqual(dataset.GetRasterBand(1).GetOverviewCount(), 2)

    def test_others_are_refused_before_one_is_made(self):
        array = samples(gdal.GDT_Byte, 600, 700, 1)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte), "two.pyr")
        with open(name, "rb") as file:
            before = file.read()
        for factors in ([2, 3], [8, 16]):
            dataset = self.update(name)
            with self.assertRaisesRegex(RuntimeError, "no room"):
                dataset.BuildOverviews("NEAREST", factors)
            del dataset
        with open(name, "rb") as file:
            self.assertEqual(file.read(), before)


class Types(FolderTest):
    def test_complex_integers_are_no_types_of_new_files(self):
        driver = gdal.GetDriverByName(DRIVER)
        self.assertNotIn("CInt", driver.GetMetadataItem("DMD_CREATIONDATATYPES"))
        for data_type in (gdal.GDT_CInt16, gdal.GDT_CInt32):
            with self.assertRaisesRegex(RuntimeError, "no pyramid holds this data type"):
                driver.Create(self.path("new.pyr"), 5, 5, 1, data_type)
        self.assertEqual(self.files(), [])


class Progress(FolderTest):
    def calls(self, read, most=None):
        """What a read tells of itself, ended after so many words."""
        seen = []

        def hear(share, *_):
            seen.append(share)
            return int(most is None or len(seen) < most)
        return read(hear), seen

    def test_of_reads(self):
        for bands in (1, 3, 12):
            array = samples(gdal.GDT_UInt16, 1000, 900, bands)
            dataset = gdal.Open(self.copy(memory_dataset(array, gdal.GDT_UInt16)))
            band = dataset.GetRasterBand(bands)
            for read in (lambda hear: dataset.ReadRaster(10, 20, 880, 970, callback=hear),
                         lambda hear: band.ReadRaster(10, 20, 880, 970, callback=hear),
                         lambda hear: band.ReadRaster(0, 0, 900, 1000, 600, 700, callback=hear)):
                pixels, seen = self.calls(read)
                self.assertIsNotNone(pixels)
                self.assertGreaterEqual(len(seen), 4)
                self.assertEqual(seen, sorted(seen))
                self.assertEqual(seen[-1], 1)
            for read in (lambda hear: dataset.ReadRaster(10, 20, 880, 970, callback=hear),
                         lambda hear: band.ReadRaster(10, 20, 880, 970, callback=hear)):
                with self.assertRaisesRegex(RuntimeError, "cancelled"):
                    self.calls(read, 2)

    def test_what_is_read_with_it_is_what_is_read_without(self):
        array = samples(gdal.GDT_Byte, 700, 600, 3)
        dataset = gdal.Open(self.copy(memory_dataset(array, gdal.GDT_Byte)))
        pixels, _ = self.calls(lambda hear: dataset.ReadRaster(3, 5, 590, 690, callback=hear))
        np.testing.assert_array_equal(
            np.frombuffer(pixels, np.uint8).reshape(3, 690, 590), array[:, 5:695, 3:593])

    def test_of_masks(self):
        array = samples(gdal.GDT_Float32, 700, 600, 1)
        dataset = gdal.Open(self.copy(memory_dataset(array, gdal.GDT_Float32)))
        mask = dataset.GetRasterBand(1).GetMaskBand()
        _, seen = self.calls(lambda hear: mask.ReadRaster(callback=hear))
        self.assertEqual((len(seen), seen[-1]), (3, 1))
        with self.assertRaises(RuntimeError):
            self.calls(lambda hear: mask.ReadRaster(callback=hear), 1)


if __name__ == "__main__":
    unittest.main()
