"""Masks of the whole dataset: of new files, of levels, and of what is made of a pyramid."""
import os
import subprocess
import unittest

import numpy as np
from osgeo import gdal

from rasters import DRIVER, FolderTest, file_sizes_up_to, memory_dataset, samples


class Masks(FolderTest):
    def setUp(self):
        super().setUp()
        self.array = samples(gdal.GDT_Byte, 600, 700, 3)
        self.mask = samples(gdal.GDT_Byte, 600, 700, 1, seed=2)[0] // 128 * 255

    def masked(self):
        source = memory_dataset(self.array, gdal.GDT_Byte)
        source.CreateMaskBand(gdal.GMF_PER_DATASET)
        source.GetRasterBand(1).GetMaskBand().WriteArray(self.mask)
        return self.copy(source)

    def create(self):
        dataset = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 700, 600, 3)
        dataset.WriteArray(self.array)
        return dataset

    def check(self, name, mask):
        dataset = gdal.Open(name)
        for number in range(1, dataset.RasterCount + 1):
            band = dataset.GetRasterBand(number)
            self.assertEqual(band.GetMaskFlags(), gdal.GMF_PER_DATASET)
            np.testing.assert_array_equal(band.GetMaskBand().ReadAsArray(), mask)

    def test_of_a_file_that_is_being_created(self):
        for whole in (True, False):
            dataset = self.create()
            maker = dataset if whole else dataset.GetRasterBand(1)
            maker.CreateMaskBand(gdal.GMF_PER_DATASET)
            self.assertEqual(dataset.GetRasterBand(2).GetMaskFlags(), gdal.GMF_PER_DATASET)
            dataset.GetRasterBand(1).GetMaskBand().WriteArray(self.mask)
            self.assertFalse([name for name in self.files() if name.startswith("new")])
            del maker, dataset
            self.assertEqual(self.files(), ["new.pyr", "new.pyr.msk"])
            self.check(self.path("new.pyr"), self.mask)
            os.remove(self.path("new.pyr"))
            os.remove(self.path("new.pyr.msk"))

    def test_of_a_file_that_cannot_be_made_goes_again(self):
        dataset = self.create()
        dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
        os.mkdir(self.path("new.pyr"))
        gdal.PushErrorHandler("CPLQuietErrorHandler")
        del dataset
        gdal.PopErrorHandler()
        self.assertEqual(self.files(), ["new.pyr"])

    def test_of_a_new_file_that_is_cut_off_goes_again(self):
        noise = samples(gdal.GDT_Byte, 3000, 3000, 1)
        dataset = gdal.GetDriverByName(DRIVER).Create(self.path("new.pyr"), 3000, 3000, 1,
                                                      options=["LEVELS=0", "STATISTICS=NO"])
        dataset.WriteArray(noise)
        dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
        dataset.GetRasterBand(1).GetMaskBand().WriteArray(noise[0])
        heard = []
        # Python drops what is thrown there.
        gdal.DontUseExceptions()
        self.addCleanup(gdal.UseExceptions)
        gdal.PushErrorHandler(lambda kind, number, text: heard.append(text))
        # Noise that GDAL compresses becomes larger than the pyramid.
        with file_sizes_up_to(noise.size + 4000):
            del dataset
        gdal.PopErrorHandler()
        self.assertEqual(self.files(), [])
        self.assertRegex("\n".join(heard), r"cannot keep its mask in .*new\.pyr\.msk: ")

    def test_of_another_raster_is_not_taken_over(self):
        self.check(self.masked(), self.mask)
        os.rename(self.path("raster.pyr.msk"), self.path("new.pyr.msk"))
        dataset = self.create()
        self.assertEqual(dataset.GetRasterBand(1).GetMaskFlags(), gdal.GMF_ALL_VALID)

    def test_of_levels(self):
        dataset = gdal.Open(self.masked())
        band = dataset.GetRasterBand(2)
        self.assertEqual(band.GetOverviewCount(), 2)
        for index in range(2):
            level = band.GetOverview(index)
            self.assertEqual(level.GetMaskFlags(), gdal.GMF_PER_DATASET)
            step = 2 << index
            np.testing.assert_array_equal(level.GetMaskBand().ReadAsArray(),
                                          self.mask[::step, ::step])

    def test_levels_without_a_mask_file_have_none(self):
        dataset = gdal.Open(self.copy(memory_dataset(self.array, gdal.GDT_Byte)))
        self.assertEqual(dataset.GetRasterBand(1).GetOverview(0).GetMaskFlags(),
                         gdal.GMF_ALL_VALID)

    def test_of_what_is_translated_from_a_level(self):
        name = self.masked()
        subprocess.run(["gdal_translate", "-q", "-oo", "OVERVIEW_LEVEL=0", name,
                        self.path("half.tif")], check=True)
        self.check(self.path("half.tif"), self.mask[::2, ::2])


if __name__ == "__main__":
    unittest.main()
