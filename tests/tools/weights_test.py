"""Levels of rasters with alpha bands, masks and palettes: against plain models, and against GDAL's own
overviews where alpha is 0 or 255."""
import os
import unittest

import numpy as np
from osgeo import gdal

from frame import ToolTest, geotiff
from pyramid import Pyramid


def stripes(height=600, width=800):
    """Columns of 200 beside transparent columns of 10."""
    pixels = np.full((height, width, 4), 200, np.uint8)
    pixels[:, 1::2, :3] = 10
    pixels[:, :, 3] = 255
    pixels[:, 1::2, 3] = 0
    return pixels


def blots(height, width, seed=5):
    """Smooth values, opaque in half of the picture and in scattered pixels."""
    random = np.random.default_rng(seed)
    pixels = random.integers(0, 256, (height, width, 4), dtype=np.uint8)
    y, x = np.mgrid[:height, :width]
    opaque = (((x // 60 + y // 60) % 2 == 0) & (random.random((height, width)) < 0.9) |
              (random.random((height, width)) < 0.05))
    pixels[:, :, 3] = np.where(opaque, 255, 0)
    return pixels


def gdal_overview(path, method):
    dataset = gdal.Open(path)
    made = gdal.GetDriverByName("MEM").CreateCopy("", dataset)
    for number in range(dataset.RasterCount):
        made.GetRasterBand(number + 1).SetColorInterpretation(
            dataset.GetRasterBand(number + 1).GetColorInterpretation())
    made.BuildOverviews(method, [2])
    return np.stack([made.GetRasterBand(number + 1).GetOverview(0).ReadAsArray()
                     for number in range(dataset.RasterCount)], axis=-1)


class Alpha(ToolTest):
    def rgba(self, pixels, name="source.tif"):
        return geotiff(self.path(name), pixels, options=["PHOTOMETRIC=RGB", "ALPHA=YES"])

    def test_transparent_columns_leave_no_trace(self):
        self.rgba(stripes())
        for method in ("average", "bilinear", "cubic", "lanczos", "gauss", "cubicspline", "rms"):
            with self.subTest(method):
                self.good("build", "source.tif", "made.pyr", "--resampling", method, "--overwrite",
                          "--levels", "2")
                for index in (0, 1):
                    self.assertTrue((Pyramid(self.path("made.pyr")).read(index + 1)[:, :, :3] == 200).all())
                self.good("verify", "made.pyr", "--resampling", method)

    def test_averages_of_opaque_pixels_are_those_of_gdal(self):
        self.rgba(blots(500, 640))
        self.good("build", "source.tif", "made.pyr", "--levels", "1")
        ours = Pyramid(self.path("made.pyr")).read(1)
        theirs = gdal_overview(self.path("source.tif"), "AVERAGE")
        seen = ours[:, :, 3] > 0
        self.assertTrue(seen.any() and not seen.all())
        np.testing.assert_array_equal(ours[seen][:, :3], theirs[seen][:, :3])

    def test_statistics_and_the_finest_level_know_no_weights(self):
        self.rgba(stripes())
        self.good("build", "source.tif", "made.pyr")
        statistics = self.document("info", "made.pyr")["statistics"][0]
        self.assertEqual([statistics[name] for name in ("minimum", "maximum", "mean")],
                         [10, 200, 105])
        self.good("verify", "made.pyr", "--against", "source.tif")

    def test_weights_can_be_turned_off(self):
        self.rgba(stripes())
        self.good("build", "source.tif", "made.pyr", "--weights", "none", "--levels", "1")
        self.assertTrue((Pyramid(self.path("made.pyr")).read(1)[:, :, :3] == 105).all())
        self.good("verify", "made.pyr", "--weights", "none")
        self.assertEqual(self.run_tool("verify", "made.pyr").returncode, 3)

    def test_colours_without_their_alpha_band(self):
        self.rgba(stripes())
        self.good("build", "source.tif", "made.pyr", "--bands", "1,2", "--levels", "2")
        self.assertTrue((Pyramid(self.path("made.pyr")).read(2) == 200).all())

    def test_threads_and_memory_change_nothing(self):
        self.rgba(blots(900, 3000))
        self.good("build", "source.tif", "one.pyr", "--threads", "1")
        self.good("build", "source.tif", "two.pyr", "--threads", "4", "--memory", "9M")
        with open(self.path("one.pyr"), "rb") as one, open(self.path("two.pyr"), "rb") as two:
            self.assertEqual(one.read(), two.read())


class Masks(ToolTest):
    def masked(self, pixels, mask, name="source.tif"):
        gdal.SetConfigOption("GDAL_TIFF_INTERNAL_MASK", "NO")
        path = geotiff(self.path(name), pixels)
        dataset = gdal.Open(path, gdal.GA_Update)
        dataset.CreateMaskBand(gdal.GMF_PER_DATASET)
        dataset.GetRasterBand(1).GetMaskBand().WriteArray(mask)
        dataset = None
        return path

    def test_hidden_pixels_leave_no_rim(self):
        pixels = np.full((700, 900, 3), 200, np.uint8)
        mask = np.full((700, 900), 255, np.uint8)
        pixels[:301, :451] = 10
        mask[:301, :451] = 0
        self.masked(pixels, mask)
        self.good("build", "source.tif", "made.pyr", "--levels", "2")
        for index, factor in ((0, 2), (1, 4)):
            coarse = Pyramid(self.path("made.pyr")).read(index + 1)
            shown = mask.reshape(700 // factor, factor, 900 // factor, factor).max(axis=(1, 3)) > 0
            self.assertTrue((coarse[shown] == 200).all())
            # Nothing undefined where all is hidden.
            self.assertTrue((coarse[~shown] == 10).all())
        self.good("verify", "made.pyr")

    def test_averages_of_shown_pixels_are_those_of_gdal(self):
        picture = blots(500, 640, 6)
        self.masked(np.ascontiguousarray(picture[:, :, :3]), picture[:, :, 3])
        self.good("build", "source.tif", "made.pyr", "--levels", "1")
        ours = Pyramid(self.path("made.pyr")).read(1)
        theirs = gdal_overview(self.path("source.tif"), "AVERAGE")
        shown = picture[:, :, 3].reshape(250, 2, 320, 2).max(axis=(1, 3)) > 0
        np.testing.assert_array_equal(ours[shown], theirs[shown])

    def test_levels_of_a_mask_in_several_walks(self):
        picture = blots(900, 3001, 7)
        self.masked(np.ascontiguousarray(picture[:, :, :3]), picture[:, :, 3])
        self.good("build", "source.tif", "one.pyr", "--threads", "1", "--resampling", "cubic")
        self.good("build", "source.tif", "two.pyr", "--threads", "3", "--resampling", "cubic",
                  "--memory", "11M")
        with open(self.path("one.pyr"), "rb") as one, open(self.path("two.pyr"), "rb") as two:
            self.assertEqual(one.read(), two.read())
        self.good("verify", "two.pyr", "--resampling", "cubic")

    def test_a_mask_of_another_size_is_named_and_not_used(self):
        geotiff(self.path("source.tif"), np.full((40, 40, 1), 9, np.uint8))
        geotiff(self.path("source.tif.msk"), np.zeros((20, 20, 1), np.uint8))
        dataset = gdal.Open(self.path("source.tif.msk"), gdal.GA_Update)
        dataset.SetMetadataItem("INTERNAL_MASK_FLAGS_1", "2")
        dataset = None
        done = self.run_tool("build", "source.tif", "made.pyr", "--levels", "1")
        self.assertEqual(done.returncode, 0)
        self.assertEqual(done.stderr, "zmcraster: source.tif: warning: a pyramid does not keep the "
                         "mask of band 1, which is of another size\n")
        self.assertTrue((Pyramid(self.path("made.pyr")).read(1) == 9).all())


class Palettes(ToolTest):
    def test_averages_of_indices_are_those_of_their_colours(self):
        pixels = np.zeros((300, 300, 1), np.uint8)
        pixels[::2] = 2
        # 0 black, 1 red, 2 white, 3 grey.
        colors = [(0, 0, 0, 255), (255, 0, 0, 255), (255, 255, 255, 255), (128, 128, 128, 255)]
        geotiff(self.path("source.tif"), pixels, colors=colors)
        self.good("build", "source.tif", "made.pyr", "--resampling", "average", "--levels", "1")
        self.assertTrue((Pyramid(self.path("made.pyr")).read(1) == 3).all())
        self.good("verify", "made.pyr", "--resampling", "average")


if __name__ == "__main__":
    unittest.main()
