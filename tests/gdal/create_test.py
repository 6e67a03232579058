"""Rasters that are created and written block by block: what the finished file is, and what the disk
holds meanwhile."""
import os
import subprocess
import sys
import time
import unittest

import numpy as np
from osgeo import gdal

from rasters import DRIVER, FolderTest, memory_dataset, place, samples

PICTURE = (gdal.GCI_RedBand, gdal.GCI_GreenBand, gdal.GCI_BlueBand, gdal.GCI_AlphaBand)


def colors():
    table = gdal.ColorTable()
    for index in range(256):
        table.SetColorEntry(index, (index, 255 - index, index // 2, 255))
    return table


class FinishedFiles(FolderTest):
    """A created file against a copy of the same raster, by the same options."""

    def create(self, array, data_type, options, prepare, order):
        path = self.path("created.pyr")
        bands, height, width = array.shape
        dataset = gdal.GetDriverByName(DRIVER).Create(path, width, height, bands, data_type,
                                                      list(options))
        prepare(dataset)
        pieces = [(x, y, b) for x in range(0, width, 200) for y in range(0, height, 200)
                  for b in range(bands)]
        for index in order(len(pieces)):
            x, y, b = pieces[index]
            dataset.GetRasterBand(b + 1).WriteArray(array[b, y:y + 200, x:x + 200], x, y)
        del dataset
        return path

    def check(self, array, data_type, options=(), prepare=lambda dataset: None,
              order=np.random.default_rng(4).permutation):
        created = self.create(array, data_type, options, prepare, order)
        source = memory_dataset(array, data_type)
        prepare(source)
        copied = self.copy(source, "copied.pyr", options=options)
        with open(created, "rb") as ours, open(copied, "rb") as theirs:
            self.assertTrue(ours.read() == theirs.read(), (data_type, array.shape, options))
        self.assertEqual([name for name in self.files() if name.endswith(".tmp")], [])
        for path in (created, copied):
            gdal.GetDriverByName(DRIVER).Delete(path)

    def test_are_those_of_copies_for_every_type_ordering_and_number_of_bands(self):
        for data_type in (gdal.GDT_Byte, gdal.GDT_Int16, gdal.GDT_Int32, gdal.GDT_Float32,
                          gdal.GDT_Float64, gdal.GDT_CFloat32):
            for bands in (1, 3, 10):
                array = samples(data_type, 601, 700, bands)
                self.check(array, data_type)
                if bands < 10:
                    self.check(array, data_type, ["ORDERING=SCANLINE"])

    def test_are_those_of_copies_by_every_option(self):
        array = samples(gdal.GDT_Byte, 1100, 1030, 3)
        for options in (["LEVELS=0"], ["LEVELS=0", "STATISTICS=NO"], ["LEVELS=6"],
                        ["RESAMPLING=CUBIC"], ["RESAMPLING=LANCZOS", "MEMORY=9M"],
                        ["RESAMPLING=MODE"], ["STATISTICS=NO"], ["BINS=16"], ["NUM_THREADS=1"],
                        ["MEMORY=8M", "NUM_THREADS=3"]):
            self.check(array, gdal.GDT_Byte, options)

    def test_are_those_of_copies_by_no_data_alpha_and_palettes(self):
        def no_data(dataset):
            for number in range(1, dataset.RasterCount + 1):
                dataset.GetRasterBand(number).SetNoDataValue(7)

        def alpha(dataset):
            for number, meaning in enumerate(PICTURE):
                dataset.GetRasterBand(number + 1).SetColorInterpretation(meaning)

        def palette(dataset):
            dataset.GetRasterBand(1).SetColorTable(colors())

        for method in ("AVERAGE", "CUBICSPLINE", "NEAREST"):
            options = ["RESAMPLING=" + method]
            array = samples(gdal.GDT_Byte, 600, 700, 4)
            array[3] = np.where(array[3] > 99, 255, 0)
            self.check(array, gdal.GDT_Byte, options, alpha)
            self.check(array % 16, gdal.GDT_Byte, options, no_data)
            self.check(array[:1] // 64, gdal.GDT_Byte, options, palette)
        self.check(array[:1], gdal.GDT_Byte, (), palette)

    def test_are_those_of_copies_where_items_are_embedded(self):
        self.check(samples(gdal.GDT_Int16, 300, 500, 2), gdal.GDT_Int16, ["EMBED=YES"], place)

    def test_have_the_levels_that_masks_weigh(self):
        array = samples(gdal.GDT_Byte, 500, 600, 1)
        mask = np.zeros((500, 600), np.uint8)
        mask[100:333, 77:400] = 255

        def hide(dataset):
            dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
            dataset.GetRasterBand(1).GetMaskBand().WriteArray(mask)

        self.check(array, gdal.GDT_Byte, (), hide)

    def test_replace_an_old_one_when_they_are_whole(self):
        old = self.copy(memory_dataset(samples(gdal.GDT_Byte, 20, 30, 1), gdal.GDT_Byte))
        with open(old, "rb") as file:
            before = file.read()
        # GDAL's own Create removes what stands there; its warper and others write beside it.
        os.rename(old, self.path("kept"))
        dataset = gdal.GetDriverByName(DRIVER).Create(old, 300, 300, 1)
        os.rename(self.path("kept"), old)
        dataset.GetRasterBand(1).Fill(5)
        dataset.FlushCache()
        with open(old, "rb") as file:
            self.assertEqual(file.read(), before)
        del dataset
        self.assertEqual(gdal.Open(old).ReadAsArray(299, 299, 1, 1)[0, 0], 5)
        self.assertEqual(self.files(), ["raster.pyr"])

    def test_keep_what_the_blocks_of_bands_hold_that_nobody_looked_at(self):
        for bands in (2, 10):
            dataset = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 600, 900, bands)
            for number in range(1, bands + 1):
                dataset.GetRasterBand(number).SetNoDataValue(9)
            dataset.GetRasterBand(1).WriteArray(np.full((10, 10), 3, np.uint8), 300, 600)
            del dataset
            expected = np.full((bands, 900, 600), 9, np.uint8)
            expected[0, 600:610, 300:310] = 3
            made = gdal.Open(self.path("new.pyr"))
            np.testing.assert_array_equal(made.ReadAsArray(), expected)
            self.assertTrue((made.GetRasterBand(2).GetOverview(1).ReadAsArray() == 9).all())

    def test_of_nothing_are_zeros(self):
        del_me = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 700, 600, 3)
        del del_me
        made = gdal.Open(self.path("new.pyr"))
        self.assertEqual(made.GetMetadataItem("COMPLETE", "ZMCPYRAMID"), "YES")
        self.assertFalse(made.ReadAsArray().any())
        self.assertEqual(made.GetRasterBand(3).GetStatistics(0, 0), [0, 0, 0, 0])


class ChosenLevels(FolderTest):
    """BuildOverviews of a dataset under creation."""

    def levels_of(self, factors, flush):
        array = samples(gdal.GDT_Byte, 700, 900, 3)
        dataset = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 900, 700, 3)
        place(dataset)
        if flush:
            dataset.WriteArray(array)
            dataset.FlushCache()
        dataset.BuildOverviews("CUBIC", factors)
        drafts = [name for name in self.files() if name.endswith(".tmp")]
        self.assertEqual(len(drafts), 1)
        if not flush:
            dataset.WriteArray(array)
        np.testing.assert_array_equal(dataset.ReadAsArray(), array)
        del dataset
        source = memory_dataset(array, gdal.GDT_Byte)
        place(source)
        count = max(factors).bit_length() - 1
        copied = self.copy(source, options=["RESAMPLING=CUBIC", f"LEVELS={count}"])
        with open(self.path("new.pyr"), "rb") as ours, open(copied, "rb") as theirs:
            self.assertTrue(ours.read() == theirs.read())
        self.assertEqual(self.files(), ["new.pyr", "new.pyr.aux.xml", "raster.pyr",
                                        "raster.pyr.aux.xml"])

    def test_of_any_number_before_and_after_pixels_are_there(self):
        for factors in ([2], [2, 4], [2, 4, 8, 16]):
            for flush in (False, True):
                self.levels_of(factors, flush)


class Windows(FolderTest):
    """Windows of all bands, whose whole tiles do not go through the block cache."""

    def test_of_any_place_layout_and_type_hold_what_was_written_last(self):
        random = np.random.default_rng(8)
        for bands, data_type in ((1, gdal.GDT_Byte), (3, gdal.GDT_Byte), (2, gdal.GDT_Int16),
                                 (3, gdal.GDT_Float64), (10, gdal.GDT_UInt16)):
            expected = np.zeros((bands, 700, 900), np.float64)
            dataset = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 900, 700, bands,
                                                          data_type)
            for step in range(40):
                x, y = random.integers(0, 890), random.integers(0, 690)
                if step % 3 == 0:
                    x, y = x // 256 * 256, y // 256 * 256
                width, height = (int(random.integers(1, 901 - x)), int(random.integers(1, 701 - y)))
                kind = (np.uint8, np.int16, np.float32)[step % 3]
                window = random.integers(0, 120, (bands, height, width)).astype(kind)
                expected[:, y:y + height, x:x + width] = window
                if step % 5 == 0:
                    band = int(random.integers(0, bands))
                    dataset.GetRasterBand(band + 1).WriteArray(window[band], int(x), int(y))
                    rest = [b for b in range(bands) if b != band]
                    for other in rest:
                        dataset.GetRasterBand(other + 1).WriteArray(window[other], int(x), int(y))
                elif step % 2 or bands == 1:
                    dataset.WriteArray(window, int(x), int(y))
                else:
                    dataset.WriteArray(np.moveaxis(window, 0, 2), int(x), int(y),
                                       interleave="pixel")
                if step % 7 == 0:
                    np.testing.assert_array_equal(
                        dataset.ReadAsArray().reshape(expected.shape), expected)
            del dataset
            made = gdal.Open(self.path("new.pyr"))
            np.testing.assert_array_equal(made.ReadAsArray().reshape(expected.shape), expected)
            del made
            os.remove(self.path("new.pyr"))

    def test_of_other_bands_or_another_order_of_them(self):
        array = samples(gdal.GDT_Byte, 600, 700, 3)
        dataset = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 700, 600, 3)
        dataset.WriteRaster(0, 0, 700, 600, array.tobytes(), band_list=[3, 1, 2])
        dataset.WriteRaster(0, 0, 512, 512, array[:2, :512, :512].tobytes(), band_list=[1, 2])
        del dataset
        expected = array[[1, 2, 0]]
        expected[:2, :512, :512] = array[:2, :512, :512]
        np.testing.assert_array_equal(gdal.Open(self.path("new.pyr")).ReadAsArray(), expected)

    def test_that_are_stretched(self):
        dataset = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 600, 512, 2)
        small = np.arange(2 * 16 * 16, dtype=np.uint8).reshape(2, 16, 16)
        dataset.WriteRaster(0, 0, 512, 512, small.tobytes(), 16, 16)
        del dataset
        made = gdal.Open(self.path("new.pyr")).ReadAsArray(0, 0, 512, 512)
        np.testing.assert_array_equal(made, small.repeat(32, 1).repeat(32, 2))


# Writes a raster row by row of blocks, and says when it closes it.
WRITER = """
import sys
import numpy as np
from osgeo import gdal
gdal.UseExceptions()
gdal.SetCacheMax(4 << 20)
path, bands, step = sys.argv[1], int(sys.argv[2]), int(sys.argv[3])
dataset = gdal.GetDriverByName("ZMCPyramid").Create(path, 2500, 2000, bands, gdal.GDT_Byte,
                                                    sys.argv[4:])
noise = np.random.default_rng(1).integers(0, 256, (bands, 2000, 2500), dtype=np.uint8)
if step < 0:
    dataset.BuildOverviews("AVERAGE", [2, 4, 8, 16, 32])
for y in range(0, 2000, abs(step)):
    dataset.WriteArray(noise[:, y:y + abs(step)], 0, y)
dataset.FlushCache()
del dataset
"""


class DiskUse(FolderTest):
    """Bytes that the folder takes on the disk, looked at all the while."""

    def used(self):
        total = 0
        for entry in os.scandir(self.folder):
            try:
                total += entry.stat().st_blocks * 512
            except FileNotFoundError:
                pass
        return total

    def most_used(self, *arguments):
        child = subprocess.Popen([sys.executable, "-c", WRITER, self.path("new.pyr"), *arguments])
        most = looks = 0
        while child.poll() is None:
            most = max(most, self.used())
            looks += 1
            time.sleep(0.0005)
        self.assertEqual(child.returncode, 0)
        self.assertGreater(looks, 20)
        return most

    def test_is_never_more_than_a_fifth_above_that_of_the_file(self):
        for arguments in (("3", "100"), ("10", "256"), ("3", "100", "LEVELS=3", "RESAMPLING=CUBIC"),
                          ("3", "-100"), ("3", "100", "EMBED=YES", "STATISTICS=NO")):
            with self.subTest(arguments):
                most = self.most_used(*arguments)
                size = os.path.getsize(self.path("new.pyr"))
                self.assertGreater(size, 2500 * 2000 * int(arguments[0]) * 1.3)
                self.assertLessEqual(most, size * 1.2)
                self.assertEqual(self.files(), ["new.pyr"])
                os.remove(self.path("new.pyr"))


if __name__ == "__main__":
    unittest.main()
