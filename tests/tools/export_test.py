"""Exports, read back through GDAL."""
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

    def test_the_format_is_taken_before_the_ending(self):
        self.pyramid()
        self.good("export", "picture.pyr", "picture.dat", "--format", "GTiff", "--co=TILED=YES")
        self.assertEqual(gdal.Open(self.path("picture.dat")).GetDriver().ShortName, "GTiff")

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
        self.assertEqual(self.files(), ["made.pyr", "source.tif"])

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
        self.refused(1, "picture.pyr: the pyramid is incomplete, 10 bytes of tiles are missing; "
                        "build it anew", "export", "picture.pyr", "x.tif")
