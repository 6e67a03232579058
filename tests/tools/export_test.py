"""Exports, read back through GDAL."""
import os

import numpy as np
from osgeo import gdal

from frame import TYPES, ToolTest, geotiff, samples
from pyramid import Pyramid


class Export(ToolTest):
    def array(self, name):
        pixels = gdal.Open(self.path(name)).ReadAsArray()
        return np.moveaxis(pixels if pixels.ndim == 3 else pixels[None], 0, -1)

    def test_every_type(self):
        for name in TYPES:
            with self.subTest(name):
                pixels = samples(name, 60, 80, 2)
                geotiff(self.path("source.tif"), pixels, name)
                self.good("build", "source.tif", "made.pyr", "--overwrite")
                self.good("export", "made.pyr", "back.tif")
                np.testing.assert_array_equal(self.array("back.tif"), pixels)

    def test_levels_windows_and_bands(self):
        self.pyramid()
        file = Pyramid(self.path("picture.pyr"))
        for level in range(3):
            self.good("export", "picture.pyr", "level.png", "--level", level)
            np.testing.assert_array_equal(self.array("level.png"), file.read(level))
        document = self.document("export", "picture.pyr", "part.tif", "--level", 1, "--window",
                                 "30,20,300,100", "--bands", "3,1", "-co", "COMPRESS=DEFLATE")
        self.assertShape(document, {"schema": int, "file": str, "target": str, "level": int,
                                    "window": [int]})
        np.testing.assert_array_equal(self.array("part.tif"),
                                      file.read(1)[20:120, 30:330][:, :, [2, 0]])
        self.assertEqual(gdal.Open(self.path("part.tif")).GetMetadata("IMAGE_STRUCTURE")
                         ["COMPRESSION"], "DEFLATE")

    def georeferenced(self, width, height, points=()):
        geotiff(self.path("picture.tif"), samples("Int16", height, width, 1), "Int16", nodata=7)
        dataset = gdal.Open(self.path("picture.tif"), gdal.GA_Update)
        if points:
            dataset.SetGCPs(points, "")
        else:
            dataset.SetGeoTransform([1000, 300.0379, 0.25, 2000, -0.5, -299.9])
        dataset = None
        self.good("build", "picture.tif", "picture.pyr", "--levels", "3")

    def test_pixels_of_a_level_have_the_size_that_they_cover(self):
        for width, height in ((1023, 1021), (1024, 1016), (1024, 1017)):
            self.georeferenced(width, height)
            for level in (1, 2, 3):
                with self.subTest(width=width, height=height, level=level):
                    self.good("export", "picture.pyr", "out.tif", "--level", level)
                    dataset = gdal.Open(self.path("out.tif"))
                    size = 2 ** level
                    np.testing.assert_allclose(
                        dataset.GetGeoTransform(),
                        [1000, size * 300.0379, size * 0.25, 2000, size * -0.5, size * -299.9],
                        rtol=1e-15)
                    self.assertEqual(dataset.GetRasterBand(1).GetNoDataValue(), 7)
                    np.testing.assert_array_equal(dataset.ReadAsArray(),
                                                  Pyramid(self.path("picture.pyr")).read(level)
                                                  [:, :, 0])
            os.remove(self.path("picture.pyr"))

    def test_windows_of_a_level_stand_where_their_pixels_are(self):
        self.georeferenced(1023, 1021)
        self.good("export", "picture.pyr", "out.tif", "--level", "2", "--window", "30,20,100,50")
        transform = gdal.Open(self.path("out.tif")).GetGeoTransform()
        np.testing.assert_allclose(
            transform, [1000 + 120 * 300.0379 + 80 * 0.25, 4 * 300.0379, 1,
                        2000 - 120 * 0.5 - 80 * 299.9, -2, 4 * -299.9], rtol=1e-14)

    def test_control_points_of_a_level(self):
        points = [gdal.GCP(x, y, 0, x / 10, y / 10) for x, y in ((0, 0), (999, 8), (80, 1001))]
        self.georeferenced(1023, 1021, points)
        self.good("export", "picture.pyr", "out.tif", "--level", "3")
        found = gdal.Open(self.path("out.tif")).GetGCPs()
        self.assertEqual([(p.GCPPixel, p.GCPLine) for p in found],
                         [(p.GCPPixel / 8, p.GCPLine / 8) for p in points])

    def test_the_format_is_taken_before_the_ending(self):
        self.pyramid()
        self.good("export", "picture.pyr", "picture.dat", "--format", "GTiff", "--co=TILED=YES")
        self.assertEqual(gdal.Open(self.path("picture.dat")).GetDriver().ShortName, "GTiff")

    def test_masks_are_kept(self):
        self.picture()
        source = gdal.Open(self.path("picture.tif"))
        source.CreateMaskBand(gdal.GMF_PER_DATASET)
        mask = samples("Byte", 300, 700, 1, 5)[:, :, 0] // 128 * 255
        source.GetRasterBand(1).GetMaskBand().WriteArray(mask)
        del source
        self.good("build", "picture.tif", "picture.pyr")
        for level, options in ((0, ()), (1, ()), (0, ("--window", "7,8,100,90"))):
            self.good("export", "picture.pyr", "back.tif", "--level", level, *options)
            back = gdal.Open(self.path("back.tif"))
            self.assertEqual(back.GetRasterBand(1).GetMaskFlags(), gdal.GMF_PER_DATASET)
            expected = mask[8:98, 7:107] if options else mask[::1 << level, ::1 << level]
            np.testing.assert_array_equal(back.GetRasterBand(1).GetMaskBand().ReadAsArray(),
                                          expected)
            del back
            # The mask stands beside the file, or in it from GDAL 3.9 on.
            for name in self.files():
                if name.startswith("back.tif"):
                    os.remove(self.path(name))

    def test_the_format_is_told_as_gdals_own_programs_tell_it(self):
        self.pyramid()
        for words in (["-of", "GTiff"], ["--of", "GTiff"], ["--of=GTiff"]):
            self.good("export", "picture.pyr", "picture.dat", *words)
            self.assertEqual(gdal.Open(self.path("picture.dat")).GetDriver().ShortName, "GTiff")

    def test_an_old_target_is_replaced(self):
        self.pyramid()
        self.good("export", "picture.pyr", "back.tif", "--level", 2)
        self.good("export", "picture.pyr", "back.tif", "--level", 1)
        self.assertEqual(self.array("back.tif").shape, (150, 350, 3))

    def test_a_failed_export_leaves_nothing(self):
        geotiff(self.path("source.tif"), samples("Double", 20, 20, 1), "Double")
        self.good("build", "source.tif", "made.pyr")
        done = self.run_tool("export", "made.pyr", "back.tif", "-co", "COMPRESS=JPEG")
        self.assertEqual(done.returncode, 1)
        for line in done.stderr.splitlines():
            self.assertTrue(line.startswith("zmcraster: back.tif: "), line)
        self.assertEqual(self.files(), ["made.pyr", "made.pyr.aux.xml", "source.tif"])

    def test_messages(self):
        self.pyramid()
        self.refused(1, "picture.pyr: it is the pyramid itself; name another file", "export",
                     "picture.pyr", "picture.pyr")
        self.refused(1, f"{self.folder}: it is a folder; name a file in it", "export",
                     "picture.pyr", self.folder)
        self.refused(2, "--format: GDAL has no format Nonesuch; gdalinfo --formats lists them",
                     "export", "picture.pyr", "x.tif", "--format", "Nonesuch")
        self.refused(2, '-co: "COMPRESS" is not NAME=VALUE', "export", "picture.pyr", "x.tif",
                     "-co", "COMPRESS")
        done = self.run_tool("export", "picture.pyr", "x.nonesuch")
        self.assertEqual((done.returncode, done.stderr.count("\n")), (1, 1))
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.truncate(Pyramid(self.path("picture.pyr")).end - 10)
        done = self.run_tool("export", "picture.pyr", "x.tif", "--quiet")
        self.assertEqual(done.returncode, 1)
        self.assertIn("its file ends before the pixels at 512, 256 of level 0", done.stderr)
        self.assertNotIn("x.tif", self.files())
        for part in (("--window", "0,0,700,256"), ("--level", "1")):
            done = self.run_tool("export", "picture.pyr", "x.tif", *part)
            self.assertEqual(done.returncode, 0, done)
            self.assertIn("warning: the pyramid is incomplete, 10 bytes are missing", done.stderr)
        with open(self.path("picture.pyr"), "r+b") as handle:
            handle.truncate(Pyramid(self.path("picture.pyr")).start + 10)
        cut = Pyramid(self.path("picture.pyr"))
        self.refused(1, f"picture.pyr: the pyramid is incomplete, {cut.end - len(cut.data)} bytes of "
                     "tiles are missing; build it anew",
                     "export", "picture.pyr", "x.tif", "--level", "1")
