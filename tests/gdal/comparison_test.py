"""What GTiff, COG and pyramids can do, side by side: the rows of the table in docs/gdal.md."""
import gzip
import importlib
import os
import re
import subprocess
import unittest

import numpy as np
from osgeo import gdal, osr

from rasters import (DRIVER, TYPES, FolderTest, file_sizes_up_to, memory_dataset, place,
                     samples)
from server import Server

PAGE = os.path.join(os.path.dirname(__file__), "..", "..", "docs", "gdal.md")
ENDINGS = {"GTiff": ".tif", "COG": ".tif", DRIVER: ".pyr"}
VERSION = int(gdal.VersionInfo()) // 10000 % 100  # the minor one
# Versions between 3.6, 3.10 and 3.13 have not been looked at.
NEWER = VERSION >= 10
NEWEST = VERSION >= 13


def bytes_of(height=600, width=700, bands=1):
    return memory_dataset(samples(gdal.GDT_Byte, height, width, bands), gdal.GDT_Byte)


def zeros(size):
    return gdal.GetDriverByName("MEM").Create("", size, size, 1)


class SideBySide(FolderTest):
    """Asks the same of three drivers, each of which has an empty folder to begin with."""

    def setUp(self):
        super().setUp()
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        self.addCleanup(gdal.PopErrorHandler)
        self.driver = DRIVER

    def compare(self, look, gtiff, cog, pyramid):
        top = self.folder
        for driver, expected in zip(ENDINGS, (gtiff, cog, pyramid)):
            self.driver = driver
            self.folder = os.path.join(top, driver)
            os.mkdir(self.folder)
            with self.subTest(driver):
                self.assertEqual(look(), expected)
        self.folder = top

    def target(self):
        return self.path("raster" + ENDINGS[self.driver])

    def make(self, source, *options, tiff_options=(), **more):
        """The path of a copy; options of pyramids, and of the two kinds of TIFF."""
        options = options if self.driver == DRIVER else tiff_options
        made = gdal.GetDriverByName(self.driver).CreateCopy(self.target(), source,
                                                            options=list(options), **more)
        assert made is not None
        del made
        return self.target()

    def left(self):
        """What stands in the folder, the raster without its ending."""
        return [re.sub(r"^raster\.(tif|pyr)", "raster", name) for name in self.files()]

    def edit(self, name):
        """Later versions of GDAL ask for a word before they break the layout of a COG."""
        try:
            return gdal.Open(name, gdal.GA_Update)
        except RuntimeError:
            return gdal.OpenEx(name, gdal.OF_UPDATE, open_options=["IGNORE_COG_LAYOUT_BREAK=YES"])

    def refuses(self, call):
        try:
            call()
        except RuntimeError:
            return True
        return False

    def kept(self, source, look):
        """What a copy shows, and the files that it takes."""
        dataset = gdal.Open(self.make(source))
        return look(dataset), self.left()

    def kept_of_band(self, source, look, number=1):
        return self.kept(source, lambda dataset: look(dataset.GetRasterBand(number)))


class Making(SideBySide):
    def test_block_by_block(self):
        def look():
            dataset = gdal.GetDriverByName(self.driver).Create(self.target(), 70, 60, 1)
            dataset.GetRasterBand(1).Fill(7)
            del dataset
            return int(gdal.Open(self.target()).ReadAsArray().sum())

        def made():
            try:
                return look()
            except RuntimeError:
                return None
        self.compare(made, 29400, 29400 if NEWEST else None, 29400)

    def test_in_memory(self):
        def look():
            name = "/vsimem/compared" + ENDINGS[self.driver]
            gdal.GetDriverByName(self.driver).CreateCopy(name, bytes_of())
            shape = gdal.Open(name).ReadAsArray().shape
            gdal.Unlink(name)
            return shape
        self.compare(look, (600, 700), (600, 700), (600, 700))

    def test_into_an_archive(self):
        self.compare(lambda: self.refuses(lambda: gdal.GetDriverByName(self.driver).CreateCopy(
            f"/vsizip/{self.path('a.zip')}/in.raster", bytes_of())), True, True, False)

    def test_from_a_compressed_stream(self):
        def look():
            name = self.make(bytes_of())
            with open(name, "rb") as plain, gzip.open(name + ".gz", "wb") as packed:
                packed.write(plain.read())
            return gdal.Open("/vsigzip/" + name + ".gz").ReadAsArray().shape
        self.compare(look, (600, 700), (600, 700), (600, 700))

    def test_name_of_the_target_while_it_is_made(self):
        def look():
            seen = set()
            self.make(bytes_of(1500, 1500, 3),
                      callback=lambda *_: seen.add(os.path.exists(self.target())) or 1)
            return True in seen
        self.compare(look, True, True, False)

    def test_cancelled(self):
        def look():
            self.assertTrue(self.refuses(lambda: self.make(
                bytes_of(1500, 1500, 3), callback=lambda done, *_: int(done < 0.1))))
            return self.files()
        self.compare(look, [], [], [])

    def test_full_disk(self):
        def look():
            source = bytes_of(900, 900)
            gdal.DontUseExceptions()
            try:
                with file_sizes_up_to(200000):
                    made = gdal.GetDriverByName(self.driver).CreateCopy(self.target(), source)
                    del made
            finally:
                gdal.UseExceptions()
            return self.left()
        self.compare(look, [] if NEWER else ["raster"], [], [])

    def test_an_old_target_of_a_copy_that_fails(self):
        def look():
            self.make(bytes_of())
            self.refuses(lambda: self.make(bytes_of(1500, 1500, 3), callback=lambda *_: 0))
            return self.files()
        self.compare(look, [], [], [])

    @unittest.skipUnless("ZMC_TOOL" in os.environ, "the command line was not built")
    def test_an_old_target_of_a_build_that_fails(self):
        target, cut = self.path("raster.pyr"), self.path("cut.tif")
        gdal.GetDriverByName("GTiff").CreateCopy(cut, bytes_of(1500, 1500, 3))
        words = [os.environ["ZMC_TOOL"], "build", cut, target, "--overwrite"]
        self.assertEqual(subprocess.run(words, capture_output=True).returncode, 0)
        with open(target, "rb") as file:
            before = file.read()
        os.truncate(cut, os.path.getsize(cut) // 2)
        self.assertNotEqual(subprocess.run(words, capture_output=True).returncode, 0)
        with open(target, "rb") as file:
            self.assertEqual(file.read(), before)
        self.assertEqual(self.files(), ["cut.tif", "raster.pyr"])

    def test_what_would_be_lost(self):
        def look():
            source = bytes_of()
            table = gdal.ColorTable(gdal.GPI_HLS)
            table.SetColorEntry(1, (10, 20, 30, 255))
            source.GetRasterBand(1).SetColorTable(table)
            return self.refuses(lambda: self.make(source, strict=1))
        self.compare(look, False, False, True)

    def test_several_rasters_in_one_file(self):
        def look():
            self.make(bytes_of())
            self.make(bytes_of(), tiff_options=["APPEND_SUBDATASET=YES"])
            return len(gdal.Open(self.target()).GetSubDatasets())
        self.compare(look, 2, 0, 0)

    def test_threads(self):
        def look():
            options = gdal.GetDriverByName(self.driver).GetMetadataItem("DMD_CREATIONOPTIONLIST")
            option = re.search("<Option name=.NUM_THREADS.[^>]*>", options).group()
            return "ALL_CPUS" in re.findall("default=.([A-Z_]*)", option)
        self.compare(look, False, False, True)


class Levels(SideBySide):
    def sizes(self):
        dataset = gdal.Open(self.target())
        band = dataset.GetRasterBand(1)
        return [band.GetOverview(i).XSize for i in range(band.GetOverviewCount())]

    def test_made_with_the_file(self):
        def look():
            self.make(bytes_of(1023, 1023))
            return self.sizes(), self.left()
        self.compare(look, ([], ["raster"]), ([511], ["raster"]), ([511, 255], ["raster"]))

    def test_renewed_in_the_file(self):
        def look():
            dataset = self.edit(self.make(bytes_of(1024, 1024)))
            dataset.GetRasterBand(1).Fill(9)
            dataset.BuildOverviews("AVERAGE", [2, 4])
            del dataset
            dataset = gdal.Open(self.target())
            band = dataset.GetRasterBand(1)
            return self.sizes(), int(band.GetOverview(0).ReadAsArray().min()), self.left()
        added = ([512, 256], 9, ["raster"])
        self.compare(look, added, ([512], 9, ["raster"]) if NEWEST else added,
                     ([512, 256], 9, ["raster", "raster.aux.xml"]))

    def test_beside_a_file_that_is_open_for_reading(self):
        def look():
            dataset = gdal.Open(self.make(bytes_of(1024, 1024)))
            refused = self.refuses(lambda: dataset.BuildOverviews("AVERAGE", [2]))
            return refused, self.left()
        self.compare(look, (False, ["raster", "raster.ovr"]), (True, ["raster"]),
                     (True, ["raster"]))

    def test_averages_of_large_integers(self):
        array = samples(gdal.GDT_Int32, 600, 700, 1)
        exact = array[0].astype(np.int64).reshape(300, 2, 350, 2).sum((1, 3)) / 4

        def look():
            dataset = self.edit(self.make(memory_dataset(array, gdal.GDT_Int32), tiff_options=[
                "RESAMPLING=AVERAGE"] * (self.driver == "COG")))
            if self.driver == "GTiff":
                dataset.BuildOverviews("AVERAGE", [2])
            level = dataset.GetRasterBand(1).GetOverview(0).ReadAsArray().astype(np.int64)
            return bool(np.abs(level - exact).max() <= 0.5)
        self.compare(look, NEWER, NEWER, True)

    def test_transparent_pixels(self):
        """Averages of what can be seen: its value, and nothing of what cannot."""
        array = samples(gdal.GDT_Byte, 600, 700, 2)
        array[1] = np.where(array[1] > 127, 255, 0)
        array[0] = np.where(array[1] == 255, 100, 0)

        def look():
            source = memory_dataset(array, gdal.GDT_Byte)
            source.GetRasterBand(2).SetColorInterpretation(gdal.GCI_AlphaBand)
            dataset = self.edit(self.make(source, tiff_options=["RESAMPLING=AVERAGE"] * (
                self.driver == "COG")))
            if self.driver == "GTiff":
                dataset.BuildOverviews("AVERAGE", [2])
            return sorted(np.unique(dataset.GetRasterBand(1).GetOverview(0).ReadAsArray()))
        self.compare(look, *[[0, 100]] * 3)


class Pixels(SideBySide):
    def test_types(self):
        def look():
            changed = {}
            for kind in [*TYPES, gdal.GDT_CInt16, gdal.GDT_CInt32]:
                source = gdal.GetDriverByName("MEM").Create("", 70, 60, 1, kind)
                dataset = gdal.Open(self.make(source))
                read = dataset.GetRasterBand(1).DataType
                if read != kind:
                    changed[gdal.GetDataTypeName(kind)] = gdal.GetDataTypeName(read)
            return changed
        self.compare(look, {}, {}, {"CInt16": "CFloat32", "CInt32": "CFloat64"})

    def test_written_in_place(self):
        def look():
            dataset = self.edit(self.make(bytes_of()))
            dataset.GetRasterBand(1).Fill(7)
            del dataset
            return int(gdal.Open(self.target()).ReadAsArray().max())
        self.compare(look, 7, 7, 7)

    def test_compressed(self):
        self.compare(lambda: os.path.getsize(self.make(
            zeros(1024), tiff_options=["COMPRESS=DEFLATE"])) < 10000, True, True, False)

    def test_less_than_a_byte(self):
        self.compare(lambda: os.path.getsize(self.make(
            zeros(1024), tiff_options=["NBITS=1", "COMPRESS=NONE"])) < 200000, True, NEWER, False)

    def test_sparse(self):
        self.compare(lambda: os.path.getsize(self.make(
            zeros(2048), tiff_options=["SPARSE_OK=YES", "COMPRESS=NONE"])) < 10000,
                     True, True, False)

    def test_blocks(self):
        def look():
            dataset = gdal.Open(self.make(bytes_of()))
            return dataset.GetRasterBand(1).GetBlockSize()
        self.compare(look, [700, 11], [512, 512], [256, 256])

    def test_interleave(self):
        def look():
            return [gdal.Open(self.make(bytes_of(bands=count))).GetMetadataItem(
                "INTERLEAVE", "IMAGE_STRUCTURE") for count in (3, 12)]
        of_tiff = ["BAND" if NEWEST else "PIXEL"] * 2
        self.compare(look, of_tiff, of_tiff, ["PIXEL", "BAND"])

    def test_file_that_is_cut(self):
        def look():
            name = self.make(bytes_of(2000, 2000))
            os.truncate(name, os.path.getsize(name) // 2)
            dataset = gdal.Open(name)
            return dataset.ReadAsArray(0, 0, 9, 9).shape, self.refuses(dataset.ReadAsArray)
        self.compare(look, *[((9, 9), True)] * 3)

    def test_file_that_is_cut_says_so_when_it_is_opened(self):
        def look():
            name = self.make(bytes_of(2000, 2000))
            os.truncate(name, os.path.getsize(name) // 2)
            gdal.ErrorReset()
            dataset = gdal.Open(name)
            return dataset is not None and gdal.GetLastErrorType() == gdal.CE_Warning
        self.compare(look, False, False, True)


class Records(SideBySide):
    def test_statistics_of_a_new_file(self):
        def look():
            dataset = gdal.Open(self.make(bytes_of()))
            band = dataset.GetRasterBand(1)
            return band.GetMinimum() is not None, band.GetDefaultHistogram(force=False) is not None
        self.compare(look, (False, False), (False, False), (True, True))

    def test_statistics_asked_for_while_reading(self):
        def look():
            gdal.Info(self.make(bytes_of()), options=["-stats"])
            return self.left()
        self.compare(look, *[["raster", "raster.aux.xml"]] * 2, ["raster"])

    def test_statistics_of_pixels_that_have_changed(self):
        def look():
            for change in (lambda band: band.ComputeStatistics(False), lambda band: band.Fill(7)):
                dataset = self.edit(self.target() if self.files() else self.make(bytes_of()))
                change(dataset.GetRasterBand(1))
                del dataset
            dataset = gdal.Open(self.target())
            return dataset.GetRasterBand(1).GetMinimum()
        self.compare(look, 0, 0, None)

    def test_no_data_value_of_each_band(self):
        def look():
            source = bytes_of(bands=3)
            for number in (1, 2, 3):
                source.GetRasterBand(number).SetNoDataValue(number)
            return self.kept(source, lambda dataset: [
                dataset.GetRasterBand(number).GetNoDataValue() for number in (1, 2, 3)])
        self.compare(look, *[([1, 2, 3], ["raster", "raster.aux.xml"])] * 3)

    def test_no_data_value_of_the_largest_integers(self):
        def look():
            source = memory_dataset(samples(gdal.GDT_Int64, 600, 700, 1), gdal.GDT_Int64)
            source.GetRasterBand(1).SetNoDataValueAsInt64(2**62 + 1)
            refused = self.refuses(lambda: self.make(source, strict=1))
            dataset = gdal.Open(self.make(source, strict=0))
            return refused, dataset.GetRasterBand(1).GetNoDataValueAsInt64() == 2**62 + 1
        self.compare(look, (False, True), (False, True), (True, True))

    def test_pixels_that_are_not_finite(self):
        array = samples(gdal.GDT_Float32, 60, 70, 1)
        array[0, 3, 3] = np.nan
        self.compare(lambda: self.kept_of_band(
            memory_dataset(array, gdal.GDT_Float32),
            lambda band: int(band.GetMaskBand().ReadAsArray()[3, 3]))[0], 255, 255, 0)

    def test_mask_of_the_dataset(self):
        def look():
            source = bytes_of()
            source.CreateMaskBand(gdal.GMF_PER_DATASET)
            source.GetRasterBand(1).GetMaskBand().Fill(255)
            return self.kept_of_band(source, lambda band: band.GetMaskFlags())
        beside = (gdal.GMF_PER_DATASET, ["raster", "raster.msk"])
        inside = (gdal.GMF_PER_DATASET, ["raster"])
        self.compare(look, inside if VERSION >= 9 else beside, inside, beside)

    def colors(self, number):
        source = bytes_of(bands=number)
        table = gdal.ColorTable()
        table.SetColorEntry(0, (1, 2, 3, 255))
        table.SetColorEntry(9, (4, 5, 6, 255))
        source.GetRasterBand(number).SetColorTable(table)
        try:
            return self.kept_of_band(source, lambda band: band.GetColorTable() and
                                     band.GetColorTable().GetColorEntry(9), number)
        except RuntimeError:
            return None

    def test_color_table_of_the_only_band(self):
        self.compare(lambda: self.colors(1), *[((4, 5, 6, 255), ["raster"])] * 3)

    def test_color_table_of_another_band(self):
        self.compare(lambda: (self.colors(2) or [None])[0], None, None, (4, 5, 6, 255))

    def test_attribute_table(self):
        table = gdal.RasterAttributeTable()
        table.CreateColumn("Value", gdal.GFT_Integer, gdal.GFU_MinMax)
        table.SetRowCount(1)
        table.SetValueAsInt(0, 0, 77)

        def look():
            source = bytes_of()
            source.GetRasterBand(1).SetDefaultRAT(table)
            return self.kept_of_band(source, lambda band: band.GetDefaultRAT().GetValueAsInt(0, 0))
        beside = (77, ["raster", "raster.aux.xml"])
        self.compare(look, *[(77, ["raster"]) if NEWEST else beside] * 2, beside)

    def test_georeference(self):
        def look():
            source = bytes_of()
            place(source)
            return self.kept(source, lambda dataset: dataset.GetGeoTransform()[0])
        self.compare(look, *[(500000, ["raster"])] * 2, (500000, ["raster", "raster.aux.xml"]))

    def test_georeference_in_the_file(self):
        def look():
            source = bytes_of()
            place(source)
            name = self.make(source, "EMBED=YES")
            return gdal.Open(name).GetGeoTransform()[0], self.left()
        self.compare(look, *[(500000, ["raster"])] * 3)

    def pinned(self, source):
        reference = osr.SpatialReference()
        reference.ImportFromEPSG(32631)
        source.SetGCPs([gdal.GCP(i * 10.0, i * i * 7.0, 5, i, 2 * i) for i in range(4)],
                       reference)
        return source

    def test_control_points(self):
        self.compare(lambda: self.kept(self.pinned(bytes_of()),
                                       lambda dataset: dataset.GetGCPCount()),
                     *[(4, ["raster"])] * 2, (4, ["raster", "raster.aux.xml"]))

    def test_control_points_in_the_file(self):
        def look():
            dataset = gdal.Open(self.make(self.pinned(bytes_of()), "EMBED=YES"))
            return dataset.GetGCPCount(), self.left()
        self.compare(look, *[(4, ["raster"])] * 3)

    def test_control_points_beside_a_georeference(self):
        def look():
            source = bytes_of()
            place(source)
            self.pinned(source)
            return self.kept(source, lambda dataset: (dataset.GetGCPCount(),
                                                      dataset.GetGeoTransform()[0]))[0]
        self.compare(look, *[(0, 500000)] * 2, (4, 500000))

    def test_texts_of_bands(self):
        def look():
            source = bytes_of()
            band = source.GetRasterBand(1)
            band.SetDescription("height")
            band.SetUnitType("m")
            band.SetScale(0.5)
            band.SetMetadata({"SENSOR": "laser"})
            return self.kept_of_band(source, lambda band: (
                band.GetDescription(), band.GetUnitType(), band.GetScale(),
                band.GetMetadataItem("SENSOR")))
        told = ("height", "m", 0.5, "laser")
        self.compare(look, *[(told, ["raster"])] * 2, (told, ["raster", "raster.aux.xml"]))

    def test_domains_of_metadata(self):
        def look():
            source = bytes_of()
            source.SetMetadata({"K": "V"}, "MINE")
            source.SetMetadata(["<x>1</x>"], "xml:EXTRA")
            return self.kept(source, lambda dataset: (
                dataset.GetMetadata("MINE"), bool(dataset.GetMetadata("xml:EXTRA"))))[0]
        self.compare(look, *[({}, False)] * 2, ({"K": "V"}, True))


class Remote(SideBySide):
    def setUp(self):
        super().setUp()
        self.addCleanup(gdal.SetConfigOption, "GDAL_DISABLE_READDIR_ON_OPEN", None)
        gdal.SetConfigOption("GDAL_DISABLE_READDIR_ON_OPEN", "EMPTY_DIR")

    def served(self, look):
        source = bytes_of(1700, 2300, 3)
        self.make(source, tiff_options=["COMPRESS=NONE", "INTERLEAVE=PIXEL"] + ["TILED=YES"] * (
            self.driver == "GTiff"))
        server = Server(self.folder)
        try:
            dataset = gdal.Open(f"/vsicurl/{server.url}{os.path.basename(self.target())}")
            server.take()
            return look(dataset, server)
        finally:
            dataset = None
            server.stop()
            gdal.VSICurlClearCache()

    def test_requests_of_one_tile(self):
        def look(dataset, server):
            dataset.ReadAsArray(1024, 1024, 256, 256)
            return len(server.take())
        self.compare(lambda: self.served(look), 1, 1, 1)

    def test_requests_of_a_window(self):
        def look(dataset, server):
            dataset.ReadAsArray(600, 600, 1024, 768)
            return len(server.take())
        self.compare(lambda: self.served(look), 4, 2, 4)

    def test_what_is_advised_is_fetched(self):
        def look(dataset, server):
            dataset.AdviseRead(600, 600, 1024, 768)
            server.take()
            dataset.ReadAsArray(600, 600, 1024, 768)
            return len(server.take()) == 0
        self.compare(lambda: self.served(look), False, False, True)


class Table(unittest.TestCase):
    def setUp(self):
        with open(PAGE) as page:
            table = page.read().split("\n## Beside GTiff and COG\n")[1].split("\n## ")[0]
        self.rows = [[cell.strip() for cell in line.strip("|").split("|")]
                     for line in table.splitlines() if line.startswith("|")][2:]

    def test_every_row_has_a_test_that_there_is(self):
        self.assertGreater(len(self.rows), 30)
        for row in self.rows:
            self.assertEqual(len(row), 5, row)
            self.assertTrue(all(row), row)
            for name in row[4].split("<br>"):
                module, group, test = re.fullmatch(r"`(\w+)\.(\w+)\.(\w+)`", name).groups()
                found = getattr(getattr(importlib.import_module(module), group), test)
                self.assertTrue(callable(found), name)

    def test_every_comparison_has_a_row(self):
        told = {name for row in self.rows for name in re.findall(r"`(\w+\.\w+\.\w+)`", row[4])}
        for group in (Making, Levels, Pixels, Records, Remote):
            for test in unittest.defaultTestLoader.getTestCaseNames(group):
                self.assertIn(f"comparison_test.{group.__name__}.{test}", told)


if __name__ == "__main__":
    unittest.main()
