"""Reading pyramids through GDAL."""
import os
import threading
import unittest

import numpy as np
from osgeo import gdal, osr

from rasters import (COMPLEX, DRIVER, SIGNED_BYTE, TYPES, FolderTest, halve, memory_dataset, place,
                     samples)


def osr_text(code):
    reference = osr.SpatialReference()
    reference.ImportFromEPSG(code)
    return reference.ExportToWkt()


class Reading(FolderTest):
    def test_the_driver_is_described_and_its_options_are_xml(self):
        driver = gdal.GetDriverByName(DRIVER)
        self.assertEqual(driver.LongName, "Pyramid raster")
        for item in ("DMD_OPENOPTIONLIST", "DMD_CREATIONOPTIONLIST"):
            tree = gdal.ParseXMLString(driver.GetMetadataItem(item))
            self.assertGreater(len(tree), 2)
        with self.assertRaises(RuntimeError):
            self.copy(memory_dataset(samples(gdal.GDT_Byte, 4, 4, 1), gdal.GDT_Byte),
                      options=["RESAMPLING=WISHFUL"])

    def test_every_type_and_every_way_to_read_it(self):
        for data_type in TYPES:
            for bands in (1, 3, 12):
                with self.subTest(type=gdal.GetDataTypeName(data_type), bands=bands):
                    array = samples(data_type, 300, 517, bands)
                    name = self.copy(memory_dataset(array, data_type), options=["STATISTICS=NO"])
                    dataset = gdal.Open(name)
                    self.assertEqual(dataset.GetRasterBand(1).DataType, data_type)
                    self.assertEqual(dataset.GetRasterBand(1).GetBlockSize(), [256, 256])
                    np.testing.assert_array_equal(np.atleast_3d(dataset.ReadAsArray()).reshape(
                        array.shape), array)
                    self.read_pieces(dataset, array)

    def read_pieces(self, dataset, array):
        """Windows, single bands, blocks and pixel-interleaved buffers agree with the array."""
        bands, height, width = array.shape
        for x, y, w, h in ((0, 0, 256, 256), (256, 256, 256, 44), (512, 0, 5, 256), (3, 5, 7, 1),
                           (200, 200, 200, 90), (255, 255, 2, 2)):
            part = array[:, y:y + h, x:x + w]
            read = dataset.ReadAsArray(x, y, w, h)
            np.testing.assert_array_equal(read.reshape(part.shape), part)
            band = dataset.GetRasterBand(bands)
            np.testing.assert_array_equal(band.ReadAsArray(x, y, w, h), part[-1])
            raw = dataset.ReadRaster(x, y, w, h, buf_pixel_space=part.itemsize * bands,
                                     buf_line_space=part.itemsize * bands * w,
                                     buf_band_space=part.itemsize)
            mixed = np.frombuffer(raw, array.dtype).reshape(h, w, bands)
            np.testing.assert_array_equal(mixed, part.transpose(1, 2, 0))
        block = np.frombuffer(dataset.GetRasterBand(1).ReadBlock(2, 1), array.dtype)
        block = block.reshape(256, 256)
        np.testing.assert_array_equal(block[:44, :5], array[0, 256:, 512:])
        self.assertFalse(block[44:].any() or block[:, 5:].any())

    def test_bands_in_any_order_and_other_buffer_types(self):
        array = samples(gdal.GDT_Int16, 300, 300, 4)
        dataset = gdal.Open(self.copy(memory_dataset(array, gdal.GDT_Int16)))
        raw = dataset.ReadRaster(10, 20, 270, 260, band_list=[4, 1, 1],
                                 buf_type=gdal.GDT_Float64)
        read = np.frombuffer(raw, np.float64).reshape(3, 260, 270)
        np.testing.assert_array_equal(read, array[[3, 0, 0], 20:280, 10:280].astype(float))

    def test_signed_bytes(self):
        array = samples(gdal.GDT_Byte, 300, 270, 2)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte), options=["PIXELTYPE=SIGNEDBYTE"])
        signed = array.view(np.int8)
        wide = gdal.Open(name)
        self.assertEqual(wide.GetRasterBand(1).DataType, SIGNED_BYTE)
        np.testing.assert_array_equal(wide.ReadAsArray(), signed.astype(np.int16))
        np.testing.assert_array_equal(wide.GetRasterBand(2).ReadAsArray(), signed[1])
        self.assertEqual(wide.GetMetadataItem("PIXEL_TYPE", "ZMCPYRAMID"), "Char")
        self.assertEqual(wide.GetRasterBand(1).GetMinimum(), signed[0].min())
        asked = gdal.OpenEx(name, open_options=["INT8_AS=INT16"])
        self.assertEqual(asked.GetRasterBand(1).DataType, gdal.GDT_Int16)
        np.testing.assert_array_equal(asked.ReadAsArray(), signed.astype(np.int16))
        flagged = gdal.OpenEx(name, open_options=["INT8_AS=SIGNEDBYTE"])
        band = flagged.GetRasterBand(1)
        self.assertEqual(band.DataType, gdal.GDT_Byte)
        self.assertEqual(band.GetMetadataItem("PIXELTYPE", "IMAGE_STRUCTURE"), "SIGNEDBYTE")
        np.testing.assert_array_equal(flagged.ReadAsArray().view(np.uint8), array)
        # The flag is understood when the dataset is a source.
        again = gdal.Open(self.copy(flagged, "again.pyr"))
        self.assertEqual(again.GetMetadataItem("PIXEL_TYPE", "ZMCPYRAMID"), "Char")
        np.testing.assert_array_equal(again.ReadAsArray(), signed.astype(np.int16))

    def test_levels_as_datasets_have_the_pixel_size_that_they_cover(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 1021, 1023, 1), gdal.GDT_Byte)
        source.SetGeoTransform([1000, 300.0379, 0.25, 2000, -0.5, -299.9])
        source.SetProjection(srs := osr_text(32633))
        dataset = gdal.Open(self.copy(source, options=["LEVELS=3"]))
        for index in range(3):
            level = dataset.GetRasterBand(1).GetOverview(index).GetDataset()
            size = 2 << index
            self.assertEqual(level.GetGeoTransform(), (1000, size * 300.0379, size * 0.25, 2000,
                                                       size * -0.5, size * -299.9))
            self.assertEqual(level.GetProjection(), dataset.GetProjection())
        self.assertIn("32633", srs)
        for index, width in enumerate((511, 255, 127)):
            for word in ("%d", "%d only"):
                level = gdal.OpenEx(dataset.GetDescription(),
                                    open_options=["OVERVIEW_LEVEL=" + word % index])
                self.assertEqual(level.RasterXSize, width)
                np.testing.assert_allclose(
                    level.GetGeoTransform(),
                    dataset.GetRasterBand(1).GetOverview(index).GetDataset().GetGeoTransform(),
                    rtol=1e-15)
                np.testing.assert_array_equal(
                    level.ReadAsArray(), dataset.GetRasterBand(1).GetOverview(index).ReadAsArray())
        # That of a translation with -ovr is stretched over the whole raster, without a word to us.
        stretched = gdal.Translate("", dataset, format="MEM", overviewLevel=2)
        self.assertEqual(stretched.GetGeoTransform()[1], 300.0379 * (1023 / 127))

    def test_levels_of_a_raster_without_georeference_have_none(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 600, 600, 1), gdal.GDT_Byte)
        dataset = gdal.Open(self.copy(source))
        level = dataset.GetRasterBand(1).GetOverview(0).GetDataset()
        self.assertIsNone(level.GetGeoTransform(can_return_null=True))

    def test_levels_are_overviews_of_their_exact_size(self):
        array = samples(gdal.GDT_Byte, 777, 1001, 3)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte))
        dataset = gdal.Open(name)
        band = dataset.GetRasterBand(2)
        self.assertEqual(band.GetOverviewCount(), 2)
        expected = halve(array)
        for index in range(2):
            overview = band.GetOverview(index)
            self.assertEqual((overview.YSize, overview.XSize), expected.shape[1:])
            np.testing.assert_array_equal(overview.ReadAsArray(), expected[1])
            level = gdal.OpenEx(name, open_options=["OVERVIEW_LEVEL=%d" % index])
            np.testing.assert_array_equal(level.ReadAsArray(), expected)
            # A request of the level's size is answered by the level.
            height, width = expected.shape[1:]
            whole = dataset.ReadAsArray(0, 0, 1001, 777, buf_xsize=width, buf_ysize=height)
            np.testing.assert_array_equal(whole, expected)
            np.testing.assert_array_equal(
                band.ReadAsArray(0, 0, 1001, 777, width, height), expected[1])
            expected = halve(expected)

    def test_colors_of_bands(self):
        def names(bands, data_type=gdal.GDT_Byte):
            array = samples(data_type, 5, 5, bands)
            dataset = gdal.Open(self.copy(memory_dataset(array, data_type)))
            return [gdal.GetColorInterpretationName(
                dataset.GetRasterBand(n + 1).GetColorInterpretation()) for n in range(bands)]
        self.assertEqual(names(1), ["Gray"])
        self.assertEqual(names(2), ["Gray", "Undefined"])
        self.assertEqual(names(2, gdal.GDT_Float32), ["Gray", "Undefined"])

    def test_palettes_are_color_tables(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 40, 600, 1) % 4, gdal.GDT_Byte)
        table = gdal.ColorTable()
        colors = [(1, 2, 3, 255), (250, 0, 9, 128), (0, 0, 0, 0), (7, 7, 7, 255)]
        for index, color in enumerate(colors):
            table.SetColorEntry(index, color)
        source.GetRasterBand(1).SetColorTable(table)
        name = self.copy(source)
        self.assertEqual(self.files(), ["raster.pyr"])
        dataset = gdal.Open(name)
        for band in (dataset.GetRasterBand(1), dataset.GetRasterBand(1).GetOverview(0)):
            self.assertEqual(band.GetColorInterpretation(), gdal.GCI_PaletteIndex)
            read = band.GetColorTable()
            self.assertEqual([read.GetColorEntry(i) for i in range(read.GetCount())], colors)

    def test_statistics_and_histograms_need_no_scan(self):
        array = samples(gdal.GDT_UInt16, 300, 400, 2)
        array[0, :9, :9] = 5
        source = memory_dataset(array, gdal.GDT_UInt16)
        source.GetRasterBand(1).SetNoDataValue(5)
        name = self.copy(source)
        dataset = gdal.Open(name)
        for index in range(2):
            valid = array[index][array[index] != 5].astype(np.float64)
            if index == 1:
                valid = array[index].astype(np.float64)
            band = dataset.GetRasterBand(index + 1)
            expected = [valid.min(), valid.max(), valid.mean(), valid.std()]
            np.testing.assert_allclose(band.GetStatistics(False, False), expected, rtol=1e-12)
            self.assertEqual([band.GetMinimum(), band.GetMaximum()], expected[:2])
            self.assertEqual(float(band.GetMetadata()["STATISTICS_MEAN"]), band.GetStatistics(
                False, False)[2])
            lower, upper, count, counts = band.GetDefaultHistogram(force=False)
            self.assertEqual((count, sum(counts)), (256, valid.size))
            self.assertEqual(upper - lower, valid.max() + 1 - valid.min())
            model, _ = np.histogram(valid, bins=256, range=(lower, upper))
            np.testing.assert_array_equal(counts, model)
        self.assertEqual(self.files(), ["raster.pyr", "raster.pyr.aux.xml"])

    def test_histograms_of_bytes_are_those_of_gdal(self):
        array = samples(gdal.GDT_Byte, 300, 400, 1)
        source = memory_dataset(array, gdal.GDT_Byte)
        dataset = gdal.Open(self.copy(source))
        self.assertEqual(dataset.GetRasterBand(1).GetDefaultHistogram(),
                         source.GetRasterBand(1).GetDefaultHistogram())

    def test_own_metadata(self):
        array = samples(gdal.GDT_Byte, 300, 600, 12)
        dataset = gdal.Open(self.copy(memory_dataset(array, gdal.GDT_Byte)))
        own = dataset.GetMetadata("ZMCPYRAMID")
        self.assertEqual((own["ORDERING"], own["VERSION"], own["COMPLETE"], own["LEVEL_MAX"]),
                         ("Morton", "1.1", "YES", "2"))
        self.assertEqual(dataset.GetMetadataItem("INTERLEAVE", "IMAGE_STRUCTURE"), "BAND")
        self.assertIn("ZMCPYRAMID", dataset.GetMetadataDomainList())
        few = gdal.Open(self.copy(memory_dataset(array[:3], gdal.GDT_Byte), "few.pyr",
                                  options=["ORDERING=SCANLINE"]))
        self.assertEqual(few.GetMetadataItem("ORDERING", "ZMCPYRAMID"), "Scanline")
        self.assertEqual(few.GetMetadataItem("INTERLEAVE", "IMAGE_STRUCTURE"), "PIXEL")

    def test_reading_writes_nothing(self):
        array = samples(gdal.GDT_Byte, 300, 400, 3)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte))
        before = os.stat(name)
        dataset = gdal.Open(name)
        gdal.Info(dataset, options=["-hist", "-stats", "-checksum", "-mdd", "all"])
        self.assertEqual(len(self.descriptors()), 1)
        del dataset
        after = os.stat(name)
        self.assertEqual(self.files(), ["raster.pyr"])
        self.assertEqual((before.st_mtime_ns, before.st_size), (after.st_mtime_ns, after.st_size))
        self.assertEqual(self.descriptors(), [])

    def test_no_other_driver_claims_the_file(self):
        name = self.copy(memory_dataset(samples(gdal.GDT_Byte, 30, 40, 1), gdal.GDT_Byte))
        self.assertEqual(gdal.IdentifyDriver(name).ShortName, DRIVER)
        others = [gdal.GetDriver(i).ShortName for i in range(gdal.GetDriverCount())]
        others.remove(DRIVER)
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        self.addCleanup(gdal.PopErrorHandler)
        self.assertIsNone(gdal.IdentifyDriverEx(name, allowed_drivers=others))

    def test_incomplete_files_show_what_they_have_and_say_so(self):
        array = samples(gdal.GDT_Byte, 777, 1001, 1)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte), options=["STATISTICS=NO"])
        whole = os.stat(name).st_size
        with open(name, "rb") as file:
            end = file.read().rfind(b"<?xml")
        self.assertLess(end, 20 + 1)  # without statistics there is no second document
        os.truncate(name, whole - 1000)
        warnings = []
        gdal.PushErrorHandler(lambda kind, number, text: warnings.append(text))
        try:
            dataset = gdal.Open(name)
        finally:
            gdal.PopErrorHandler()
        self.assertEqual(len(warnings), 1)
        self.assertIn("1000 bytes are missing", warnings[0])
        self.assertEqual(dataset.GetMetadata("ZMCPYRAMID")["BYTES_MISSING"], "1000")
        self.assertEqual(dataset.GetMetadata("ZMCPYRAMID")["COMPLETE"], "NO")
        band = dataset.GetRasterBand(1)
        np.testing.assert_array_equal(dataset.ReadAsArray(0, 0, 1001, 768), array[0, :768])
        np.testing.assert_array_equal(band.ReadAsArray(0, 0, 512, 777), array[0, :, :512])
        # The finest level is the last in the file.
        self.assertEqual(band.GetOverviewCount(), 2)
        np.testing.assert_array_equal(band.GetOverview(0).ReadAsArray(), halve(array)[0])
        for read in (dataset.ReadAsArray, band.ReadAsArray, lambda: band.ReadBlock(3, 3)):
            with self.assertRaisesRegex(RuntimeError, "its file ends before the pixels at 768, 768"):
                read()
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        dataset = gdal.OpenEx(name, open_options=["MISSING=ZEROS"])
        gdal.PopErrorHandler()
        zeros = dataset.ReadAsArray()
        np.testing.assert_array_equal(zeros[:768], array[0, :768])
        self.assertFalse(zeros[-1, -100:].any())

    def test_levels_and_bands_that_an_incomplete_file_lacks(self):
        for bands, ordering, most in ((3, "SCANLINE", 3), (3, "BLOCKED", 3), (11, "MORTON", 0)):
            array = samples(gdal.GDT_Byte, 600, 1100, bands)
            name = self.copy(memory_dataset(array, gdal.GDT_Byte), f"{ordering}.pyr",
                             options=["STATISTICS=NO", "ORDERING=" + ordering])
            whole = gdal.Open(name)
            band = whole.GetRasterBand(1)
            levels = [band.GetOverview(i).ReadAsArray() for i in range(band.GetOverviewCount())]
            del band, whole
            size = os.path.getsize(name)
            for share in (0.9, 0.5, 0.25, 0.15, 0.05, 0.02):
                os.truncate(name, int(size * share))
                gdal.PushErrorHandler("CPLQuietErrorHandler")
                dataset = gdal.Open(name)
                band = dataset.GetRasterBand(1)
                shown = [band.GetOverview(i) for i in range(band.GetOverviewCount())]
                self.assertLessEqual(len(shown), most)
                for level in shown:
                    expected = next(each for each in levels if each.shape == (level.YSize,
                                                                              level.XSize))
                    np.testing.assert_array_equal(level.ReadAsArray(), expected)
                held = 0
                for number in range(bands):
                    for y in range(0, 600, 256):
                        for x in range(0, 1100, 256):
                            try:
                                read = dataset.GetRasterBand(number + 1).ReadAsArray(
                                    x, y, min(256, 1100 - x), min(256, 600 - y))
                            except RuntimeError:
                                continue
                            held += read.size
                            np.testing.assert_array_equal(
                                read, array[number, y:y + 256, x:x + 256])
                gdal.PopErrorHandler()
                # Nothing but what is not there is refused: the rest of one row of tiles at most.
                levels_size = sum(each.size for each in levels) * bands
                if ordering != "MORTON":
                    least = int(size * share) - 1000 - levels_size - 256 * 256 * bands
                    self.assertGreaterEqual(held, least)
                elif share > 0.02:
                    self.assertGreater(held, 0)

    def test_damaged_files_are_refused(self):
        name = self.copy(memory_dataset(samples(gdal.GDT_Byte, 30, 40, 1), gdal.GDT_Byte))
        with open(name, "rb") as file:
            content = file.read()
        for at in list(range(0, 24)) + list(range(24, 900, 11)):
            with open(self.path("bad.pyr"), "wb") as file:
                file.write(content[:at] + bytes([content[at] ^ 0x55]) + content[at + 1:])
            gdal.PushErrorHandler("CPLQuietErrorHandler")
            try:
                dataset = gdal.Open(self.path("bad.pyr"))
                dataset.GetRasterBand(1).Checksum()
            except RuntimeError:
                pass
            finally:
                gdal.PopErrorHandler()

    def test_eight_threads_with_a_dataset_each(self):
        array = samples(gdal.GDT_UInt16, 700, 900, 3)
        name = self.copy(memory_dataset(array, gdal.GDT_UInt16))
        def sums():
            dataset = gdal.Open(name)
            return [dataset.GetRasterBand(n).Checksum() for n in (1, 2, 3)] + [
                dataset.GetRasterBand(n).GetOverview(0).Checksum() for n in (1, 2, 3)]
        expected, found = sums(), [None] * 8
        def run(index):
            for _ in range(5):
                found[index] = sums()
        threads = [threading.Thread(target=run, args=(i,)) for i in range(8)]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join()
        self.assertEqual(found, [expected] * 8)

    def test_a_viewers_windows_are_those_of_a_geotiff_with_the_same_levels(self):
        array = samples(gdal.GDT_Byte, 1200, 1500, 3)
        name = self.copy(memory_dataset(array, gdal.GDT_Byte))
        pyramid = gdal.Open(name)
        tiff = gdal.GetDriverByName("GTiff").CreateCopy(
            self.path("same.tif"), memory_dataset(array, gdal.GDT_Byte),
            options=["TILED=YES", "INTERLEAVE=PIXEL"])
        bands = [pyramid.GetRasterBand(n) for n in (1, 2, 3)]
        tiff.BuildOverviews("NONE", [2, 4, 8])
        for index in range(bands[0].GetOverviewCount()):
            for number in (1, 2, 3):
                level = bands[number - 1].GetOverview(index)
                twin = tiff.GetRasterBand(number).GetOverview(index)
                # GDAL rounds sizes up, pyramids cut them: the last line or column repeats.
                data = np.pad(level.ReadAsArray(), ((0, twin.YSize - level.YSize),
                                                    (0, twin.XSize - level.XSize)), mode="edge")
                twin.WriteArray(data)
        tiff.FlushCache()
        random = np.random.default_rng(7)
        for _ in range(60):
            zoom = int(random.choice([1, 2, 4]))
            w, h = int(random.integers(20, 150)), int(random.integers(20, 150))
            x = int(random.integers(0, (1200 - w * zoom) // zoom)) * zoom
            y = int(random.integers(0, (900 - h * zoom) // zoom)) * zoom
            window = (x, y, w * zoom, h * zoom)
            np.testing.assert_array_equal(
                pyramid.ReadAsArray(*window, buf_xsize=w, buf_ysize=h),
                tiff.ReadAsArray(*window, buf_xsize=w, buf_ysize=h), str((window, zoom)))


class Masks(FolderTest):
    def test_floating_bands_mask_what_is_not_finite(self):
        array = samples(gdal.GDT_Float32, 300, 300, 3)
        array[0, 5, 7], array[1, 260, 270], array[2, 0, 0] = np.nan, np.inf, -np.inf
        dataset = gdal.Open(self.copy(memory_dataset(array, gdal.GDT_Float32)))
        for index in range(3):
            mask = dataset.GetRasterBand(index + 1).GetMaskBand()
            np.testing.assert_array_equal(mask.ReadAsArray() == 255, np.isfinite(array[index]))
            level = dataset.GetRasterBand(index + 1).GetOverview(0)
            np.testing.assert_array_equal(level.GetMaskBand().ReadAsArray() == 255,
                                          np.isfinite(level.ReadAsArray()))

    def test_no_data_values_of_every_type(self):
        for data_type, kind in TYPES.items():
            with self.subTest(type=gdal.GetDataTypeName(data_type)):
                array = samples(data_type, 300, 300, 2)
                array[0, 10:20, 250:260] = 17
                array[1, 30, 30] = 18
                source = memory_dataset(array, data_type)
                source.GetRasterBand(1).SetNoDataValue(17)
                source.GetRasterBand(2).SetNoDataValue(18)
                dataset = gdal.Open(self.copy(source))
                for index, value in ((0, 17), (1, 18)):
                    band = dataset.GetRasterBand(index + 1)
                    self.assertEqual(band.GetNoDataValue(), value)
                    self.assertEqual(band.GetMaskFlags(), gdal.GMF_NODATA)
                    expected = (array[index] != value) * 255
                    np.testing.assert_array_equal(band.GetMaskBand().ReadAsArray(), expected)
                    np.testing.assert_array_equal(
                        band.GetMaskBand().ReadAsArray(3, 11, 290, 1), expected[11:12, 3:293])

    def test_large_integers_are_told_apart(self):
        array = np.full((1, 4, 4), 2**62, np.int64)
        array[0, 1, 1] += 1
        source = memory_dataset(array, gdal.GDT_Int64)
        source.GetRasterBand(1).SetNoDataValue(2**62 + 1)
        # The reducers know doubles only, so a strict copy is refused.
        with self.assertRaisesRegex(RuntimeError, "last digits of the no-data value"):
            self.copy(source)
        self.assertEqual(self.files(), [])
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        self.addCleanup(gdal.PopErrorHandler)
        dataset = gdal.Open(self.copy(source, strict=0))
        mask = dataset.GetRasterBand(1).GetMaskBand().ReadAsArray()
        self.assertEqual((mask == 0).sum(), 1)
        self.assertEqual(mask[1, 1], 0)

    def test_integers_without_no_data_are_all_valid(self):
        dataset = gdal.Open(self.copy(memory_dataset(samples(gdal.GDT_Byte, 9, 9, 1),
                                                     gdal.GDT_Byte)))
        self.assertEqual(dataset.GetRasterBand(1).GetMaskFlags(), gdal.GMF_ALL_VALID)

    def test_a_translated_float_raster_gets_no_mask_file(self):
        name = self.copy(memory_dataset(samples(gdal.GDT_Float32, 60, 60, 1), gdal.GDT_Float32))
        gdal.Translate(self.path("plain.tif"), name)
        self.assertEqual(self.files(), ["plain.tif", "raster.pyr", "raster.pyr.aux.xml"])

    def test_the_sidecar_carries_the_place(self):
        source = memory_dataset(samples(gdal.GDT_Byte, 9, 9, 1), gdal.GDT_Byte)
        place(source)
        dataset = gdal.Open(self.copy(source))
        self.assertEqual(dataset.GetGeoTransform(), source.GetGeoTransform())
        self.assertTrue(dataset.GetSpatialRef().IsSame(source.GetSpatialRef()))


if __name__ == "__main__":
    unittest.main()
