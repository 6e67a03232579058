"""Writing pyramids through GDAL: copies, block by block, and in update mode."""
import os
import subprocess
import unittest

import numpy as np
from osgeo import gdal

from rasters import (COMPLEX, DRIVER, TYPES, FolderTest, file_sizes_up_to, halve, memory_dataset,
                     place, samples)


def quiet(call):
    gdal.PushErrorHandler("CPLQuietErrorHandler")
    try:
        return call()
    finally:
        gdal.PopErrorHandler()


def gdal_levels(name, number):
    dataset = gdal.Open(name)
    band = dataset.GetRasterBand(number)
    return [band.GetOverview(index).ReadAsArray() for index in range(band.GetOverviewCount())]


class Copies(FolderTest):
    def test_every_type_and_number_of_bands(self):
        for data_type in TYPES:
            for bands in (1, 2, 3, 4, 5, 12):
                array = samples(data_type, 27, 31, bands)
                name = self.copy(memory_dataset(array, data_type))
                np.testing.assert_array_equal(gdal.Open(name).ReadAsArray().reshape(array.shape),
                                              array)

    def test_no_bands_are_refused(self):
        source = gdal.GetDriverByName("MEM").Create("", 5, 5, 0, gdal.GDT_Byte)
        with self.assertRaisesRegex(RuntimeError, "no bands"):
            self.copy(source)
        self.assertEqual(self.files(), [])

    def test_complex_integers_become_floats(self):
        source = gdal.GetDriverByName("MEM").Create("", 5, 4, 1, gdal.GDT_CInt16)
        source.GetRasterBand(1).WriteArray(np.full((4, 5), 3 - 7j))
        dataset = gdal.Open(self.copy(source))
        self.assertEqual(dataset.GetRasterBand(1).DataType, gdal.GDT_CFloat32)
        self.assertTrue((dataset.ReadAsArray() == 3 - 7j).all())

    def test_bands_of_different_types_get_one_that_holds_both(self):
        source = gdal.GetDriverByName("MEM").Create("", 3, 2, 1, gdal.GDT_Byte)
        source.AddBand(gdal.GDT_Int16)
        source.GetRasterBand(1).WriteArray(np.full((2, 3), 255))
        source.GetRasterBand(2).WriteArray(np.full((2, 3), -300))
        read = gdal.Open(self.copy(source)).ReadAsArray()
        self.assertEqual((read[0, 0, 0], read[1, 0, 0], read.dtype), (255, -300, np.int16))

    def test_options(self):
        array = samples(gdal.GDT_Byte, 600, 700, 1)
        source = memory_dataset(array, gdal.GDT_Byte)
        dataset = gdal.Open(self.copy(source, options=[
            "RESAMPLING=NEAREST", "LEVELS=4", "ORDERING=SCANLINE", "STATISTICS=NO",
            "NUM_THREADS=1", "MEMORY=64M"]))
        band = dataset.GetRasterBand(1)
        self.assertEqual(band.GetOverviewCount(), 4)
        np.testing.assert_array_equal(band.GetOverview(0).ReadAsArray(), array[0, ::2, ::2])
        self.assertIsNone(band.GetMinimum())
        none = gdal.Open(self.copy(source, "flat.pyr", options=["LEVELS=0", "BINS=16"]))
        self.assertEqual(none.GetRasterBand(1).GetOverviewCount(), 0)
        for bad in ("LEVELS=-1", "LEVELS=x", "MEMORY=12Q", "NUM_THREADS=some", "BINS=1e3"):
            with self.assertRaises(RuntimeError):
                quiet(lambda: self.copy(source, "bad.pyr", options=[bad]))
        self.assertNotIn("bad.pyr", self.files())

    def test_cancelling_leaves_nothing_behind(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 1200, 1300, 3), gdal.GDT_Byte)
        for limit in np.random.default_rng(3).uniform(0, 0.95, 12):
            with self.assertRaises(RuntimeError):
                quiet(lambda: self.copy(source, callback=lambda done, *_: int(done < limit)))
            self.assertEqual(self.files(), [])
            self.assertEqual(self.descriptors(), [])

    def test_progress_rises_to_one(self):
        seen = []
        source = memory_dataset(samples(gdal.GDT_Byte, 700, 900, 3), gdal.GDT_Byte)
        self.copy(source, callback=lambda done, *_: seen.append(done) or 1)
        self.assertEqual(seen, sorted(seen))
        self.assertEqual(seen[-1], 1.0)

    def test_a_source_that_fails_leaves_nothing_behind(self):
        name = self.path("cut.tif")
        array = samples(gdal.GDT_Byte, 900, 900, 1)
        gdal.GetDriverByName("GTiff").CreateCopy(name, memory_dataset(array, gdal.GDT_Byte))
        os.truncate(name, 400000)
        source = gdal.Open(name)
        with self.assertRaisesRegex(RuntimeError, "cut.tif"):
            quiet(lambda: self.copy(source))
        self.assertEqual(self.files(), ["cut.tif"])

    def test_a_full_disk_is_told_and_leaves_nothing_behind(self):
        # A file may not grow beyond this; the signal of the limit is ignored by Python.
        script = ("import resource, sys; resource.setrlimit(resource.RLIMIT_FSIZE, (200000,) * 2)\n"
                  "from osgeo import gdal; gdal.UseExceptions()\n"
                  "ds = gdal.GetDriverByName('MEM').Create('', 900, 900, 1)\n"
                  "try:\n gdal.GetDriverByName('%s').CreateCopy(sys.argv[1], ds)\n"
                  "except RuntimeError as e: print('refused', e)" % DRIVER)
        done = subprocess.run(["/usr/bin/python3", "-c", script, self.path("big.pyr")],
                              capture_output=True, text=True)
        self.assertIn("refused", done.stdout, done.stderr)
        self.assertEqual(self.files(), [])

    def test_what_the_sidecar_keeps(self):
        source = memory_dataset(samples(gdal.GDT_Int16, 40, 50, 2), gdal.GDT_Int16)
        place(source)
        source.SetMetadata({"TITLE": "a hill", "AREA_OR_POINT": "Point"})
        source.SetMetadata({"LINE_OFF": "1"}, "RPC")
        source.SetMetadata(["<x>1</x>"], "xml:EXTRA")
        source.SetMetadata({"K": "V"}, "MINE")
        first, second = source.GetRasterBand(1), source.GetRasterBand(2)
        first.SetDescription("height")
        first.SetNoDataValue(-32768)
        first.SetUnitType("m")
        first.SetScale(0.5)
        first.SetOffset(-100)
        first.SetMetadata({"SENSOR": "laser", "STATISTICS_MEAN": "-1"})
        second.SetCategoryNames(["none", "water", "wood"])
        second.SetColorInterpretation(gdal.GCI_AlphaBand)
        table = gdal.RasterAttributeTable()
        table.CreateColumn("Value", gdal.GFT_Integer, gdal.GFU_MinMax)
        table.SetRowCount(1)
        table.SetValueAsInt(0, 0, 77)
        second.SetDefaultRAT(table)
        dataset = gdal.Open(self.copy(source))
        self.assertEqual(dataset.GetGeoTransform(), source.GetGeoTransform())
        self.assertTrue(dataset.GetSpatialRef().IsSame(source.GetSpatialRef()))
        self.assertEqual(dataset.GetMetadata(), source.GetMetadata())
        for domain in ("RPC", "MINE"):
            self.assertEqual(dataset.GetMetadata(domain), source.GetMetadata(domain))
        self.assertEqual(dataset.GetMetadata("xml:EXTRA")[0].strip(), "<x>1</x>")
        first, second = dataset.GetRasterBand(1), dataset.GetRasterBand(2)
        self.assertEqual((first.GetDescription(), first.GetNoDataValue(), first.GetUnitType(),
                          first.GetScale(), first.GetOffset()), ("height", -32768, "m", 0.5, -100))
        self.assertEqual(first.GetMetadataItem("SENSOR"), "laser")
        self.assertNotEqual(first.GetMetadataItem("STATISTICS_MEAN"), "-1")
        self.assertEqual(second.GetCategoryNames(), ["none", "water", "wood"])
        self.assertEqual(second.GetColorInterpretation(), gdal.GCI_AlphaBand)
        self.assertEqual(second.GetDefaultRAT().GetValueAsInt(0, 0), 77)

    def test_control_points_are_kept(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 9, 9, 1), gdal.GDT_Byte)
        points = [gdal.GCP(i * 10.0, i * i * 7.0, 5, i, 2 * i) for i in range(4)]
        place(source)
        source.SetGCPs(points, source.GetSpatialRef())
        dataset = gdal.Open(self.copy(source))
        self.assertEqual([(p.GCPX, p.GCPY, p.GCPZ, p.GCPPixel, p.GCPLine)
                          for p in dataset.GetGCPs()],
                         [(p.GCPX, p.GCPY, p.GCPZ, p.GCPPixel, p.GCPLine) for p in points])

    def test_a_mask_of_the_whole_dataset_is_kept(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 20, 30, 3), gdal.GDT_Byte)
        source.CreateMaskBand(gdal.GMF_PER_DATASET)
        mask = np.zeros((20, 30), np.uint8)
        mask[3:9] = 255
        source.GetRasterBand(1).GetMaskBand().WriteArray(mask)
        dataset = gdal.Open(self.copy(source))
        self.assertEqual(dataset.GetRasterBand(2).GetMaskFlags(), gdal.GMF_PER_DATASET)
        np.testing.assert_array_equal(dataset.GetRasterBand(2).GetMaskBand().ReadAsArray(), mask)

    def test_a_mask_that_cannot_be_kept_leaves_nothing_behind(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 30, 40, 1), gdal.GDT_Byte)
        place(source)
        source.CreateMaskBand(gdal.GMF_PER_DATASET)
        os.mkdir(self.path("raster.pyr.msk"))
        with self.assertRaises(RuntimeError):
            self.copy(source)
        self.assertEqual(self.files(), ["raster.pyr.msk"])

    def test_a_sidecar_that_is_cut_off_leaves_nothing_behind(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 30, 40, 1), gdal.GDT_Byte)
        source.SetMetadata({"LONG": "x" * 1500000})
        with file_sizes_up_to(1024000), self.assertRaisesRegex(
                RuntimeError, r"cannot keep its metadata in .*raster\.pyr\.aux\.xml: Unable to save"):
            quiet(lambda: self.copy(source))
        self.assertEqual(self.files(), [])

    def test_a_mask_that_is_cut_off_leaves_nothing_behind(self):
        noise = samples(gdal.GDT_Byte, 3000, 3000, 1)
        source = memory_dataset(noise, gdal.GDT_Byte)
        source.CreateMaskBand(gdal.GMF_PER_DATASET)
        source.GetRasterBand(1).GetMaskBand().WriteArray(noise[0])
        flat = ["LEVELS=0", "STATISTICS=NO"]
        # Noise that GDAL compresses becomes larger than the pyramid.
        with file_sizes_up_to(noise.size + 4000):
            with self.assertRaisesRegex(RuntimeError, r"keep its mask in .*raster\.pyr\.msk: "):
                quiet(lambda: self.copy(source, options=flat))
        self.assertEqual(self.files(), [])
        self.copy(source, options=flat)
        self.assertEqual(self.files(), ["raster.pyr", "raster.pyr.msk"])
        self.assertGreater(os.path.getsize(self.path("raster.pyr.msk")), noise.size + 4000)

    def test_strict_copies_refuse_what_is_lost_and_others_name_it(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 9, 9, 1), gdal.GDT_Byte)
        table = gdal.ColorTable(gdal.GPI_HLS)
        table.SetColorEntry(1, (10, 20, 30, 255))
        source.GetRasterBand(1).SetColorTable(table)
        with self.assertRaisesRegex(RuntimeError, "color table of band 1"):
            self.copy(source, strict=1)
        self.assertEqual(self.files(), [])
        heard = []
        gdal.PushErrorHandler(lambda kind, number, text: heard.append((kind, text)))
        self.copy(source, strict=0)
        gdal.PopErrorHandler()
        self.assertEqual(heard[0][0], gdal.CE_Warning)
        self.assertIn("color table of band 1", heard[0][1])

    def test_bands_that_are_no_picture_stay_none(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 9, 9, 4), gdal.GDT_Byte)
        wanted = [gdal.GCI_RedBand, gdal.GCI_GreenBand, gdal.GCI_BlueBand, gdal.GCI_AlphaBand]
        for number, color in enumerate(wanted):
            source.GetRasterBand(number + 1).SetColorInterpretation(color)
        dataset = gdal.Open(self.copy(source))
        self.assertEqual([dataset.GetRasterBand(n + 1).GetColorInterpretation()
                          for n in range(4)], wanted)
        source.GetRasterBand(1).SetColorInterpretation(gdal.GCI_GrayIndex)
        for number in (2, 3, 4):
            source.GetRasterBand(number).SetColorInterpretation(gdal.GCI_Undefined)
        dataset = gdal.Open(self.copy(source, "grey.pyr"))
        self.assertEqual([dataset.GetRasterBand(n + 1).GetColorInterpretation() for n in range(4)],
                         [gdal.GCI_GrayIndex] + [gdal.GCI_Undefined] * 3)

    def test_there_and_back_for_every_type(self):
        for data_type in TYPES:
            with self.subTest(type=gdal.GetDataTypeName(data_type)):
                array = samples(data_type, 50, 300, 3)
                source = memory_dataset(array, data_type)
                place(source)
                source.GetRasterBand(2).SetDescription("middle")
                if data_type not in COMPLEX:
                    for number in (1, 2, 3):
                        source.GetRasterBand(number).SetNoDataValue(9)
                back = gdal.GetDriverByName("GTiff").CreateCopy(
                    self.path("back.tif"), gdal.Open(self.copy(source)))
                back = None
                back = gdal.Open(self.path("back.tif"))
                np.testing.assert_array_equal(back.ReadAsArray(), array)
                self.assertEqual(back.GetGeoTransform(), source.GetGeoTransform())
                self.assertEqual(back.GetRasterBand(2).GetDescription(), "middle")
                self.assertEqual(back.GetRasterBand(2).GetNoDataValue(),
                                 source.GetRasterBand(2).GetNoDataValue())


class BlockByBlock(FolderTest):
    def create(self, width, height, bands, data_type, options=()):
        return gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), width, height, bands,
                                                   data_type, list(options))

    def test_windows_in_any_order_for_every_type_and_ordering(self):
        random = np.random.default_rng(5)
        for data_type in TYPES:
            for bands in (1, 3, 10):
                array = samples(data_type, 300, 530, bands)
                dataset = self.create(530, 300, bands, data_type, ["STATISTICS=NO"])
                pieces = [(x, y, b) for x in range(0, 530, 100) for y in range(0, 300, 90)
                          for b in range(bands)]
                for index in random.permutation(len(pieces)):
                    x, y, b = pieces[index]
                    dataset.GetRasterBand(b + 1).WriteArray(array[b, y:y + 90, x:x + 100], x, y)
                np.testing.assert_array_equal(dataset.GetRasterBand(1).ReadAsArray(), array[0])
                del dataset
                made = gdal.Open(self.path("new.pyr"))
                np.testing.assert_array_equal(made.ReadAsArray().reshape(array.shape), array)
                self.assertEqual(made.GetRasterBand(1).GetOverviewCount(), 2)
                self.assertEqual(self.files(), ["new.pyr"])

    def test_levels_and_statistics_are_made_at_the_end(self):
        array = samples(gdal.GDT_Byte, 300, 530, 3)
        dataset = self.create(530, 300, 3, gdal.GDT_Byte)
        dataset.WriteArray(array)
        self.assertFalse(os.path.exists(self.path("new.pyr")))
        del dataset
        made = gdal.Open(self.path("new.pyr"))
        np.testing.assert_array_equal(made.GetRasterBand(3).GetOverview(0).ReadAsArray(),
                                      halve(array)[2])
        self.assertEqual(made.GetRasterBand(1).GetStatistics(0, 0)[:2], [0.0, 255.0])

    def test_a_small_block_cache_loses_nothing(self):
        before = gdal.GetCacheMax()
        gdal.SetCacheMax(300000)
        self.addCleanup(gdal.SetCacheMax, before)
        for bands in (3, 10):
            array = samples(gdal.GDT_UInt16, 600, 800, bands)
            dataset = self.create(800, 600, bands, gdal.GDT_UInt16)
            for y in range(0, 600, 50):
                dataset.WriteArray(array[:, y:y + 50], 0, y)
            del dataset
            np.testing.assert_array_equal(gdal.Open(self.path("new.pyr")).ReadAsArray(), array)

    def test_what_is_not_written_is_no_data(self):
        dataset = self.create(600, 300, 2, gdal.GDT_Int16)
        dataset.GetRasterBand(1).SetNoDataValue(-5)
        dataset.GetRasterBand(2).SetNoDataValue(-5)
        dataset.GetRasterBand(1).WriteArray(np.ones((10, 10)), 300, 20)
        place(dataset)
        del dataset
        made = gdal.Open(self.path("new.pyr"))
        expected = np.full((2, 300, 600), -5)
        expected[0, 20:30, 300:310] = 1
        np.testing.assert_array_equal(made.ReadAsArray(), expected)
        self.assertEqual(made.GetGeoTransform()[0], 500000)
        self.assertEqual(made.GetRasterBand(1).GetMinimum(), 1)

    def test_what_is_not_written_is_no_data_to_its_last_digit(self):
        for data_type, value in ((gdal.GDT_Int64, 2**53 + 1), (gdal.GDT_UInt64, 2**64 - 2)):
            dataset = self.create(300, 10, 1, data_type)
            dataset.GetRasterBand(1).SetNoDataValue(value)
            dataset.GetRasterBand(1).WriteArray(np.ones((10, 10), TYPES[data_type]))
            del dataset
            made = gdal.Open(self.path("new.pyr"))
            band = made.GetRasterBand(1)
            self.assertEqual(int(band.ReadAsArray(299, 9, 1, 1)[0, 0]), value)
            self.assertEqual(band.GetMaskBand().ReadAsArray(299, 9, 1, 1)[0, 0], 0)

    def test_a_file_that_cannot_be_made_leaves_nothing_behind(self):
        dataset = self.create(30, 30, 1, gdal.GDT_Byte)
        place(dataset)
        dataset.FlushCache()
        self.assertEqual([name for name in self.files() if not name.endswith(".tmp")], [])
        os.mkdir(self.path("new.pyr"))
        try:
            del dataset
        except RuntimeError:
            pass
        self.assertEqual(self.files(), ["new.pyr"])

    @unittest.skipUnless(hasattr(gdal.Dataset, "Close"), "GDAL closes without an answer")
    def test_closing_answers_that_a_file_cannot_be_made(self):
        dataset = self.create(30, 30, 1, gdal.GDT_Byte)
        os.mkdir(self.path("new.pyr"))
        # Where closing throws, Python of 3.10 closes once more.
        gdal.DontUseExceptions()
        self.addCleanup(gdal.UseExceptions)
        self.assertEqual(quiet(dataset.Close), gdal.CE_Failure)
        self.assertIn("cannot replace it: it is a folder", gdal.GetLastErrorMsg())

    def test_options_that_do_not_fit_are_refused_at_once(self):
        for data_type, option in ((gdal.GDT_CFloat32, "RESAMPLING=MEDIAN"),
                                  (gdal.GDT_Byte, "ORDERING=MORTON"), (gdal.GDT_Byte, "LEVELS=9")):
            with self.assertRaises(RuntimeError):
                self.create(30, 30, 1, data_type, [option])
            self.assertEqual(self.files(), [])

    def test_levels_that_do_not_fit_are_refused_at_once_and_forgotten(self):
        dataset = self.create(64, 64, 1, gdal.GDT_CFloat32)
        dataset.GetRasterBand(1).Fill(3)
        for method, factors in (("MEDIAN", [2]), ("NEAREST", [1024])):
            with self.assertRaises(RuntimeError):
                dataset.BuildOverviews(method, factors)
        del dataset
        made = gdal.Open(self.path("new.pyr"))
        self.assertEqual(made.GetRasterBand(1).GetOverviewCount(), 0)
        self.assertEqual(made.ReadAsArray(63, 63, 1, 1)[0, 0], 3)

    def test_color_tables_go_into_the_file(self):
        dataset = self.create(30, 30, 1, gdal.GDT_Byte)
        table = gdal.ColorTable()
        table.SetColorEntry(0, (9, 8, 7, 255))
        dataset.GetRasterBand(1).SetColorTable(table)
        dataset.GetRasterBand(1).Fill(0)
        del dataset
        if os.path.exists(self.path("new.pyr.aux.xml")):
            os.remove(self.path("new.pyr.aux.xml"))
        made = gdal.Open(self.path("new.pyr"))
        self.assertEqual(made.GetRasterBand(1).GetColorTable().GetColorEntry(0), (9, 8, 7, 255))

    def test_color_tables_have_the_colors_of_pixels(self):
        for data_type, shown in ((gdal.GDT_Byte, 256), (gdal.GDT_UInt16, 300)):
            dataset = self.create(30, 30, 1, data_type)
            table = gdal.ColorTable()
            table.SetColorEntry(299, (9, 8, 7, 255))
            dataset.GetRasterBand(1).SetColorTable(table)
            del dataset
            made = gdal.Open(self.path("new.pyr"))
            self.assertEqual(made.GetRasterBand(1).GetColorTable().GetCount(), shown)
            del made
            os.remove(self.path("new.pyr"))

    def test_signed_bytes(self):
        dataset = self.create(300, 10, 2, gdal.GDT_Byte, ["PIXELTYPE=SIGNEDBYTE"])
        array = samples(gdal.GDT_Byte, 10, 300, 2)
        for number in (1, 2):
            dataset.GetRasterBand(number).WriteRaster(0, 0, 300, 10, array[number - 1].tobytes(),
                                                      buf_type=gdal.GDT_Byte)
        del dataset
        made = gdal.Open(self.path("new.pyr"))
        np.testing.assert_array_equal(made.ReadAsArray(), array.view(np.int8).astype(np.int16))

    def test_levels_asked_for_before_the_end(self):
        array = samples(gdal.GDT_Byte, 64, 64, 1)
        dataset = self.create(64, 64, 1, gdal.GDT_Byte)
        dataset.GetRasterBand(1).WriteArray(array[0])
        with self.assertRaises(RuntimeError):
            dataset.BuildOverviews("AVERAGE", [3])
        dataset.BuildOverviews("NEAREST", [2, 4])
        del dataset
        band = gdal.Open(self.path("new.pyr"))
        self.assertEqual(band.GetRasterBand(1).GetOverviewCount(), 2)
        np.testing.assert_array_equal(band.GetRasterBand(1).GetOverview(1).ReadAsArray(),
                                      array[0, ::4, ::4])

    def test_what_cannot_be_made_is_refused(self):
        for arguments in ((5, 5, 0, gdal.GDT_Byte),):
            with self.assertRaises(RuntimeError):
                self.create(*arguments)
        with self.assertRaises(RuntimeError):
            gdal.GetDriverByName(DRIVER).Create("/vsicurl/http://127.0.0.1:9/new.pyr", 5, 5, 1)
        self.assertEqual(self.files(), [])


class Updates(FolderTest):
    def setUp(self):
        super().setUp()
        self.array = samples(gdal.GDT_Byte, 600, 700, 3)
        self.name = self.copy(memory_dataset(self.array, gdal.GDT_Byte))

    def test_blocks_written_in_place(self):
        dataset = gdal.Open(self.name, gdal.GA_Update)
        self.array[1, 250:270, 500:600] = 7
        dataset.GetRasterBand(2).WriteArray(self.array[1, 250:270, 500:600], 500, 250)
        np.testing.assert_array_equal(dataset.ReadAsArray(), self.array)
        del dataset
        np.testing.assert_array_equal(gdal.Open(self.name).ReadAsArray(), self.array)

    def test_blocks_of_morton_files_written_in_place(self):
        array = samples(gdal.GDT_Byte, 600, 700, 11)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte), "morton.pyr")
        dataset = gdal.Open(name, gdal.GA_Update)
        array[9, 500:, 600:] = 7
        dataset.GetRasterBand(10).WriteArray(array[9, 500:, 600:], 600, 500)
        del dataset
        np.testing.assert_array_equal(gdal.Open(name).ReadAsArray(), array)

    def test_levels_are_renewed_exactly(self):
        for method in ("AVERAGE", "NEAREST", "CUBIC", "LANCZOS", "MODE", "BILINEAR", "RMS"):
            dataset = gdal.Open(self.name, gdal.GA_Update)
            dataset.BuildOverviews(method, [2, 4])
            renewed = [dataset.GetRasterBand(b).GetOverview(i).ReadAsArray()
                       for b in (1, 2, 3) for i in (0, 1)]
            del dataset
            built = gdal.Open(self.copy(memory_dataset(self.array, gdal.GDT_Byte), "built.pyr",
                                        options=["RESAMPLING=" + method]))
            expected = [built.GetRasterBand(b).GetOverview(i).ReadAsArray()
                        for b in (1, 2, 3) for i in (0, 1)]
            for a, b in zip(renewed, expected):
                np.testing.assert_array_equal(a, b, method)
            reread = gdal.Open(self.name).GetRasterBand(1)
        self.assertEqual(self.files(), ["built.pyr", "raster.pyr"])

    def test_levels_are_renewed_by_alpha_masks_and_every_method(self):
        for method in ("gauss", "cubicspline", "average", "lanczos"):
            with self.subTest(method):
                array = samples(gdal.GDT_Byte, 500, 700, 4)
                array[3] = np.where(array[3] > 99, 255, 0)
                source = memory_dataset(array, gdal.GDT_Byte)
                for number, meaning in enumerate((gdal.GCI_RedBand, gdal.GCI_GreenBand,
                                                  gdal.GCI_BlueBand, gdal.GCI_AlphaBand)):
                    source.GetRasterBand(number + 1).SetColorInterpretation(meaning)
                built = self.copy(source, options=["RESAMPLING=" + method])
                expected = [gdal_levels(built, number) for number in (1, 4)]
                plain = self.copy(source, "plain.zmc", options=["RESAMPLING=" + method,
                                                                "WEIGHTS=NONE"])
                self.assertFalse((gdal_levels(plain, 1)[0] == expected[0][0]).all())
                dataset = gdal.Open(plain, gdal.GA_Update)
                dataset.BuildOverviews(method, [2, 4])
                dataset = None
                for number, levels in zip((1, 4), expected):
                    for ours, theirs in zip(gdal_levels(plain, number), levels):
                        np.testing.assert_array_equal(ours, theirs)

    def test_levels_without_room_are_refused(self):
        dataset = gdal.Open(self.name, gdal.GA_Update)
        for factors in ([8], [3], []):
            with self.assertRaises(RuntimeError):
                quiet(lambda: dataset.BuildOverviews("AVERAGE", factors))
        with self.assertRaises(RuntimeError):
            quiet(lambda: dataset.BuildOverviews("AVERAGE_MAGPHASE", [2]))
        with self.assertRaises(RuntimeError):
            quiet(lambda: gdal.Open(self.name).BuildOverviews("AVERAGE", [2]))
        del dataset
        self.assertEqual(self.files(), ["raster.pyr"])

    def test_statistics_histograms_and_color_tables_are_stored_in_the_file(self):
        dataset = gdal.Open(self.name, gdal.GA_Update)
        band = dataset.GetRasterBand(2)
        band.SetStatistics(1, 2, 1.5, 0.25)
        band.SetDefaultHistogram(-0.5, 3.5, [4, 3, 2, 1])
        table = gdal.ColorTable()
        table.SetColorEntry(0, (9, 8, 7, 255))
        band.SetColorTable(table)
        del band, dataset
        self.assertEqual(self.files(), ["raster.pyr"])
        dataset = gdal.Open(self.name)
        band = dataset.GetRasterBand(2)
        self.assertEqual(band.GetStatistics(0, 0), [1, 2, 1.5, 0.25])
        self.assertEqual(band.GetDefaultHistogram(force=0), (-0.5, 3.5, 4, [4, 3, 2, 1]))
        self.assertEqual(band.GetColorTable().GetColorEntry(0), (9, 8, 7, 255))
        self.assertEqual(dataset.GetRasterBand(1).GetMinimum(), 0)
        self.assertEqual(dataset.GetRasterBand(3).GetMaximum(), 255)

    def test_stores_that_keep_copies_leave_none_and_need_one(self):
        def store(maximum, *options):
            dataset = gdal.OpenEx(self.name, gdal.OF_UPDATE, open_options=list(options))
            dataset.GetRasterBand(2).SetStatistics(1, maximum, 1.5, 0.25)

        def maximum():
            dataset = gdal.Open(self.name)
            return dataset.GetRasterBand(2).GetStatistics(0, 0)[1]

        store(2, "KEEP_COPIES=YES")
        self.assertEqual((maximum(), self.files()), (2, ["raster.pyr"]))
        # Where no copy can be made, nothing is stored over the only document.
        os.mkdir(self.name + ".zmcmeta")
        with self.assertRaises(RuntimeError):
            quiet(lambda: store(3, "KEEP_COPIES=YES"))
        self.assertEqual(maximum(), 2)
        store(4, "KEEP_COPIES=NO")
        self.assertEqual(maximum(), 4)

    def test_statistics_are_shown_again_when_they_are_renewed(self):
        dataset = gdal.Open(self.name, gdal.GA_Update)
        dataset.GetRasterBand(2).WriteArray(np.full((600, 700), 9, np.uint8))
        del dataset
        dataset = gdal.Open(self.name, gdal.GA_Update)
        self.assertIsNone(dataset.GetRasterBand(2).GetMetadataItem("STATISTICS_MEAN"))
        dataset.GetRasterBand(2).ComputeStatistics(False)
        del dataset
        dataset = gdal.Open(self.name)
        self.assertEqual(dataset.GetRasterBand(2).GetStatistics(0, 0), [9, 9, 9, 0])

    def test_statistics_of_a_sidecar_go_when_pixels_change(self):
        source = memory_dataset(self.array, gdal.GDT_Byte)
        name = self.copy(source, "plain.pyr", options=["STATISTICS=NO"])
        dataset = gdal.Open(name)
        for number in (2, 3):
            dataset.GetRasterBand(number).ComputeStatistics(False)
        del dataset
        dataset = gdal.Open(name, gdal.GA_Update)
        dataset.GetRasterBand(2).SetMetadataItem("kept", "yes")
        dataset.GetRasterBand(2).WriteArray(np.full((600, 700), 9, np.uint8))
        del dataset
        dataset = gdal.Open(name)
        self.assertEqual(dataset.GetRasterBand(2).GetMetadata(), {"kept": "yes"})
        self.assertEqual(dataset.GetRasterBand(3).GetStatistics(0, 0)[1], 255)

    def test_no_data_goes_to_the_sidecar_and_into_the_masks(self):
        dataset = gdal.Open(self.name, gdal.GA_Update)
        dataset.GetRasterBand(1).SetNoDataValue(40)
        mask = dataset.GetRasterBand(1).GetMaskBand().ReadAsArray()
        np.testing.assert_array_equal(mask == 0, self.array[0] == 40)
        dataset.GetRasterBand(1).DeleteNoDataValue()
        self.assertEqual(dataset.GetRasterBand(1).GetMaskFlags(), gdal.GMF_ALL_VALID)
        dataset.GetRasterBand(1).SetNoDataValue(41)
        del dataset
        self.assertEqual(self.files(), ["raster.pyr", "raster.pyr.aux.xml"])
        dataset = gdal.Open(self.name)
        mask = dataset.GetRasterBand(1).GetMaskBand().ReadAsArray()
        np.testing.assert_array_equal(mask == 0, self.array[0] == 41)

    def test_moving_copying_and_deleting_take_the_sidecar_along(self):
        dataset = gdal.Open(self.name, gdal.GA_Update)
        place(dataset)
        del dataset
        driver = gdal.GetDriverByName(DRIVER)
        driver.CopyFiles(self.path("copy.pyr"), self.name)
        driver.Rename(self.path("moved.pyr"), self.name)
        self.assertEqual(self.files(), ["copy.pyr", "copy.pyr.aux.xml", "moved.pyr",
                                        "moved.pyr.aux.xml"])
        self.assertEqual(gdal.Open(self.path("moved.pyr")).GetGeoTransform()[0], 500000)
        driver.Delete(self.path("copy.pyr"))
        driver.Delete(self.path("moved.pyr"))
        self.assertEqual(self.files(), [])


if __name__ == "__main__":
    unittest.main()
